#pragma once

#include "FileTransferThread.h"

#include <QString>
#include <QStringList>
#include <QVector>

// What a copy between the PC and the device will do, worked out before it starts and
// without touching the device: the file jobs of a drop (local files and folders into a
// device folder, packages installed) or of a drag out (device entries into a local folder).
// Reads only the local file system.
class TransferPlan
{
public:
    enum class Outcome
    {
        Ready,
        NothingToCopy, // the dropped selection holds no plain file
        NoSpace        // the files need at least the free space of the volume
    };

    // One entry of the tree's selection for a drag out.
    struct DeviceEntry
    {
        QString path;
        QString name;
        bool folder = false;
        quint64 size = 0;
        bool insideSelection = false; // a selected folder above it brings it along
    };

    // The dropped local paths into targetFolder: each keeps its name and inner layout below
    // the target (hidden entries and links inside folders are left out); ".zantro" files
    // are installed instead of copied.
    static TransferPlan forDrop(const QString& targetFolder, const QStringList& localPaths, quint64 freeSpace);
    // The entries into localFolder; names that cannot stand as a local name are skipped.
    static TransferPlan forDragOut(const QVector<DeviceEntry>& entries, const QString& localFolder);

    Outcome outcome() const;
    const QVector<FileTransferThread::Job>& jobs() const;
    // The local targets that exist already (a drag out would replace them).
    QStringList existingTargets() const;
    // Leaves out the jobs whose local target exists already.
    void skipExisting();

    // target and a remainder joined by exactly one "/".
    static QString joinDevicePath(const QString& target, QString remainder);

private:
    Outcome m_outcome = Outcome::Ready;
    QVector<FileTransferThread::Job> m_jobs;
};
