#pragma once

#include <QTreeWidgetItem>

// A tree item that sorts by item type (in the first column only), then by its display text
// in the sort column without regard to letter case. Pages that mix item types pass them on
// creation; the settings tree also tags its items with a kind of its own.
class CITreeWidgetItem : public QTreeWidgetItem
{
public:
    explicit CITreeWidgetItem(int type = Type);
    explicit CITreeWidgetItem(QTreeWidget* tree, int type = Type);
    explicit CITreeWidgetItem(QTreeWidgetItem* parent, int type = Type);

    int kind() const;
    void setKind(int kind);

    bool operator<(const QTreeWidgetItem& other) const override;

    // Turns on sorting by column of a tree whose items are already in the order that sort
    // gives: enabling sorting would otherwise sort the whole tree again, comparing and
    // moving every item on the GUI thread.
    static void enableSortingInOrder(QTreeWidget* tree, int column, Qt::SortOrder order);

private:
    int m_kind = 0;
};
