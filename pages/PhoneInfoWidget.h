#pragma once

#include "GatewayComponentWidget.h"
#include "ui_PhoneInfoWidget.h"

struct DeviceCache;
class QTableWidget;

// The phone information page: identity, screen, hardware features, memory and file-system
// sizes, build numbers and media formats, copied from the device's cache record in one
// pass. It asks the device nothing and has no worker.
class PhoneInfoWidget : public GatewayComponentWidget, public Ui::PhoneInfoWidgetClass
{
    Q_OBJECT

public:
    explicit PhoneInfoWidget(QWidget* parent = nullptr);

    // Fills the page from record (owned by the device object); null leaves it as it is.
    void setDeviceRecord(const DeviceCache* record);

public slots:
    QString componentName() override;
    void startComponent(const QString& deviceId) override;
    bool canSearch() override;
    bool search(const QString& text) override;
    void raisePriority() override;
    void lowerPriority() override;
    QString xmlReport() override;

private:
    static void fillFormats(QTableWidget* table, const QMap<QString, QString>& formats);

    const DeviceCache* m_record = nullptr;
};
