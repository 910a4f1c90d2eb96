#pragma once

#include "PageFeed.h"
#include "PageWorkerThread.h"
#include "PathPriorityQueue.h"

#include <QMutex>
#include <QSharedPointer>

class _DirectoryInfo;
class _ZantDevice;

// What the file system page and its crawler share: the folders still to fetch, in crawl
// order, and the levels fetched, oldest first. Each load of a volume has a number; what
// the crawler brings back for an earlier load is dropped, so that a reload starts clean
// even while a fetch of the old load is under way.
class FileSystemCrawl
{
public:
    using Level = QSharedPointer<_DirectoryInfo>;

    // GUI thread: forgets what is pending and queues root (unless empty) as the first fetch
    // of a new load.
    void restart(const QString& root);
    // Crawler: the next folder to fetch and the load it belongs to; false when none.
    bool take(QString& path, quint64& load);
    // Crawler: queues the level's folders by their priority and hands the level over,
    // unless a new load has begun since the fetch.
    void deliver(quint64 load, const Level& level);

    PageFeed<Level>& levels();

private:
    mutable QMutex m_loadLock; // keeps a load's number, requests and levels together
    quint64 m_load = 0;
    PathPriorityQueue m_requests;
    PageFeed<Level> m_levels;
};

// Crawls the device's volume for the file system page: fetches the first folder of the
// crawl, queues its sub-folders and hands the level to the page; waits, backing off up to
// 250 ms, while nothing is queued; ends when the page stops it or the device answers a
// fetch with 0xDEADBEEF. A folder that fails otherwise is skipped.
class DeviceFileSystemViewThread : public PageWorkerThread
{
public:
    static constexpr quint32 EndOfCrawl = 0xDEADBEEF;
    static constexpr unsigned IdleStepMs = 2;
    static constexpr unsigned IdleCapMs = 250;

    DeviceFileSystemViewThread(GatewayComponentWidget* page, QSharedPointer<_ZantDevice> device,
                               QSharedPointer<FileSystemCrawl> crawl);

    // Where a folder goes in the crawl, ignoring letter case: "usermod" 0, "user" 1,
    // "shared" or "err" 2, anything else 10.
    static quint16 priorityOf(const QString& path);

protected:
    void work() override;

private:
    QSharedPointer<_ZantDevice> m_device;
    QSharedPointer<FileSystemCrawl> m_crawl;
    unsigned m_idleDelay = 0;
};
