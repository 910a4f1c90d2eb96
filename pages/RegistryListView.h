#pragma once

#include "GatewayComponentWidget.h"
#include "PageFeed.h"
#include "PageWorker.h"
#include "RegistryInfo.h"
#include "TickPacer.h"
#include "ui_RegistryListView.h"

#include <QSharedPointer>

class RecordTableModel;
class _ZantDevice;

// The registry page: one row per registry entry of the device, with the classes that
// handle its MIME type and its flags. Its worker asks the device once; each tick moves a
// time slice of the entries into the table.
class RegistryListView : public GatewayComponentWidget, public Ui::RegistryListViewClass
{
    Q_OBJECT

public:
    static constexpr int FirstTickMs = 500;
    static constexpr int IdleStartMs = 1;
    static constexpr int IdleCapMs = 500;

    explicit RegistryListView(QWidget* parent = nullptr);

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

    QSharedPointer<_ZantDevice> m_device;
    RecordTableModel* m_model;
    QSharedPointer<PageFeed<RegistryInfo>> m_pending = QSharedPointer<PageFeed<RegistryInfo>>::create();
    TickPacer m_pacer{IdleStartMs, IdleCapMs};
    QString m_report;
    // Last, so the worker is stopped before anything it reports to goes.
    PageWorker m_worker;
};
