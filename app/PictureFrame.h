#pragma once

#include <QPixmap>
#include <QString>

class QPainter;
class QWidget;

// What the splash and the About picture share: a frameless window the size of its picture,
// centred on the primary screen, showing the picture with the version and the rights notice.
class PictureFrame
{
public:
    PictureFrame(const QString& imagePath, const QString& notice, const QString& version);

    // Makes window a frameless, always-on-top window sized to the picture and centred.
    void prepare(QWidget* window) const;

    // The picture with the version drawn on it.
    void paintPicture(QPainter& painter) const;
    void paintNotice(QPainter& painter, int baseline) const;

private:
    QPixmap m_picture;
    QString m_notice;
    QString m_version;
};
