#include "QBinaryStream.h"
#include "QVectorStream.h"
#include "TestSupport.h"

#include <QTemporaryDir>
#include <QtTest>

class TestStreams : public QObject
{
    Q_OBJECT

private slots:
    // The MIF loops rely on a short read giving 0, consuming nothing and ending the stream;
    // negative counts are refused.
    void shortReads()
    {
        for (const int consumedBefore : {0, 2}) {
            const QByteArray data = QByteArray("\1\2\3\4\5").left(3 + consumedBefore);
            QVectorStream stream(data);
            for (int i = 0; i < consumedBefore; ++i)
                stream.readUInt8();
            QVERIFY(!stream.atEnd() && !stream.hasError());
            QCOMPARE(stream.readUInt32(), 0u);
            QVERIFY(stream.atEnd() && stream.hasError());
            QCOMPARE(stream.position(), qint64(consumedBefore));
            QCOMPARE(int(stream.readUInt8()), int(data.at(consumedBefore)));
        }
        char buffer[4] = {};
        QVectorStream stream(QByteArray("\1\2\3\4"));
        QVERIFY(!stream.readBytes(buffer, -1) && stream.hasError());
        QCOMPARE(stream.position(), qint64(0));
        QVectorStream writer;
        QVERIFY(!writer.writeBytes(buffer, -4) && writer.hasError() && writer.data().isEmpty());
    }

    // One of the two orders is the machine's, the other is swapped both ways.
    void byteOrder_data()
    {
        QTest::addColumn<int>("order");
        QTest::addColumn<int>("width");
        QTest::addColumn<QByteArray>("bytes");
        QTest::addColumn<quint32>("value");
        QTest::newRow("16 big") << int(QStream::BigEndian) << 2 << QByteArray("\x12\x34") << 0x1234u;
        QTest::newRow("32 little") << int(QStream::LittleEndian) << 4 << QByteArray("\x78\x56\x34\x12") << 0x12345678u;
    }
    void byteOrder()
    {
        QFETCH(int, order);
        QFETCH(int, width);
        QFETCH(QByteArray, bytes);
        QFETCH(quint32, value);
        QVectorStream writer(QByteArray(), order);
        width == 2 ? writer.writeUInt16(quint16(value)) : writer.writeUInt32(value);
        QCOMPARE(writer.data(), bytes);
        QVectorStream reader(bytes, order);
        QCOMPARE(width == 2 ? reader.readUInt16() : reader.readUInt32(), value);
        QVERIFY(!reader.hasError() && !writer.hasError());
    }

    void binaryStreamOnFile()
    {
        QTemporaryDir dir;
        const QString path = dir.filePath("values.bin");
        QFile output(path);
        QVERIFY(output.open(QIODevice::WriteOnly));
        QBinaryStream out(&output);
        out.writeUInt16(quint16(0x2233));
        out.writeUInt8(quint8(0x11));
        QVERIFY(!out.hasError());
        output.close();
        QCOMPARE(TestSupport::readFile(path), QByteArray("\x33\x22\x11"));

        QFile input(path);
        QVERIFY(input.open(QIODevice::ReadOnly));
        QBinaryStream in(&input);
        QCOMPARE(in.readUInt16(), quint16(0x2233));
        QVERIFY(!in.hasError());
        QCOMPARE(in.readUInt32(), 0u); // only one byte left
        QVERIFY(in.hasError() && in.atEnd());
        QBinaryStream noWrite(&input);
        noWrite.writeUInt8(quint8(1));
        QVERIFY(noWrite.hasError());
        QFile closed(path);
        QBinaryStream unopened(&closed);
        QVERIFY(unopened.hasError());
        QCOMPARE(unopened.readUInt8(), quint8(0));
    }
};

QTEST_GUILESS_MAIN(TestStreams)
#include "tst_streams.moc"
