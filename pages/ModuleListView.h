#pragma once

#include "GatewayComponentWidget.h"
#include "ModuleInfo.h"
#include "PageFeed.h"
#include "PageWorker.h"
#include "TickPacer.h"
#include "ui_ModuleListView.h"

#include <QSharedPointer>
#include <QVector>

class RecordTableModel;
class _ZantDevice;

// The module list page: every module installed on the device, one row each. Its worker asks
// the device once; each tick then moves a time slice of the modules into the table, so a
// long list fills in while the window stays responsive.
class ModuleListView : public GatewayComponentWidget, public Ui::ModuleListViewClass
{
    Q_OBJECT

public:
    // Pacing of the tick: the first after FirstTickMs, then backing off by 100 ms from
    // IdleStartMs up to IdleCapMs while the device has not answered.
    static constexpr int FirstTickMs = 500;
    static constexpr int IdleStartMs = 1;
    static constexpr int IdleCapMs = 500;
    // A module row is six long texts: a shorter slice than the other pages' leaves the rest
    // of the frame to lay them out.
    static constexpr int SliceMs = 5;

    explicit ModuleListView(QWidget* parent = nullptr);

    // The tick's timer, so that its pacing can be observed.
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
    void singleClick(ModuleInfo info);
    void doubleClick(ModuleInfo info);

private:
    void finish();
    // The module a row shows; the fields the table does not show stay at their defaults.
    ModuleInfo moduleAt(int row) const;

    QSharedPointer<_ZantDevice> m_device;
    RecordTableModel* m_model;
    // The modules shown, in the order they arrived (the model's arrival index).
    QVector<ModuleInfo> m_modules;
    QSharedPointer<PageFeed<ModuleInfo>> m_pending = QSharedPointer<PageFeed<ModuleInfo>>::create();
    TickPacer m_pacer{IdleStartMs, IdleCapMs};
    QString m_report;
    // Last, so the worker is stopped before anything it reports to goes.
    PageWorker m_worker;
};
