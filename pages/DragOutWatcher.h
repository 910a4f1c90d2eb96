#pragma once

#include <QList>
#include <QObject>
#include <QString>
#include <QStringList>
#include <QTimer>

#include <atomic>

class WinVolumeMonitor;

// Learns where a drag out of the file system page ended: the drag carries only the anchor
// file, and the folder where a copy of it appears is the drop folder. The drives are
// watched from the start (a watch takes a while to set up); each created or renamed file
// is looked at on its watcher's thread, so the GUI thread hears only of the anchor's copy,
// and only while a drag is under way. The copy counts when it is a plain file of this user's;
// it is removed. When no copy appears within Polls polls after the drag
// ended, the drop target was not recognised.
class DragOutWatcher : public QObject
{
    Q_OBJECT

public:
    static constexpr int PollMs = 500;
    static constexpr int Polls = 10;

    DragOutWatcher(const QString& anchorPath, const QStringList& drives, QObject* parent = nullptr);
    ~DragOutWatcher() override;

    void dragStarted();
    void dragEnded();
    void dragCancelled();

signals:
    void dropFolderFound(QString folder);
    void dropNotRecognized();
    // From a watcher's thread: the anchor's copy at path.
    void anchorLanded(QString path);

private:
    // On a watcher's thread.
    void onFileAppeared(const QString& path);
    void onAnchorLanded(const QString& path);
    void onPoll();

    const QString m_anchorName;
    std::atomic<bool> m_armed{false};
    QList<WinVolumeMonitor*> m_monitors;
    QTimer m_poll;
    int m_polls = 0;
};
