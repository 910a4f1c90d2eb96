#pragma once

#include "GatewayComponentWidget.h"
#include "IdRecord.h"
#include "PageFeed.h"
#include "PageWorker.h"
#include "TickPacer.h"
#include "ui_ClassListView.h"

#include <QSharedPointer>

struct DeviceCache;
class RecordTableModel;

// The class id list page: every class the device's record knows, with its names, whether it
// is available and where it comes from. A worker queues the record's classes; each tick
// moves a time slice of them into the table and tells how many rows it shows.
class ClassListView : public GatewayComponentWidget, public Ui::ClassListViewClass
{
    Q_OBJECT

public:
    static constexpr int FirstTickMs = 500;
    static constexpr int IdleStartMs = 1;
    static constexpr int IdleCapMs = 500;

    explicit ClassListView(QWidget* parent = nullptr);

    // Starts the worker on record's classes (the record stays the device's); null, or a
    // second call, starts nothing.
    void setDeviceRecord(const DeviceCache* record);

    const TickPacer& pacer() const;
    RecordTableModel* model() const;

public slots:
    QString componentName() override;
    void startComponent(const QString& deviceId) override;
    bool canSearch() override;
    bool search(const QString& text) override;
    void raisePriority() override;
    void lowerPriority() override;
    QString xmlReport() override;

    void onTableClick(const QModelIndex& index);
    void onTableDoubleClick(const QModelIndex& index);
    void onTimeElapse();

signals:
    void singleClick(QString moduleEntry);
    void doubleClick(QString moduleEntry);

private:
    void finish();

    const DeviceCache* m_record = nullptr;
    RecordTableModel* m_model;
    QSharedPointer<PageFeed<IdRecord>> m_pending = QSharedPointer<PageFeed<IdRecord>>::create();
    TickPacer m_pacer{IdleStartMs, IdleCapMs};
    QString m_report;
    PageWorker m_worker;
};
