#include "ModuleListView.h"
#include "PageFixtures.h"
#include "Portlex.h"
#include "RegistryListView.h"
#include "SimulatorProcess.h"
#include "_ZantDevice.h"

#include <QSignalSpy>
#include <QTemporaryDir>

using namespace PageFixtures;

namespace {

enum RegistryColumn { ClassTypeColumn, ClassHandlerColumn, FlagsColumn, MimeTypeColumn };
enum ModuleColumn { NameColumn, VersionColumn, TypeColumn, SignatureColumn, PathColumn, CopyrightColumn };

QByteArray module(const QByteArray& name, const QByteArray& version, const QByteArray& type, const QByteArray& signature,
                  const QByteArray& copyright)
{
    return "<module volume=\"flash\" folder=\"usermod/" + name + "\" name=\"" + name + "\" version=\"" + version
        + "\" type=\"" + type + "\" signature=\"" + signature + "\" copyright=\"" + copyright + "\" size=\"16\"/>\n";
}

// A module of the image description that registers one MIME type.
QByteArray mimeModule(const QByteArray& folder, const QByteArray& type, const QByteArray& handler, const QByteArray& base)
{
    return "<module volume=\"flash\" folder=\"" + folder + "\" name=\"" + folder.mid(folder.lastIndexOf('/') + 1)
        + "\" size=\"16\"><mime type=\"" + type + "\" handler=\"" + handler + "\" base=\"" + base + "\"/></module>\n";
}

// A system and a user module folder.
const QByteArray RegistryVolume = " modules=\"sys/mod usermod\" install=\"usermod\"";

} // namespace

// The module list and registry pages against real simulators: a small module image, the
// sample device for the registry's export, and devices failing their queries.
class TestModulePages : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase()
    {
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        QVERIFY(Portlex::Initialize());
        QVERIFY(writeImage(m_image.path(), "modules", " modules=\"usermod\"", {},
                           module("quote", "1.0", "Application", "test", "&quot;Q&quot; &amp; &lt;co&gt;")
                               + module("plain", "2.0", "Library", "maker", "P")));
        m_device = m_simulator.connectDevice(m_image.path(), "modules");
        QVERIFY(m_device);
        QVERIFY(m_sample.connectDevice(SimulatorProcess::sampleImage("simulator"), "registry"));
    }

    void cleanupTestCase()
    {
        m_device.reset();
        Portlex::Destroy();
    }

    // The export follows the table's order, escapes, and is frozen at its first call, even
    // when that came before the rows.
    void exportFollowsTheTableAndIsFrozen()
    {
        ModuleListView early;
        early.startComponent("modules");
        const QString empty = early.xmlReport();
        QCOMPARE(empty, QString("<!DOCTYPE zant-modules>\n<modules/>\n"));
        QVERIFY(fillByHand(early));
        QCOMPARE(early._moduleTable->rowCount(), 2);
        QCOMPARE(early.xmlReport(), empty);

        ModuleListView page;
        QSignalSpy statuses(&page, &GatewayComponentWidget::statusChanged);
        page.startComponent("modules");
        QVERIFY(fillByHand(page));
        QCOMPARE(signalTexts(statuses), QStringList({"Processing Device Modules", "Ready"}));
        page._moduleTable->sortByColumn(PathColumn, Qt::DescendingOrder);
        const QString report = page.xmlReport();
        QCOMPARE(report, QString("<!DOCTYPE zant-modules>\n"
                                 "<modules>\n"
                                 " <module copyright=\"&quot;Q&quot; &amp; &lt;co&gt;\" path=\"/usermod/quote/quote.mif\" "
                                 "signature=\"Test Signed\" type=\"Application\" version=\"1.0\" name=\"quote\"/>\n"
                                 " <module copyright=\"P\" path=\"/usermod/plain/plain.mif\" signature=\"Maker Signed\" "
                                 "type=\"Library\" version=\"2.0\" name=\"plain\"/>\n"
                                 "</modules>\n"));
        page._moduleTable->sortByColumn(NameColumn, Qt::AscendingOrder);
        QCOMPARE(page.xmlReport(), report);
    }

    // A click brings the row's module; the row does not show its size and id, so the record
    // leaves them at 0.
    void clicksEmitTheRowsModule()
    {
        ModuleListView page;
        page.resize(900, 300);
        page.show();
        page.startComponent("modules");
        QVERIFY(fillByHand(page));
        QVERIFY(QTest::qWaitForWindowExposed(&page));
        QVector<ModuleInfo> modules;
        QCOMPARE(m_device->GetModules(modules, nullptr, nullptr), 0);
        ModuleInfo expected;
        for (const ModuleInfo& module : std::as_const(modules))
            expected = module.name == "plain" ? module : expected;
        QVERIFY(expected.size != 0);
        expected.size = 0;
        expected.moduleId = 0;

        QTableWidget* table = page._moduleTable;
        const QPoint cell = table->visualItemRect(table->item(columnTexts(table, NameColumn).indexOf("plain"), PathColumn)).center();
        QSignalSpy singles(&page, &ModuleListView::singleClick);
        QSignalSpy doubles(&page, &ModuleListView::doubleClick);
        QTest::mouseClick(table->viewport(), Qt::LeftButton, {}, cell);
        QTest::mouseDClick(table->viewport(), Qt::LeftButton, {}, cell);
        QCOMPARE(singles.first().at(0).value<ModuleInfo>(), expected);
        QCOMPARE(doubles.count(), 1);
        QCOMPARE(doubles.at(0).at(0).value<ModuleInfo>(), expected);
        // A cell outside any table brings nothing.
        QTableWidgetItem loose("loose");
        page.onTableDoubleClick(&loose);
        QCOMPARE(doubles.count(), 1);
    }

    // Left to its own timer. The rows come sorted by class type as text, equal ones in the
    // device's order.
    void exportOfTheSimulator()
    {
        RegistryListView page;
        QSignalSpy statuses(&page, &GatewayComponentWidget::statusChanged);
        page.startComponent("registry");
        QTRY_VERIFY_WITH_TIMEOUT(page.isComplete(), 30000);
        QCOMPARE(signalTexts(statuses), QStringList({"Querying Registry IDs", "Processing Registry Entries", "Ready"}));
        QCOMPARE(page.state(), GatewayComponentWidget::Complete);
        QVERIFY(isExpectedExport(page.xmlReport(), "registrylist-simulator.xml"));
    }

    // The first claim of a MIME type is active, a later one not; a system module's claim is
    // restricted. Class type is the record's base class, class handler its handler class.
    void flagsAndClasses()
    {
        QTemporaryDir image;
        QVERIFY(writeImage(image.path(), "flags", RegistryVolume, {}, mimeModule("sys/mod/s1", "text/x-a", "0x00000011", "0x00000001")
                                             + mimeModule("sys/mod/s2", "text/x-a", "0x00000012", "0x00000002")
                                             + mimeModule("usermod/u1", "text/x-b", "0x00000013", "0x00000003")
                                             + mimeModule("usermod/u2", "TEXT/X-B", "0x00000014", "0x00000004")));
        SimulatorProcess simulator(m_sockets.path());
        QVERIFY(simulator.connectDevice(image.path(), "flags"));
        RegistryListView page;
        page.startComponent("flags");
        QVERIFY(fillByHand(page));
        QCOMPARE(columnTexts(page._registryTable, ClassTypeColumn), QStringList({"1", "2", "3", "4"}));
        QCOMPARE(columnTexts(page._registryTable, ClassHandlerColumn), QStringList({"17", "18", "19", "20"}));
        QCOMPARE(columnTexts(page._registryTable, FlagsColumn), QStringList({"Active | Restricted", "Restricted", "Active", ""}));
        QCOMPARE(columnTexts(page._registryTable, MimeTypeColumn), QStringList({"text/x-a", "text/x-a", "text/x-b", "TEXT/X-B"}));
    }

    // A failed query leaves its text and an empty table; the tick goes on polling, and the
    // page never completes.
    void failedQueryKeepsPolling_data()
    {
        QTest::addColumn<bool>("registry");
        QTest::addColumn<QString>("rule");
        QTest::addColumn<QString>("status");
        QTest::addColumn<GatewayComponentWidget::ComponentState>("state");
        QTest::newRow("module list") << false << "GetModules=3" << "Error: 3" << GatewayComponentWidget::Failed;
        QTest::newRow("no registry object") << true << "GetRegistry=3" << "Registry Object is not available in DelvixStubs.dll1"
                                            << GatewayComponentWidget::Starting;
        QTest::newRow("negative registry code") << true << "GetRegistry=0xDEADBEEF" << "Error: -559038737"
                                                << GatewayComponentWidget::Starting;
    }

    void failedQueryKeepsPolling()
    {
        QFETCH(bool, registry);
        QFETCH(QString, rule);
        QFETCH(QString, status);
        QFETCH(GatewayComponentWidget::ComponentState, state);
        SimulatorProcess failing(m_sockets.path());
        QVERIFY(failing.connectDevice(SimulatorProcess::sampleImage("simulator"), "failing", {"--fail", rule}));
        const auto check = [&](auto& page, const QTableWidget* table) {
            QSignalSpy ticks(&page.pacer(), &TickPacer::timeout);
            page.startComponent("failing");
            QTRY_COMPARE(page.status(), status);
            const int ticksAtFailure = int(ticks.count());
            QTRY_VERIFY_WITH_TIMEOUT(ticks.count() >= ticksAtFailure + 2, 5000);
            QVERIFY(page.pacer().isArmed());
            QCOMPARE(table->rowCount(), 0);
            QCOMPARE(page.status(), status);
            QCOMPARE(page.state(), state);
            QVERIFY(!page.isComplete() && !page.canSearch());
        };
        if (registry) {
            RegistryListView page;
            check(page, page._registryTable);
        } else {
            ModuleListView page;
            check(page, page._moduleTable);
        }
    }

    // A device without entries still completes; with no row there is nothing to search.
    void emptyRegistryCompletes()
    {
        QTemporaryDir image;
        QVERIFY(writeImage(image.path(), "empty", RegistryVolume));
        SimulatorProcess empty(m_sockets.path());
        QVERIFY(empty.connectDevice(image.path(), "empty"));
        RegistryListView page;
        page.startComponent("empty");
        QVERIFY(fillByHand(page));
        QCOMPARE(page.state(), GatewayComponentWidget::Complete);
        QCOMPARE(page._registryTable->rowCount(), 0);
        QVERIFY(!page.canSearch());
        QCOMPARE(page.xmlReport(), QString("<!DOCTYPE registrylist>\n<entries/>\n"));
    }

private:
    QTemporaryDir m_sockets;
    QTemporaryDir m_image;
    SimulatorProcess m_simulator{m_sockets.path()};
    SimulatorProcess m_sample{m_sockets.path()};
    QSharedPointer<_ZantDevice> m_device;
};

QTEST_MAIN(TestModulePages)
#include "tst_modulepages.moc"
