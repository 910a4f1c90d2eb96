#pragma once

#include "PlatformScanFile.h"
#include "ScanComparison.h"
#include "ui_PlatformComparisonView.h"

#include <QFrame>
#include <QIcon>

// Platform scans side by side: one row per class id found in any of them, one column per
// scan with a check where the scan has the class. A summary line counts the classes in every
// scan and in one only, and "Differences only" hides the classes that every scan has.
class PlatformComparisonView : public QFrame, public Ui::PlatformComparisonViewClass
{
    Q_OBJECT

public:
    // The columns before the first scan's.
    static constexpr int FixedColumns = 4;

    explicit PlatformComparisonView(QWidget* parent = nullptr);

    // Adds the scan file at path as a new column. False when it cannot be read; a file without
    // a class list is also reported in a "File Format Error" box (its column stays).
    bool loadScan(const QString& path);
    // Marks the class present in the scan shown in column; a class not shown yet gets a row.
    void addScanEntry(int column, const QString& name, const QString& value, const QString& family,
        const QString& subfamily);
    // The "platform-comparison" document of the scans loaded; empty before the first.
    QString exportText() const;

    const ScanComparison& comparison() const { return m_comparison; }

public slots:
    // Hides the rows of classes that every scan has, or shows every row again.
    void showDifferencesOnly(bool on);

private:
    int addScanColumn(const QString& header);
    // Marks each entry's class present in the scan of column, the new ones in rows added at once.
    void addScanEntries(int column, const QVector<PlatformScanFile::Entry>& entries);
    // Rows move when the table sorts: the row of each class is looked up afresh once per load.
    void indexRows();
    void refreshSummary();

    QIcon m_checkIcon;
    ScanComparison m_comparison;
    QVector<int> m_rowOfClass;
    bool m_rowsIndexed = false;
};
