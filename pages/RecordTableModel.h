#pragma once

#include <QAbstractTableModel>
#include <QStringList>
#include <QVector>

// The rows of a list page: one text per cell, fixed once added, read-only. Rows arrive in
// batches at the end (one insertion per batch, so a view lays out once per batch, not once
// per row) and are sorted by the case-folded text of one column (sortKey), equal cells
// keeping the order they had, as a table of items does. The folded texts of a column are
// worked out the first time it is sorted by and kept, so that a header click sorts keys,
// not texts. A row remembers where it arrived, so a page can keep records beside it.
class RecordTableModel : public QAbstractTableModel
{
    Q_OBJECT

public:
    explicit RecordTableModel(const QStringList& headers, QObject* parent = nullptr);

    // Adds rows (each with one text per column) after the last row.
    void appendRows(const QVector<QStringList>& rows);

    // The position row had among the added rows.
    int arrivalIndex(int row) const;
    QString text(int row, int column) const;
    // Every row's texts, top to bottom as the rows stand now: what an export writes.
    QVector<QStringList> rows() const;

    int rowCount(const QModelIndex& parent = QModelIndex()) const override;
    int columnCount(const QModelIndex& parent = QModelIndex()) const override;
    QVariant data(const QModelIndex& index, int role = Qt::DisplayRole) const override;
    QVariant headerData(int section, Qt::Orientation orientation, int role = Qt::DisplayRole) const override;
    Qt::ItemFlags flags(const QModelIndex& index) const override;
    void sort(int column, Qt::SortOrder order = Qt::AscendingOrder) override;

private:
    const QVector<QString>& keys(int column);

    QStringList m_headers;
    QVector<QStringList> m_records; // in arrival order
    QVector<int> m_order;           // row -> arrival index
    QVector<QVector<QString>> m_keys; // per column, by arrival index, filled on the first sort
};
