#pragma once

#include "PlatformComparisonModel.h"
#include "ScanComparison.h"
#include "ui_PlatformComparisonView.h"

#include <QFrame>

// Platform scans side by side: one row per class id found in any of them, one column per
// scan with a check where the scan has the class. A summary line counts the classes in every
// scan and in one only, and "Differences only" hides the classes that every scan has.
class PlatformComparisonView : public QFrame, public Ui::PlatformComparisonViewClass
{
    Q_OBJECT

public:
    explicit PlatformComparisonView(QWidget* parent = nullptr);

    // Adds the scan file at path as a new column. False when it cannot be read; a file without
    // a class list is also reported in a "File Format Error" box (its column stays).
    bool loadScan(const QString& path);
    // Adds the files in order, read in parallel; stops at the first that loadScan would refuse.
    bool loadScans(const QStringList& paths);
    // The "platform-comparison" document of the scans loaded; empty before the first.
    QString exportText() const;

    const ScanComparison& comparison() const { return m_model->comparison(); }
    const PlatformComparisonModel* model() const { return m_model; }

public slots:
    // Hides the rows of classes that every scan has, or shows every row again.
    void showDifferencesOnly(bool on);

private:
    PlatformComparisonModel* m_model;
};
