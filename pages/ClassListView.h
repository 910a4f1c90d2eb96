#pragma once

#include "GatewayComponentWidget.h"
#include "IdRecord.h"
#include "PageFeed.h"
#include "PageWorker.h"
#include "TickPacer.h"
#include "ui_ClassListView.h"

#include <QSharedPointer>

struct DeviceCache;
class QTableWidgetItem;

// The class id list page: every class the device's record knows, with its names, whether it
// is available and where it comes from. A worker queues the record's classes; the tick
// moves them into the table and reports its progress every hundred rows.
class ClassListView : public GatewayComponentWidget, public Ui::ClassListViewClass
{
    Q_OBJECT

public:
    static constexpr int FirstTickMs = 500;
    static constexpr int IdleStartMs = 1;
    static constexpr int IdleCapMs = 500;
    // The status tells the count of shown rows at every multiple of this.
    static constexpr int ProgressStep = 100;

    explicit ClassListView(QWidget* parent = nullptr);

    // Starts the worker on record's classes (the record stays the device's); null, or a
    // second call, starts nothing.
    void setDeviceRecord(const DeviceCache* record);

    const TickPacer& pacer() const;

public slots:
    QString componentName() override;
    void startComponent(const QString& deviceId) override;
    bool canSearch() override;
    bool search(const QString& text) override;
    void raisePriority() override;
    void lowerPriority() override;
    bool isComplete() override;
    QString xmlReport() override;

    void onTableClick(QTableWidgetItem* item);
    void onTableDoubleClick(QTableWidgetItem* item);
    void onTimeElapse();

signals:
    void singleClick(QString moduleEntry);
    void doubleClick(QString moduleEntry);

private:
    void appendRow(const IdRecord& record);
    void setTableQuiet(bool quiet);
    void finish();

    const DeviceCache* m_record = nullptr;
    QSharedPointer<PageFeed<IdRecord>> m_pending = QSharedPointer<PageFeed<IdRecord>>::create();
    TickPacer m_pacer{IdleStartMs, IdleCapMs};
    // Rows shown by this page; each page counts from zero.
    int m_processed = 0;
    QString m_report;
    PageWorker m_worker;
};
