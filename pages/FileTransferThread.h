#pragma once

#include <QElapsedTimer>
#include <QSharedPointer>
#include <QString>
#include <QStringList>
#include <QThread>
#include <QVector>

#include <atomic>

class _ZantDevice;

// Runs the file system page's device actions off the GUI thread, one after the other, and
// says how far it is: drops (copies and package installations), drags out and opened
// files (device files and folders into a local folder), runs and deletes. Progress reaches
// the GUI at most every ProgressIntervalMs. When the thread has ended, summary() is the
// one message for the user: what succeeded, counted, and each failure with its code and
// the device's reason. cancel() stops the copy under way after its current chunk, leaving
// no partial file, and skips the rest; what is done already stays.
class FileTransferThread : public QThread
{
    Q_OBJECT

public:
    static constexpr qint64 ProgressIntervalMs = 16;
    // At most this many failures are named in the summary; the rest are counted.
    static constexpr int NamedFailures = 3;

    struct Job
    {
        enum Kind
        {
            ToDevice,   // copy source (local) to target (device)
            Install,    // install the package source on the volume
            ToPC,       // copy source (device) to target (local)
            FolderToPC, // source is a device folder: its contents go below target
            Run,        // start the .mod file source
            Delete      // delete source (a folder with its contents)
        };
        Kind kind = ToDevice;
        QString source;
        QString target;
        quint64 size = 0;
    };

    FileTransferThread(QSharedPointer<_ZantDevice> device, QVector<Job> jobs, quint16 volumeId);
    ~FileTransferThread() override;

    void cancel();

    // After the thread has ended: the message for the user, whether something on the device
    // changed, and the local files that arrived.
    QString summary() const;
    bool changedDevice() const;
    QStringList arrived() const;

    // A name the device gave that may stand as one component of a local path.
    static bool isPlainName(const QString& name);

signals:
    // The work is known: that many files, that many bytes in all.
    void sized(int files, quint64 bytes);
    // Working on file number file (from 0); bytes moved so far in all.
    void progress(int file, quint64 bytes, QString name);

protected:
    void run() override;

private:
    static bool onProgress(void* context, int value, int maximum, const QString& text);
    void reportProgress(quint64 bytes, bool force);
    // Replaces the folder jobs by the files below them, creating the local folders.
    void expandFolders();
    void expandFolder(const QString& devicePath, const QString& localFolder);
    // Runs the job; on failure, reason gets the code and what the device said.
    int perform(const Job& job, QString* reason);
    void fail(const QString& what, const QString& reason);

    QSharedPointer<_ZantDevice> m_device;
    QVector<Job> m_jobs;
    quint16 m_volumeId;
    std::atomic<bool> m_cancel{false};
    int m_current = 0;
    quint64 m_doneBefore = 0; // bytes of the files finished before the current one
    QElapsedTimer m_sinceProgress;
    // Filled by the thread, read once it has ended.
    QStringList m_done;     // installs, runs and deletes that succeeded
    QStringList m_failures;
    QStringList m_arrived;
    int m_copied = 0;
    int m_copies = 0;
    bool m_changedDevice = false;
};
