#include "PageWorkerThread.h"

#include <QDeadlineTimer>
#include <QMutexLocker>

PageWorkerThread::PageWorkerThread(GatewayComponentWidget* page)
    : m_page(page)
{
}

PageWorkerThread::~PageWorkerThread() = default;

void PageWorkerThread::run()
{
    work();
}

void PageWorkerThread::requestStop()
{
    QMutexLocker lock(&m_lock);
    m_stop = true;
    m_wake.wakeAll();
}

bool PageWorkerThread::isStopRequested() const
{
    return m_stop;
}

bool PageWorkerThread::pause(unsigned long ms)
{
    return pauseUntil(QDeadlineTimer(qint64(ms)));
}

bool PageWorkerThread::pauseUntil(const QDeadlineTimer& deadline)
{
    QMutexLocker lock(&m_lock);
    while (!m_stop && !deadline.hasExpired())
        m_wake.wait(&m_lock, deadline);
    return !m_stop;
}

void PageWorkerThread::release(unsigned long waitMs)
{
    // Connected first, so that an end during the wait is not missed. Both paths may fire
    // when the thread ends right now; a second deleteLater is harmless.
    connect(this, &QThread::finished, this, &QObject::deleteLater);
    setParent(nullptr);
    requestStop();
    wait(QDeadlineTimer(qint64(waitMs)));
    {
        QMutexLocker lock(&m_lock);
        m_page = nullptr;
    }
    if (!isRunning())
        deleteLater();
}

template <typename Action>
bool PageWorkerThread::withPage(Action action)
{
    QMutexLocker lock(&m_lock);
    if (!m_page)
        return false;
    action(m_page);
    return true;
}

bool PageWorkerThread::reportStatus(const QString& status)
{
    return withPage([&](GatewayComponentWidget* page) { page->setStatus(status); });
}

bool PageWorkerThread::reportState(GatewayComponentWidget::ComponentState state)
{
    return withPage([&](GatewayComponentWidget* page) { page->setState(state); });
}

bool PageWorkerThread::reportStatus(const QString& status, GatewayComponentWidget::ComponentState state)
{
    return withPage([&](GatewayComponentWidget* page) {
        page->setStatus(status);
        page->setState(state);
    });
}

bool PageWorkerThread::reportTimedStatus(const QString& message)
{
    return withPage([&](GatewayComponentWidget* page) { emit page->timedStatusChanged(message); });
}
