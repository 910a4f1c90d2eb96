#include "DeviceFileSystemViewThread.h"

#include "_ZantDevice.h"

#include <QMutexLocker>

#include <algorithm>
#include <utility>

void FileSystemCrawl::restart(const QString& root)
{
    QMutexLocker lock(&m_loadLock);
    ++m_load;
    m_requests.clear();
    m_levels.clear();
    if (!root.isEmpty())
        m_requests.push(0, root);
}

bool FileSystemCrawl::take(QString& path, quint64& load)
{
    QMutexLocker lock(&m_loadLock);
    quint16 priority = 0;
    load = m_load;
    return m_requests.pop(priority, path);
}

void FileSystemCrawl::deliver(quint64 load, const Level& level)
{
    QMutexLocker lock(&m_loadLock);
    if (load != m_load)
        return;
    for (const Level& folder : std::as_const(level->directories))
        m_requests.push(DeviceFileSystemViewThread::priorityOf(folder->Path()), folder->Path());
    m_levels.append(level);
}

PageFeed<FileSystemCrawl::Level>& FileSystemCrawl::levels()
{
    return m_levels;
}

DeviceFileSystemViewThread::DeviceFileSystemViewThread(GatewayComponentWidget* page, QSharedPointer<_ZantDevice> device,
                                                       QSharedPointer<FileSystemCrawl> crawl)
    : PageWorkerThread(page)
    , m_device(std::move(device))
    , m_crawl(std::move(crawl))
{
}

quint16 DeviceFileSystemViewThread::priorityOf(const QString& path)
{
    const auto has = [&path](const char* text) { return path.contains(QLatin1String(text), Qt::CaseInsensitive); };
    if (has("usermod"))
        return 0;
    if (has("user"))
        return 1;
    if (has("shared") || has("err"))
        return 2;
    return 10;
}

void DeviceFileSystemViewThread::work()
{
    // "Ready" once the crawl has run dry, not while the page is still reading its volume.
    bool fetched = false;
    while (!isStopRequested()) {
        QString path;
        quint64 load = 0;
        if (!m_crawl->take(path, load)) {
            if (std::exchange(fetched, false))
                reportStatus(GatewayComponentWidget::readyStatus());
            m_idleDelay = std::min(m_idleDelay + IdleStepMs, IdleCapMs);
            pause(m_idleDelay);
            continue;
        }
        reportStatus(QStringLiteral("Processing File System..."));
        fetched = true;
        auto level = QSharedPointer<_DirectoryInfo>::create();
        const int result = m_device->GetFileSystemLevel(path, level, nullptr, nullptr);
        if (isStopRequested())
            return;
        if (result == 0) {
            m_crawl->deliver(load, level);
        } else if (quint32(result) == EndOfCrawl) {
            // The device has ended the crawl; the tree keeps what it has.
            reportStatus(GatewayComponentWidget::readyStatus());
            return;
        }
        m_idleDelay = 1;
    }
}
