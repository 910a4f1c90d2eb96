#pragma once

#include "GatewayComponentWidget.h"
#include "PageFeed.h"
#include "PageWorker.h"
#include "RegistryInfo.h"
#include "TickPacer.h"
#include "ui_RegistryListView.h"

#include <QSharedPointer>

class QTableWidgetItem;
class _ZantDevice;

// The registry page: one row per registry entry of the device, with the classes that
// handle its MIME type and its flags. Its worker asks the device once; the tick moves the
// entries into the table a short batch per turn of the event loop.
class RegistryListView : public GatewayComponentWidget, public Ui::RegistryListViewClass
{
    Q_OBJECT

public:
    static constexpr int FirstTickMs = 500;
    static constexpr int IdleStartMs = 1;
    static constexpr int IdleCapMs = 500;

    explicit RegistryListView(QWidget* parent = nullptr);

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
    void appendRow(const RegistryInfo& entry);
    void finish();

    QSharedPointer<_ZantDevice> m_device;
    QSharedPointer<PageFeed<RegistryInfo>> m_pending = QSharedPointer<PageFeed<RegistryInfo>>::create();
    TickPacer m_pacer{IdleStartMs, IdleCapMs};
    QString m_report;
    // Last, so the worker is stopped before anything it reports to goes.
    PageWorker m_worker;
};
