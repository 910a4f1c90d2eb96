#include "CITreeWidgetItem.h"

#include <QHeaderView>
#include <QSignalBlocker>

CITreeWidgetItem::CITreeWidgetItem(int type)
    : QTreeWidgetItem(type)
{
}

CITreeWidgetItem::CITreeWidgetItem(QTreeWidget* tree, int type)
    : QTreeWidgetItem(tree, type)
{
}

CITreeWidgetItem::CITreeWidgetItem(QTreeWidgetItem* parent, int type)
    : QTreeWidgetItem(parent, type)
{
}

int CITreeWidgetItem::kind() const
{
    return m_kind;
}

void CITreeWidgetItem::setKind(int kind)
{
    m_kind = kind;
}

bool CITreeWidgetItem::operator<(const QTreeWidgetItem& other) const
{
    const QTreeWidget* tree = treeWidget();
    const int column = tree ? tree->sortColumn() : 0;
    if (column == 0 && type() != other.type())
        return type() < other.type();
    return QString::compare(text(column), other.text(column), Qt::CaseInsensitive) < 0;
}

void CITreeWidgetItem::enableSortingInOrder(QTreeWidget* tree, int column, Qt::SortOrder order)
{
    QHeaderView* header = tree->header();
    // No column to sort by while sorting comes on: the model declines to sort.
    header->setSortIndicator(-1, order);
    tree->setSortingEnabled(true);
    // The indicator returns without telling the tree, which would sort.
    const QSignalBlocker quiet(header);
    header->setSortIndicator(column, order);
}
