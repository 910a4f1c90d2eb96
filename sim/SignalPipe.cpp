#include "SignalPipe.h"

#include <QSocketNotifier>

#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <unistd.h>

int SignalPipe::s_writeEnd = -1;

SignalPipe::SignalPipe(QObject* parent)
    : QObject(parent)
{
}

SignalPipe::~SignalPipe()
{
    if (m_fds[0] < 0)
        return;
    ::signal(SIGINT, SIG_DFL);
    ::signal(SIGTERM, SIG_DFL);
    s_writeEnd = -1;
    ::close(m_fds[0]);
    ::close(m_fds[1]);
}

void SignalPipe::onSignal(int signalNumber)
{
    const int savedErrno = errno;
    const unsigned char byte = static_cast<unsigned char>(signalNumber);
    if (s_writeEnd >= 0) {
        const ssize_t written = ::write(s_writeEnd, &byte, 1);
        Q_UNUSED(written);
    }
    errno = savedErrno;
}

bool SignalPipe::install()
{
    if (s_writeEnd >= 0 || ::pipe2(m_fds, O_CLOEXEC | O_NONBLOCK) != 0)
        return false;
    s_writeEnd = m_fds[1];
    m_notifier = new QSocketNotifier(m_fds[0], QSocketNotifier::Read, this);
    connect(m_notifier, &QSocketNotifier::activated, this, &SignalPipe::onReadable);

    struct sigaction action = {};
    action.sa_handler = &SignalPipe::onSignal;
    sigemptyset(&action.sa_mask);
    action.sa_flags = SA_RESTART;
    return ::sigaction(SIGINT, &action, nullptr) == 0 && ::sigaction(SIGTERM, &action, nullptr) == 0;
}

void SignalPipe::onReadable()
{
    unsigned char byte = 0;
    while (::read(m_fds[0], &byte, 1) == 1)
        emit received(byte);
}
