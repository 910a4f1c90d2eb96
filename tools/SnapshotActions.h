#pragma once

#include <QSharedPointer>
#include <QString>

class QJsonObject;
class QWidget;
class _ZantDevice;

// The device window's File → Save Snapshot... and File → Compare with Snapshot...: the
// snapshot is taken on a worker thread while a busy dialog shows, so the window stays live.
class SnapshotActions
{
public:
    // Asks for a file and saves the device's snapshot to it.
    static void save(QWidget* parent, const QSharedPointer<_ZantDevice>& device, const QString& deviceId);
    // Asks for a snapshot file and shows how the device differs from it.
    static void compare(QWidget* parent, const QSharedPointer<_ZantDevice>& device, const QString& deviceId);

    // The device's snapshot taken on a worker, files up to hashLimit hashed (-1: none);
    // false after telling the user why.
    static bool take(QWidget* parent, const QSharedPointer<_ZantDevice>& device, const QString& deviceId, qint64 hashLimit,
                     QJsonObject* snapshot);
};
