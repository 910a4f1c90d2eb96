#pragma once

#include "IdRecord.h"
#include "PageFeed.h"
#include "PageWorkerThread.h"

#include <QSharedPointer>

// Queues a device's classes in ascending id order for the class id list page, all at once:
// the page's tick takes them in time slices, so the worker need not pace itself.
class ClassListViewThread : public PageWorkerThread
{
public:
    using Feed = QSharedPointer<PageFeed<IdRecord>>;

    // classes is a copy: the worker never reads the device's record, which may go first.
    ClassListViewThread(GatewayComponentWidget* page, IdRecordMap classes, Feed feed);

protected:
    void work() override;

private:
    IdRecordMap m_classes;
    Feed m_feed;
};
