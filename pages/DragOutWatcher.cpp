#include "DragOutWatcher.h"

#include "WinVolumeMonitor.h"

#include <QFile>
#include <QFileInfo>

#include <sys/stat.h>
#include <unistd.h>

namespace {

bool isOwnRegularFile(const QString& path)
{
    struct stat status {};
    return ::lstat(QFile::encodeName(path).constData(), &status) == 0 && S_ISREG(status.st_mode)
        && status.st_uid == ::geteuid();
}

} // namespace

DragOutWatcher::DragOutWatcher(const QString& anchorPath, const QStringList& drives, QObject* parent)
    : QObject(parent)
    , m_anchorName(QFileInfo(anchorPath).fileName())
{
    m_poll.setSingleShot(true);
    connect(&m_poll, &QTimer::timeout, this, &DragOutWatcher::onPoll);
    connect(this, &DragOutWatcher::anchorLanded, this, &DragOutWatcher::onAnchorLanded, Qt::QueuedConnection);
    for (const QString& drive : drives) {
        auto* monitor = new WinVolumeMonitor(drive);
        const auto look = [this](const QString& path) { onFileAppeared(path); };
        connect(monitor, &WinVolumeMonitor::fileAddedEvent, monitor, look, Qt::DirectConnection);
        // Some file managers write under a passing name and rename when done.
        connect(monitor, &WinVolumeMonitor::fileNewNameEvent, monitor, look, Qt::DirectConnection);
        monitor->start();
        m_monitors.append(monitor);
    }
}

DragOutWatcher::~DragOutWatcher()
{
    for (WinVolumeMonitor* monitor : std::as_const(m_monitors))
        monitor->stop();
    qDeleteAll(m_monitors);
}

void DragOutWatcher::dragStarted()
{
    m_poll.stop();
    m_armed = true;
}

void DragOutWatcher::dragEnded()
{
    m_polls = 0;
    m_poll.start(PollMs);
}

void DragOutWatcher::dragCancelled()
{
    m_poll.stop();
    m_armed = false;
}

void DragOutWatcher::onFileAppeared(const QString& path)
{
    // Only the copy of the anchor itself, never a file that merely has it in its path, nor
    // one another user or program put there under its name.
    if (!m_armed || QFileInfo(path).fileName() != m_anchorName || !isOwnRegularFile(path))
        return;
    if (m_armed.exchange(false))
        emit anchorLanded(path);
}

void DragOutWatcher::onAnchorLanded(const QString& path)
{
    m_poll.stop();
    QFile::remove(path);
    emit dropFolderFound(QFileInfo(path).absolutePath());
}

void DragOutWatcher::onPoll()
{
    if (!m_armed)
        return;
    if (++m_polls >= Polls) {
        m_armed = false;
        emit dropNotRecognized();
        return;
    }
    m_poll.start(PollMs);
}
