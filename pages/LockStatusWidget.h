#pragma once

#include "ui_LockStatusWidget.h"

#include <QAbstractButton>
#include <QSharedPointer>

class _ZantDevice;
struct EnablementQuery;

// The device window's status-bar indicator of the developer enablement mode: a text and an
// LED. A click on it, or a right-click on either part, is reported as released(), on which
// the window opens the enablement dialog.
class LockStatusWidget : public QAbstractButton, public Ui::LockStatusWidgetClass
{
    Q_OBJECT

public:
    explicit LockStatusWidget(QWidget* parent = nullptr);
    ~LockStatusWidget() override;

    // Asks the device for its mode off the GUI thread and shows it when the answer comes;
    // an unknown device changes nothing. A failed question shows "Not known" and says why
    // in the tool tip, and is announced by failed().
    void setDevice(const QString& deviceId);
    // Grey, saying the device is gone; setDevice brings it back.
    void showDisconnected();
    // An answer is awaited.
    bool isBusy() const { return m_busy; }

signals:
    void failed(int code, const QString& text);

public slots:
    void onCustomContextMenuRequested(QPoint point);
    void onMouseRelease(QMouseEvent* event);

protected:
    void mouseReleaseEvent(QMouseEvent* event) override;
    void paintEvent(QPaintEvent* event) override;

private:
    void showLed(const QString& picture);
    void showAnswer(const EnablementQuery& answer);

    QSharedPointer<_ZantDevice> m_device;
    bool m_busy = false;
    int m_question = 0;  // the latest question asked; older answers are dropped
};
