#pragma once

#include "ui_SecuritySettings.h"

#include <QSharedPointer>
#include <QWidget>

class _ZantDevice;
struct EnablementQuery;

// The device's developer enablement mode: its name, expiry text and privileges, and "Lock",
// which asks the device to leave the mode with the next call made to it. The device is
// asked off the GUI thread; meanwhile the panel says so and "Lock" waits for the answer.
class SecuritySettings : public QWidget, public Ui::SecuritySettingsClass
{
    Q_OBJECT

public:
    explicit SecuritySettings(QWidget* parent = nullptr);
    ~SecuritySettings() override;

    // Asks the device's mode once and shows it when the answer comes; an unknown device
    // leaves the panel as built. A failed question shows its code and the device's reason
    // in place of the mode.
    void setDevice(const QString& deviceId);
    bool isBusy() const { return m_busy; }

public slots:
    void onLockPressed();

private:
    void showAnswer(const EnablementQuery& answer);

    QSharedPointer<_ZantDevice> m_device;
    bool m_busy = false;
    bool m_serviceEnabled = false;
    bool m_signatureEnabled = false;
};
