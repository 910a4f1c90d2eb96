#include "QBinaryStream.h"
#include "QVectorStream.h"

#include <QFile>
#include <QTemporaryDir>
#include <QtTest>

namespace {

// The order that differs from the machine's, so that every value is swapped.
int otherByteOrder()
{
    return QStream::machineByteOrder() == QStream::LittleEndian ? QStream::BigEndian : QStream::LittleEndian;
}

QByteArray bytes(std::initializer_list<int> values)
{
    QByteArray result;
    for (int v : values)
        result.append(char(v));
    return result;
}

} // namespace

class TestStreams : public QObject
{
    Q_OBJECT

private slots:
    void hostByteOrder();
    void shortVectorRead_data();
    void shortVectorRead();
    void readEntryPointsAgree();
    void byteOrderWrites_data();
    void byteOrderWrites();
    void byteOrderReads_data();
    void byteOrderReads();
    void vectorWriteAppendsWithoutMovingReads();
    void negativeCounts();
    void binaryStreamOnFile();
    void binaryStreamFailures();
};

void TestStreams::hostByteOrder()
{
    QVectorStream stream;
    QCOMPARE(stream.hostByteOrder(), QStream::machineByteOrder());
    QCOMPARE(stream.byteOrder(), int(QStream::LittleEndian));
    if (QSysInfo::ByteOrder == QSysInfo::LittleEndian)
        QCOMPARE(QStream::machineByteOrder(), 2);
}

void TestStreams::shortVectorRead_data()
{
    QTest::addColumn<QByteArray>("data");
    QTest::addColumn<int>("width");
    QTest::addColumn<int>("consumedBefore");

    QTest::newRow("uint32 from 3 bytes") << bytes({ 1, 2, 3 }) << 4 << 0;
    QTest::newRow("uint16 from 1 byte") << bytes({ 1 }) << 2 << 0;
    QTest::newRow("uint8 from nothing") << QByteArray() << 1 << 0;
    QTest::newRow("uint32 after 2 of 5 bytes") << bytes({ 1, 2, 3, 4, 5 }) << 4 << 2;
}

void TestStreams::shortVectorRead()
{
    QFETCH(QByteArray, data);
    QFETCH(int, width);
    QFETCH(int, consumedBefore);

    QVectorStream stream(data);
    for (int i = 0; i < consumedBefore; ++i)
        stream.readUInt8();
    QVERIFY(!stream.atEnd());
    QVERIFY(!stream.hasError());

    quint32 value = 0xDEADBEEF;
    switch (width) {
    case 1: value = stream.readUInt8(); break;
    case 2: value = stream.readUInt16(); break;
    default: value = stream.readUInt32(); break;
    }
    QCOMPARE(value, 0u);
    QVERIFY(stream.atEnd());
    QVERIFY(stream.hasError());
    QCOMPARE(stream.position(), qint64(consumedBefore));

    // Nothing was consumed: a read that fits still gets the next byte.
    if (consumedBefore < data.size())
        QCOMPARE(int(stream.readUInt8()), int(quint8(data.at(consumedBefore))));
}

void TestStreams::readEntryPointsAgree()
{
    const QByteArray data = bytes({ 0xAB, 0x01, 0x02, 0x01, 0x02, 0x03, 0x04 });
    QVectorStream first(data);
    QVectorStream second(data);

    quint8 u8 = 0;
    quint16 u16 = 0;
    quint32 u32 = 0;
    QCOMPARE(second.readUInt8(u8), first.readUInt8());
    QCOMPARE(u8, quint8(0xAB));
    QCOMPARE(second.readUInt16(u16), first.readUInt16());
    QCOMPARE(u16, quint16(0x0201));
    QCOMPARE(second.readUInt32(u32), first.readUInt32());
    QCOMPARE(u32, quint32(0x04030201));

    u32 = 0xFFFFFFFF;
    QCOMPARE(second.readUInt32(u32), 0u);
    QCOMPARE(u32, 0u);
}

void TestStreams::byteOrderWrites_data()
{
    QTest::addColumn<bool>("swapped");
    QTest::addColumn<int>("width");
    QTest::addColumn<bool>("signedEntry");
    QTest::addColumn<QByteArray>("expected");

    // Expected bytes as a little-endian machine stores them.
    QTest::newRow("16 swapped") << true << 2 << false << bytes({ 0x12, 0x34 });
    QTest::newRow("16 native") << false << 2 << false << bytes({ 0x34, 0x12 });
    QTest::newRow("16 swapped, second entry") << true << 2 << true << bytes({ 0x12, 0x34 });
    QTest::newRow("32 swapped") << true << 4 << false << bytes({ 0x12, 0x34, 0x56, 0x78 });
    QTest::newRow("32 native") << false << 4 << false << bytes({ 0x78, 0x56, 0x34, 0x12 });
    QTest::newRow("32 native, second entry") << false << 4 << true << bytes({ 0x78, 0x56, 0x34, 0x12 });
    QTest::newRow("8 never swapped") << true << 1 << false << bytes({ 0x12 });
    QTest::newRow("8 second entry") << true << 1 << true << bytes({ 0x12 });
}

void TestStreams::byteOrderWrites()
{
    if (QSysInfo::ByteOrder != QSysInfo::LittleEndian)
        QSKIP("The expected bytes are those of a little-endian machine");
    QFETCH(bool, swapped);
    QFETCH(int, width);
    QFETCH(bool, signedEntry);
    QFETCH(QByteArray, expected);

    QVectorStream stream(QByteArray(), swapped ? otherByteOrder() : QStream::machineByteOrder());
    switch (width) {
    case 1:
        signedEntry ? stream.writeUInt8(qint8(0x12)) : stream.writeUInt8(quint8(0x12));
        break;
    case 2:
        signedEntry ? stream.writeUInt16(qint16(0x1234)) : stream.writeUInt16(quint16(0x1234));
        break;
    default:
        signedEntry ? stream.writeUInt32(qint32(0x12345678)) : stream.writeUInt32(quint32(0x12345678));
        break;
    }
    QCOMPARE(stream.data(), expected);
    QVERIFY(!stream.hasError());
}

void TestStreams::byteOrderReads_data()
{
    QTest::addColumn<bool>("swapped");
    QTest::addColumn<quint16>("expected16");
    QTest::addColumn<quint32>("expected32");

    QTest::newRow("native") << false << quint16(0x0201) << quint32(0x06050403);
    QTest::newRow("swapped") << true << quint16(0x0102) << quint32(0x03040506);
}

void TestStreams::byteOrderReads()
{
    if (QSysInfo::ByteOrder != QSysInfo::LittleEndian)
        QSKIP("The expected values are those of a little-endian machine");
    QFETCH(bool, swapped);
    QFETCH(quint16, expected16);
    QFETCH(quint32, expected32);

    QVectorStream stream(bytes({ 1, 2, 3, 4, 5, 6, 7 }), swapped ? otherByteOrder() : QStream::machineByteOrder());
    QCOMPARE(stream.readUInt16(), expected16);
    QCOMPARE(stream.readUInt32(), expected32);
    QCOMPARE(stream.readUInt8(), quint8(7));
    QVERIFY(!stream.hasError());

    // A value written in one order reads back in the same order.
    QVectorStream roundTrip(QByteArray(), stream.byteOrder());
    roundTrip.writeUInt32(quint32(0xA1B2C3D4));
    roundTrip.writeUInt16(quint16(0xE5F6));
    QVectorStream back(roundTrip.data(), stream.byteOrder());
    QCOMPARE(back.readUInt32(), quint32(0xA1B2C3D4));
    QCOMPARE(back.readUInt16(), quint16(0xE5F6));
}

void TestStreams::vectorWriteAppendsWithoutMovingReads()
{
    QVectorStream stream(bytes({ 9 }));
    QCOMPARE(stream.readUInt8(), quint8(9));
    stream.writeUInt16(quint16(0x0102));
    QCOMPARE(stream.data().size(), 3);
    QCOMPARE(stream.position(), qint64(1));
    QCOMPARE(stream.readUInt16(), quint16(0x0102));
    QVERIFY(!stream.atEnd());
}

void TestStreams::negativeCounts()
{
    char buffer[4] = {};
    QVectorStream stream(bytes({ 1, 2, 3, 4 }));
    QVERIFY(!stream.readBytes(buffer, -1));
    QVERIFY(stream.hasError());
    QCOMPARE(stream.position(), qint64(0));

    QVectorStream writer;
    QVERIFY(!writer.writeBytes(buffer, -4));
    QVERIFY(writer.hasError());
    QVERIFY(writer.data().isEmpty());
}

void TestStreams::binaryStreamOnFile()
{
    QTemporaryDir dir;
    QVERIFY(dir.isValid());
    const QString path = dir.filePath("values.bin");

    QFile output(path);
    QVERIFY(output.open(QIODevice::WriteOnly));
    {
        QBinaryStream out(&output);
        out.writeUInt8(quint8(0x11));
        out.writeUInt16(quint16(0x2233));
        out.writeUInt32(quint32(0x44556677));
        out.writeUInt32(qint32(-1));
        QVERIFY(!out.hasError());
    }
    output.close();
    QCOMPARE(QFileInfo(path).size(), qint64(11));

    QFile input(path);
    QVERIFY(input.open(QIODevice::ReadOnly));
    QBinaryStream in(&input);
    QCOMPARE(in.readUInt8(), quint8(0x11));
    QCOMPARE(in.readUInt16(), quint16(0x2233));
    QCOMPARE(in.readUInt32(), quint32(0x44556677));
    QVERIFY(!in.atEnd());
    QCOMPARE(in.readUInt32(), quint32(0xFFFFFFFF));
    QVERIFY(in.atEnd());
    QVERIFY(!in.hasError());

    // Reading past the end fails and yields 0.
    QCOMPARE(in.readUInt16(), quint16(0));
    QVERIFY(in.hasError());
}

void TestStreams::binaryStreamFailures()
{
    QTemporaryDir dir;
    QVERIFY(dir.isValid());
    const QString path = dir.filePath("three.bin");
    QFile output(path);
    QVERIFY(output.open(QIODevice::WriteOnly));
    QCOMPARE(output.write(bytes({ 1, 2, 3 })), qint64(3));
    output.close();

    // A short read is a failure even though some bytes arrived.
    QFile input(path);
    QVERIFY(input.open(QIODevice::ReadOnly));
    QBinaryStream in(&input);
    QCOMPARE(in.readUInt32(), 0u);
    QVERIFY(in.hasError());
    QVERIFY(in.atEnd());

    // Writing to a read-only device fails.
    QFile readOnly(path);
    QVERIFY(readOnly.open(QIODevice::ReadOnly));
    QBinaryStream noWrite(&readOnly);
    noWrite.writeUInt16(quint16(1));
    QVERIFY(noWrite.hasError());

    // A device that was never opened is a bad state.
    QFile closed(path);
    QBinaryStream unopened(&closed);
    QVERIFY(unopened.hasError());
    QCOMPARE(unopened.readUInt8(), quint8(0));
}

QTEST_GUILESS_MAIN(TestStreams)
#include "tst_streams.moc"
