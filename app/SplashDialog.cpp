#include "SplashDialog.h"

#include <QPaintEvent>
#include <QPainter>

#include <algorithm>

SplashDialog::SplashDialog(const QString& imagePath, const QString& notice, const QString& version, QWidget* parent)
    : QWidget(parent)
    , m_frame(imagePath, notice, version)
{
    m_frame.prepare(this);
}

void SplashDialog::startCloseTimer(int ms)
{
    m_closeTimer = startTimer(std::min(ms, LongestShowing));
}

void SplashDialog::timerEvent(QTimerEvent* event)
{
    if (event->timerId() != m_closeTimer)
        return;
    killTimer(m_closeTimer);
    m_closeTimer = 0;
    hide();
    deleteLater();
}

void SplashDialog::paintEvent(QPaintEvent* event)
{
    QPainter painter(this);
    m_frame.paintPicture(painter);
    m_frame.paintNotice(painter, 240);
    event->accept();
}
