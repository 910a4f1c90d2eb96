#pragma once

#include "IdRecord.h"
#include "PageFeed.h"
#include "PageWorkerThread.h"

#include <QSharedPointer>

// Walks a device's classes in ascending id order and queues them for the class id list
// page, one per step with a short sleep between, so the GUI thread is never starved.
class ClassListViewThread : public PageWorkerThread
{
public:
    using Feed = QSharedPointer<PageFeed<IdRecord>>;

    // The time from one class to the next.
    static constexpr unsigned long StepMs = 1;

    // classes is a copy: the worker never reads the device's record, which may go first.
    ClassListViewThread(GatewayComponentWidget* page, IdRecordMap classes, Feed feed);

protected:
    void work() override;

private:
    IdRecordMap m_classes;
    Feed m_feed;
};
