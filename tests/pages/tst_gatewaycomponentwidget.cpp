#include "CITableWidgetItem.h"
#include "CITreeWidgetItem.h"
#include "PageFixtures.h"
#include "StubPage.h"

#include <QSignalSpy>

namespace {

const QList<QStringList> Modules = {
    {"AppletShell", "1.0", "/usermod/shell"},   {"Browser", "2.1", "/usermod/browser"},
    {"Calendar", "1.4", "/shared/diary"},       {"ShellBrowser", "3.0", "/usermod/shellbrowser"},
    {"UserShell", "shell 2", "/usermod/usershell"},
};

// The smallest searching page: a table of Modules and a tree, searched through the base.
class SearchPage : public StubPage
{
public:
    SearchPage()
    {
        for (const QStringList& cells : Modules) {
            table.insertRow(table.rowCount());
            for (int column = 0; column < 3; ++column)
                table.setItem(table.rowCount() - 1, column, new QTableWidgetItem(cells[column]));
        }
    }
    bool search(const QString& text) override { return applyTableSearch(text, &table); }
    bool searchInTree(const QString& text) { return applyTreeSearch(text, &tree); }

    QTableWidget table{0, 3};
    QTreeWidget tree;
};

// The visible rows, each as "row:" and its selected columns: "3:02" is row 3 shown with its
// first and last cells selected. A hidden row shows only with selected cells, as "-row:".
QString shown(const QTableWidget& table)
{
    QStringList rows;
    for (int row = 0; row < table.rowCount(); ++row) {
        QString cells;
        for (int column = 0; column < table.columnCount(); ++column)
            cells += table.item(row, column)->isSelected() ? QString::number(column) : QString();
        if (!table.isRowHidden(row) || !cells.isEmpty())
            rows.append(QString(table.isRowHidden(row) ? "-%1:" : "%1:").arg(row) + cells);
    }
    return rows.join(' ');
}

// Every selected (*) or expanded (+) item of the tree, in order.
QString marked(QTreeWidget& tree)
{
    QStringList items;
    for (QTreeWidgetItemIterator it(&tree); *it; ++it) {
        const QString marks = QString((*it)->isSelected() ? "*" : "") + ((*it)->isExpanded() ? "+" : "");
        if (!marks.isEmpty())
            items.append((*it)->text(0) + (*it)->text(1) + (*it)->text(2) + marks);
    }
    return items.join(' ');
}

} // namespace

// What every page shares: the search duty, and the order of the table and tree
// items (item type first, for a tree only in its first column, then the text without regard
// to letter case, ids and numbers as text).
class TestGatewayComponentWidget : public QObject
{
    Q_OBJECT

private slots:
    // Hits forming blocks, runs and single cells select exactly the hit cells.
    void tableSearch_data()
    {
        QTest::addColumn<QString>("text");
        QTest::addColumn<QString>("result");
        QTest::newRow("two characters clear") << "sh" << "0: 1: 2: 3: 4:";
        QTest::newRow("case-insensitive in any column") << "SHARED" << "2:2";
        QTest::newRow("two hits in a row") << "browser" << "1:02 3:02";
        QTest::newRow("runs and a block") << "shell" << "0:02 3:02 4:012";
        QTest::newRow("not across columns") << "Browser2.1" << "";
    }

    void tableSearch()
    {
        QFETCH(QString, text);
        QFETCH(QString, result);
        SearchPage page;
        QSignalSpy timed(&page, &GatewayComponentWidget::timedStatusChanged);
        QVERIFY(page.search(text));
        QCOMPARE(shown(page.table), result);
        QCOMPARE(PageFixtures::signalTexts(timed), result.isEmpty() ? QStringList{'"' + text + "\" not found."} : QStringList());
        QCOMPARE(page.searchText(), text.size() >= 3 ? text : QString());
    }

    void tableSearchReplacesPreviousAndClears()
    {
        SearchPage page;
        page.search("browser");
        // A cell the user selected besides the hits stays selected.
        page.table.item(1, 1)->setSelected(true);
        page.search("calendar");
        QCOMPARE(shown(page.table), QString("-1:1 2:0"));
        // A search without result hides every row until the search is cleared.
        page.search("nothing");
        QCOMPARE(shown(page.table), QString("-1:1"));
        page.search("ca");
        QCOMPARE(shown(page.table), QString("0: 1:1 2: 3: 4:"));
        // Clearing a table whose rows have gone touches nothing.
        page.search("cal");
        page.table.setRowCount(0);
        page.clearTableSearch();
        QCOMPARE(page.table.rowCount(), 0);
    }

    void treeSearch()
    {
        SearchPage page;
        auto* audio = new QTreeWidgetItem(new QTreeWidgetItem(&page.tree, {"Multimedia"}), {"", "Audio"});
        for (const char* name : {"MidiPlayer", "Mixer", "MidiSynth"})
            new QTreeWidgetItem(audio, {"", "", name});
        auto* network = new QTreeWidgetItem(&page.tree, {"Network"});
        new QTreeWidgetItem(network, {"", "Sockets", "0x000000ab"});
        new QTreeWidgetItem(&page.tree, {"MidiTools"});
        network->setExpanded(true);
        network->child(0)->setSelected(true);
        QSignalSpy timed(&page, &GatewayComponentWidget::timedStatusChanged);
        QVERIFY(page.searchInTree("midi"));
        QCOMPARE(marked(page.tree), QString("Multimedia+ Audio+ MidiPlayer*+ MidiSynth*+ MidiTools*+"));
        QVERIFY(page.searchInTree("0X0000"));
        QCOMPARE(marked(page.tree), QString("Network+ Sockets0x000000ab*+"));
        QVERIFY(timed.isEmpty());
        QVERIFY(page.searchInTree("Sockets0x"));
        QCOMPARE(marked(page.tree), QString());
        QCOMPARE(PageFixtures::signalTexts(timed), QStringList{"\"Sockets0x\" not found."});
        page.searchInTree("0x0000");
        QVERIFY(!page.searchInTree("So"));
        QCOMPARE(marked(page.tree), QString());
        QVERIFY(page.searchText().isEmpty());
    }

    // order: -1 the left item sorts first, 1 the right one, 0 neither.
    void order_data()
    {
        QTest::addColumn<int>("column");
        QTest::addColumn<int>("leftType");
        QTest::addColumn<QString>("left");
        QTest::addColumn<int>("rightType");
        QTest::addColumn<QString>("right");
        QTest::addColumn<int>("order");
        QTest::newRow("case ignored") << 0 << 0 << "apple" << 0 << "Banana" << -1;
        QTest::newRow("same text in other case") << 0 << 0 << "Media" << 0 << "media" << 0;
        QTest::newRow("ids as text") << 0 << 0 << "0x10" << 0 << "0x9" << -1;
        QTest::newRow("empty first") << 0 << 0 << "" << 0 << "a" << -1;
        QTest::newRow("non-ASCII without case") << 0 << 0 << "Ärger" << 0 << "ärmel" << -1;
        QTest::newRow("type before text") << 0 << 2 << "a" << 1 << "z" << 1;
        QTest::newRow("tree: type ignored in another column") << 1 << 2 << "a" << 1 << "z" << -1;
    }

    void order()
    {
        QFETCH(int, column);
        QFETCH(int, leftType);
        QFETCH(QString, left);
        QFETCH(int, rightType);
        QFETCH(QString, right);
        QFETCH(int, order);
        if (column == 0) {
            const CITableWidgetItem a(left, leftType), b(right, rightType);
            const QTableWidgetItem plain(right, rightType);
            QCOMPARE(a < b, order < 0);
            QCOMPARE(b < a, order > 0);
            QCOMPARE(a < plain, order < 0);
            // An item outside a tree sorts by its first column.
            CITreeWidgetItem l(leftType), r(rightType);
            l.setText(0, left);
            r.setText(0, right);
            QCOMPARE(l < r, order < 0);
        }
        QTreeWidget tree;
        tree.setColumnCount(2);
        tree.sortItems(column, Qt::AscendingOrder);
        auto* l = new CITreeWidgetItem(&tree, leftType);
        auto* r = new CITreeWidgetItem(&tree, rightType);
        // The other column holds the opposite order, so a wrong column shows.
        l->setText(column, left);
        l->setText(1 - column, "b");
        r->setText(column, right);
        r->setText(1 - column, "a");
        QCOMPARE(*l < *r, order < 0);
        QCOMPARE(*r < *l, order > 0);
    }

    // The table item keeps its sort key beside its text; a new text must renew it.
    void tableItemSortsByItsNewText()
    {
        CITableWidgetItem item("aaa");
        const CITableWidgetItem middle("mmm");
        item.setText("ZZZ");
        QVERIFY(middle < item);
        item.setData(Qt::EditRole, "Aab");
        QVERIFY(item < middle);
    }
};

QTEST_MAIN(TestGatewayComponentWidget)
#include "tst_gatewaycomponentwidget.moc"
