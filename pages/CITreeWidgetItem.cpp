#include "CITreeWidgetItem.h"

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
