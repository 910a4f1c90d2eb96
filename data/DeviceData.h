#pragma once

#include <QMap>
#include <QString>

// The facts a device reports about itself: identity and build texts, and name/value maps
// of its hardware and of the audio, image and video formats it supports.
struct DeviceData
{
    QString phoneName;
    QString targetId;
    QString zantVersion;
    QString zantBuildNumber;
    QString staticBuildId;
    QString dynamicBuildId;
    QString componentServicesBuild;

    QMap<QString, QString> hardware;
    QMap<QString, QString> audio;
    QMap<QString, QString> image;
    QMap<QString, QString> video;

    QString hardwareValue(const QString& key, const QString& defaultValue) const;
    QMap<QString, QString> audioValues() const { return audio; }
    QMap<QString, QString> imageValues() const { return image; }
    QMap<QString, QString> videoValues() const { return video; }
};
