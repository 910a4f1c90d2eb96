#pragma once

#include <QSharedPointer>
#include <QString>
#include <QThread>
#include <QVector>

#include <atomic>

class _ZantDevice;

// Moves files between the PC and the device off the GUI thread, one after the other, and
// says how far it is: the file system page's drops (copies and package installations) and
// drags out (device files and folders into a local folder). Each file's outcome is one
// message. cancel() stops the copy under way after its current chunk, leaving no partial
// file, and skips the rest; files already moved stay.
class FileTransferThread : public QThread
{
    Q_OBJECT

public:
    struct Job
    {
        enum Kind
        {
            ToDevice, // copy source (local) to target (device)
            Install,  // install the package source on the volume
            ToPC,     // copy source (device) to target (local)
            FolderToPC // source is a device folder: its contents go below target
        };
        Kind kind = ToDevice;
        QString source;
        QString target;
        quint64 size = 0;
    };

    FileTransferThread(QSharedPointer<_ZantDevice> device, QVector<Job> jobs, quint16 volumeId);
    ~FileTransferThread() override;

    void cancel();

    // A name the device gave that may stand as one component of a local path.
    static bool isPlainName(const QString& name);

signals:
    // The work is known: that many files, that many bytes in all.
    void sized(int files, quint64 bytes);
    // Working on file number file (from 0); bytes moved so far in all.
    void progress(int file, quint64 bytes, QString name);
    void fileDone(QString message);

protected:
    void run() override;

private:
    static bool onProgress(void* context, int value, int maximum, const QString& text);
    // Replaces the folder jobs by the files below them, creating the local folders.
    void expandFolders();
    void expandFolder(const QString& devicePath, const QString& localFolder);
    int transfer(const Job& job, QString* reason);

    QSharedPointer<_ZantDevice> m_device;
    QVector<Job> m_jobs;
    quint16 m_volumeId;
    std::atomic<bool> m_cancel{false};
    int m_current = 0;
    quint64 m_doneBefore = 0; // bytes of the files finished before the current one
};
