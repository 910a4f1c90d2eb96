#include "WinVolumeMonitor.h"

#include <QDir>
#include <QDirIterator>
#include <QFile>
#include <QFileInfo>
#include <QQueue>
#include <QStorageInfo>

#include <poll.h>
#include <sys/eventfd.h>
#include <sys/inotify.h>
#include <unistd.h>

#include <cerrno>

namespace {

constexpr quint32 WatchMask = IN_CREATE | IN_DELETE | IN_MODIFY | IN_ATTRIB | IN_MOVED_FROM | IN_MOVED_TO
    | IN_ONLYDIR | IN_DONT_FOLLOW | IN_EXCL_UNLINK;

bool isHidden(const QString& name)
{
    return name.startsWith(QLatin1Char('.'));
}

} // namespace

WinVolumeMonitor::WinVolumeMonitor(const QString& path)
    : m_path(QDir::cleanPath(QDir::fromNativeSeparators(path)))
    , m_inotify(inotify_init1(IN_NONBLOCK | IN_CLOEXEC))
    , m_wake(eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC))
{
}

WinVolumeMonitor::~WinVolumeMonitor()
{
    stop();
    wait();
    if (m_inotify >= 0)
        ::close(m_inotify);
    if (m_wake >= 0)
        ::close(m_wake);
}

void WinVolumeMonitor::stop()
{
    m_stop = true;
    if (m_wake >= 0) {
        const quint64 one = 1;
        [[maybe_unused]] const ssize_t written = ::write(m_wake, &one, sizeof one);
    }
}

int WinVolumeMonitor::watchedFolders() const
{
    return m_watched;
}

QStringList WinVolumeMonitor::localDrives()
{
    QStringList drives{QDir::homePath()};
    for (const QStorageInfo& volume : QStorageInfo::mountedVolumes()) {
        const QString root = volume.rootPath();
        const bool removable = root.startsWith(QLatin1String("/media/")) || root.startsWith(QLatin1String("/run/media/"));
        if (removable && volume.isValid() && volume.isReady() && !drives.contains(root))
            drives.append(root);
    }
    return drives;
}

void WinVolumeMonitor::run()
{
    if (m_inotify < 0 || m_wake < 0 || !QFileInfo(m_path).isDir())
        return;
    watchTree(m_path, false);

    // Aligned for the event records the kernel writes into it.
    alignas(inotify_event) char buffer[64 * 1024];
    while (!m_stop) {
        pollfd waits[2] = {{m_inotify, POLLIN, 0}, {m_wake, POLLIN, 0}};
        if (::poll(waits, 2, -1) < 0) {
            if (errno == EINTR)
                continue;
            return;
        }
        if (m_stop || (waits[1].revents & POLLIN))
            return;
        for (;;) {
            const qint64 length = readEvents(buffer, qint64(sizeof buffer));
            if (length <= 0)
                break;
            handleEvents(buffer, length);
            if (m_stop)
                return;
        }
    }
}

qint64 WinVolumeMonitor::readEvents(char* buffer, qint64 size)
{
    return qint64(::read(m_inotify, buffer, size_t(size)));
}

void WinVolumeMonitor::watchTree(const QString& folder, bool report)
{
    QQueue<QString> pending;
    pending.enqueue(folder);
    while (!pending.isEmpty() && !m_stop) {
        const QString current = pending.dequeue();
        bool added = false;
        if (!watchFolder(current, added))
            continue;
        QDirIterator entries(current, QDir::AllEntries | QDir::NoDotAndDotDot | QDir::System);
        while (entries.hasNext()) {
            const QString path = entries.next();
            const QFileInfo info = entries.fileInfo();
            const bool folderEntry = info.isDir() && !info.isSymLink();
            if (report)
                emit folderEntry ? directoryAddedEvent(path) : fileAddedEvent(path);
            if (folderEntry && !isHidden(info.fileName()))
                pending.enqueue(path);
        }
        // Counted once its entries were looked at: from then on nothing in it goes unseen.
        if (added)
            ++m_watched;
    }
}

bool WinVolumeMonitor::watchFolder(const QString& folder, bool& added)
{
    if (m_folders.size() >= MaxFolders)
        return false;
    const int watch = inotify_add_watch(m_inotify, QFile::encodeName(folder).constData(), WatchMask);
    if (watch < 0)
        return false;
    // A folder watched before (found again after an overflow, or moved) keeps its watch.
    added = !m_folders.contains(watch);
    m_folders.insert(watch, folder);
    return true;
}

void WinVolumeMonitor::handleEvents(const char* buffer, qint64 length)
{
    for (qint64 offset = 0; offset < length;) {
        const auto* event = reinterpret_cast<const inotify_event*>(buffer + offset);
        offset += qint64(sizeof(inotify_event)) + event->len;
        if (event->mask & IN_Q_OVERFLOW) {
            // Changes were lost, folders that appeared meanwhile among them.
            watchTree(m_path, false);
            continue;
        }
        if (event->mask & IN_IGNORED) {
            if (m_folders.remove(event->wd) > 0)
                --m_watched;
            continue;
        }
        const QString folder = m_folders.value(event->wd);
        if (folder.isEmpty() || event->len == 0)
            continue;
        const QString name = QFile::decodeName(event->name);
        const QString path = folder + QLatin1Char('/') + name;
        // Classified as it is now: what was removed or moved away counts as a file.
        const bool isDirectory = QFileInfo(path).isDir();
        const quint32 mask = event->mask;
        if (mask & IN_CREATE)
            emit isDirectory ? directoryAddedEvent(path) : fileAddedEvent(path);
        else if (mask & IN_DELETE)
            emit isDirectory ? directoryRemovedEvent(path) : fileRemovedEvent(path);
        else if (mask & (IN_MODIFY | IN_ATTRIB))
            emit isDirectory ? directoryModifiedEvent(path) : fileModifiedEvent(path);
        else if (mask & IN_MOVED_FROM)
            emit isDirectory ? directoryOldNameEvent(path) : fileOldNameEvent(path);
        else if (mask & IN_MOVED_TO)
            emit isDirectory ? directoryNewNameEvent(path) : fileNewNameEvent(path);

        if ((mask & IN_MOVED_FROM) && (mask & IN_ISDIR)) {
            // Its watches would go on reporting the old paths; a move within the tree
            // watches it again under the new one.
            const QString prefix = path + QLatin1Char('/');
            for (auto it = m_folders.begin(); it != m_folders.end();) {
                if (it.value() == path || it.value().startsWith(prefix)) {
                    inotify_rm_watch(m_inotify, it.key());
                    it = m_folders.erase(it);
                    --m_watched;
                } else {
                    ++it;
                }
            }
        }
        if ((mask & (IN_CREATE | IN_MOVED_TO)) && (mask & IN_ISDIR) && !isHidden(name))
            watchTree(path, true);
    }
}
