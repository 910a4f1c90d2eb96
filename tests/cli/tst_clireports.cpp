#include "CliRun.h"
#include "JsonSchema.h"
#include "Portlex.h"
#include "SimulatorProcess.h"
#include "TestSupport.h"

#include <QJsonArray>
#include <QJsonDocument>
#include <QJsonObject>
#include <QTemporaryDir>
#include <QXmlStreamReader>
#include <QtTest>

#include <unistd.h>

namespace {

// The handset's phone facts as the page shows them, worked out by hand from its device.xml:
// sizes formatted, a feature "Yes" only when the device says exactly "Yes".
const char* const HandsetInfo = R"(<!DOCTYPE phone-info>
<phone-info>
 <hardware manufacturer="Kestrel Mobile" model="K7 Fold" phone-name="Kestrel K7" firmware="K7FW 1.09.22" platform-id="0x00000B4E" mobile-id="K7-2210-4471" chip-id="KM6120" imei="356938035643809" hwid="0x0B4E07A2" qxe-version="2.5.9" color-depth="16" screen-width="240" screen-height="320" flip-phone="Yes" vibrate="Yes" location-support="No" pen-support="No"/>
 <device target-id="0x0B4E0007" mdn="4155550147" ruimid="0x8F21C3A7" device-id-hash="c41d09be77a2f310" memory="8.00 MB" free-memory="3.00 MB" file-system-size="128.00 MB" file-system-available-size="84.00 MB"/>
 <zant version="3.2.1" build-number="3.2.1.0388" component-services-build="CS 5.0.11.1978" dynamic-build-id="K7-D-240214-03" static-build-id="K7-S-240214-03"/>
 <media-formats>
  <format kind="image" format="BMP" supported="Yes"/>
  <format kind="image" format="GIF" supported="Yes"/>
  <format kind="image" format="JPEG" supported="Yes"/>
  <format kind="image" format="PNG" supported="Yes"/>
  <format kind="image" format="WBMP" supported="Yes"/>
  <format kind="audio" format="AAC" supported="Yes"/>
  <format kind="audio" format="AMR-NB" supported="Yes"/>
  <format kind="audio" format="AMR-WB" supported="No"/>
  <format kind="audio" format="MIDI" supported="Yes"/>
  <format kind="audio" format="MP3" supported="Yes"/>
  <format kind="audio" format="PCM" supported="Yes"/>
  <format kind="video" format="H.263" supported="Yes"/>
  <format kind="video" format="MPEG-4 SP" supported="Playback only"/>
 </media-formats>
</phone-info>
)";

// Every element of an XML document with attributes, as "element attribute=value ...", in
// document order.
QStringList xmlElements(const QByteArray& xml)
{
    QStringList elements;
    for (QXmlStreamReader reader(xml); !reader.atEnd();) {
        if (reader.readNext() != QXmlStreamReader::StartElement || reader.attributes().isEmpty())
            continue;
        QString line = reader.name().toString();
        for (const QXmlStreamAttribute& attribute : reader.attributes())
            line += ' ' + attribute.name().toString() + '=' + attribute.value().toString();
        elements << line;
    }
    return elements;
}

// The same lines from a JSON document, attributes named as the XML has them for that element,
// typed values turned back into the XML's texts (true is "Yes" or, in a level, "Found"; an
// array is its names joined by " | ").
void jsonElements(const QJsonObject& object, const QString& element, const QHash<QString, QStringList>& names,
                  const QString& trueText, QStringList& out)
{
    if (names.contains(element)) {
        QString line = element;
        for (const QString& name : names.value(element)) {
            const QJsonValue value = object.value(name);
            QString text = value.toString();
            if (value.isDouble())
                text = QString::number(value.toInteger());
            else if (value.isBool())
                text = value.toBool() ? trueText : (trueText == "Found" ? "Not Found" : "No");
            else if (value.isArray())
                text = value.toVariant().toStringList().join(" | ");
            line += ' ' + name + '=' + text;
        }
        out << line;
    }
    for (auto it = object.begin(); it != object.end(); ++it) {
        for (const QJsonValue& child : it.value().toArray())
            if (child.isObject())
                jsonElements(child.toObject(), it.key(), names, trueText, out);
    }
}

} // namespace

// delvix-cli's device reports against real simulators: written-out texts where a rule lives
// (the phone facts, the page's columns, JUnit), every JSON document checked against its schema
// and against the XML beside it, and the exit status a pipeline reads.
class TestCliReports : public QObject
{
    Q_OBJECT

    QTemporaryDir m_sockets;
    SimulatorProcess m_handset {m_sockets.path()}, m_simulator {m_sockets.path()}, m_twin {m_sockets.path()},
        m_refusing {m_sockets.path()};

private slots:
    void initTestCase()
    {
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        const QString handset = SimulatorProcess::sampleImage("handset");
        QVERIFY(m_handset.start(handset, "kestrel-k7") && m_simulator.start(SimulatorProcess::sampleImage("simulator"), "aurora-sim"));
        // Two more handsets of the same display name; one refuses every connection.
        QVERIFY(m_twin.start(handset, "kestrel-k8"));
        QVERIFY(m_refusing.start(handset, "refusing-k9", {"--refuse-connect", "1106:locked by its owner"}));
        QVERIFY(TestSupport::writeFile(m_sockets.filePath("bad.xml"), "<level><Id value="));
    }

    void phoneFactsWrittenOut()
    {
        const CliRun xml = runCli({"info", "kestrel-k7"});
        QCOMPARE(xml.exitCode, 0);
        QCOMPARE(QString::fromUtf8(xml.out), QString::fromUtf8(HandsetInfo));
        // Machine output: sizes in bytes, numbers as numbers, features as booleans.
        const QJsonObject json = QJsonDocument::fromJson(runCli({"--format", "json", "info", "kestrel-k7"}).out).object();
        const QJsonObject hardware = json["hardware"][0].toObject(), device = json["device"][0].toObject();
        QCOMPARE(hardware["imei"], QJsonValue("356938035643809"));
        QCOMPARE(hardware["color-depth"], QJsonValue(16));
        QCOMPARE(hardware["flip-phone"], QJsonValue(true));
        QCOMPARE(hardware["location-support"], QJsonValue(false));
        QCOMPARE(device["memory"], QJsonValue(8388608));
        QCOMPARE(device["file-system-available-size"], QJsonValue(88080384));
        QCOMPARE(json["identity"].toObject(), (QJsonObject {{"id", "kestrel-k7"}, {"name", "Zantro USB Device: Kestrel K7"}}));
    }

    void jsonFollowsItsSchema_data()
    {
        QTest::addColumn<QStringList>("arguments");
        QTest::addColumn<QString>("schema");
        const QList<QPair<QString, QString>> commands {{"modules", "modules"}, {"info", "phone-info"}, {"classes", "class-ids"},
            {"family-tree", "familyTree"}, {"registry", "registrylist"}, {"settings", "settings"}, {"processes", "processes"},
            {"loaded-modules", "loaded-modules"}};
        for (const QString device : {"kestrel-k7", "aurora-sim"}) {
            for (const auto& [command, schema] : commands) {
                // The simulator's processes come and go between two runs; the handset's stay.
                if (device == "kestrel-k7" || (!command.contains("process") && !command.startsWith("loaded")))
                    QTest::addRow("%s %s", qPrintable(command), qPrintable(device)) << QStringList {command, device} << schema;
            }
            QTest::addRow("level %s", qPrintable(device)) << QStringList {"level", device, "Level-1"} << "levelreport";
        }
        QTest::newRow("ls") << QStringList {"ls", "kestrel-k7", "/user"} << "folder";
        QTest::newRow("devices") << QStringList {"devices"} << "devices";
    }
    // Valid against its schema, and every XML element's attributes in it with the same texts.
    void jsonFollowsItsSchema()
    {
        QFETCH(QStringList, arguments);
        QFETCH(QString, schema);
        const CliRun xml = runCli(arguments), json = runCli(QStringList {"--format", "json"} + arguments);
        QVERIFY(json.exitCode == xml.exitCode && json.exitCode >= 0 && json.exitCode <= 1);
        const QJsonObject document = QJsonDocument::fromJson(json.out).object();
        const QJsonObject rules = JsonSchema::load(QCoreApplication::applicationDirPath(), schema);
        QVERIFY2(!rules.isEmpty(), qPrintable(schema));
        const QString violation = JsonSchema::violation(document, rules);
        QVERIFY2(violation.isEmpty(), qPrintable(violation));
        QCOMPARE(document["schema"], QJsonValue("delvix." + schema));

        // A formatted size ("8.00 MB") is in bytes in JSON: phoneFactsWrittenOut checks those.
        QStringList expected = xmlElements(xml.out).replaceInStrings(QRegularExpression(" [a-z-]+=[0-9.]+ (bytes|kB|MB|GB)"), "");
        QHash<QString, QStringList> names;
        for (const QString& line : std::as_const(expected)) {
            QStringList attributes;
            for (const QString& pair : line.split(' ').mid(1))
                if (pair.contains('='))
                    attributes << pair.section('=', 0, 0);
            names.insert(line.section(' ', 0, 0), attributes);
        }
        QStringList got;
        const QString root = QString::fromUtf8(xml.out).section('<', 2, 2).section(QRegularExpression("[ />]"), 0, 0);
        jsonElements(document, root, names, arguments.first() == "level" ? "Found" : "Yes", got);
        // JSON groups children by name: the same elements, not always in the XML's order.
        expected.sort();
        got.sort();
        QVERIFY(expected.size() > 1);
        QCOMPARE(got, expected);
    }

    void csvHasThePagesColumns_data()
    {
        QTest::addColumn<QStringList>("arguments");
        QTest::addColumn<QString>("header");
        QTest::newRow("modules") << QStringList {"modules", "kestrel-k7"}
                                 << "Module Name,Component Services Version,Module Type,Signature,Path,Copyright";
        QTest::newRow("classes") << QStringList {"classes", "kestrel-k7"} << "Class Name,Class ID,Family,Sub-family,Available,Path";
        QTest::newRow("family-tree") << QStringList {"family-tree", "kestrel-k7"} << "Family,Sub-Family,Class Name,Class ID";
        QTest::newRow("level") << QStringList {"level", "kestrel-k7", "Level-1"} << "Family,Subfamily,Class Name,Class ID,Result";
        QTest::newRow("registry") << QStringList {"registry", "kestrel-k7"} << "Class Type,Class Handler,Flags,Mime Type";
        QTest::newRow("processes") << QStringList {"processes", "kestrel-k7"} << "Process Name,Process ID,Thread Name,ID,State,Priority";
        QTest::newRow("loaded-modules") << QStringList {"loaded-modules", "kestrel-k7"} << "Process Name,Process ID,Module Name,Size,Location";
        QTest::newRow("ls") << QStringList {"ls", "kestrel-k7", "/user"} << "Type,Name,Path,Size,File Attributes";
        QTest::newRow("settings") << QStringList {"settings", "kestrel-k7"} << "Node,Path,Name,Value";
        QTest::newRow("info") << QStringList {"info", "kestrel-k7"} << "Kind,Format,Supported";
    }
    // The page's titles in its order, and one line per record of the XML.
    void csvHasThePagesColumns()
    {
        QFETCH(QStringList, arguments);
        QFETCH(QString, header);
        const QStringList lines = QString::fromUtf8(runCli(QStringList {"--format=csv"} + arguments).out).split('\n', Qt::SkipEmptyParts);
        QVERIFY(!lines.isEmpty());
        QCOMPARE(lines.first(), header);
        const QString record = arguments.first() == "classes" ? "ZTOId" : arguments.first() == "info" ? "format"
            : arguments.first() == "settings" ? "value" : arguments.first() == "processes" ? "thread"
            : arguments.first() == "loaded-modules" ? "module" : arguments.first() == "ls" || arguments.first() == "registry" ? "entry"
            : arguments.first() == "modules" ? "module" : "class";
        QCOMPARE(lines.size() - 1, xmlElements(runCli(arguments).out).filter(QRegularExpression('^' + record + ' ')).size());
    }

    // One test case per class of the level, a failure for each class the handset lacks.
    void levelAsJUnit()
    {
        const CliRun run = runCli({"--format", "junit", "level", "kestrel-k7", "Level-1"});
        QCOMPARE(run.exitCode, 1);
        QXmlStreamReader reader(run.out);
        QStringList suites, failed;
        int cases = 0;
        while (!reader.atEnd()) {
            if (reader.readNext() != QXmlStreamReader::StartElement)
                continue;
            if (reader.name() == QLatin1String("testsuite"))
                suites << reader.attributes().value("name").toString();
            cases += reader.name() == QLatin1String("testcase");
            if (reader.name() == QLatin1String("failure"))
                failed << reader.attributes().value("message").toString();
        }
        QVERIFY2(!reader.hasError(), qPrintable(reader.errorString()));
        const QStringList levelLines = xmlElements(runCli({"level", "kestrel-k7", "Level-1"}).out).filter(QRegularExpression("^class "));
        QCOMPARE(cases, levelLines.size());
        QCOMPARE(failed, (QStringList {"class WlanAdapter (0x01065001), family Connectivity, sub-family Wlan: Not Found",
                                       "class PathRenderer (0x01025001), family Graphics, sub-family Vector: Not Found"}));
        QCOMPARE(suites, (QStringList {"Applications", "Connectivity", "Graphics", "Kernel", "Location", "Media", "Messaging",
                                       "Security", "Storage", "Telephony", "UserInterface"}));
    }

    void failuresExitWithTheirStatus_data()
    {
        QTest::addColumn<QStringList>("arguments");
        QTest::addColumn<int>("exitCode");
        QTest::addColumn<QString>("said");
        QTest::newRow("unknown device") << QStringList {"classes", "no-such-device"} << 3 << "no-such-device";
        QTest::newRow("refused connection") << QStringList {"classes", "refusing-k9"} << 3 << "error 1106 (the device refuses the request) locked by its owner";
        QTest::newRow("several devices") << QStringList {"classes", "kestrel"} << 2 << "names several devices";
        QTest::newRow("unknown level") << QStringList {"level", "aurora-sim", "Level-9"} << 2 << "Level-1, Level-2";
        QTest::newRow("unreadable level") << QStringList {"level", "aurora-sim", "/none/Level-1.xml"} << 4 << "cannot open";
        QTest::newRow("bad level") << QStringList {"level", "aurora-sim", m_sockets.filePath("bad.xml")} << 4 << "bad.xml";
        QTest::newRow("junit elsewhere") << QStringList {"--format", "junit", "modules", "aurora-sim"} << 2 << "level only";
    }
    void failuresExitWithTheirStatus()
    {
        QFETCH(QStringList, arguments);
        QFETCH(int, exitCode);
        QFETCH(QString, said);
        const CliRun run = runCli(arguments);
        QCOMPARE(run.exitCode, exitCode);
        QVERIFY2(QString::fromUtf8(run.err).contains(said), run.err.constData());
        if (arguments.last() == "kestrel") // every match named, not the first picked
            QVERIFY(run.err.contains("kestrel-k7") && run.err.contains("kestrel-k8") && run.err.contains("refusing-k9"));
        QVERIFY(run.out.isEmpty());
    }

    // A reader that went away (head, a pager quit early) ends the command quietly, with success.
    void closedOutputIsANormalEnd()
    {
        QProcess process;
        // The output is a pipe whose reader is gone before the tool writes.
        process.setChildProcessModifier([] {
            int ends[2];
            if (::pipe(ends) == 0 && ::close(ends[0]) == 0)
                ::dup2(ends[1], STDOUT_FILENO);
        });
        process.start(QCoreApplication::applicationDirPath() + "/delvix-cli", {"classes", "kestrel-k7"});
        QVERIFY(process.waitForFinished(60000) && process.exitStatus() == QProcess::NormalExit);
        QCOMPARE(process.exitCode(), 0);
        QCOMPARE(process.readAllStandardError(), QByteArray());
    }

    // -o replaces the file through a save file: a second link keeps the old content.
    void outputReplacesTheFile()
    {
        const QString target = m_sockets.filePath("out.xml"), link = m_sockets.filePath("link.xml");
        QVERIFY(TestSupport::writeFile(target, "old") && ::link(qPrintable(target), qPrintable(link)) == 0);
        const CliRun run = runCli({"devices", "-o", target});
        QVERIFY(run.exitCode == 0 && run.out.isEmpty());
        QVERIFY2(TestSupport::readFile(target).startsWith("<!DOCTYPE zant-devices>\n<devices>\n <device id="), TestSupport::readFile(target).constData());
        QCOMPARE(TestSupport::readFile(link), QByteArray("old"));
    }
};

QTEST_GUILESS_MAIN(TestCliReports)
#include "tst_clireports.moc"
