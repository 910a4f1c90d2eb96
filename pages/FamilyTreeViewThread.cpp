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
    QDeadlineTimer nextStep = QDeadlineTimer::current(Qt::PreciseTimer);
    const QVector<IdRecord> shown = FamilyReport::availableClasses(m_classes);
    for (const IdRecord& record : shown) {
        m_feed->append(record);
        nextStep += StepMs;
        if (!pauseUntil(nextStep))
            return;
    }
    m_feed->close();
}
