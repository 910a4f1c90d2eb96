#include "CITableWidgetItem.h"
#include "CITreeWidgetItem.h"

#include <QTest>
#include <QTreeWidget>

// The order of the pages' table and tree items: item type first (for a tree only in its
// first column), then the text without regard to letter case, ids and numbers as text.
class TestItemOrdering : public QObject
{
    Q_OBJECT

private slots:
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
        QTest::newRow("versions as text") << 0 << 0 << "10.0" << 0 << "9.0" << -1;
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

QTEST_MAIN(TestItemOrdering)
#include "tst_itemordering.moc"
