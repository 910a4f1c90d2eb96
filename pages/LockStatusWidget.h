#pragma once

#include "ui_LockStatusWidget.h"

#include <QAbstractButton>
#include <QSharedPointer>

class _ZantDevice;

// The device window's status-bar indicator of the developer enablement mode: a text and an
// LED. A click on it, or a right-click on either part, is reported as released(), on which
// the window opens the enablement dialog.
class LockStatusWidget : public QAbstractButton, public Ui::LockStatusWidgetClass
{
    Q_OBJECT

public:
    explicit LockStatusWidget(QWidget* parent = nullptr);
    ~LockStatusWidget() override;

    // Asks the device for its mode and shows it; an unknown device changes nothing.
    void setDevice(const QString& deviceId);

public slots:
    void onCustomContextMenuRequested(QPoint point);
    void onMouseRelease(QMouseEvent* event);

protected:
    void mouseReleaseEvent(QMouseEvent* event) override;
    void paintEvent(QPaintEvent* event) override;

private:
    void showLed(const QString& picture);

    QSharedPointer<_ZantDevice> m_device;
};
