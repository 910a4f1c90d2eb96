#pragma once

#include "FamilyGrouping.h"
#include "GatewayComponentWidget.h"
#include "IdRecord.h"
#include "PageFeed.h"
#include "PageWorker.h"
#include "TickPacer.h"
#include "ui_FamilyTreeView.h"

#include <QSharedPointer>

struct DeviceCache;

// The family tree page: the device's available classes grouped by family, then sub-family.
// A worker queues the classes from the device's record; each tick inserts classes for a
// slice of SliceMs (at least one) and then lets the event loop run.
class FamilyTreeView : public GatewayComponentWidget, public Ui::FamilyTreeViewClass
{
    Q_OBJECT

public:
    static constexpr int FirstTickMs = 20;
    static constexpr int IdleStartMs = 0;
    static constexpr int IdleCapMs = 500;
    static constexpr int SliceMs = 8;

    explicit FamilyTreeView(QWidget* parent = nullptr);

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
    QString xmlReport() override;

    void onTimeElapse();

private:
    void placeClass(const IdRecord& record);
    void finish();

    const DeviceCache* m_record = nullptr;
    QSharedPointer<PageFeed<IdRecord>> m_pending = QSharedPointer<PageFeed<IdRecord>>::create();
    TickPacer m_pacer{IdleStartMs, IdleCapMs};
    FamilyGrouping m_grouping{nullptr}; // on _familyTree once the form is set up
    int m_placed = 0;
    QString m_report;
    // Last, so the worker is stopped before anything it reports to goes.
    PageWorker m_worker;
};
