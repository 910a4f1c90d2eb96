// Every XML reader refuses what would cost more time or memory than the file's size
// (declared entities, deep nesting, huge attributes, huge files) with a message naming the
// file: the limits are checked once on the policy, and each reader is checked to use it.
#include "LevelDefinition.h"
#include "NameDatabases.h"
#include "PlatformScanFile.h"
#include "TestSupport.h"
#include "XmlEscape.h"
#include "XmlReadPolicy.h"

#ifdef DELVIX_WITH_SIM
#include "DeviceProfileParser.h"
#endif

#include <QDomDocument>
#include <QTemporaryDir>
#include <QTest>

namespace {

const QByteArray DtdBlowUp = "<!DOCTYPE r [<!ENTITY e \"" + QByteArray(4000, 'x') + "\">]>";

QByteArray nested(int levels) { return QByteArray("<n>").repeated(levels) + QByteArray("</n>").repeated(levels); }
QByteArray attributeOf(qsizetype chars) { return "<x a=\"" + QByteArray(chars, 'a') + "\"/>"; }

// The records a reader found in path (classes, level ids or volumes), or -1 with its message.
int readAs(const QString& reader, const QString& path, QString& error)
{
    if (reader == "name database") {
        QFile file(path);
        QList<IdRecord> entries;
        const bool read = file.open(QIODevice::ReadOnly) && NameDatabases::readEntries(&file, "class", entries, &error);
        return read ? int(entries.size()) : -1;
    }
    if (reader == "platform scan") {
        const PlatformScanFile scan = PlatformScanFile::read(path);
        error = scan.errorString;
        return scan.status == PlatformScanFile::Read ? int(scan.entries.size()) : -1;
    }
    if (reader == "level file") {
        LevelDefinition level;
        error = level.load(path) ? QString() : level.errorString();
        return error.isEmpty() ? int(level.records().size()) : -1;
    }
#ifdef DELVIX_WITH_SIM
    DeviceProfileParser parser;
    DeviceProfile profile;
    error = parser.parseFile(path, profile) ? QString() : parser.errorString();
    return error.isEmpty() ? int(profile.volumes.size()) : -1;
#else
    return -1;
#endif
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
    void limits_data()
    {
        QTest::addColumn<QByteArray>("xml");
        QTest::addColumn<QString>("message"); // empty: accepted
        // Small enough that an unchecked parse expands it quickly: the DTD alone is refused.
        QTest::newRow("entity blow-up") << DtdBlowUp + "<r>" + QByteArray("&e;").repeated(1000) + "</r>" << "a DTD is not accepted";
        QTest::newRow("external DTD") << QByteArray("<!DOCTYPE r SYSTEM \"r.dtd\"><r/>") << "a DTD is not accepted";
        QTest::newRow("65 levels") << nested(65) << "nesting deeper than 64 levels";
        QTest::newRow("attribute over 64 KiB") << attributeOf(XmlReadPolicy::MaxAttributeChars + 1)
                                               << "attribute \"a\" on line 1 longer than 65536 characters";
        // The bare DOCTYPE is what the program's own exports write.
        QTest::newRow("bare DOCTYPE") << QByteArray("<!DOCTYPE zant-class-ids>\n<r/>") << "";
        QTest::newRow("64 levels") << nested(64) << "";
        QTest::newRow("attribute of 64 KiB") << attributeOf(XmlReadPolicy::MaxAttributeChars) << "";
    }
    void limits()
    {
        QFETCH(QByteArray, xml);
        QFETCH(QString, message);
        XmlReadPolicy policy(XmlReadPolicy::DatabaseFileBytes);
        QDomDocument document;
        QCOMPARE(policy.parse(xml, QStringLiteral("in.xml"), document), message.isEmpty());
        QVERIFY2(policy.errorString().startsWith(message.isEmpty() ? QString() : QStringLiteral("in.xml: ") + message),
                 qPrintable(policy.errorString()));
        // The file limit, at a size a test can write.
        QTemporaryDir dir;
        const QString path = dir.filePath("r.xml");
        for (const qint64 limit : {qint64(xml.size()), qint64(xml.size()) - 1}) {
            XmlReadPolicy small(limit);
            QVERIFY(TestSupport::writeFile(path, xml));
            QCOMPARE(small.readFile(path, document), message.isEmpty() && limit == xml.size());
            QVERIFY(limit == xml.size() || small.errorString() == QStringLiteral("%1: larger than %2 bytes").arg(path).arg(limit));
        }
    }

    // Each reader goes through the policy, with its own file limit.
    void readersUseThePolicy_data()
    {
        QTest::addColumn<QString>("reader");
        QTest::addColumn<QByteArray>("open");  // a document with one record is open + close
        QTest::addColumn<QByteArray>("close");
        QTest::addColumn<qint64>("maxBytes");
        const qint64 database = XmlReadPolicy::DatabaseFileBytes;
        QTest::newRow("name database") << "name database" << QByteArray(R"(<classes><class id="0x01011001" name="Heap"/>)")
                                       << QByteArray("</classes>") << database;
        QTest::newRow("level file") << "level file" << QByteArray(R"(<level><Id value="0x01011001" name="Heap"/>)")
                                    << QByteArray("</level>") << database;
        QTest::newRow("platform scan") << "platform scan"
                                       << QByteArray(R"(<ZTOINFO><ZantHeaderDataList><ZTOId value="0x01011001"/>)")
                                       << QByteArray("</ZantHeaderDataList></ZTOINFO>") << database;
#ifdef DELVIX_WITH_SIM
        QTest::newRow("device profile") << "device profile" << QByteArray(R"(<device id="t" name="T"><volume id="1" mount="/" folder="flash"/>)")
                                        << QByteArray("</device>") << XmlReadPolicy::ProfileFileBytes;
#endif
    }
    void readersUseThePolicy()
    {
        QFETCH(QString, reader);
        QFETCH(QByteArray, open);
        QFETCH(QByteArray, close);
        QFETCH(qint64, maxBytes);
        QTemporaryDir dir;
        const QString path = dir.filePath("input.xml");
        QString error;
        QVERIFY(TestSupport::writeFile(path, "<!DOCTYPE zant-class-ids>" + open + nested(60) + close));
        QCOMPARE(readAs(reader, path, error), 1);
        QVERIFY(TestSupport::writeFile(path, DtdBlowUp + open + close));
        QCOMPARE(readAs(reader, path, error), -1);
        QVERIFY2(error.startsWith(path + ": a DTD is not accepted"), qPrintable(error));
        QVERIFY(writePadded(path, open, close, maxBytes + 1));
        QCOMPARE(readAs(reader, path, error), -1);
        QCOMPARE(error, QStringLiteral("%1: larger than %2 bytes").arg(path).arg(maxBytes));
    }

    // The escape rule for what XML cannot carry: written out, then undone exactly; a level
    // file read back gives the names as they were before the rule.
    void escapeRule_data()
    {
        QTest::addColumn<QString>("text");
        QTest::addColumn<QString>("written");
        QTest::newRow("plain") << "plain { U+ {U+" << "plain { U+ {U+007B}U+";
        QTest::newRow("controls") << "ctl\x01" "a\x1b[31m" << "ctl{U+0001}a{U+001B}[31m";
        QTest::newRow("non-characters") << QString("fffe") + QChar(0xFFFE) + QChar(0xFFFF) << "fffe{U+FFFE}{U+FFFF}";
        QTest::newRow("lone surrogates") << QString(QChar(0xDC00)) + "x" + QChar(0xD800) << "{U+DC00}x{U+D800}";
        QTest::newRow("a pair is carried") << QString::fromUtf8("\xF0\x9F\x98\x80") << QString::fromUtf8("\xF0\x9F\x98\x80");
        QTest::newRow("the rule's own form") << "{U+0041}" << "{U+007B}U+0041}";
    }
    void escapeRule()
    {
        QFETCH(QString, text);
        QFETCH(QString, written);
        QCOMPARE(XmlEscape::escaped(text), written);
        QCOMPARE(XmlEscape::unescaped(written), text);
        QTemporaryDir dir;
        QVERIFY(TestSupport::writeFile(dir.filePath("level.xml"),
                                       "<level><Id value=\"0x01011001\" name=\"" + written.toHtmlEscaped().toUtf8() + "\"/></level>"));
        LevelDefinition level;
        QVERIFY2(level.load(dir.filePath("level.xml")), qPrintable(level.errorString()));
        QCOMPARE(level.records().value(0).name, text);
    }
};

QTEST_GUILESS_MAIN(TestXmlPolicy)
#include "tst_xmlpolicy.moc"
