#include "ISettingsTreeViewThread.h"

#include "_ZantDevice.h"

ISettingsTreeViewThread::ISettingsTreeViewThread(GatewayComponentWidget* page, QSharedPointer<_ZantDevice> device,
                                                 Queue queue, Feed feed)
    : PageWorkerThread(page)
    , m_device(std::move(device))
    , m_queue(std::move(queue))
    , m_feed(std::move(feed))
{
}

std::optional<quint16> ISettingsTreeViewThread::childPriority(const QString& path, bool childOfRoot, int siblings)
{
    const auto has = [&path](const char* text) { return path.contains(QLatin1String(text), Qt::CaseInsensitive); };
    if (has("oattest"))
        return 20;
    if (has("appinfo"))
        return 1;
    if (has("ztoversion"))
        return 2;
    if (has("CSA_NORMAL") || has("CSA_REMOVAL"))
        return std::nullopt;
    if (childOfRoot)
        return 10;
    if (siblings <= 10)
        return 11;
    if (siblings <= 50)
        return 12;
    if (siblings <= 100)
        return 13;
    return 14;
}

void ISettingsTreeViewThread::work()
{
    reportStatus(QStringLiteral("Querying ISettings"), GatewayComponentWidget::Processing);
    bool firstQuery = true;
    quint16 priority = 0;
    QString path;
    while (!isStopRequested()) {
        // Only this thread fills the queue, so once it is empty the crawl is over.
        if (!m_queue->pop(priority, path)) {
            reportStatus(GatewayComponentWidget::readyStatus());
            m_feed->close();
            return;
        }
        auto node = QSharedPointer<_SettingsInfo>::create();
        node->SetPath(path);
        const int result = m_device->GetChildSettings(node);
        if (isStopRequested())
            return;
        if (result != 0) {
            if (quint32(result) == EndOfCrawl)
                m_feed->close();
            else
                reportStatus(GatewayComponentWidget::errorStatus(result), GatewayComponentWidget::Failed);
            return;
        }
        const int siblings = int(node->children.size());
        for (const Node& child : std::as_const(node->children)) {
            if (const std::optional<quint16> childPriorityValue = childPriority(child->Path(), firstQuery, siblings))
                m_queue->push(*childPriorityValue, child->Path());
        }
        m_feed->append(node);
        firstQuery = false;
    }
}
