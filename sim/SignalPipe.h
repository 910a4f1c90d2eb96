#pragma once

#include <QObject>

class QSocketNotifier;

// Brings SIGINT and SIGTERM into the event loop: the handler only writes the signal's
// number to a pipe, and a notifier on the other end emits received() on the loop's thread.
class SignalPipe : public QObject
{
    Q_OBJECT

public:
    explicit SignalPipe(QObject* parent = nullptr);
    ~SignalPipe() override;

    // Catches SIGINT and SIGTERM from now on. One instance per process.
    bool install();

signals:
    void received(int signalNumber);

private:
    static void onSignal(int signalNumber);
    void onReadable();

    static int s_writeEnd;
    int m_fds[2] = {-1, -1};
    QSocketNotifier* m_notifier = nullptr;
};
