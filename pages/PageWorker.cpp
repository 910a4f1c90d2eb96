#include "PageWorker.h"

#include "PageWorkerThread.h"
#include "Protocol.h"

PageWorker::~PageWorker()
{
    release();
}

void PageWorker::start(PageWorkerThread* thread, QThread::Priority priority)
{
    if (m_thread || !thread)
        return;
    m_thread = thread;
    m_thread->start(priority);
}

void PageWorker::release()
{
    if (!m_thread)
        return;
    m_thread->release(teardownWaitMs());
    m_thread = nullptr;
}

bool PageWorker::exists() const
{
    return m_thread != nullptr;
}

bool PageWorker::isRunning() const
{
    return m_thread && m_thread->isRunning();
}

void PageWorker::setPriority(QThread::Priority priority)
{
    if (isRunning())
        m_thread->setPriority(priority);
}

PageWorkerThread* PageWorker::thread() const
{
    return m_thread;
}

unsigned long PageWorker::teardownWaitMs()
{
    return Protocol::CallTimeoutMs;
}
