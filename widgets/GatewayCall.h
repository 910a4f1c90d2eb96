#pragma once

#include <QCoreApplication>
#include <QObject>
#include <QPointer>
#include <QString>

#include <functional>
#include <type_traits>
#include <utility>

// Runs one blocking gateway call off the GUI thread and hands its result back to the GUI
// thread, to done, unless receiver has gone meanwhile. A device that stops answering then
// holds up a worker for a call timeout, never the windows. The workers are a pool of their
// own: calls wait on devices, not on the processor, so a few hung ones must not hold up
// the next call or Qt's global pool.
class GatewayCall
{
public:
    // job runs on a worker and returns the result by value; done(result) runs on the GUI
    // thread. Both are copied: they must not capture anything the worker may not touch.
    template <typename Job, typename Done>
    static void run(QObject* receiver, Job job, Done done)
    {
        using Result = std::decay_t<std::invoke_result_t<Job>>;
        // Made here, read only on the GUI thread: the worker merely carries it.
        const QPointer<QObject> guard(receiver);
        start([guard, job = std::move(job), done = std::move(done)]() mutable {
            Result result = job();
            QMetaObject::invokeMethod(
                QCoreApplication::instance(),
                [guard, done = std::move(done), result = std::move(result)]() mutable {
                    if (guard)
                        done(std::move(result));
                },
                Qt::QueuedConnection);
        });
    }

    // Waits until every call under way has returned (each does within the call timeout).
    static void waitForDone();
    // The text a window shows for a failed call: its code and why (the device's reason for a
    // code the device answered, the library's own words for its codes).
    static QString failureText(int code, const QString& reason);
    // True for the codes that mean the device is not there to answer (gone or silent).
    static bool deviceAbsent(int code);

private:
    static void start(std::function<void()> task);
};
