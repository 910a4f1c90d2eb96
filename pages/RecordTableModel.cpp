#include "RecordTableModel.h"

#include "SortKey.h"

RecordTableModel::RecordTableModel(const QStringList& headers, QObject* parent)
    : QAbstractTableModel(parent)
    , m_headers(headers)
    , m_keys(headers.size())
{
}

void RecordTableModel::appendRows(const QVector<QStringList>& rows)
{
    if (rows.isEmpty())
        return;
    const int first = int(m_records.size());
    beginInsertRows(QModelIndex(), first, first + int(rows.size()) - 1);
    for (const QStringList& row : rows) {
        m_order.append(int(m_records.size()));
        m_records.append(row);
    }
    endInsertRows();
}

int RecordTableModel::arrivalIndex(int row) const
{
    return m_order.value(row, -1);
}

QString RecordTableModel::text(int row, int column) const
{
    if (row < 0 || row >= m_order.size())
        return QString();
    return m_records.at(m_order.at(row)).value(column);
}

QVector<QStringList> RecordTableModel::rows() const
{
    QVector<QStringList> shown;
    shown.reserve(m_order.size());
    for (const int record : m_order)
        shown.append(m_records.at(record));
    return shown;
}

int RecordTableModel::rowCount(const QModelIndex& parent) const
{
    return parent.isValid() ? 0 : int(m_order.size());
}

int RecordTableModel::columnCount(const QModelIndex& parent) const
{
    return parent.isValid() ? 0 : int(m_headers.size());
}

QVariant RecordTableModel::data(const QModelIndex& index, int role) const
{
    if (!index.isValid() || (role != Qt::DisplayRole && role != Qt::EditRole))
        return QVariant();
    return text(index.row(), index.column());
}

QVariant RecordTableModel::headerData(int section, Qt::Orientation orientation, int role) const
{
    if (role != Qt::DisplayRole)
        return QVariant();
    // Row numbers count the rows as shown, as a table of items numbers them.
    if (orientation == Qt::Vertical)
        return section + 1;
    return m_headers.value(section);
}

Qt::ItemFlags RecordTableModel::flags(const QModelIndex& index) const
{
    // Never editable: the page shows what the device said.
    return index.isValid() ? Qt::ItemIsEnabled | Qt::ItemIsSelectable : Qt::NoItemFlags;
}

void RecordTableModel::sort(int column, Qt::SortOrder order)
{
    if (column < 0 || column >= m_headers.size())
        return;
    const QVector<QString>& key = keys(column);
    emit layoutAboutToBeChanged({}, QAbstractItemModel::VerticalSortHint);
    const QVector<int> before = m_order;
    // Stable in both directions: equal cells keep the order they were shown in.
    sortByKeys(m_order, key, order);

    QVector<int> rowOf(m_order.size());
    for (int row = 0; row < m_order.size(); ++row)
        rowOf[m_order.at(row)] = row;
    const QModelIndexList from = persistentIndexList();
    QModelIndexList to;
    to.reserve(from.size());
    for (const QModelIndex& index : from)
        to.append(index.isValid() ? this->index(rowOf.at(before.at(index.row())), index.column()) : index);
    changePersistentIndexList(from, to);
    emit layoutChanged({}, QAbstractItemModel::VerticalSortHint);
}

const QVector<QString>& RecordTableModel::keys(int column)
{
    QVector<QString>& key = m_keys[column];
    key.reserve(m_records.size());
    for (qsizetype record = key.size(); record < m_records.size(); ++record)
        key.append(sortKey(m_records.at(record).value(column)));
    return key;
}
