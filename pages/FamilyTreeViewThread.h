#pragma once

#include "IdRecord.h"
#include "PageFeed.h"
#include "PageWorkerThread.h"

#include <QSharedPointer>

// Queues the classes the family tree shows (FamilyReport::availableClasses, in ascending id
// order) for its page, one class per step with a short sleep between. The feed is closed
// once every class has been queued.
class FamilyTreeViewThread : public PageWorkerThread
{
public:
    using Feed = QSharedPointer<PageFeed<IdRecord>>;

    // The time of each queued class; the steps keep this rate.
    static constexpr unsigned long StepMs = 1;

    // classes is a copy: the worker never reads the device's record, which may go first.
    FamilyTreeViewThread(GatewayComponentWidget* page, IdRecordMap classes, Feed feed);

protected:
    void work() override;

private:
    IdRecordMap m_classes;
    Feed m_feed;
};
