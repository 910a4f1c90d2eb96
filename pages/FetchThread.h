#pragma once

#include "PageFeed.h"
#include "PageWorkerThread.h"

#include <QSharedPointer>
#include <QVector>

// The worker of a page that asks the device once (ModuleListViewThread and its kin derive
// from FetchThread<TheirRecord>). The page supplies the query and the texts for its
// outcome; the records go into the page's feed, which is closed on success, so that an
// answer without records still lets the page complete. After a failure the feed stays
// open and the page never completes.
template <typename Record>
class FetchThread : public PageWorkerThread
{
public:
    using Feed = QSharedPointer<PageFeed<Record>>;

protected:
    FetchThread(GatewayComponentWidget* page, Feed feed)
        : PageWorkerThread(page)
        , m_feed(std::move(feed))
    {
    }

    // The device query, on the worker thread, without any lock held. 0 means success.
    virtual int fetch(QVector<Record>& records) = 0;
    // Reports the outcome to the page (status and state texts), before the records are
    // handed over, so the page never completes ahead of its "processing" status.
    virtual void reportResult(int result) = 0;

private:
    void work() final
    {
        QVector<Record> records;
        const int result = fetch(records);
        if (isStopRequested())
            return;
        reportResult(result);
        if (result != 0)
            return;
        m_feed->append(records);
        m_feed->close();
    }

    Feed m_feed;
};
