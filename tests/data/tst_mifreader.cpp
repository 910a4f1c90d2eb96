#include "MifEntry.h"
#include "MifFormat.h"
#include "MifReader.h"
#include "MifWriter.h"
#include "QBinaryStream.h"
#include "QVectorStream.h"
#include "TestSupport.h"

#include <QTemporaryDir>
#include <QtEndian>
#include <QtTest>

#include <sys/stat.h>

using namespace MifFormat;

Q_DECLARE_METATYPE(MifEntry)

namespace {

void put32(QByteArray& data, int position, quint32 value)
{
    qToLittleEndian(value, data.data() + position);
}

quint32 get32(const QByteArray& data, int position)
{
    return qFromLittleEndian<quint32>(data.constData() + position);
}

// Two entries of type 0x10 (ids 1 and 2) with blobs "abc" and "defg".
QByteArray twoBlobFile()
{
    MifWriter writer;
    writer.addResource(0x10, 1, "abc");
    writer.addResource(0x10, 2, "defg");
    return writer.data();
}

// A module header built by hand: filler bytes around the five counts.
QByteArray moduleHeader(quint16 classes, quint16 applets, quint16 external, quint16 notifiers, quint16 mimeTypes,
                        int size = ModuleHeaderSize)
{
    QVectorStream out(QByteArray(ModuleHeaderCountsOffset, '\x5A'));
    for (quint16 count : {classes, applets, external, notifiers, mimeTypes})
        out.writeUInt16(count);
    return (out.data() + QByteArray(ModuleHeaderSize, '\x5A')).left(size);
}

QByteArray uint32s(std::initializer_list<quint32> values)
{
    QVectorStream out;
    for (quint32 v : values)
        out.writeUInt32(v);
    return out.data();
}

// A module file from explicit resource blobs, keyed by module resource id.
QByteArray moduleFile(const QMap<int, QByteArray>& resources)
{
    MifWriter writer;
    for (auto it = resources.cbegin(); it != resources.cend(); ++it)
        writer.addResource(ModuleType, quint16(it.key()), it.value());
    return writer.data();
}

// Every module resource filled, in the form the reader gives back (no kind, file texts or
// applet names: those are not stored).
MifEntry richEntry()
{
    MifEntry entry;
    entry.classes = {0x01000001, 0x01000002, 0xFFFFFFFF};
    entry.externalClasses = {0x02000010};
    entry.applets = {MifApplet{0x01000001, QString(), 0x1234, 3, 0x0300ABCD, 0x8001, 0xFFFF}, MifApplet()};
    entry.notifiers = {MifNotifier{0x05000001, 0x05000002, 0x80000000}};
    entry.mimeTypes = {MifMimeType{0x01000002, 0x04000001, "image/jpeg"},
                       MifMimeType{1, 2, QString::fromLatin1("text/caf\xe9")}, MifMimeType()};
    entry.classCount = 3;
    entry.appletCount = 2;
    entry.externalClassCount = 1;
    entry.notificationCount = 1;
    entry.mimeTypeCount = 3;
    return entry;
}

} // namespace

// The MIF container and module reader and writer, and the byte streams under them.
class TestMifReader : public QObject
{
    Q_OBJECT

private slots:
    void moduleRoundTrip_data()
    {
        QTest::addColumn<QByteArray>("header");
        QTest::addColumn<QByteArray>("expectedHeader");
        QByteArray header(ModuleHeaderSize, '\0');
        for (int i = 0; i < header.size(); ++i)
            header[i] = char(0xA0 + i);
        QByteArray counted = header;
        counted.replace(ModuleHeaderCountsOffset, 10, QByteArray("\3\0\2\0\1\0\1\0\3\0", 10));
        QByteArray padded = QByteArray(ModuleHeaderSize, '\0').replace(ModuleHeaderCountsOffset, 10, counted.mid(ModuleHeaderCountsOffset, 10));
        padded.replace(0, 10, header.left(10));
        QTest::newRow("own header, counts written in") << header << counted;
        QTest::newRow("longer header kept whole") << header + "tail" << counted + "tail";
        QTest::newRow("short header padded") << header.left(10) << padded;
    }
    void moduleRoundTrip()
    {
        QFETCH(QByteArray, header);
        QFETCH(QByteArray, expectedHeader);
        MifEntry entry = richEntry();
        entry.header = header;
        const QByteArray data = MifWriter::moduleData(entry);
        QVERIFY(data.contains("text/caf\xe9"));  // Latin-1, not UTF-8
        MifReader reader;
        QVERIFY2(reader.readData(data), qPrintable(reader.errorString()));
        QCOMPARE(reader.entryCount(), 1);
        QCOMPARE(reader.blobCount(), 6);
        MifEntry decoded;
        QVERIFY(reader.decodeModule(decoded));
        QCOMPARE(decoded.header, expectedHeader);
        entry.header = expectedHeader;
        QVERIFY(decoded == entry);
        QCOMPARE(MifWriter::moduleData(decoded), data);
    }

    void moduleFiles()
    {
        QTemporaryDir dir;
        QString error;
        QVERIFY2(MifWriter::writeModuleFile(dir.filePath("module.mif"), richEntry(), &error), qPrintable(error));
        MifReader reader;
        MifEntry decoded;
        QVERIFY(reader.readFile(dir.filePath("module.mif")) && reader.decodeModule(decoded));
        QCOMPARE(decoded.header.size(), ModuleHeaderSize);
        decoded.header.clear();
        QVERIFY(decoded == richEntry());
        QVERIFY(!reader.readFile(dir.filePath("missing.mif")) && reader.errorString().contains("missing.mif"));
        QVERIFY(!MifWriter::writeModuleFile(dir.filePath("no/such/folder/module.mif"), richEntry(), &error) && !error.isEmpty());

        // What is not a regular file is refused at once, also behind a link: a FIFO would
        // block the open, a device never end. A file past the limit is refused unread.
        QVERIFY(::mkfifo(QFile::encodeName(dir.filePath("fifo.mif")).constData(), 0600) == 0);
        QVERIFY(QFile::link("/dev/zero", dir.filePath("zero.mif")) && QFile::link(dir.filePath("fifo.mif"), dir.filePath("pipe.mif")));
        for (const char* name : {"fifo.mif", "zero.mif", "pipe.mif"}) {
            QVERIFY(!reader.readFile(dir.filePath(name)));
            QCOMPARE(reader.errorString(), dir.filePath(name) + " is not a regular file");
        }
        QFile sparse(dir.filePath("sparse.mif"));
        QVERIFY(sparse.open(QIODevice::WriteOnly) && sparse.write(twoBlobFile()) > 0 && sparse.resize(MifReader::MaxFileSize + 1));
        sparse.close();
        QVERIFY(!reader.readFile(sparse.fileName()));
        QCOMPARE(reader.errorString(), QStringLiteral("%1 is larger than %2 bytes").arg(sparse.fileName()).arg(MifReader::MaxFileSize));
    }

    void containerLookups()
    {
        MifWriter writer;
        QCOMPARE(writer.addBlob("shared"), 0);
        QCOMPARE(writer.addBlob(QByteArray()), 1);
        QCOMPARE(writer.addBlob("last"), 2);
        QVERIFY(writer.addEntry(0x10, 5, 2, 0));   // ids 5..7 -> blobs 0..2
        QVERIFY(writer.addEntry(0x20, 100, 0, 0)); // shares blob 0
        QVERIFY(writer.addEntry(0x5000, 9, 0, 2)); // a module type id out of the module range
        MifReader reader;
        QVERIFY2(reader.readData(writer.data()), qPrintable(reader.errorString()));
        QCOMPARE(reader.entryCount(), 3);
        QCOMPARE(reader.blobCount(), 3);
        QCOMPARE(reader.resource(0x10, 5), QByteArray("shared"));
        QCOMPARE(reader.resource(0x20, 100), QByteArray("shared"));
        QCOMPARE(reader.resource(0x10, 7), QByteArray("last"));
        QCOMPARE(reader.resource(0x5000, 9), QByteArray("last"));
        QVERIFY(reader.hasResource(0x10, 6));  // a zero-size blob exists
        QVERIFY(reader.resource(0x10, 6).isEmpty());
        for (quint16 id : {4, 8, 99, 101})
            QVERIFY(!reader.hasResource(0x10, id) && !reader.hasResource(0x20, id));
        QVERIFY(reader.resource(0x30, 5).isNull());

        // No module header among them, so nothing is decoded and the entry is reset.
        MifEntry entry = richEntry();
        QVERIFY(!reader.decodeModule(entry));
        QVERIFY(entry == MifEntry());

        // Of two entries covering an id, the first in the table wins.
        for (bool wideFirst : {true, false}) {
            MifWriter overlapping;
            for (const char* blob : {"w0", "w1", "w2", "narrow"})
                overlapping.addBlob(blob);
            overlapping.addEntry(1, wideFirst ? 10 : 11, wideFirst ? 2 : 0, wideFirst ? 0 : 3);
            overlapping.addEntry(1, wideFirst ? 11 : 10, wideFirst ? 0 : 2, wideFirst ? 3 : 0);
            QVERIFY(reader.readData(overlapping.data()));
            QCOMPARE(reader.resource(1, 10) + reader.resource(1, 11) + reader.resource(1, 12),
                     QByteArray(wideFirst ? "w0w1w2" : "w0narroww2"));
        }

        // Another writer may count offsets from the blob area rather than from the file start;
        // bytes after the last blob are ignored.
        QByteArray data = twoBlobFile();
        const int table = FileHeaderSize + 2 * EntrySize;
        const quint32 base = get32(data, table);
        for (int k = 0; k < 3; ++k)
            put32(data, table + k * OffsetSize, get32(data, table + k * OffsetSize) - base);
        for (const QByteArray& file : {data, twoBlobFile() + "trailing"}) {
            QVERIFY2(reader.readData(file), qPrintable(reader.errorString()));
            QCOMPARE(reader.resource(0x10, 1) + reader.resource(0x10, 2), QByteArray("abcdefg"));
        }
    }

    void moduleHeaderMissingOrShort()
    {
        const QByteArray classes = uint32s({0x01000001});
        for (const int headerSize : {0, 39, 40}) {
            MifReader reader;
            QVERIFY(reader.readData(headerSize ? moduleFile({{HeaderId, moduleHeader(1, 0, 0, 0, 0, headerSize)}, {ClassesId, classes}})
                                               : moduleFile({{ClassesId, classes}})));
            MifEntry entry = richEntry();
            QCOMPARE(reader.decodeModule(entry), headerSize == 40);
            QVERIFY(headerSize == 40 ? entry.classCount == 1 && entry.classes == QVector<quint32>({0x01000001}) && entry.applets.isEmpty()
                                     : entry == MifEntry());
        }
    }

    void recordDecoding_data()
    {
        QTest::addColumn<QByteArray>("data");
        QTest::addColumn<QVector<quint32>>("classes");
        QTest::addColumn<int>("applets");
        QTest::addColumn<int>("notifiers");
        QTest::addColumn<QStringList>("mimeTypes");
        const QByteArray applet = uint32s({0x01000001, 0, 0x00020001, 3, 0x00050004});
        const QByteArray notifier = uint32s({1, 2, 3});
        const QByteArray mime = uint32s({7, 8}) + QByteArray("text/plain", 11);
        QTest::newRow("ids stop at the first 0")
            << moduleFile({{HeaderId, moduleHeader(9, 0, 9, 0, 0)}, {ClassesId, uint32s({5, 6, 0, 7})}, {ExternalClassesId, uint32s({0, 8})}})
            << QVector<quint32>({5, 6}) << 0 << 0 << QStringList();
        QTest::newRow("partial trailing id ignored")
            << moduleFile({{HeaderId, moduleHeader(0, 0, 0, 0, 0)}, {ClassesId, uint32s({5}) + "\x01\x02"}, {ExternalClassesId, "\x01"}})
            << QVector<quint32>({5}) << 0 << 0 << QStringList();
        QTest::newRow("counts larger than the records")
            << moduleFile({{HeaderId, moduleHeader(0, 5, 0, 4, 3)}, {AppletsId, applet + applet + applet.left(19)},
                           {NotifiersId, notifier + notifier.left(8)}, {MimeTypesId, mime + uint32s({1})}})
            << QVector<quint32>() << 2 << 1 << QStringList({"text/plain"});
        QTest::newRow("counts smaller than the records")
            << moduleFile({{HeaderId, moduleHeader(0, 1, 0, 1, 1)}, {AppletsId, applet + applet},
                           {NotifiersId, notifier + notifier}, {MimeTypesId, mime + mime}})
            << QVector<quint32>() << 1 << 1 << QStringList({"text/plain"});
        QTest::newRow("MIME text without terminator")
            << moduleFile({{HeaderId, moduleHeader(0, 0, 0, 0, 2)}, {MimeTypesId, mime + uint32s({7, 8}) + "text/html"}})
            << QVector<quint32>() << 0 << 0 << QStringList({"text/plain"});
    }
    void recordDecoding()
    {
        QFETCH(QByteArray, data);
        QFETCH(QVector<quint32>, classes);
        QFETCH(int, applets);
        QFETCH(int, notifiers);
        QFETCH(QStringList, mimeTypes);
        MifReader reader;
        QVERIFY2(reader.readData(data), qPrintable(reader.errorString()));
        MifEntry entry;
        QVERIFY(reader.decodeModule(entry));
        QCOMPARE(entry.classes, classes);
        QVERIFY(entry.externalClasses.isEmpty());
        QCOMPARE(entry.applets.size(), applets);
        for (const MifApplet& applet : entry.applets)
            QVERIFY(applet == (MifApplet{0x01000001, QString(), 1, 2, 3, 4, 5}));
        QCOMPARE(entry.notifiers.size(), notifiers);
        for (const MifNotifier& notifier : entry.notifiers)
            QVERIFY(notifier == (MifNotifier{1, 2, 3}));
        QStringList texts;
        for (const MifMimeType& mimeType : entry.mimeTypes) {
            QVERIFY(mimeType.handlerClassId == 7 && mimeType.baseClassId == 8);
            texts.append(mimeType.mimeType);
        }
        QCOMPARE(texts, mimeTypes);
    }

    // The only guard of the container bounds: the fuzz replay does not find these.
    void malformedContainers_data()
    {
        QTest::addColumn<QByteArray>("data");
        const QByteArray good = twoBlobFile();
        const int table = FileHeaderSize + 2 * EntrySize;
        const quint32 first = get32(good, table), second = get32(good, table + OffsetSize);
        auto patched = [&](std::initializer_list<std::pair<int, quint32>> words) {
            QByteArray data = good;
            for (const auto& [position, value] : words)
                put32(data, position, value);
            return data;
        };
        auto entryOver = [](int blobs, quint16 firstId, quint16 span, quint16 firstBlob) {
            MifWriter writer;
            for (int k = 0; k < blobs; ++k)
                writer.addBlob("a");
            writer.addEntry(1, firstId, span, firstBlob);
            return writer.data();
        };
        QTest::newRow("empty") << QByteArray();
        QTest::newRow("truncated header") << good.left(FileHeaderSize - 1);
        QTest::newRow("truncated entry table") << good.left(FileHeaderSize + EntrySize + 3);
        QTest::newRow("truncated offset table") << good.left(table + OffsetSize + 1);
        QTest::newRow("truncated blobs") << good.left(good.size() - 1);
        QByteArray manyEntries = good;
        qToLittleEndian(quint16(5000), manyEntries.data() + EntryCountOffset);
        QTest::newRow("entry count larger than the data") << manyEntries;
        QTest::newRow("blob count larger than the data") << patched({{BlobCountOffset, 1000}});
        QTest::newRow("blob count that wraps when counted") << patched({{BlobCountOffset, 0xFFFFFFFF}});
        QTest::newRow("offset table size that wraps in 32 bits") << patched({{BlobCountOffset, 0x3FFFFFFF}});
        QTest::newRow("decreasing offsets within the data") << patched({{table + 4, first + 5}, {table + 8, first + 4}});
        QTest::newRow("first offset above the second") << patched({{table, second + 1}});
        QTest::newRow("offsets that wrap") << patched({{table, 0xFFFFFFF0}, {table + 4, 0xFFFFFFF3}, {table + 8, 5}});
        QTest::newRow("offset past the end") << patched({{table + 8, get32(good, table + 8) + 1}});
        QTest::newRow("offset far past the end") << patched({{table + 8, 0xFFFFFFFF}});
        QTest::newRow("first blob + span beyond the blobs") << entryOver(2, 0, 2, 0);
        QTest::newRow("first blob + span overflowing 16 bits") << entryOver(1, 0, 0xFFFF, 0xFFFF);
        QTest::newRow("entry without any blob") << entryOver(0, 0, 0, 0);
        QTest::newRow("id range beyond 65535") << entryOver(2, 0xFFFF, 1, 0);
    }
    void malformedContainers()
    {
        QFETCH(QByteArray, data);
        MifReader reader;
        QVERIFY(reader.readData(twoBlobFile()));
        QVERIFY(!reader.readData(data) && !reader.errorString().isEmpty());
        // A failed read also drops what an earlier read had loaded.
        QVERIFY(!reader.hasResource(0x10, 1) && reader.entryCount() == 0 && reader.blobCount() == 0);
        MifEntry entry = richEntry();
        QVERIFY(!reader.decodeModule(entry));
        QVERIFY(entry == MifEntry());

        QTemporaryDir dir;
        QVERIFY(TestSupport::writeFile(dir.filePath("broken.mif"), data) && !reader.readFile(dir.filePath("broken.mif")));
    }

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

QTEST_GUILESS_MAIN(TestMifReader)
#include "tst_mifreader.moc"
