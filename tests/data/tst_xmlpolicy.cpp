// Every XML reader refuses what would cost more time or memory than the file's size
// (declared entities, deep nesting, huge attributes, huge files) with a message naming the
// file, and still reads what the program ships and writes.
#include "LevelDefinition.h"
#include "NameDatabases.h"
#include "TestSupport.h"
#include "XmlReadPolicy.h"

#ifdef DELVIX_WITH_SIM
#include "DeviceProfileParser.h"
#endif

#include <QCoreApplication>
#include <QDomDocument>
#include <QFile>
#include <QTemporaryDir>
#include <QTest>

#include <algorithm>

namespace {

// A document the reader takes is open + body + close, with one record in open.
struct Reader
{
    QString name;
    QByteArray open;
    QByteArray close;
    qint64 maxBytes;
};

QList<Reader> readers()
{
    QList<Reader> list{
        {"name database", R"(<classes><class id="0x01011001" name="Heap"/>)", "</classes>", XmlReadPolicy::DatabaseFileBytes},
        {"level file", R"(<level><Id value="0x01011001" name="Heap"/>)", "</level>", XmlReadPolicy::DatabaseFileBytes},
    };
#ifdef DELVIX_WITH_SIM
    list.append({"device profile", R"(<device id="t" name="T"><volume id="1" mount="/" folder="flash"/>)", "</device>",
                 XmlReadPolicy::ProfileFileBytes});
#endif
    return list;
}

Reader readerNamed(const QString& name)
{
    const QList<Reader> all = readers();
    return *std::find_if(all.cbegin(), all.cend(), [&name](const Reader& r) { return r.name == name; });
}

// The records the reader found (classes, level ids or volumes), or -1 with its message.
int readAs(const QString& reader, const QString& path, QString& error)
{
    if (reader == "name database") {
        QFile file(path);
        QList<IdRecord> entries;
        if (!file.open(QIODevice::ReadOnly) || !NameDatabases::readEntries(&file, "class", entries, &error))
            return -1;
        return int(entries.size());
    }
    if (reader == "level file") {
        LevelDefinition level;
        if (!level.load(path)) {
            error = level.errorString();
            return -1;
        }
        return int(level.records().size());
    }
#ifdef DELVIX_WITH_SIM
    DeviceProfileParser parser;
    DeviceProfile profile;
    if (!parser.parseFile(path, profile)) {
        error = parser.errorString();
        return -1;
    }
    return int(profile.volumes.size());
#else
    return -1;
#endif
}

QByteArray nested(int levels)
{
    return QByteArray("<n>").repeated(levels) + QByteArray("</n>").repeated(levels);
}

QByteArray attributeOf(qsizetype chars)
{
    return "<x a=\"" + QByteArray(chars, 'a') + "\"/>";
}

// head, spaces up to size bytes in all, then tail; written in pieces, as the file may be large.
bool writePadded(const QString& path, const QByteArray& head, const QByteArray& tail, qint64 size)
{
    QFile file(path);
    if (!file.open(QIODevice::WriteOnly) || file.write(head) != head.size())
        return false;
    const QByteArray spaces(1 << 20, ' ');
    for (qint64 left = size - head.size() - tail.size(); left > 0; left -= spaces.size()) {
        if (file.write(spaces.constData(), std::min<qint64>(left, spaces.size())) < 0)
            return false;
    }
    return file.write(tail) == tail.size();
}

} // namespace

class TestXmlPolicy : public QObject
{
    Q_OBJECT

private slots:
    // prolog goes before the root, body inside it; a fileSize pads the body with spaces.
    void readerRefusesBreach_data()
    {
        QTest::addColumn<QString>("reader");
        QTest::addColumn<QByteArray>("prolog");
        QTest::addColumn<QByteArray>("body");
        QTest::addColumn<qint64>("fileSize");
        QTest::addColumn<QString>("message");
        // Small enough that an unchecked parse expands it quickly: the DTD alone is refused.
        const QByteArray blowUp = "<!DOCTYPE r [<!ENTITY e \"" + QByteArray(4000, 'x') + "\">]>";
        for (const Reader& r : readers()) {
            const auto row = [&r](const char* attack) -> QTestData& { return QTest::addRow("%s: %s", qPrintable(r.name), attack); };
            row("entity blow-up") << r.name << blowUp << "<x>" + QByteArray("&e;").repeated(1000) + "</x>" << qint64(0)
                                  << "a DTD is not accepted";
            row("internal subset") << r.name << QByteArray("<!DOCTYPE r [<!ELEMENT r ANY>]>") << QByteArray() << qint64(0)
                                   << "a DTD is not accepted";
            row("external DTD") << r.name << QByteArray("<!DOCTYPE r SYSTEM \"r.dtd\">") << QByteArray() << qint64(0)
                                << "a DTD is not accepted";
            row("65 levels") << r.name << QByteArray() << nested(64) << qint64(0) << "nesting deeper than 64 levels";
            row("attribute over 64 KiB") << r.name << QByteArray() << attributeOf(XmlReadPolicy::MaxAttributeChars + 1)
                                         << qint64(0) << "attribute \"a\" on line 1 longer than 65536 characters";
            row("file one byte over") << r.name << QByteArray() << QByteArray() << r.maxBytes + 1
                                      << QString("larger than %1 bytes").arg(r.maxBytes);
        }
    }
    void readerRefusesBreach()
    {
        QFETCH(QString, reader);
        QFETCH(QByteArray, prolog);
        QFETCH(QByteArray, body);
        QFETCH(qint64, fileSize);
        QFETCH(QString, message);
        const Reader r = readerNamed(reader);
        QTemporaryDir dir;
        const QString path = dir.filePath("input.xml");
        QVERIFY(writePadded(path, prolog + r.open + body, r.close, fileSize));

        QString error;
        QCOMPARE(readAs(reader, path, error), -1);
        QVERIFY2(error.startsWith(path + ": "), qPrintable(error));
        QVERIFY2(error.contains(message), qPrintable(error));
    }

    // Just inside each limit, and the bare DOCTYPE the program's own exports write.
    void readerAcceptsWithinLimits_data()
    {
        QTest::addColumn<QString>("reader");
        QTest::addColumn<QByteArray>("prolog");
        QTest::addColumn<QByteArray>("body");
        for (const Reader& r : readers()) {
            const auto row = [&r](const char* attack) -> QTestData& { return QTest::addRow("%s: %s", qPrintable(r.name), attack); };
            row("bare DOCTYPE") << r.name << QByteArray("<!DOCTYPE zant-class-ids>\n") << QByteArray(" <x/>\n");
            row("64 levels") << r.name << QByteArray() << nested(63);
            row("attribute of 64 KiB") << r.name << QByteArray() << attributeOf(XmlReadPolicy::MaxAttributeChars);
        }
    }
    void readerAcceptsWithinLimits()
    {
        QFETCH(QString, reader);
        QFETCH(QByteArray, prolog);
        QFETCH(QByteArray, body);
        const Reader r = readerNamed(reader);
        QTemporaryDir dir;
        const QString path = dir.filePath("input.xml");
        QVERIFY(TestSupport::writeFile(path, prolog + r.open + body + r.close));

        QString error;
        QCOMPARE(readAs(reader, path, error), 1);
    }

    void shippedFilesPass_data()
    {
        QTest::addColumn<QString>("path");
        QTest::addColumn<qint64>("maxBytes");
        const QDir bin(QCoreApplication::applicationDirPath());
        for (const char* name : {"ClassDB.xml", "InterfaceDB.xml", "PriviledgeDB.xml"})
            QTest::newRow(name) << bin.filePath(name) << XmlReadPolicy::DatabaseFileBytes;
        const QDir levels(bin.filePath("Levels"));
        for (const QString& name : levels.entryList({"*.xml"}, QDir::Files))
            QTest::newRow(qPrintable(name)) << levels.filePath(name) << XmlReadPolicy::DatabaseFileBytes;
#ifdef DELVIX_WITH_SIM
        for (const char* image : {"handset", "simulator"})
            QTest::newRow(image) << QString(DELVIX_SAMPLES_DIR "/devices/%1/device.xml").arg(image) << XmlReadPolicy::ProfileFileBytes;
#endif
    }
    void shippedFilesPass()
    {
        QFETCH(QString, path);
        QFETCH(qint64, maxBytes);
        XmlReadPolicy policy(maxBytes);
        QDomDocument document;
        QVERIFY2(policy.readFile(path, document), qPrintable(policy.errorString()));
        QVERIFY(!document.documentElement().firstChildElement().isNull());
    }
};

QTEST_GUILESS_MAIN(TestXmlPolicy)
#include "tst_xmlpolicy.moc"
