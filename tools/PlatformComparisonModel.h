#pragma once

#include "PlatformScanFile.h"
#include "ScanComparison.h"

#include <QAbstractTableModel>
#include <QIcon>

// The rows of a platform scan comparison: a class a row, the class's names first, then a column
// per scan with a check where the scan has the class. Read-only. Sorting is stable and by the
// case-folded text of a name column; by a scan column, the classes the scan has come first
// either way, as a table of items puts its empty cells last. "Differences only" leaves out the
// classes every scan has without losing their places in the order.
class PlatformComparisonModel : public QAbstractTableModel
{
    Q_OBJECT

public:
    // The columns before the first scan's.
    static constexpr int FixedColumns = 4;

    explicit PlatformComparisonModel(QObject* parent = nullptr);

    // A new column for the scan named header; returns the scan's index.
    int addScan(const QString& header);
    // Marks each entry's class present in scan; new classes get rows after the last.
    void addEntries(int scan, const QVector<PlatformScanFile::Entry>& entries);
    void setDifferencesOnly(bool on);

    const ScanComparison& comparison() const { return m_comparison; }

    int rowCount(const QModelIndex& parent = QModelIndex()) const override;
    int columnCount(const QModelIndex& parent = QModelIndex()) const override;
    QVariant data(const QModelIndex& index, int role = Qt::DisplayRole) const override;
    QVariant headerData(int section, Qt::Orientation orientation, int role = Qt::DisplayRole) const override;
    Qt::ItemFlags flags(const QModelIndex& index) const override;
    void sort(int column, Qt::SortOrder order = Qt::AscendingOrder) override;

private:
    QString text(int classIndex, int column) const;
    const QVector<QString>& keys(int column);
    // The shown rows from the sorted classes, as the filter stands.
    void filterRows();

    ScanComparison m_comparison;
    QIcon m_checkIcon;
    QStringList m_headers;
    bool m_differencesOnly = false;
    QVector<int> m_sorted;            // every class index, in the order of the last sort
    QVector<int> m_rows;              // row -> class index, the shown ones
    QVector<QVector<QString>> m_keys; // per name column, by class index, filled on sorting
};
