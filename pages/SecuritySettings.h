#pragma once

#include "ui_SecuritySettings.h"

#include <QSharedPointer>
#include <QWidget>

class _ZantDevice;

// The device's developer enablement mode: its name, expiry text and privileges, and "Lock",
// which asks the device to leave the mode with the next call made to it.
class SecuritySettings : public QWidget, public Ui::SecuritySettingsClass
{
    Q_OBJECT

public:
    explicit SecuritySettings(QWidget* parent = nullptr);
    ~SecuritySettings() override;

    // Shows the device's mode once; an unknown device leaves the panel as built.
    void setDevice(const QString& deviceId);

public slots:
    void onLockPressed();

private:
    QSharedPointer<_ZantDevice> m_device;
};
