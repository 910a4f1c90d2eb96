#pragma once

#include "IdRecord.h"
#include "PageFeed.h"
#include "PageWorkerThread.h"

#include <QSharedPointer>

// Walks a device's classes in ascending id order and queues the available ones for the
// family tree page, names that are missing given as "unknown", one class per step with a
// short sleep between. The feed is closed once every class has been looked at.
class FamilyTreeViewThread : public PageWorkerThread
{
public:
    using Feed = QSharedPointer<PageFeed<IdRecord>>;

    // The time of each class, shown or skipped; the steps keep this rate.
    static constexpr unsigned long StepMs = 1;

    // classes is a copy: the worker never reads the device's record, which may go first.
    FamilyTreeViewThread(GatewayComponentWidget* page, IdRecordMap classes, Feed feed);

protected:
    void work() override;

private:
    IdRecordMap m_classes;
    Feed m_feed;
};
