#pragma once

#include <QThread>

class PageWorkerThread;

// A page's hold on its worker thread. Destroying it (with the page) stops the worker:
// the stop flag is set, the worker gets at most the gateway's call timeout to finish its
// step, and is then deleted once it has returned. A page declares one as a member and so
// cannot forget its teardown.
class PageWorker
{
public:
    PageWorker() = default;
    ~PageWorker();
    PageWorker(const PageWorker&) = delete;
    PageWorker& operator=(const PageWorker&) = delete;

    // Takes ownership of thread and starts it; ignored when a worker already exists.
    void start(PageWorkerThread* thread, QThread::Priority priority);
    // The stop flag, the bounded wait and the deletion; the worker is gone afterwards.
    void release();

    bool exists() const;
    bool isRunning() const;
    // Changes the priority of a running worker; a worker that has ended is left alone.
    void setPriority(QThread::Priority priority);
    PageWorkerThread* thread() const;

    // How long teardown waits for a worker: the gateway's call timeout, after which every
    // device call has returned.
    static unsigned long teardownWaitMs();

private:
    PageWorkerThread* m_thread = nullptr;
};
