#include "FamilyTreeViewThread.h"

#include "FamilyReport.h"

FamilyTreeViewThread::FamilyTreeViewThread(GatewayComponentWidget* page, IdRecordMap classes, Feed feed)
    : PageWorkerThread(page)
    , m_classes(std::move(classes))
    , m_feed(std::move(feed))
{
}

void FamilyTreeViewThread::work()
{
    reportStatus(QStringLiteral("Processing Class IDs"), GatewayComponentWidget::Processing);
    const QVector<IdRecord> shown = FamilyReport::availableClasses(m_classes);
    if (isStopRequested())
        return;
    m_feed->append(shown);
    m_feed->close();
}
