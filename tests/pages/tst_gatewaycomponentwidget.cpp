#include "GatewayComponentWidget.h"

#include <QSignalSpy>
#include <QTableWidget>
#include <QTest>
#include <QThread>
#include <QTreeWidget>

namespace {

// The smallest page: a table and a tree searched through the base's helpers.
class SearchPage : public GatewayComponentWidget
{
public:
    QTableWidget table{0, 3};
    QTreeWidget tree;

    QString componentName() override { return QStringLiteral("Search"); }
    void startComponent(const QString&) override {}
    bool canSearch() override { return true; }
    bool search(const QString& text) override { return applyTableSearch(text, &table); }
    bool searchInTree(const QString& text) { return applyTreeSearch(text, &tree); }
    void raisePriority() override {}
    void lowerPriority() override {}
    QString xmlReport() override { return QString(); }
};

void fillTable(QTableWidget& table, const QList<QStringList>& rows)
{
    table.setRowCount(int(rows.size()));
    for (int row = 0; row < rows.size(); ++row) {
        for (int column = 0; column < rows[row].size(); ++column)
            table.setItem(row, column, new QTableWidgetItem(rows[row][column]));
    }
}

QList<int> visibleRows(const QTableWidget& table)
{
    QList<int> rows;
    for (int row = 0; row < table.rowCount(); ++row) {
        if (!table.isRowHidden(row))
            rows.append(row);
    }
    return rows;
}

QStringList selectedTexts(const QTableWidget& table)
{
    QStringList texts;
    for (int row = 0; row < table.rowCount(); ++row) {
        for (int column = 0; column < table.columnCount(); ++column) {
            const QTableWidgetItem* item = table.item(row, column);
            if (item && item->isSelected())
                texts.append(item->text());
        }
    }
    return texts;
}

const QList<QStringList> Modules = {
    {"AppletShell", "1.0", "/usermod/shell"},
    {"Browser", "2.1", "/usermod/browser"},
    {"Calendar", "1.4", "/shared/diary"},
    {"ShellBrowser", "3.0", "/usermod/shellbrowser"},
};

} // namespace

class TestGatewayComponentWidget : public QObject
{
    Q_OBJECT

private slots:
    void statusAndStateEmitOnlyOnChange()
    {
        SearchPage page;
        QSignalSpy statusSpy(&page, &GatewayComponentWidget::statusChanged);
        QSignalSpy stateSpy(&page, &GatewayComponentWidget::stateChanged);

        QCOMPARE(page.state(), GatewayComponentWidget::Starting);
        QVERIFY(page.status().isEmpty());

        page.setStatus(QString());
        page.setState(GatewayComponentWidget::Starting);
        QCOMPARE(statusSpy.count(), 0);
        QCOMPARE(stateSpy.count(), 0);

        page.setStatus("Starting");
        page.setStatus("Starting");
        page.setState(GatewayComponentWidget::Processing);
        page.setState(GatewayComponentWidget::Processing);
        QCOMPARE(statusSpy.count(), 1);
        QCOMPARE(statusSpy.at(0).at(0).toString(), QString("Starting"));
        QCOMPARE(stateSpy.count(), 1);
        QCOMPARE(stateSpy.at(0).at(0).value<GatewayComponentWidget::ComponentState>(), GatewayComponentWidget::Processing);

        page.setStatus("Ready");
        page.setState(GatewayComponentWidget::Complete);
        QCOMPARE(statusSpy.count(), 2);
        QCOMPARE(stateSpy.count(), 2);
        QCOMPARE(page.status(), QString("Ready"));
        QCOMPARE(int(page.state()), 2);
    }

    // A worker thread sets status and state while the GUI thread reads them; the signals
    // reach a receiver on the GUI thread queued, in order, ending with the last values.
    void statusFromWorkerThreadArrivesQueued()
    {
        SearchPage page;
        QStringList statuses;
        QList<GatewayComponentWidget::ComponentState> states;
        QThread* emitter = nullptr;
        bool crossThread = true;
        connect(&page, &GatewayComponentWidget::statusChanged, this, [&](const QString& status) {
            crossThread = crossThread && QThread::currentThread() == thread();
            statuses.append(status);
        });
        connect(&page, &GatewayComponentWidget::stateChanged, this,
                [&](GatewayComponentWidget::ComponentState state) { states.append(state); });

        emitter = QThread::create([&page] {
            for (int i = 1; i <= 200; ++i)
                page.setStatus(QString::number(i));
            page.setState(GatewayComponentWidget::Processing);
            page.setState(GatewayComponentWidget::Failed);
        });
        emitter->start();
        while (!emitter->isFinished()) {
            const QString seen = page.status();
            QVERIFY(seen.isEmpty() || (seen.toInt() >= 1 && seen.toInt() <= 200));
        }
        emitter->wait();
        delete emitter;

        QTRY_COMPARE(statuses.size(), 200);
        QVERIFY(crossThread);
        QCOMPARE(statuses.last(), QString("200"));
        QTRY_COMPARE(states.size(), 2);
        QCOMPARE(states.last(), GatewayComponentWidget::Failed);
        QCOMPARE(page.state(), GatewayComponentWidget::Failed);
    }

    void tableSearch_data()
    {
        QTest::addColumn<QString>("text");
        QTest::addColumn<QList<int>>("rows");
        QTest::addColumn<QStringList>("selected");
        QTest::addColumn<bool>("notFound");

        QTest::newRow("two characters clear") << "sh" << QList<int>{0, 1, 2, 3} << QStringList() << false;
        QTest::newRow("three characters search") << "cal" << QList<int>{2} << QStringList{"Calendar"} << false;
        QTest::newRow("case-insensitive in any column") << "SHARED" << QList<int>{2} << QStringList{"/shared/diary"} << false;
        QTest::newRow("two hits in one row") << "browser" << QList<int>{1, 3}
                                             << QStringList{"Browser", "/usermod/browser", "ShellBrowser", "/usermod/shellbrowser"} << false;
        QTest::newRow("hits in adjacent rows") << "USERMOD" << QList<int>{0, 1, 3}
                                               << QStringList{"/usermod/shell", "/usermod/browser", "/usermod/shellbrowser"} << false;
        QTest::newRow("not found") << "xyz" << QList<int>() << QStringList() << true;
    }

    void tableSearch()
    {
        QFETCH(QString, text);
        QFETCH(QList<int>, rows);
        QFETCH(QStringList, selected);
        QFETCH(bool, notFound);

        SearchPage page;
        fillTable(page.table, Modules);
        QSignalSpy timed(&page, &GatewayComponentWidget::timedStatusChanged);

        QVERIFY(page.search(text));
        QCOMPARE(visibleRows(page.table), rows);
        QStringList actual = selectedTexts(page.table);
        actual.sort();
        selected.sort();
        QCOMPARE(actual, selected);
        QCOMPARE(timed.count(), notFound ? 1 : 0);
        if (notFound)
            QCOMPARE(timed.at(0).at(0).toString(), QString("\"xyz\" not found."));
        QCOMPARE(page.searchText(), text.size() >= 3 ? text : QString());
    }

    void tableSearchReplacesPreviousAndClears()
    {
        SearchPage page;
        fillTable(page.table, Modules);

        page.search("browser");
        // A cell the user selected besides the hits stays selected.
        page.table.item(1, 1)->setSelected(true);
        page.search("calendar");
        QCOMPARE(visibleRows(page.table), QList<int>{2});
        QCOMPARE(selectedTexts(page.table), (QStringList{"2.1", "Calendar"}));

        // A search without result leaves every row hidden until the search is cleared.
        page.search("nothing");
        QVERIFY(visibleRows(page.table).isEmpty());
        QCOMPARE(selectedTexts(page.table), QStringList{"2.1"});

        page.search("ca");
        QCOMPARE(visibleRows(page.table), (QList<int>{0, 1, 2, 3}));
        QCOMPARE(selectedTexts(page.table), QStringList{"2.1"});
        QVERIFY(page.searchText().isEmpty());

        // Clearing again, or clearing a table that has gone, does nothing.
        page.search("cal");
        page.table.setRowCount(0);
        page.clearTableSearch();
        page.clearTableSearch();
        QCOMPARE(page.table.rowCount(), 0);
    }

    // Hits forming blocks, runs and single cells select exactly the hit cells.
    void tableSearchSelectsExactCells()
    {
        SearchPage page;
        fillTable(page.table, {{"abc1", "abc2", "x"},
                               {"abc3", "abc4", "y"},
                               {"abc5", "z", "abc6"},
                               {"q", "r", "s"},
                               {"abc7", "abc8", "abc9"},
                               {"t", "abc10", "u"}});
        page.search("abc");
        QCOMPARE(visibleRows(page.table), (QList<int>{0, 1, 2, 4, 5}));
        QStringList selected = selectedTexts(page.table);
        QCOMPARE(selected, (QStringList{"abc1", "abc2", "abc3", "abc4", "abc5", "abc6", "abc7", "abc8", "abc9", "abc10"}));
        QCOMPARE(page.table.selectionModel()->selectedIndexes().size(), 10);

        page.search("ab");
        QVERIFY(selectedTexts(page.table).isEmpty());
    }

    void treeSearch()
    {
        SearchPage page;
        page.tree.setColumnCount(2);
        auto* family = new QTreeWidgetItem(&page.tree, {"Multimedia"});
        auto* subFamily = new QTreeWidgetItem(family, {"", "Audio"});
        auto* deep = new QTreeWidgetItem(subFamily, {"", "", "MidiPlayer"});
        auto* sibling = new QTreeWidgetItem(subFamily, {"", "", "MidiRecorder"});
        auto* mixer = new QTreeWidgetItem(subFamily, {"", "", "Mixer"});
        auto* lastSibling = new QTreeWidgetItem(subFamily, {"", "", "MidiSynth"});
        auto* other = new QTreeWidgetItem(&page.tree, {"Network"});
        auto* otherChild = new QTreeWidgetItem(other, {"", "Sockets"});
        auto* midiFamily = new QTreeWidgetItem(&page.tree, {"MIDI tools"});
        other->setExpanded(true);
        otherChild->setSelected(true);
        QSignalSpy timed(&page, &GatewayComponentWidget::timedStatusChanged);

        QVERIFY(page.searchInTree("midi"));
        QCOMPARE(page.tree.selectedItems().size(), 4);
        QVERIFY(deep->isSelected());
        QVERIFY(sibling->isSelected());
        QVERIFY(!mixer->isSelected());
        QVERIFY(lastSibling->isSelected());
        QVERIFY(midiFamily->isSelected());
        QVERIFY(deep->isExpanded());
        QVERIFY(subFamily->isExpanded());
        QVERIFY(family->isExpanded());
        QVERIFY(!other->isExpanded());
        QCOMPARE(timed.count(), 0);

        QVERIFY(page.searchInTree("Socket"));
        QCOMPARE(page.tree.selectedItems(), QList<QTreeWidgetItem*>{otherChild});
        QVERIFY(!family->isExpanded());
        QVERIFY(other->isExpanded());

        QVERIFY(page.searchInTree("printer"));
        QVERIFY(page.tree.selectedItems().isEmpty());
        QCOMPARE(timed.count(), 1);
        QCOMPARE(timed.at(0).at(0).toString(), QString("\"printer\" not found."));

        page.searchInTree("Audio");
        QVERIFY(!page.searchInTree("Au"));
        QVERIFY(page.tree.selectedItems().isEmpty());
        QVERIFY(!family->isExpanded());
        QVERIFY(page.searchText().isEmpty());
    }

    void itemMatches_data()
    {
        QTest::addColumn<QString>("text");
        QTest::addColumn<bool>("matches");
        QTest::newRow("first column") << "proc" << true;
        QTest::newRow("last column, other case") << "0X000000AB" << true;
        QTest::newRow("inside a word") << "ell" << true;
        QTest::newRow("across columns") << "Shell0x" << false;
        QTest::newRow("absent") << "kernel" << false;
    }

    void itemMatches()
    {
        QFETCH(QString, text);
        QFETCH(bool, matches);
        SearchPage page;
        QTreeWidgetItem item({"Process", "Shell", "0x000000ab"});
        QCOMPARE(page.itemMatches(text, &item), matches);
        QVERIFY(!page.itemMatches(text, nullptr));
    }

    void sharedTexts()
    {
        QCOMPARE(GatewayComponentWidget::errorStatus(42), QString("Error: 42"));
        QCOMPARE(GatewayComponentWidget::errorStatus(-559038737), QString("Error: -559038737"));
        SearchPage page;
        QVERIFY(!page.isComplete());
    }
};

QTEST_MAIN(TestGatewayComponentWidget)
#include "tst_gatewaycomponentwidget.moc"
