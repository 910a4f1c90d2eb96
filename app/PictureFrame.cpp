#include "PictureFrame.h"

#include <QFont>
#include <QGuiApplication>
#include <QPainter>
#include <QScreen>
#include <QWidget>

PictureFrame::PictureFrame(const QString& imagePath, const QString& notice, const QString& version)
    : m_picture(imagePath)
    , m_notice(notice)
    , m_version(version)
{
}

void PictureFrame::prepare(QWidget* window) const
{
    window->setWindowFlags(window->windowFlags() | Qt::SplashScreen | Qt::WindowStaysOnTopHint);
    window->setAttribute(Qt::WA_NoSystemBackground);
    window->resize(m_picture.size());
    if (const QScreen* screen = QGuiApplication::primaryScreen()) {
        QRect place(QPoint(0, 0), m_picture.size());
        place.moveCenter(screen->geometry().center());
        window->move(place.topLeft());
    }
}

void PictureFrame::paintPicture(QPainter& painter) const
{
    painter.setBackgroundMode(Qt::TransparentMode);
    painter.drawPixmap(0, 0, m_picture);
    painter.setRenderHint(QPainter::Antialiasing);
    painter.setPen(QColor(17, 183, 200));
    painter.setFont(QFont("Helvetica", 12, QFont::Bold));
    painter.drawText(30, 162, m_version);
}

void PictureFrame::paintNotice(QPainter& painter, int baseline) const
{
    painter.setPen(QColor(128, 128, 128));
    painter.setFont(QFont("Helvetica", 9, QFont::Normal));
    painter.drawText(20, baseline, m_notice);
}
