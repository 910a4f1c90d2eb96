#include "CliRun.h"
#include "ModuleInfoDialog.h"
#include "PlatformClassIDDialog.h"
#include "PlatformComparisonView.h"
#include "Portlex.h"
#include "SimulatorProcess.h"
#include "TestSupport.h"

#include <QTemporaryDir>
#include <QtTest>

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
        const QByteArray expected = dialog._moduleInfoView->mifEntryXml().toUtf8();
        QVERIFY(expected.contains("<class name="));
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
        QTest::newRow("scan without classes") << QStringList {"compare", "large.xml", "other.xml"} << "other";
        QTest::newRow("not a MIF file") << QStringList {"mif", "garbage.mif"} << "garbage.mif";
        QTest::newRow("module the device lacks") << QStringList {"mif", "kestrel:nothing"} << "\"nothing\"";
        QTest::newRow("folder without modules") << QStringList {"scan", "empty"} << "empty";
    }
    void refusalsExit4()
    {
        QFETCH(QStringList, arguments);
        QFETCH(QString, named);
        const CliRun run = runCli(arguments);
        QCOMPARE(run.exitCode, 4);
        QVERIFY2(run.err.contains(named.toUtf8()), run.err.constData());
        QCOMPARE(run.out, QByteArray());
    }
};

QTEST_MAIN(CliToolsTest)
#include "tst_clitools.moc"
