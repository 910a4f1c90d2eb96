#include "CITreeWidgetItem.h"

#include <QTest>
#include <QTreeWidget>

// The tree item's ordering: type first (sort column 0 only), then the sort column's text
// without regard to letter case.
class TestCITreeWidgetItem : public QObject
{
    Q_OBJECT

private slots:
    void orderOfTwoItems_data()
    {
        QTest::addColumn<int>("sortColumn");
        QTest::addColumn<int>("leftType");
        QTest::addColumn<QString>("leftText");
        QTest::addColumn<int>("rightType");
        QTest::addColumn<QString>("rightText");
        QTest::addColumn<bool>("leftFirst");
        QTest::addColumn<bool>("rightFirst");

        const int plain = QTreeWidgetItem::Type;
        QTest::newRow("case ignored") << 0 << plain << "apple" << plain << "Banana" << true << false;
        QTest::newRow("case ignored, upper first") << 0 << plain << "APPLE" << plain << "banana" << true << false;
        QTest::newRow("same text in other case") << 0 << plain << "Media" << plain << "media" << false << false;
        QTest::newRow("ids as text") << 0 << plain << "0x10" << plain << "0x9" << true << false;
        QTest::newRow("empty before text") << 0 << plain << "" << plain << "a" << true << false;
        QTest::newRow("type before text") << 0 << 2 << "a" << 1 << "z" << false << true;
        QTest::newRow("type in other column ignored") << 1 << 2 << "a" << 1 << "z" << true << false;
        QTest::newRow("equal types, text decides") << 0 << 1 << "zeta" << 1 << "Alpha" << false << true;
    }

    void orderOfTwoItems()
    {
        QFETCH(int, sortColumn);
        QFETCH(int, leftType);
        QFETCH(QString, leftText);
        QFETCH(int, rightType);
        QFETCH(QString, rightText);
        QFETCH(bool, leftFirst);
        QFETCH(bool, rightFirst);

        QTreeWidget tree;
        tree.setColumnCount(2);
        tree.sortItems(sortColumn, Qt::AscendingOrder);
        auto* left = new CITreeWidgetItem(&tree, leftType);
        auto* right = new CITreeWidgetItem(&tree, rightType);
        // The other column holds the opposite order, so a wrong column shows.
        left->setText(sortColumn, leftText);
        left->setText(1 - sortColumn, "b");
        right->setText(sortColumn, rightText);
        right->setText(1 - sortColumn, "a");

        QCOMPARE(*left < *right, leftFirst);
        QCOMPARE(*right < *left, rightFirst);
    }

    void detachedItemUsesFirstColumn()
    {
        CITreeWidgetItem left;
        CITreeWidgetItem right;
        left.setText(0, "alpha");
        left.setText(1, "z");
        right.setText(0, "Beta");
        right.setText(1, "a");
        QVERIFY(left < right);
        QVERIFY(!(right < left));

        CITreeWidgetItem typed(1);
        CITreeWidgetItem later(2);
        typed.setText(0, "z");
        later.setText(0, "a");
        QVERIFY(typed < later);
    }

    void treeSortUsesTheOrdering_data()
    {
        QTest::addColumn<int>("column");
        QTest::addColumn<Qt::SortOrder>("order");
        QTest::addColumn<QStringList>("expected");

        QTest::newRow("first column: type 1 first") << 0 << Qt::AscendingOrder
                                                    << QStringList{"beta", "Delta", "alpha", "Charlie"};
        QTest::newRow("first column descending") << 0 << Qt::DescendingOrder
                                                 << QStringList{"Charlie", "alpha", "Delta", "beta"};
        QTest::newRow("second column: text only") << 1 << Qt::AscendingOrder
                                                  << QStringList{"Charlie", "beta", "alpha", "Delta"};
    }

    void treeSortUsesTheOrdering()
    {
        QFETCH(int, column);
        QFETCH(Qt::SortOrder, order);
        QFETCH(QStringList, expected);

        QTreeWidget tree;
        tree.setColumnCount(2);
        const QList<QPair<int, QStringList>> rows = {
            {2, {"alpha", "3"}}, {1, {"Delta", "4"}}, {2, {"Charlie", "1"}}, {1, {"beta", "2"}}};
        for (const auto& row : rows) {
            auto* item = new CITreeWidgetItem(&tree, row.first);
            item->setText(0, row.second[0]);
            item->setText(1, row.second[1]);
        }
        tree.sortItems(column, order);

        QStringList sorted;
        for (int i = 0; i < tree.topLevelItemCount(); ++i)
            sorted.append(tree.topLevelItem(i)->text(0));
        QCOMPARE(sorted, expected);
    }
};

QTEST_MAIN(TestCITreeWidgetItem)
#include "tst_citreewidgetitem.moc"
