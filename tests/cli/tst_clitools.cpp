#include "CliRun.h"
#include "ModuleInfoDialog.h"
#include "PlatformClassIDDialog.h"
#include "PlatformComparisonView.h"
#include "PlatformScanFile.h"
#include "PlatformScanReport.h"
#include "Portlex.h"
#include "SimulatorProcess.h"
#include "TestSupport.h"

#include <QTemporaryDir>
#include <QtTest>

#include <sys/stat.h>

// The device-less tools and a device module's MIF entry on the command line, compared with
// what their windows save: the module information, the platform scan and the comparison.
class CliToolsTest : public QObject
{
    Q_OBJECT

    QTemporaryDir m_sockets;
    QTemporaryDir m_work;
    SimulatorProcess m_simulator {m_sockets.path()};

    QString work(const QString& name) const { return m_work.filePath(name); }

private slots:
    void initTestCase()
    {
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        QVERIFY(Portlex::Initialize());
        QVERIFY(m_simulator.connectDevice(SimulatorProcess::sampleImage("handset"), "kestrel-k7"));
        // The smaller platform lacks the classes only the larger one's later modules export.
        for (const auto& [name, count] : {std::pair("large", "40"), std::pair("small", "10")}) {
            QProcess generator;
            generator.start(SimulatorProcess::executable(), {"platform", work(name), "--mifs", count});
            QVERIFY(generator.waitForFinished(60000) && generator.exitCode() == 0);
            QCOMPARE(runCli({"scan", work(name), "-o", work(name + QString(".xml"))}).exitCode, 0);
        }
        QVERIFY(TestSupport::writeFile(work("other.xml"), "<!DOCTYPE platform-scan>\n<ZTOINFO/>\n"));
        QVERIFY(TestSupport::writeFile(work("garbage.mif"), "not a resource container"));
        QVERIFY(QDir(m_work.path()).mkpath("empty") && QDir::setCurrent(m_work.path()));
        // Scans the policy refuses, each for a reason of its own.
        QVERIFY(TestSupport::writeFile(work("dtd.xml"), "<!DOCTYPE s [<!ENTITY a \"b\">]><ZTOINFO/>"));
        QVERIFY(TestSupport::writeFile(work("deep.xml"), QByteArray("<a>").repeated(70) + QByteArray("</a>").repeated(70)));
        // A folder whose MIF names lead to what is no file: scanning it must neither wait nor read for ever.
        QVERIFY(QDir(m_work.path()).mkpath("devices") && ::mkfifo(QFile::encodeName(work("fifo")).constData(), 0600) == 0);
        QVERIFY(QFile::link("/dev/zero", work("devices/zero.mif")) && QFile::link(work("fifo"), work("devices/pipe.mif")));
    }

    // A MIF file on this computer, or a device's module by its name or its path.
    void mifEqualsTheWindowsExport_data()
    {
        QTest::addColumn<QString>("target");
        QTest::addColumn<QString>("devicePath"); // empty: the target is a file
        const QString path = "/usermod/equalizer/equalizer.mif";
        QTest::newRow("file") << SimulatorProcess::sampleImage("handset") + "/flash" + path << "";
        QTest::newRow("module by name") << "Kestrel:equalizer" << path;
        QTest::newRow("module by path") << "kestrel-k7:" + path << path;
    }
    void mifEqualsTheWindowsExport()
    {
        QFETCH(QString, target);
        QFETCH(QString, devicePath);
        ModuleInfoDialog dialog;
        ModuleInfo module;
        module.path = devicePath;
        if (devicePath.isEmpty())
            dialog.openMifFile(target, "equalizer");
        else
            dialog.openDeviceModule("kestrel-k7", module);
        // A device's module is read on a worker.
        QTRY_VERIFY_WITH_TIMEOUT(dialog._moduleInfoView->mifEntryXml().contains("<class name="), 10000);
        const QByteArray expected = dialog._moduleInfoView->mifEntryXml().toUtf8();
        const CliRun run = runCli({"mif", target});
        QCOMPARE(run.exitCode, 0);
        QCOMPARE(run.out, expected);
    }

    // The document of the whole platform, in scan order, with nothing on a stderr that is no terminal.
    void scanEqualsTheWindowsExport()
    {
        std::vector<MifEntry> entries;
        QVERIFY(Portlex::GetPlatformClassIds(work("large"), entries, nullptr, nullptr) > 0);
        PlatformClassIDDialog dialog;
        dialog.populate(entries);
        const CliRun run = runCli({"scan", work("large")});
        QCOMPARE(run.exitCode, 0);
        QCOMPARE(run.err, QByteArray());
        QCOMPARE(run.out, dialog.xmlText().toUtf8());
    }

    // Scans written by the tool compared as the comparison window compares and saves them;
    // only a class in one scan fails, and only when asked to.
    void compareEqualsTheWindowsExport_data()
    {
        QTest::addColumn<QString>("second");
        QTest::addColumn<QStringList>("options");
        QTest::addColumn<int>("exitCode");
        const QStringList fail = {"--fail-on-difference"};
        QTest::newRow("differing") << "small.xml" << QStringList() << 0;
        QTest::newRow("differing, failing on a difference") << "small.xml" << fail << 1;
        QTest::newRow("same classes, failing on a difference") << "large.xml" << fail << 0;
    }
    void compareEqualsTheWindowsExport()
    {
        QFETCH(QString, second);
        QFETCH(QStringList, options);
        QFETCH(int, exitCode);
        PlatformComparisonView view;
        QVERIFY(view.loadScan(work("large.xml")) && view.loadScan(work(second)));
        const CliRun run = runCli(QStringList {"compare", work("large.xml"), work(second)} + options);
        QCOMPARE(run.exitCode, exitCode);
        QCOMPARE(run.out, view.exportText().toUtf8());
    }

    // Each refusal exits 4 and names what it could not use.
    void refusalsExit4_data()
    {
        QTest::addColumn<QStringList>("arguments");
        QTest::addColumn<QString>("named");
        QTest::newRow("unreadable scan") << QStringList {"compare", "missing.xml", "large.xml"} << "missing";
        QTest::newRow("scan with a DTD") << QStringList {"compare", "large.xml", "dtd.xml"} << "dtd.xml: a DTD is not accepted";
        QTest::newRow("scan nested too deep") << QStringList {"compare", "deep.xml", "large.xml"} << "deep.xml: nesting deeper than 64 levels";
        QTest::newRow("MIF links to a device and a FIFO") << QStringList {"scan", "devices"} << "no module information file below devices";
        QTest::newRow("scan without classes") << QStringList {"compare", "large.xml", "other.xml"} << "other";
        QTest::newRow("not a MIF file") << QStringList {"mif", "garbage.mif"} << "garbage.mif";
        QTest::newRow("module the device lacks") << QStringList {"mif", "kestrel:nothing"} << "\"nothing\"";
        QTest::newRow("folder without modules") << QStringList {"scan", "empty"} << "empty";
    }
    void refusalsExit4()
    {
        QFETCH(QStringList, arguments);
        QFETCH(QString, named);
        const CliRun run = runCli(arguments, 20000);
        QCOMPARE(run.exitCode, 4);
        QVERIFY2(run.err.contains(named.toUtf8()), run.err.constData());
        QCOMPARE(run.out, QByteArray());
    }

    // Names with characters XML cannot carry come back from a written scan as they were.
    void escapedScanNamesReadBack()
    {
        const QString odd = QStringLiteral("ctl\x01" "a {U+0041} ") + QChar(0xFFFE) + QChar(0xD800);
        const QVector<QStringList> rows {{odd, "0x01011001", "Family\x1b", "Sub", "/a.mif"}, {"ctla", "0x01011002", "F", "S", "/b.mif"}};
        QVERIFY(TestSupport::writeFile(work("odd.xml"), PlatformScanReport::build(rows).write(Report::Format::Xml)));
        const PlatformScanFile file = PlatformScanFile::read(work("odd.xml"));
        QCOMPARE(file.status, PlatformScanFile::Read);
        QCOMPARE(file.entries.size(), 2);
        QCOMPARE(file.entries.at(0).name, odd);
        QCOMPARE(file.entries.at(0).family, QStringLiteral("Family\x1b"));
        QCOMPARE(file.entries.at(1).name, QStringLiteral("ctla"));
    }
};

QTEST_MAIN(CliToolsTest)
#include "tst_clitools.moc"
