#include "DeviceWindow.h"
#include "PageFixtures.h"
#include "Portlex.h"
#include "RegistryListView.h"
#include "SimulatorProcess.h"
#include "TestSupport.h"

#include <QLabel>
#include <QLineEdit>
#include <QProcess>
#include <QSignalSpy>
#include <QTemporaryDir>

using namespace PageFixtures;

namespace {

enum Column { ClassTypeColumn, ClassHandlerColumn, FlagsColumn, MimeTypeColumn };

// A module of the image description that registers one MIME type.
QByteArray mimeModule(const QByteArray& folder, const QByteArray& type, const QByteArray& handler, const QByteArray& base)
{
    return "<module volume=\"flash\" folder=\"" + folder + "\" name=\"" + folder.mid(folder.lastIndexOf('/') + 1)
        + "\" size=\"16\"><mime type=\"" + type + "\" handler=\"" + handler + "\" base=\"" + base + "\"/></module>\n";
}

// An image of one flash volume with a system and a user module folder, holding modules.
bool writeImage(const QString& folder, const QByteArray& modules)
{
    const QDir image(folder);
    return image.mkpath("flash/usermod")
        && TestSupport::writeFile(image.filePath("device.xml"),
                                  "<device id=\"registry\" name=\"Registry\" connection=\"simulator\">\n"
                                  " <identity phoneName=\"Registry\" targetId=\"0x0A1100FE\" zantVersion=\"3.2.9\"/>\n"
                                  " <volume id=\"1\" name=\"Flash\" mount=\"/\" folder=\"flash\" size=\"16777216\""
                                  " modules=\"sys/mod usermod\" install=\"usermod\"/>\n"
                                  "</device>\n")
        && TestSupport::writeFile(image.filePath("modules.xml"), "<sample>\n" + modules + "</sample>\n")
        && QProcess::execute(SimulatorProcess::executable(), {"make-sample", image.filePath("modules.xml"), folder}) == 0;
}

} // namespace

// The registry page against real simulators: the sample device's export, queries that
// fail, a registry without entries, a generated one, clicks, and the page in a window.
class TestRegistryListView : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase()
    {
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        QVERIFY(Portlex::Initialize());
        QVERIFY(m_simulator.connectDevice(SimulatorProcess::sampleImage("simulator"), "registry"));
    }

    void cleanupTestCase() { Portlex::Destroy(); }

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
        QFile expected(QFINDTESTDATA("expected/registrylist-simulator.xml"));
        QVERIFY(expected.open(QIODevice::ReadOnly));
        const QString report = page.xmlReport();
        if (report != QString::fromUtf8(expected.readAll())) {
            QFile actual(QDir::temp().filePath("actual-registrylist-simulator.xml"));
            QVERIFY(actual.open(QIODevice::WriteOnly) && actual.write(report.toUtf8()) > 0);
            QFAIL(qPrintable("the export differs from the expected one; it is in " + actual.fileName()));
        }
    }

    // The first claim of a MIME type is active, a later one not; a system module's claim is
    // restricted. Class type is the record's base class, class handler its handler class.
    void flagsAndClasses()
    {
        QTemporaryDir image;
        QVERIFY(writeImage(image.path(), mimeModule("sys/mod/s1", "text/x-a", "0x00000011", "0x00000001")
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
    void failedQueryNeverCompletes_data()
    {
        QTest::addColumn<QString>("code");
        QTest::addColumn<QString>("status");
        QTest::newRow("no registry object") << "3" << "Registry Object is not available in DelvixStubs.dll1";
        QTest::newRow("other code") << "9" << "Error: 9";
        QTest::newRow("negative code") << "0xDEADBEEF" << "Error: -559038737";
    }

    void failedQueryNeverCompletes()
    {
        QFETCH(QString, code);
        QFETCH(QString, status);
        SimulatorProcess failing(m_sockets.path());
        QVERIFY(failing.connectDevice(SimulatorProcess::sampleImage("simulator"), "failing", {"--fail", "GetRegistry=" + code}));
        RegistryListView page;
        QSignalSpy ticks(&page.pacer(), &TickPacer::timeout);
        page.startComponent("failing");
        QTRY_COMPARE(page.status(), status);
        const int ticksAtFailure = int(ticks.count());
        QTRY_VERIFY_WITH_TIMEOUT(ticks.count() >= ticksAtFailure + 2, 5000);
        QVERIFY(page.pacer().isArmed());
        QCOMPARE(page._registryTable->rowCount(), 0);
        QCOMPARE(page.status(), status);
        QVERIFY(!page.isComplete() && !page.canSearch());
        QCOMPARE(page.state(), GatewayComponentWidget::Starting);
    }

    // A device without entries still completes; with no row there is nothing to search.
    void emptyRegistryCompletes()
    {
        QTemporaryDir image;
        QVERIFY(writeImage(image.path(), QByteArray()));
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

    // A generated image's records: one per module first, then claims of the same types
    // again, which the device marks inactive.
    void generatedRegistry()
    {
        QTemporaryDir image;
        QCOMPARE(QProcess::execute(SimulatorProcess::executable(),
                                   {"generate", image.path(), "--modules", "3", "--classes", "2", "--files", "0",
                                    "--processes", "0", "--mime-types", "7"}),
                 0);
        SimulatorProcess generated(m_sockets.path());
        QVERIFY(generated.connectDevice(image.path(), "generated", {}, SimulatorProcess::Image::InPlace));
        RegistryListView page;
        page.startComponent("generated");
        QVERIFY(fillByHand(page));
        const QStringList types = columnTexts(page._registryTable, MimeTypeColumn);
        const QStringList flags = columnTexts(page._registryTable, FlagsColumn);
        QCOMPARE(types.size(), 7);
        QStringList active;
        for (int row = 0; row < types.size(); ++row) {
            if (flags.at(row) == "Active")
                active << types.at(row);
            else
                QCOMPARE(flags.at(row), QString());
        }
        active.sort();
        QCOMPARE(active, QStringList({"application/x-gen-0", "application/x-gen-1", "application/x-gen-2"}));
    }

    // Both clicks bring the cell's text; a null cell brings nothing.
    void clicksEmitTheCellText()
    {
        RegistryListView page;
        page.resize(800, 400);
        page.show();
        page.startComponent("registry");
        QVERIFY(fillByHand(page));
        QVERIFY(QTest::qWaitForWindowExposed(&page));
        QTableWidget* table = page._registryTable;
        const QPoint cell = table->visualItemRect(table->item(0, MimeTypeColumn)).center();
        QSignalSpy singles(&page, &RegistryListView::singleClick);
        QSignalSpy doubles(&page, &RegistryListView::doubleClick);
        QTest::mouseClick(table->viewport(), Qt::LeftButton, {}, cell);
        QTest::mouseDClick(table->viewport(), Qt::LeftButton, {}, cell);
        QCOMPARE(signalTexts(singles), QStringList(table->item(0, MimeTypeColumn)->text()));
        QCOMPARE(signalTexts(doubles), QStringList(table->item(0, MimeTypeColumn)->text()));
        page.onTableClick(nullptr);
        page.onTableDoubleClick(nullptr);
        QCOMPARE(singles.count() + doubles.count(), 2);
    }

    // Chosen in a device window, the page starts, completes and may be searched and exported.
    void shownInTheWindow()
    {
        DeviceWindow window;
        window.setAttribute(Qt::WA_DeleteOnClose, false);
        window.setDevice("registry");
        window.action_Registry->trigger();
        QTRY_VERIFY_WITH_TIMEOUT(window._registryListView->isComplete(), 30000);
        QVERIFY(window.actionExport_to_XML->isEnabled());
        QVERIFY(window.findChild<QLineEdit*>()->isEnabled());
        QCOMPARE(window.findChild<QLabel*>("_status")->text(), QString("Ready"));
    }

private:
    QTemporaryDir m_sockets;
    SimulatorProcess m_simulator{m_sockets.path()};
};

QTEST_MAIN(TestRegistryListView)
#include "tst_registrylistview.moc"
