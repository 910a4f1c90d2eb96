#include "CITableWidgetItem.h"

#include "SortKey.h"

namespace {

QString keyOf(const QTableWidgetItem& item)
{
    return sortKey(item.data(Qt::DisplayRole).toString());
}

} // namespace

CITableWidgetItem::CITableWidgetItem(const QString& text, int type)
    : QTableWidgetItem(text, type)
    , m_sortKey(sortKey(text))
{
}

void CITableWidgetItem::setData(int role, const QVariant& value)
{
    QTableWidgetItem::setData(role, value);
    if (role == Qt::DisplayRole || role == Qt::EditRole)
        m_sortKey = keyOf(*this);
}

bool CITableWidgetItem::operator<(const QTableWidgetItem& other) const
{
    if (type() != other.type())
        return type() < other.type();
    if (const auto* ci = dynamic_cast<const CITableWidgetItem*>(&other))
        return m_sortKey < ci->m_sortKey;
    return m_sortKey < keyOf(other);
}
