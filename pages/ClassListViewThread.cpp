#include "ClassListViewThread.h"

ClassListViewThread::ClassListViewThread(GatewayComponentWidget* page, IdRecordMap classes, Feed feed)
    : PageWorkerThread(page)
    , m_classes(std::move(classes))
    , m_feed(std::move(feed))
{
}

void ClassListViewThread::work()
{
    reportStatus(QStringLiteral("Processing Class IDs"), GatewayComponentWidget::Processing);
    const QVector<IdRecord> records(m_classes.cbegin(), m_classes.cend());
    if (isStopRequested())
        return;
    m_feed->append(records);
    m_feed->close();
}
