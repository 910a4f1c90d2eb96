#include "PlatformComparisonModel.h"

#include "SortKey.h"

#include <algorithm>

PlatformComparisonModel::PlatformComparisonModel(QObject* parent)
    : QAbstractTableModel(parent)
    , m_checkIcon(QStringLiteral(":/Resources/CheckBoxIcon.png"))
    , m_headers {tr("Class Name"), tr("Class ID"), tr("Family"), tr("Sub-Family")}
    , m_keys(FixedColumns)
{
}

int PlatformComparisonModel::addScan(const QString& header)
{
    const int column = int(m_headers.size());
    beginInsertColumns(QModelIndex(), column, column);
    m_headers.append(header);
    const int scan = m_comparison.addScan(header);
    endInsertColumns();
    return scan;
}

void PlatformComparisonModel::addEntries(int scan, const QVector<PlatformScanFile::Entry>& entries)
{
    if (scan < 0 || scan >= m_comparison.scans().size())
        return;
    // Presence changes which rows the filter shows, so the rows are laid out afresh once.
    beginResetModel();
    const int known = int(m_comparison.classes().size());
    m_comparison.reserve(known + entries.size());
    m_sorted.reserve(known + entries.size());
    for (const PlatformScanFile::Entry& entry : entries)
        m_comparison.add(scan, entry.name, entry.value, entry.family, entry.subFamily);
    for (int index = known; index < m_comparison.classes().size(); ++index)
        m_sorted.append(index);
    filterRows();
    endResetModel();
}

void PlatformComparisonModel::setDifferencesOnly(bool on)
{
    if (on == m_differencesOnly)
        return;
    beginResetModel();
    m_differencesOnly = on;
    filterRows();
    endResetModel();
}

void PlatformComparisonModel::filterRows()
{
    if (!m_differencesOnly) {
        m_rows = m_sorted;
        return;
    }
    m_rows.clear();
    for (const int index : std::as_const(m_sorted)) {
        if (!m_comparison.isInEveryScan(index))
            m_rows.append(index);
    }
}

int PlatformComparisonModel::rowCount(const QModelIndex& parent) const
{
    return parent.isValid() ? 0 : int(m_rows.size());
}

int PlatformComparisonModel::columnCount(const QModelIndex& parent) const
{
    return parent.isValid() ? 0 : int(m_headers.size());
}

QString PlatformComparisonModel::text(int classIndex, int column) const
{
    const ScanComparison::Class& entry = m_comparison.classes().at(classIndex);
    switch (column) {
    case 0:
        return entry.name;
    case 1:
        return entry.id;
    case 2:
        return entry.family;
    default:
        return entry.subFamily;
    }
}

QVariant PlatformComparisonModel::data(const QModelIndex& index, int role) const
{
    if (!index.isValid() || index.row() >= m_rows.size() || index.column() >= m_headers.size())
        return QVariant();
    const int classIndex = m_rows.at(index.row());
    if (index.column() < FixedColumns)
        return role == Qt::DisplayRole || role == Qt::EditRole ? text(classIndex, index.column()) : QVariant();
    if (!m_comparison.isPresent(classIndex, index.column() - FixedColumns))
        return QVariant();
    if (role == Qt::DecorationRole)
        return m_checkIcon;
    if (role == Qt::TextAlignmentRole)
        return int(Qt::AlignCenter);
    return QVariant();
}

QVariant PlatformComparisonModel::headerData(int section, Qt::Orientation orientation, int role) const
{
    if (role != Qt::DisplayRole)
        return QVariant();
    if (orientation == Qt::Vertical)
        return section + 1;
    return m_headers.value(section);
}

Qt::ItemFlags PlatformComparisonModel::flags(const QModelIndex& index) const
{
    return index.isValid() ? Qt::ItemIsEnabled | Qt::ItemIsSelectable : Qt::NoItemFlags;
}

void PlatformComparisonModel::sort(int column, Qt::SortOrder order)
{
    if (column < 0 || column >= m_headers.size())
        return;
    emit layoutAboutToBeChanged({}, QAbstractItemModel::VerticalSortHint);
    const QVector<int> before = m_rows;
    if (column >= FixedColumns) {
        const int scan = column - FixedColumns;
        std::stable_partition(m_sorted.begin(), m_sorted.end(),
            [this, scan](int index) { return m_comparison.isPresent(index, scan); });
    } else {
        sortByKeys(m_sorted, keys(column), order);
    }
    filterRows();

    QVector<int> rowOf(m_comparison.classes().size(), -1);
    for (int row = 0; row < m_rows.size(); ++row)
        rowOf[m_rows.at(row)] = row;
    const QModelIndexList from = persistentIndexList();
    QModelIndexList to;
    to.reserve(from.size());
    for (const QModelIndex& index : from)
        to.append(index.isValid() ? this->index(rowOf.at(before.at(index.row())), index.column()) : index);
    changePersistentIndexList(from, to);
    emit layoutChanged({}, QAbstractItemModel::VerticalSortHint);
}

const QVector<QString>& PlatformComparisonModel::keys(int column)
{
    QVector<QString>& key = m_keys[column];
    key.reserve(m_comparison.classes().size());
    for (qsizetype index = key.size(); index < m_comparison.classes().size(); ++index)
        key.append(sortKey(text(int(index), column)));
    return key;
}
