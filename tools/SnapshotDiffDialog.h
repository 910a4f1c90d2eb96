#pragma once

#include "SnapshotDiff.h"

#include <QDialog>

class QLabel;
class QTableWidget;

// The differences between a saved snapshot and the device as it is now, in the look of the
// scan comparison with "Differences only": the counts above, then one row per difference,
// its kind, what it is, and its texts in the snapshot and on the device, coloured by change.
class SnapshotDiffDialog : public QDialog
{
    Q_OBJECT

public:
    SnapshotDiffDialog(const SnapshotDiff& difference, const QString& snapshotName, QWidget* parent = nullptr);

    QTableWidget* table() const { return m_table; }
    QString summary() const;

private:
    QLabel* m_summary = nullptr;
    QTableWidget* m_table = nullptr;
};
