#include "DeviceWindow.h"
#include "ModuleListView.h"
#include "TablePageFixtures.h"
#include "TreePageFixtures.h"

#include <QSignalSpy>
#include <QTemporaryDir>
#include <QTest>

using namespace TablePageFixtures;
using namespace TreePageFixtures;

namespace {

enum Column
{
    NameColumn,
    VersionColumn,
    TypeColumn,
    SignatureColumn,
    PathColumn,
    CopyrightColumn
};

QStringList columnTexts(const QTableWidget* table, int column)
{
    QStringList texts;
    for (int row = 0; row < table->rowCount(); ++row)
        texts.append(table->item(row, column)->text());
    return texts;
}

int findRow(const QTableWidget* table, const QString& name)
{
    return columnTexts(table, NameColumn).indexOf(name);
}

QStringList texts(const QList<QList<QVariant>>& signalArguments)
{
    QStringList list;
    for (const QList<QVariant>& arguments : signalArguments)
        list.append(arguments.at(0).toString());
    return list;
}

} // namespace

// The module list page on devices served by a real simulator: the sample images and small
// images written here with known modules.
class TestModuleListView : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase()
    {
        QVERIFY(m_sockets.isValid());
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        QVERIFY(Portlex::Initialize());
    }

    void cleanupTestCase()
    {
        Portlex::Destroy();
    }

    void startsWaitingForItsDevice()
    {
        ModuleListView page;
        QCOMPARE(page.status(), QString("Starting"));
        QCOMPARE(page.state(), GatewayComponentWidget::Starting);
        QCOMPARE(page.componentName(), QString("ModuleList"));
        QCOMPARE(page.pacer().lastArmed(), 500);
        QStringList headers;
        for (int column = 0; column < page._moduleTable->columnCount(); ++column)
            headers.append(page._moduleTable->horizontalHeaderItem(column)->text());
        QCOMPARE(headers, QStringList({"Module Name", "Component Services Version", "Module Type", "Signature", "Path",
                                       "Copyright"}));
        QVERIFY(!page._moduleTable->isSortingEnabled());
        QCOMPARE(page._moduleTable->palette().color(QPalette::Inactive, QPalette::Highlight), QColor(17, 183, 200));

        // An id the gateway does not know starts nothing: the page keeps waiting.
        page.startComponent("no-such-device");
        QSignalSpy armed(&page.pacer(), &TickPacer::armed);
        QVERIFY(armed.wait(1000));
        QCOMPARE(page.status(), QString("Starting"));
        QVERIFY(!page.canSearch());
        QVERIFY(!page.isComplete());
    }

    void fillsFromTheDevice_data()
    {
        QTest::addColumn<QString>("image");
        QTest::addColumn<QByteArray>("modules");
        QTest::addColumn<int>("rows");
        QTest::newRow("simulator sample") << "simulator" << QByteArray() << 34;
        QTest::newRow("handset sample") << "handset" << QByteArray() << 36;
        QTest::newRow("one module") << "" << module("solo", "1.0", "Application", "test", "Solo") << 1;
        QTest::newRow("no modules") << "" << QByteArray() << 0;
    }

    void fillsFromTheDevice()
    {
        QFETCH(QString, image);
        QFETCH(QByteArray, modules);
        QFETCH(int, rows);
        QTemporaryDir folder;
        if (image.isEmpty())
            QVERIFY(writeImage(folder.path(), QByteArray(), modules));
        const QString path = image.isEmpty() ? folder.path() : SimulatorProcess::sampleImage(image);
        SimulatorProcess simulator(m_sockets.path());
        QVERIFY(connectImage(simulator, path, "fill"));

        ModuleListView page;
        QSignalSpy statuses(&page, &GatewayComponentWidget::statusChanged);
        QSignalSpy states(&page, &GatewayComponentWidget::stateChanged);
        page.startComponent("fill");
        QVERIFY(waitReady(page));
        QCOMPARE(page._moduleTable->rowCount(), rows);
        QCOMPARE(texts(statuses), QStringList({"Processing Device Modules", "Ready"}));
        QCOMPARE(states.count(), 2);
        QCOMPARE(states.at(1).at(0).value<GatewayComponentWidget::ComponentState>(), GatewayComponentWidget::Complete);
        QVERIFY(page.canSearch());
        QVERIFY(page.isComplete());
        QVERIFY(page._moduleTable->isSortingEnabled());
        // Complete pages tick no more.
        QVERIFY(!page.pacer().isArmed());
    }

    void rowsKeepTheNumbers()
    {
        SimulatorProcess simulator(m_sockets.path());
        QVERIFY(connectImage(simulator, SimulatorProcess::sampleImage("simulator"), "rows"));
        ModuleListView page;
        page.startComponent("rows");
        QVERIFY(waitReady(page));
        // The texts are in the export below; the numbers behind two of them ride along.
        const QTableWidget* table = page._moduleTable;
        const int row = findRow(table, "blockdrop");
        QVERIFY(row >= 0);
        QCOMPARE(table->item(row, TypeColumn)->data(Qt::UserRole).toUInt(), quint32(ModuleInfo::Application));
        QCOMPARE(table->item(row, SignatureColumn)->data(Qt::UserRole).toUInt(), quint32(ModuleInfo::DeveloperSigned));
        QCOMPARE(table->rowHeight(row), 20);
    }

    void sortsWithoutLetterCase()
    {
        QTemporaryDir folder;
        QVERIFY(writeImage(folder.path(), QByteArray(),
                           module("beta", "10.0", "Library", "unsigned", "b") + module("Alpha", "9.0", "Application", "test", "a")
                               + module("alpha2", "1.0", "System", "maker", "C") + module("Gamma", "2.0", "Extension", "invalid", "d")
                               + module("delta", "1.1", "Application Preinstalled", "developer", "E")));
        SimulatorProcess simulator(m_sockets.path());
        QVERIFY(connectImage(simulator, folder.path(), "sorting"));
        ModuleListView page;
        page.startComponent("sorting");
        QVERIFY(waitReady(page));
        QTableWidget* table = page._moduleTable;
        QCOMPARE(columnTexts(table, NameColumn), QStringList({"Alpha", "alpha2", "beta", "delta", "Gamma"}));

        // Every column sorts as text without regard to case: "10.0" before "9.0".
        table->sortByColumn(VersionColumn, Qt::AscendingOrder);
        QCOMPARE(columnTexts(table, VersionColumn), QStringList({"1.0", "1.1", "10.0", "2.0", "9.0"}));
        table->sortByColumn(CopyrightColumn, Qt::DescendingOrder);
        QCOMPARE(columnTexts(table, CopyrightColumn), QStringList({"E", "d", "C", "b", "a"}));
    }

    void failedQueryKeepsPolling()
    {
        SimulatorProcess simulator(m_sockets.path());
        QVERIFY(connectImage(simulator, SimulatorProcess::sampleImage("simulator"), "failing", {"--fail", "GetModules=3"}));
        ModuleListView page;
        QSignalSpy armed(&page.pacer(), &TickPacer::armed);
        page.startComponent("failing");
        QVERIFY(QTest::qWaitFor([&] { return page.state() == GatewayComponentWidget::Failed; }, ReadyTimeoutMs));
        QCOMPARE(page.status(), QString("Error: 3"));
        // The tick backs off to its cap and goes on polling an empty table.
        QVERIFY(QTest::qWaitFor([&] { return !armed.isEmpty() && armed.last().at(0).toInt() == 500; }, 5000));
        QVERIFY(page.pacer().isArmed());
        QCOMPARE(page._moduleTable->rowCount(), 0);
        QVERIFY(!page.isComplete());
        QVERIFY(!page.canSearch());
    }

    void clicksEmitTheRowsModule()
    {
        SimulatorProcess simulator(m_sockets.path());
        const QSharedPointer<_ZantDevice> device = connectImage(simulator, SimulatorProcess::sampleImage("handset"), "clicks");
        QVERIFY(device);
        ModuleListView page;
        page.resize(900, 600);
        page.show();
        page.startComponent("clicks");
        QVERIFY(waitReady(page));
        QVERIFY(QTest::qWaitForWindowExposed(&page));

        QTableWidget* table = page._moduleTable;
        const int row = findRow(table, "carousel");
        QVERIFY(row >= 0);
        table->scrollToItem(table->item(row, PathColumn));
        const QPoint cell = table->visualItemRect(table->item(row, PathColumn)).center();
        QSignalSpy singles(&page, &ModuleListView::singleClick);
        QSignalSpy doubles(&page, &ModuleListView::doubleClick);

        QTest::mouseClick(table->viewport(), Qt::LeftButton, {}, cell);
        QCOMPARE(singles.count(), 1);
        QCOMPARE(doubles.count(), 0);

        QVector<ModuleInfo> modules;
        QCOMPARE(device->GetModules(modules, nullptr, nullptr), 0);
        ModuleInfo expected;
        for (const ModuleInfo& module : std::as_const(modules)) {
            if (module.name == "carousel")
                expected = module;
        }
        QVERIFY(expected.size != 0);
        // The row does not show the size and the id, so the record leaves them at 0.
        expected.size = 0;
        expected.moduleId = 0;
        QCOMPARE(singles.at(0).at(0).value<ModuleInfo>(), expected);

        QTest::mouseDClick(table->viewport(), Qt::LeftButton, {}, cell);
        QCOMPARE(doubles.count(), 1);
        QCOMPARE(doubles.at(0).at(0).value<ModuleInfo>(), expected);

        // A cell outside any table brings nothing.
        QTableWidgetItem loose("loose");
        page.onTableClick(&loose);
        page.onTableDoubleClick(nullptr);
        QCOMPARE(doubles.count(), 1);
    }

    void exportFollowsTheTableOrder_data()
    {
        QTest::addColumn<int>("column");
        QTest::addColumn<int>("order");
        QTest::addColumn<QString>("expected");
        QTest::newRow("by name") << int(NameColumn) << int(Qt::AscendingOrder) << "zant-modules-simulator.xml";
        QTest::newRow("by path, descending") << int(PathColumn) << int(Qt::DescendingOrder)
                                             << "zant-modules-simulator-by-path.xml";
    }

    void exportFollowsTheTableOrder()
    {
        QFETCH(int, column);
        QFETCH(int, order);
        QFETCH(QString, expected);
        SimulatorProcess simulator(m_sockets.path());
        QVERIFY(connectImage(simulator, SimulatorProcess::sampleImage("simulator"), "export"));
        ModuleListView page;
        page.startComponent("export");
        QVERIFY(waitReady(page));
        page._moduleTable->sortByColumn(column, Qt::SortOrder(order));
        QVERIFY(matchesExpected(expected, page.xmlReport()));
    }

    void exportIsFrozenAtItsFirstCall()
    {
        QTemporaryDir folder;
        QVERIFY(writeImage(folder.path(), QByteArray(),
                           module("quote", "1.0", "Application", "test", "&quot;Q&quot; &amp; &lt;co&gt;")
                               + module("plain", "2.0", "Library", "maker", "P")));
        SimulatorProcess simulator(m_sockets.path());
        QVERIFY(connectImage(simulator, folder.path(), "frozen"));
        ModuleListView page;
        page.startComponent("frozen");
        // Before the first tick the table is empty, and so is the frozen report.
        const QString early = page.xmlReport();
        QCOMPARE(early, QString("<!DOCTYPE zant-modules>\n<modules/>\n"));
        QVERIFY(waitReady(page));
        QCOMPARE(page._moduleTable->rowCount(), 2);
        QCOMPARE(page.xmlReport(), early);

        ModuleListView later;
        later.startComponent("frozen");
        QVERIFY(waitReady(later));
        const QString report = later.xmlReport();
        QCOMPARE(report, QString("<!DOCTYPE zant-modules>\n"
                                 "<modules>\n"
                                 " <module copyright=\"P\" path=\"/usermod/plain/plain.mif\" signature=\"Maker Signed\" "
                                 "type=\"Library\" version=\"2.0\" name=\"plain\"/>\n"
                                 " <module copyright=\"&quot;Q&quot; &amp; &lt;co&gt;\" path=\"/usermod/quote/quote.mif\" "
                                 "signature=\"Test Signed\" type=\"Application\" version=\"1.0\" name=\"quote\"/>\n"
                                 "</modules>\n"));
        later._moduleTable->sortByColumn(NameColumn, Qt::DescendingOrder);
        QCOMPARE(later.xmlReport(), report);
    }

    void searchShowsMatchingRows()
    {
        SimulatorProcess simulator(m_sockets.path());
        QVERIFY(connectImage(simulator, SimulatorProcess::sampleImage("handset"), "search"));
        ModuleListView page;
        page.startComponent("search");
        QVERIFY(waitReady(page));
        const QTableWidget* table = page._moduleTable;
        const auto shown = [table] {
            QStringList names;
            for (int row = 0; row < table->rowCount(); ++row) {
                if (!table->isRowHidden(row))
                    names.append(table->item(row, NameColumn)->text());
            }
            return names;
        };

        QVERIFY(page.search("/CARD/"));
        QCOMPARE(shown(), QStringList({"carousel", "offlinemaps"}));
        QCOMPARE(page.searchText(), QString("/CARD/"));
        QVERIFY(page.search("ca"));
        QCOMPARE(shown().count(), table->rowCount());
        QVERIFY(page.searchText().isEmpty());
    }

    void windowRoutesDoubleClicksWhileShown()
    {
        SimulatorProcess simulator(m_sockets.path());
        QVERIFY(connectImage(simulator, SimulatorProcess::sampleImage("simulator"), "window"));
        DeviceWindow window;
        window.setAttribute(Qt::WA_DeleteOnClose, false);
        window.setDevice("window");
        QCOMPARE(window.pageAt(1), static_cast<GatewayComponentWidget*>(window._moduleListView));
        // The route exists while the page is shown; disconnecting it tells whether it did.
        const auto routed = [&window] {
            return QObject::disconnect(window._moduleListView, &ModuleListView::doubleClick, &window,
                                       &DeviceWindow::onModuleInfoExamine);
        };
        QVERIFY(!routed());

        window.action_Modules->trigger();
        QVERIFY(waitReady(*window._moduleListView));
        QVERIFY(window.actionExport_to_XML->isEnabled());
        QVERIFY(routed());
        QVERIFY(!routed());

        window.action_Phone_Information->trigger();
        window.action_Modules->trigger();
        window.action_Phone_Information->trigger();
        QVERIFY(!routed());
        window.action_Modules->trigger();
        QVERIFY(routed());
        // Shown twice, routed once.
        QVERIFY(!routed());
    }

private:
    QTemporaryDir m_sockets;
};

QTEST_MAIN(TestModuleListView)
#include "tst_modulelistview.moc"
