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
    // Steps are due one StepMs after another, so the sleeps' overruns do not add up.
    QDeadlineTimer nextStep = QDeadlineTimer::current(Qt::PreciseTimer);
    for (const IdRecord& record : std::as_const(m_classes)) {
        m_feed->append(record);
        nextStep += StepMs;
        if (!pauseUntil(nextStep))
            return;
    }
    m_feed->close();
}
