#pragma once

#include "PageFeed.h"
#include "PageWorkerThread.h"
#include "PathPriorityQueue.h"

#include <QSharedPointer>

#include <optional>

class _SettingsInfo;
class _ZantDevice;

// Crawls the device's settings store for the settings tree page: takes the first path of
// the crawl queue, asks the device for that node, queues its children by their priority
// and hands the answered node to the page. The crawl ends when the queue runs dry or at
// the first node the device refuses.
class ISettingsTreeViewThread : public PageWorkerThread
{
public:
    using Node = QSharedPointer<_SettingsInfo>;
    using Feed = QSharedPointer<PageFeed<Node>>;
    using Queue = QSharedPointer<PathPriorityQueue>;

    // A device's way of saying that the crawl is over: it ends without an error.
    static constexpr quint32 EndOfCrawl = 0xDEADBEEF;

    // queue holds the first path to read; feed is closed when the crawl ends without error.
    ISettingsTreeViewThread(GatewayComponentWidget* page, QSharedPointer<_ZantDevice> device, Queue queue, Feed feed);

    // Where a child at path goes in the crawl, ignoring letter case: "oattest" last (20),
    // "appinfo" (1) and "ztoversion" (2) first, "CSA_NORMAL"/"CSA_REMOVAL" never (nothing);
    // the children of the root at 10, the others by how crowded their parent is: up to 10
    // siblings 11, up to 50 12, up to 100 13, more 14.
    static std::optional<quint16> childPriority(const QString& path, bool childOfRoot, int siblings);

protected:
    void work() override;

private:
    QSharedPointer<_ZantDevice> m_device;
    Queue m_queue;
    Feed m_feed;
};
