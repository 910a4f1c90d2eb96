#include "MifEntry.h"
#include "MifFormat.h"
#include "MifReader.h"
#include "MifWriter.h"
#include "QVectorStream.h"

#include <QDir>
#include <QFile>
#include <QTemporaryDir>
#include <QtEndian>
#include <QtTest>

using namespace MifFormat;

Q_DECLARE_METATYPE(MifEntry)

namespace {

void put16(QByteArray& data, int position, quint16 value)
{
    qToLittleEndian(value, data.data() + position);
}

void put32(QByteArray& data, int position, quint32 value)
{
    qToLittleEndian(value, data.data() + position);
}

quint32 get32(const QByteArray& data, int position)
{
    return qFromLittleEndian<quint32>(data.constData() + position);
}

int offsetTablePosition(int entryCount)
{
    return FileHeaderSize + entryCount * EntrySize;
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
QByteArray moduleHeader(quint16 classes, quint16 applets, quint16 external, quint16 notifiers, quint16 mimeTypes, int size = ModuleHeaderSize)
{
    QVectorStream out;
    const QByteArray filler(ModuleHeaderCountsOffset, '\x5A');
    out.writeBytes(filler.constData(), filler.size());
    for (quint16 count : { classes, applets, external, notifiers, mimeTypes })
        out.writeUInt16(count);
    QByteArray header = out.data();
    header.append(ModuleHeaderSize - header.size(), '\x5A');
    return header.left(size);
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

MifEntry richEntry()
{
    MifEntry entry;
    entry.kind = 7;
    entry.fileName = "camera.mif";
    entry.filePath = "/modules/camera.mif";
    entry.classes = { 0x01000001, 0x01000002, 0xFFFFFFFF };
    entry.externalClasses = { 0x02000010 };
    MifApplet applet;
    applet.classId = 0x01000001;
    applet.name = "not stored";
    applet.baseId = 0x1234;
    applet.appType = 3;
    applet.host = 0x0300ABCD;
    applet.privSet = 0x8001;
    applet.flags = 0xFFFF;
    entry.applets = { applet, MifApplet() };
    MifNotifier notifier;
    notifier.typeId = 0x05000001;
    notifier.notifierId = 0x05000002;
    notifier.mask = 0x80000000;
    entry.notifiers = { notifier };
    MifMimeType image;
    image.handlerClassId = 0x01000002;
    image.baseClassId = 0x04000001;
    image.mimeType = "image/jpeg";
    MifMimeType latin;
    latin.handlerClassId = 1;
    latin.baseClassId = 2;
    latin.mimeType = QString::fromLatin1("text/caf\xe9");
    MifMimeType empty;
    entry.mimeTypes = { image, latin, empty };
    entry.classCount = 3;
    entry.appletCount = 2;
    entry.externalClassCount = 1;
    entry.notificationCount = 1;
    entry.mimeTypeCount = 3;
    return entry;
}

// What the reader gives back for an entry the writer stored.
MifEntry storedForm(MifEntry entry, const QByteArray& header)
{
    entry.kind = 0;
    entry.fileName.clear();
    entry.filePath.clear();
    for (MifApplet& applet : entry.applets)
        applet.name.clear();
    entry.header = header;
    return entry;
}

} // namespace

class TestMifReader : public QObject
{
    Q_OBJECT

private slots:
    void moduleRoundTrip_data();
    void moduleRoundTrip();
    void moduleFiles();
    void containerLookups();
    void firstEntryWins_data();
    void firstEntryWins();
    void offsetBaseIsIrrelevant();
    void moduleHeaderMissingOrShort_data();
    void moduleHeaderMissingOrShort();
    void recordDecoding_data();
    void recordDecoding();
    void malformedContainers_data();
    void malformedContainers();
    void widestCoverage();
};

void TestMifReader::moduleRoundTrip_data()
{
    QTest::addColumn<MifEntry>("entry");
    QTest::addColumn<QByteArray>("expectedHeader");

    MifEntry rich = richEntry();
    QByteArray header(ModuleHeaderSize, '\0');
    for (int i = 0; i < header.size(); ++i)
        header[i] = char(0xA0 + i);
    rich.header = header;
    QByteArray richHeader = header;
    put16(richHeader, ModuleHeaderCountsOffset, 3);
    put16(richHeader, ModuleHeaderCountsOffset + 2, 2);
    put16(richHeader, ModuleHeaderCountsOffset + 4, 1);
    put16(richHeader, ModuleHeaderCountsOffset + 6, 1);
    put16(richHeader, ModuleHeaderCountsOffset + 8, 3);
    QTest::newRow("all resources, own header") << rich << richHeader;

    MifEntry noHeader = richEntry();
    QByteArray zeroHeader(ModuleHeaderSize, '\0');
    zeroHeader.replace(ModuleHeaderCountsOffset, 10, richHeader.mid(ModuleHeaderCountsOffset, 10));
    QTest::newRow("header built from the counts") << noHeader << zeroHeader;

    MifEntry longHeader = richEntry();
    longHeader.header = header + QByteArray("tail");
    QTest::newRow("longer header kept whole") << longHeader << richHeader + QByteArray("tail");

    MifEntry shortHeader = richEntry();
    shortHeader.header = header.left(10);
    QByteArray padded = richHeader;
    padded.replace(10, ModuleHeaderCountsOffset - 10, QByteArray(ModuleHeaderCountsOffset - 10, '\0'));
    padded.replace(ModuleHeaderCountsOffset + 10, 4, QByteArray(4, '\0'));
    QTest::newRow("short header padded") << shortHeader << padded;

    QTest::newRow("empty entry") << MifEntry() << QByteArray(ModuleHeaderSize, '\0');
}

void TestMifReader::moduleRoundTrip()
{
    QFETCH(MifEntry, entry);
    QFETCH(QByteArray, expectedHeader);

    const QByteArray data = MifWriter::moduleData(entry);
    MifReader reader;
    QVERIFY2(reader.readData(data), qPrintable(reader.errorString()));
    QVERIFY(reader.errorString().isEmpty());
    QCOMPARE(reader.entryCount(), 1);
    QCOMPARE(reader.blobCount(), 6);

    MifEntry decoded;
    QVERIFY(reader.decodeModule(decoded));
    QCOMPARE(decoded.header, expectedHeader);
    QVERIFY(decoded == storedForm(entry, expectedHeader));

    // Once in stored form, an entry survives the trip byte for byte.
    QCOMPARE(MifWriter::moduleData(decoded), data);
}

void TestMifReader::moduleFiles()
{
    QTemporaryDir dir;
    QVERIFY(dir.isValid());
    const QString path = dir.filePath("module.mif");
    const MifEntry entry = richEntry();

    QString error;
    QVERIFY2(MifWriter::writeModuleFile(path, entry, &error), qPrintable(error));
    MifReader reader;
    QVERIFY2(reader.readFile(path), qPrintable(reader.errorString()));
    MifEntry decoded;
    QVERIFY(reader.decodeModule(decoded));
    QVERIFY(decoded == storedForm(entry, decoded.header));
    QCOMPARE(decoded.header.size(), ModuleHeaderSize);

    // A truncated file fails through the file stream as it does in memory.
    QFile file(path);
    QVERIFY(file.open(QIODevice::ReadWrite));
    QVERIFY(file.resize(file.size() - 1));
    file.close();
    QVERIFY(!reader.readFile(path));
    QVERIFY(!reader.errorString().isEmpty());
    QVERIFY(!reader.hasResource(ModuleType, HeaderId));

    QVERIFY(!reader.readFile(dir.filePath("missing.mif")));
    QVERIFY(reader.errorString().contains("missing.mif"));
    QVERIFY(!reader.readFile(dir.path()));
    QVERIFY(!reader.errorString().isEmpty());

    error.clear();
    QVERIFY(!MifWriter::writeModuleFile(dir.filePath("no/such/folder/module.mif"), entry, &error));
    QVERIFY(!error.isEmpty());
    QVERIFY(MifWriter::writeModuleFile(dir.filePath("no-error-wanted.mif"), entry, nullptr));

    MifWriter writer;
    writer.addResource(1, 1, "x");
    QVERIFY2(writer.writeFile(dir.filePath("plain.mif"), &error), qPrintable(error));
    QVERIFY(reader.readFile(dir.filePath("plain.mif")));
    QCOMPARE(reader.resource(1, 1), QByteArray("x"));
}

void TestMifReader::containerLookups()
{
    MifWriter writer;
    const int shared = writer.addBlob("shared");
    const int empty = writer.addBlob(QByteArray());
    const int last = writer.addBlob("last");
    QCOMPARE(shared, 0);
    QCOMPARE(empty, 1);
    QCOMPARE(last, 2);
    QVERIFY(writer.addEntry(0x10, 5, 2, 0));  // ids 5..7 -> blobs 0..2
    QVERIFY(writer.addEntry(0x20, 100, 0, 0)); // shares blob 0
    QVERIFY(writer.addEntry(0x5000, 9, 0, 2)); // a module type id out of the module range
    const QByteArray data = writer.data();

    MifReader reader;
    QVERIFY2(reader.readData(data), qPrintable(reader.errorString()));
    QCOMPARE(reader.entryCount(), 3);
    QCOMPARE(reader.blobCount(), 3);
    QCOMPARE(reader.resource(0x10, 5), QByteArray("shared"));
    QCOMPARE(reader.resource(0x20, 100), QByteArray("shared"));
    QCOMPARE(reader.resource(0x10, 7), QByteArray("last"));
    QCOMPARE(reader.resource(0x5000, 9), QByteArray("last"));

    // A zero-size blob is a resource that exists and is empty.
    QVERIFY(reader.hasResource(0x10, 6));
    QVERIFY(reader.resource(0x10, 6).isEmpty());

    for (quint16 id : { 4, 8, 99, 101 })
        QVERIFY(!reader.hasResource(0x10, id) && !reader.hasResource(0x20, id));
    QVERIFY(!reader.hasResource(0x30, 5));
    QVERIFY(reader.resource(0x30, 5).isNull());

    // No module header among them, so nothing is decoded and the entry is reset.
    MifEntry entry = richEntry();
    QVERIFY(!reader.decodeModule(entry));
    QVERIFY(entry == MifEntry());
}

void TestMifReader::firstEntryWins_data()
{
    QTest::addColumn<bool>("wideFirst");
    QTest::newRow("wide entry first") << true;
    QTest::newRow("narrow entry first") << false;
}

void TestMifReader::firstEntryWins()
{
    QFETCH(bool, wideFirst);

    MifWriter writer;
    writer.addBlob("w0");
    writer.addBlob("w1");
    writer.addBlob("w2");
    writer.addBlob("narrow");
    if (wideFirst) {
        writer.addEntry(1, 10, 2, 0);
        writer.addEntry(1, 11, 0, 3);
    } else {
        writer.addEntry(1, 11, 0, 3);
        writer.addEntry(1, 10, 2, 0);
    }
    MifReader reader;
    QVERIFY(reader.readData(writer.data()));
    QCOMPARE(reader.resource(1, 10), QByteArray("w0"));
    QCOMPARE(reader.resource(1, 11), QByteArray(wideFirst ? "w1" : "narrow"));
    QCOMPARE(reader.resource(1, 12), QByteArray("w2"));
}

void TestMifReader::offsetBaseIsIrrelevant()
{
    // Another writer may count offsets from the blob area rather than from the file start.
    QByteArray data = twoBlobFile();
    const int table = offsetTablePosition(2);
    const quint32 base = get32(data, table);
    for (int k = 0; k < 3; ++k)
        put32(data, table + k * OffsetSize, get32(data, table + k * OffsetSize) - base);
    MifReader reader;
    QVERIFY2(reader.readData(data), qPrintable(reader.errorString()));
    QCOMPARE(reader.resource(0x10, 1), QByteArray("abc"));
    QCOMPARE(reader.resource(0x10, 2), QByteArray("defg"));

    // Bytes after the last blob are ignored.
    QVERIFY(reader.readData(twoBlobFile() + "trailing"));
    QCOMPARE(reader.resource(0x10, 2), QByteArray("defg"));
}

void TestMifReader::moduleHeaderMissingOrShort_data()
{
    QTest::addColumn<QByteArray>("data");
    QTest::addColumn<bool>("decoded");

    const QByteArray classes = uint32s({ 0x01000001 });
    QTest::newRow("no header resource") << moduleFile({ { ClassesId, classes } }) << false;
    QTest::newRow("empty header") << moduleFile({ { HeaderId, QByteArray() }, { ClassesId, classes } }) << false;
    QTest::newRow("39-byte header") << moduleFile({ { HeaderId, moduleHeader(1, 0, 0, 0, 0, 39) }, { ClassesId, classes } }) << false;
    QTest::newRow("40-byte header") << moduleFile({ { HeaderId, moduleHeader(1, 0, 0, 0, 0) }, { ClassesId, classes } }) << true;
}

void TestMifReader::moduleHeaderMissingOrShort()
{
    QFETCH(QByteArray, data);
    QFETCH(bool, decoded);

    MifReader reader;
    QVERIFY2(reader.readData(data), qPrintable(reader.errorString()));
    MifEntry entry = richEntry();
    QCOMPARE(reader.decodeModule(entry), decoded);
    if (decoded) {
        QCOMPARE(entry.classCount, quint16(1));
        QCOMPARE(entry.classes, QVector<quint32>({ 0x01000001 }));
        QVERIFY(entry.applets.isEmpty() && entry.mimeTypes.isEmpty());
    } else {
        QVERIFY(entry == MifEntry());
    }
}

void TestMifReader::recordDecoding_data()
{
    QTest::addColumn<QByteArray>("data");
    QTest::addColumn<QVector<quint32>>("classes");
    QTest::addColumn<QVector<quint32>>("externalClasses");
    QTest::addColumn<int>("applets");
    QTest::addColumn<int>("notifiers");
    QTest::addColumn<QStringList>("mimeTypes");

    QVectorStream applet;
    applet.writeUInt32(quint32(0x01000001));
    applet.writeUInt32(quint32(0));
    applet.writeUInt16(quint16(1));
    applet.writeUInt16(quint16(2));
    applet.writeUInt32(quint32(3));
    applet.writeUInt16(quint16(4));
    applet.writeUInt16(quint16(5));
    const QByteArray appletRecord = applet.data();
    QCOMPARE(appletRecord.size(), AppletRecordSize);
    const QByteArray notifierRecord = uint32s({ 1, 2, 3 });
    const QByteArray mimeRecord = uint32s({ 7, 8 }) + QByteArray("text/plain", 11);

    QTest::newRow("ids stop at the first 0")
        << moduleFile({ { HeaderId, moduleHeader(9, 0, 9, 0, 0) }, { ClassesId, uint32s({ 5, 6, 0, 7 }) }, { ExternalClassesId, uint32s({ 0, 8 }) } })
        << QVector<quint32>({ 5, 6 }) << QVector<quint32>() << 0 << 0 << QStringList();
    QTest::newRow("partial trailing id ignored")
        << moduleFile({ { HeaderId, moduleHeader(0, 0, 0, 0, 0) }, { ClassesId, uint32s({ 5 }) + "\x01\x02" }, { ExternalClassesId, "\x01" } })
        << QVector<quint32>({ 5 }) << QVector<quint32>() << 0 << 0 << QStringList();
    QTest::newRow("counts larger than the records")
        << moduleFile({ { HeaderId, moduleHeader(0, 5, 0, 4, 3) }, { AppletsId, appletRecord + appletRecord + appletRecord.left(19) }, { NotifiersId, notifierRecord + notifierRecord.left(8) }, { MimeTypesId, mimeRecord + uint32s({ 1 }) } })
        << QVector<quint32>() << QVector<quint32>() << 2 << 1 << QStringList({ "text/plain" });
    QTest::newRow("counts smaller than the records")
        << moduleFile({ { HeaderId, moduleHeader(0, 1, 0, 1, 1) }, { AppletsId, appletRecord + appletRecord }, { NotifiersId, notifierRecord + notifierRecord }, { MimeTypesId, mimeRecord + mimeRecord } })
        << QVector<quint32>() << QVector<quint32>() << 1 << 1 << QStringList({ "text/plain" });
    QTest::newRow("zero counts read nothing")
        << moduleFile({ { HeaderId, moduleHeader(0, 0, 0, 0, 0) }, { AppletsId, appletRecord }, { NotifiersId, notifierRecord }, { MimeTypesId, mimeRecord } })
        << QVector<quint32>() << QVector<quint32>() << 0 << 0 << QStringList();
    QTest::newRow("MIME text without terminator")
        << moduleFile({ { HeaderId, moduleHeader(0, 0, 0, 0, 2) }, { MimeTypesId, mimeRecord + uint32s({ 7, 8 }) + "text/html" } })
        << QVector<quint32>() << QVector<quint32>() << 0 << 0 << QStringList({ "text/plain" });
    QTest::newRow("empty MIME text")
        << moduleFile({ { HeaderId, moduleHeader(0, 0, 0, 0, 2) }, { MimeTypesId, uint32s({ 7, 8 }) + QByteArray(1, '\0') + mimeRecord } })
        << QVector<quint32>() << QVector<quint32>() << 0 << 0 << QStringList({ "", "text/plain" });
    QTest::newRow("missing resources stay empty")
        << moduleFile({ { HeaderId, moduleHeader(4, 4, 4, 4, 4) } })
        << QVector<quint32>() << QVector<quint32>() << 0 << 0 << QStringList();
}

void TestMifReader::recordDecoding()
{
    QFETCH(QByteArray, data);
    QFETCH(QVector<quint32>, classes);
    QFETCH(QVector<quint32>, externalClasses);
    QFETCH(int, applets);
    QFETCH(int, notifiers);
    QFETCH(QStringList, mimeTypes);

    MifReader reader;
    QVERIFY2(reader.readData(data), qPrintable(reader.errorString()));
    MifEntry entry;
    QVERIFY(reader.decodeModule(entry));
    QCOMPARE(entry.classes, classes);
    QCOMPARE(entry.externalClasses, externalClasses);
    QCOMPARE(entry.applets.size(), applets);
    for (const MifApplet& applet : entry.applets) {
        QCOMPARE(applet.classId, quint32(0x01000001));
        QCOMPARE(applet.baseId, quint16(1));
        QCOMPARE(applet.appType, quint16(2));
        QCOMPARE(applet.host, quint32(3));
        QCOMPARE(applet.privSet, quint16(4));
        QCOMPARE(applet.flags, quint16(5));
    }
    QCOMPARE(entry.notifiers.size(), notifiers);
    for (const MifNotifier& notifier : entry.notifiers)
        QVERIFY(notifier.typeId == 1 && notifier.notifierId == 2 && notifier.mask == 3);
    QStringList texts;
    for (const MifMimeType& mimeType : entry.mimeTypes) {
        QVERIFY(mimeType.handlerClassId == 7 && mimeType.baseClassId == 8);
        texts.append(mimeType.mimeType);
    }
    QCOMPARE(texts, mimeTypes);
}

void TestMifReader::malformedContainers_data()
{
    QTest::addColumn<QByteArray>("data");

    const QByteArray good = twoBlobFile();
    const int table = offsetTablePosition(2);
    QTest::newRow("empty") << QByteArray();
    QTest::newRow("truncated header") << good.left(FileHeaderSize - 1);
    QTest::newRow("truncated entry table") << good.left(FileHeaderSize + EntrySize + 3);
    QTest::newRow("truncated offset table") << good.left(table + OffsetSize + 1);
    QTest::newRow("truncated blobs") << good.left(good.size() - 1);

    QByteArray data = good;
    put16(data, EntryCountOffset, 5000);
    QTest::newRow("entry count larger than the data") << data;
    data = good;
    put32(data, BlobCountOffset, 1000);
    QTest::newRow("blob count larger than the data") << data;
    data = good;
    put32(data, BlobCountOffset, 0xFFFFFFFF);
    QTest::newRow("blob count that wraps when counted") << data;
    data = good;
    put32(data, BlobCountOffset, 0x3FFFFFFF);
    QTest::newRow("offset table size that wraps in 32 bits") << data;

    data = good;
    put32(data, table + OffsetSize, get32(data, table) + 5);
    put32(data, table + 2 * OffsetSize, get32(data, table) + 4);
    QTest::newRow("decreasing offsets within the data") << data;
    data = good;
    put32(data, table, get32(data, table + OffsetSize) + 1);
    QTest::newRow("first offset above the second") << data;
    data = good;
    put32(data, table, 0xFFFFFFF0);
    put32(data, table + OffsetSize, 0xFFFFFFF3);
    put32(data, table + 2 * OffsetSize, 5);
    QTest::newRow("offsets that wrap") << data;
    data = good;
    put32(data, table + 2 * OffsetSize, get32(data, table + 2 * OffsetSize) + 1);
    QTest::newRow("offset past the end") << data;
    data = good;
    put32(data, table + 2 * OffsetSize, 0xFFFFFFFF);
    QTest::newRow("offset far past the end") << data;

    MifWriter writer;
    writer.addBlob("a");
    writer.addBlob("b");
    writer.addEntry(1, 0, 2, 0);
    QTest::newRow("first blob + span beyond the blobs") << writer.data();

    MifWriter overflow;
    overflow.addBlob("a");
    overflow.addEntry(1, 0, 0xFFFF, 0xFFFF);
    QTest::newRow("first blob + span overflowing 16 bits") << overflow.data();

    MifWriter noBlobs;
    noBlobs.addEntry(1, 0, 0, 0);
    QTest::newRow("entry without any blob") << noBlobs.data();

    MifWriter idRange;
    idRange.addBlob("a");
    idRange.addBlob("b");
    idRange.addEntry(1, 0xFFFF, 1, 0);
    QTest::newRow("id range beyond 65535") << idRange.data();
}

void TestMifReader::malformedContainers()
{
    QFETCH(QByteArray, data);

    // A failed read also drops what an earlier read had loaded.
    MifReader reader;
    QVERIFY(reader.readData(twoBlobFile()));
    QVERIFY(reader.hasResource(0x10, 1));

    QVERIFY(!reader.readData(data));
    QVERIFY(!reader.errorString().isEmpty());
    QVERIFY(!reader.hasResource(0x10, 1));
    QCOMPARE(reader.entryCount(), 0);
    QCOMPARE(reader.blobCount(), 0);
    MifEntry entry = richEntry();
    QVERIFY(!reader.decodeModule(entry));
    QVERIFY(entry == MifEntry());

    QTemporaryDir dir;
    QVERIFY(dir.isValid());
    QFile file(dir.filePath("broken.mif"));
    QVERIFY(file.open(QIODevice::WriteOnly));
    file.write(data);
    file.close();
    QVERIFY(!reader.readFile(file.fileName()));
    QVERIFY(!reader.errorString().isEmpty());
}

void TestMifReader::widestCoverage()
{
    // The most a file can claim: a full table of entries that each cover every id.
    MifWriter writer;
    for (int k = 0; k <= 0xFFFF; ++k)
        writer.addBlob(k == 0xFFFF ? QByteArray("top") : QByteArray());
    for (int i = 0; i < MaxEntries - 1; ++i)
        QVERIFY(writer.addEntry(1, 0, 0xFFFF, 0));
    QVERIFY(writer.addEntry(2, 40000, 0, 7));
    QVERIFY(!writer.addEntry(3, 0, 0, 0));
    QVERIFY(!writer.addResource(3, 0, "full"));

    MifReader reader;
    QVERIFY2(reader.readData(writer.data()), qPrintable(reader.errorString()));
    QCOMPARE(reader.entryCount(), MaxEntries);
    QCOMPARE(reader.blobCount(), 0x10000);
    QCOMPARE(reader.resource(1, 0xFFFF), QByteArray("top"));
    QVERIFY(reader.hasResource(1, 0));
    QVERIFY(reader.resource(1, 0).isEmpty());
    QVERIFY(reader.hasResource(2, 40000));
    QVERIFY(!reader.hasResource(2, 40001));
    QVERIFY(!reader.hasResource(3, 0));
}

QTEST_GUILESS_MAIN(TestMifReader)
#include "tst_mifreader.moc"
