#pragma once

#include "IdRecord.h"
#include "PageFeed.h"
#include "PageWorkerThread.h"

#include <QSharedPointer>

// Queues the classes the family tree shows (FamilyReport::availableClasses, in ascending id
// order) for its page, all at once, and closes the feed; the page paces their insertion.
class FamilyTreeViewThread : public PageWorkerThread
{
public:
    using Feed = QSharedPointer<PageFeed<IdRecord>>;

    // classes is a copy: the worker never reads the device's record, which may go first.
    FamilyTreeViewThread(GatewayComponentWidget* page, IdRecordMap classes, Feed feed);

protected:
    void work() override;

private:
    IdRecordMap m_classes;
    Feed m_feed;
};
