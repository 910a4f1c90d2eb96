#include "FamilyTreeViewThread.h"

namespace {

void fillUnknown(QString& text)
{
    if (text.isEmpty())
        text = QStringLiteral("unknown");
}

} // namespace

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
    for (const IdRecord& known : std::as_const(m_classes)) {
        if (known.available) {
            IdRecord record = known;
            fillUnknown(record.name);
            fillUnknown(record.family);
            fillUnknown(record.subFamily);
            m_feed->append(record);
        }
        nextStep += StepMs;
        if (!pauseUntil(nextStep))
            return;
    }
    m_feed->close();
}
