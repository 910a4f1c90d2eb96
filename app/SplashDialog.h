#pragma once

#include "PictureFrame.h"

#include <QWidget>

// The start-up picture. It closes and deletes itself when its timer runs out.
class SplashDialog : public QWidget
{
public:
    // The longest a splash stays up, in milliseconds.
    static constexpr int LongestShowing = 7000;

    SplashDialog(const QString& imagePath, const QString& notice, const QString& version, QWidget* parent = nullptr);

    void startCloseTimer(int ms);

protected:
    void timerEvent(QTimerEvent* event) override;
    void paintEvent(QPaintEvent* event) override;

private:
    PictureFrame m_frame;
    int m_closeTimer = 0;
};
