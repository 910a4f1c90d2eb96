#include "ModuleListView.h"
#include "PageFixtures.h"
#include "Portlex.h"
#include "SimulatorProcess.h"
#include "TestSupport.h"
#include "_ZantDevice.h"

#include <QProcess>
#include <QSignalSpy>
#include <QTemporaryDir>

using namespace PageFixtures;

namespace {

enum Column { NameColumn, VersionColumn, TypeColumn, SignatureColumn, PathColumn, CopyrightColumn };

QByteArray module(const QByteArray& name, const QByteArray& version, const QByteArray& type, const QByteArray& signature,
                  const QByteArray& copyright)
{
    return "<module volume=\"flash\" folder=\"usermod/" + name + "\" name=\"" + name + "\" version=\"" + version
        + "\" type=\"" + type + "\" signature=\"" + signature + "\" copyright=\"" + copyright + "\" size=\"16\"/>\n";
}

// An image of one flash volume holding two modules, built by zantro-sim.
bool writeImage(const QString& folder)
{
    const QDir image(folder);
    return TestSupport::writeFile(image.filePath("device.xml"),
                                  "<device id=\"modules\" name=\"Modules\" connection=\"simulator\">\n"
                                  " <identity phoneName=\"Modules\" targetId=\"0x0A1100FF\" zantVersion=\"3.2.9\"/>\n"
                                  " <volume id=\"1\" name=\"Flash\" mount=\"/\" folder=\"flash\" size=\"16777216\" modules=\"usermod\"/>\n"
                                  "</device>\n")
        && image.mkpath("flash/usermod")
        && TestSupport::writeFile(image.filePath("modules.xml"),
                                  "<sample>\n" + module("quote", "1.0", "Application", "test", "&quot;Q&quot; &amp; &lt;co&gt;")
                                      + module("plain", "2.0", "Library", "maker", "P") + "</sample>\n")
        && QProcess::execute(SimulatorProcess::executable(), {"make-sample", image.filePath("modules.xml"), folder}) == 0;
}

} // namespace

// The module list page on a small image served by real simulators: one answering, one
// failing the module query.
class TestModuleListView : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase()
    {
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        QVERIFY(Portlex::Initialize());
        QVERIFY(writeImage(m_image.path()));
        m_device = m_simulator.connectDevice(m_image.path(), "modules");
        QVERIFY(m_device);
        QVERIFY(m_failing.connectDevice(m_image.path(), "failing", {"--fail", "GetModules=3"}));
    }

    void cleanupTestCase()
    {
        m_device.reset();
        Portlex::Destroy();
    }

    // Left to its own timer: the tick goes on polling an empty table.
    void failedQueryKeepsPolling()
    {
        ModuleListView page;
        QSignalSpy ticks(&page.pacer(), &TickPacer::timeout);
        page.startComponent("failing");
        QTRY_COMPARE(page.status(), QString("Error: 3"));
        QCOMPARE(page.state(), GatewayComponentWidget::Failed);
        QTRY_VERIFY(ticks.count() >= 2);
        QVERIFY(page.pacer().isArmed());
        QCOMPARE(page._moduleTable->rowCount(), 0);
        QVERIFY(!page.isComplete() && !page.canSearch());
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

private:
    QTemporaryDir m_sockets;
    QTemporaryDir m_image;
    SimulatorProcess m_simulator{m_sockets.path()};
    SimulatorProcess m_failing{m_sockets.path()};
    QSharedPointer<_ZantDevice> m_device;
};

QTEST_MAIN(TestModuleListView)
#include "tst_modulelistview.moc"
