#pragma once

#include <QHash>
#include <QString>
#include <QStringList>
#include <QThread>

#include <atomic>

// Watches one local folder tree (a "drive": the home folder or a removable medium) and
// reports every change below it as a signal carrying the entry's full path, with "/" as
// the separator. Linux inotify watches folders one by one, so the tree is watched folder
// by folder, breadth-first, hidden folders skipped, at most MaxFolders of them; folders
// that appear are watched as they come, and after a kernel queue overflow the tree is
// walked again. stop() wakes the wait at once, so the thread ends promptly on a quiet disk.
class WinVolumeMonitor : public QThread
{
    Q_OBJECT

public:
    // Beyond this many folders below one root, further folders are not watched.
    static constexpr int MaxFolders = 30000;

    explicit WinVolumeMonitor(const QString& path);
    ~WinVolumeMonitor() override;

    void stop();
    // The folders watched now (from the watcher's thread; for figures).
    int watchedFolders() const;

    // The "local drives": the user's home folder, then every mounted removable medium.
    static QStringList localDrives();

signals:
    void directoryAddedEvent(QString path);
    void fileAddedEvent(QString path);
    void directoryRemovedEvent(QString path);
    void fileRemovedEvent(QString path);
    void directoryModifiedEvent(QString path);
    void fileModifiedEvent(QString path);
    void directoryOldNameEvent(QString path);
    void fileOldNameEvent(QString path);
    void directoryNewNameEvent(QString path);
    void fileNewNameEvent(QString path);

protected:
    void run() override;
    // Reads pending event records of the kernel into buffer: their length, or 0 or less when
    // none are pending.
    virtual qint64 readEvents(char* buffer, qint64 size);

private:
    // Watches folder and the folders below it; with report, also announces what it finds
    // (a folder that appeared may have filled before its watch was set).
    void watchTree(const QString& folder, bool report);
    // Watches folder; added tells whether it was not watched before.
    bool watchFolder(const QString& folder, bool& added);
    void handleEvents(const char* buffer, qint64 length);

    const QString m_path;
    std::atomic<bool> m_stop{false};
    int m_inotify = -1;
    int m_wake = -1; // an eventfd that stop() writes to
    QHash<int, QString> m_folders; // watch descriptor → folder
    std::atomic<int> m_watched{0};
};
