#include "../pages/PageFixtures.h"
#include "CliRun.h"
#include "ClassListView.h"
#include "FamilyTreeView.h"
#include "LevelViewWidget.h"
#include "ModuleListView.h"
#include "PhoneInfoWidget.h"
#include "Portlex.h"
#include "RegistryListView.h"
#include "_ZantDevice.h"

#include <QJsonArray>
#include <QJsonDocument>
#include <QJsonObject>
#include <QTemporaryDir>
#include <QXmlStreamReader>

#include <unistd.h>

using namespace PageFixtures;

namespace {

// Every ZTOId element as an object of its attributes, in document order.
QJsonArray classRows(const QByteArray& xml)
{
    QJsonArray rows;
    for (QXmlStreamReader reader(xml); !reader.atEnd();) {
        if (reader.readNext() == QXmlStreamReader::StartElement && reader.name() == QLatin1String("ZTOId")) {
            QJsonObject row;
            for (const QXmlStreamAttribute& attribute : reader.attributes())
                row.insert(attribute.name().toString(), attribute.value().toString());
            rows.append(row);
        }
    }
    return rows;
}

// The export of a page once it is complete; start gives it its device.
template <typename Page, typename Start>
QString filledExport(Start start)
{
    Page page;
    start(page);
    return fillByHand(page) ? page.xmlReport() : QString();
}

} // namespace

// delvix-cli's device reports on both sample devices: each document equal to the complete page's
// export, the other formats carrying the same rows, and the exit status a pipeline reads.
class TestCliReports : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase()
    {
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        QVERIFY(Portlex::Initialize());
        m_devices.insert("kestrel-k7", m_handset.connectDevice(SimulatorProcess::sampleImage("handset"), "kestrel-k7"));
        m_devices.insert("aurora-sim", m_simulator.connectDevice(SimulatorProcess::sampleImage("simulator"), "aurora-sim"));
        QVERIFY(m_devices.value("kestrel-k7") && m_devices.value("aurora-sim"));
        QVERIFY(TestSupport::writeFile(m_sockets.filePath("bad.xml"), "<level><Id value="));
    }

    void cleanupTestCase()
    {
        m_devices.clear();
        Portlex::Destroy();
    }

    void sameDocumentAsThePage_data()
    {
        QTest::addColumn<QStringList>("arguments");
        QTest::addColumn<int>("exitCode");
        for (const char* command : {"modules", "classes", "family-tree", "registry", "info"}) {
            QTest::addRow("%s handset", command) << QStringList{command, "kestrel-k7"} << 0;
            QTest::addRow("%s simulator", command) << QStringList{command, "aurora-sim"} << 0;
        }
        // The handset lacks classes of the first level, the simulator has them all.
        QTest::newRow("level handset") << QStringList{"level", "kestrel-k7", "Level-1"} << 1;
        QTest::newRow("level simulator") << QStringList{"level", "aurora-sim", "Level-1"} << 0;
    }

    void sameDocumentAsThePage()
    {
        QFETCH(QStringList, arguments);
        QFETCH(int, exitCode);
        const CliRun run = runCli(arguments);
        QCOMPARE(run.exitCode, exitCode);
        QCOMPARE(QString::fromUtf8(run.out), pageExport(arguments.at(0), arguments.at(1)));
    }

    void jsonAndCsvCarryTheRows()
    {
        for (const QString& device : m_devices.keys()) {
            const QJsonArray rows = classRows(runCli({"classes", device}).out);
            QCOMPARE(rows.size(), m_devices.value(device)->cache.classes.size());
            const QJsonObject json = QJsonDocument::fromJson(runCli({"--format", "json", "classes", device}).out).object();
            QCOMPARE(json.value("ZantHeaderDataList").toArray().at(0).toObject().value("ZTOId").toArray(), rows);
            const QList<QByteArray> lines = runCli({"--format=csv", "classes", device}).out.trimmed().split('\n');
            QCOMPARE(lines.size(), rows.size() + 1);
            QCOMPARE(lines.at(0), QByteArray("path,subfamily,family,value,name"));
            QStringList first;
            for (const QByteArray& name : lines.at(0).split(','))
                first.append(rows.at(0).toObject().value(QString::fromUtf8(name)).toString());
            QCOMPARE(QString::fromUtf8(lines.at(1)), first.join(','));
        }
    }

    void failuresExitWithTheirStatus_data()
    {
        QTest::addColumn<QStringList>("arguments");
        QTest::addColumn<int>("exitCode");
        QTest::addColumn<QString>("said");
        QTest::newRow("unknown device") << QStringList{"classes", "no-such-device"} << 3 << "no-such-device";
        QTest::newRow("unknown level") << QStringList{"level", "aurora-sim", "Level-9"} << 2 << "Level-1, Level-2";
        QTest::newRow("unreadable level") << QStringList{"level", "aurora-sim", "/none/Level-1.xml"} << 4 << "cannot open";
        QTest::newRow("bad level") << QStringList{"level", "aurora-sim", m_sockets.filePath("bad.xml")} << 4 << "bad.xml";
    }

    void failuresExitWithTheirStatus()
    {
        QFETCH(QStringList, arguments);
        QFETCH(int, exitCode);
        QFETCH(QString, said);
        const CliRun run = runCli(arguments);
        QCOMPARE(run.exitCode, exitCode);
        QVERIFY2(QString::fromUtf8(run.err).contains(said), run.err.constData());
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

private:
    // The export of the page that shows command's data for device, once it is complete.
    QString pageExport(const QString& command, const QString& device)
    {
        DeviceCache* cache = &m_devices.value(device)->cache;
        const auto started = [&device](GatewayComponentWidget& page) { page.startComponent(device); };
        const auto recorded = [cache](auto& page) { page.setDeviceRecord(cache); };
        if (command == "modules")
            return filledExport<ModuleListView>(started);
        if (command == "registry")
            return filledExport<RegistryListView>(started);
        if (command == "classes")
            return filledExport<ClassListView>(recorded);
        if (command == "family-tree")
            return filledExport<FamilyTreeView>(recorded);
        if (command == "level") {
            LevelViewWidget page;
            page.setDeviceRecord(cache);
            page._levelDocuments->setCurrentIndex(page._levelDocuments->findText("Level-1"));
            return page.isComplete() ? page.xmlReport() : QString();
        }
        PhoneInfoWidget page;
        page.setDeviceRecord(cache);
        // The document holds the page's own texts: a size as formatted, a format table's first row.
        const QString report = page.xmlReport();
        const bool sameTexts = report.contains("memory=\"" + page._totalMemory->text() + '"')
            && report.contains("format=\"" + page._imageFormats->item(0, 0)->text() + "\" supported=\""
                               + page._imageFormats->item(0, 1)->text() + '"');
        return page.isComplete() && sameTexts ? report : QString();
    }

    QTemporaryDir m_sockets;
    SimulatorProcess m_handset{m_sockets.path()};
    SimulatorProcess m_simulator{m_sockets.path()};
    QMap<QString, QSharedPointer<_ZantDevice>> m_devices;
};

QTEST_MAIN(TestCliReports)
#include "tst_clireports.moc"
