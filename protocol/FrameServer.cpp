#include "FrameServer.h"

#include "ServerConnection.h"

#include <QFile>
#include <QFileInfo>
#include <QLocalSocket>
#include <QSocketNotifier>
#include <QtDebug>

#include <fcntl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace {

// Out of descriptors with none to spare, clients wait in the backlog this long before
// the next try.
constexpr int AcceptRetryMs = 200;

int openSpare()
{
    return ::open("/dev/null", O_RDONLY | O_CLOEXEC);
}

} // namespace

FrameServer::FrameServer(RequestHandler* handler, QObject* parent)
    : QObject(parent), m_handler(handler), m_halfOpenTimeoutMs(Protocol::HalfOpenTimeoutMs)
{
    m_acceptRetry.setSingleShot(true);
    m_acceptRetry.setInterval(AcceptRetryMs);
    connect(&m_acceptRetry, &QTimer::timeout, this, [this] {
        if (m_notifier)
            m_notifier->setEnabled(true);
    });
}

FrameServer::~FrameServer()
{
    close();
}

bool FrameServer::clearSocketPath(const QString& socketPath)
{
    const QByteArray path = QFile::encodeName(socketPath);
    struct stat info;
    if (::lstat(path.constData(), &info) != 0)
        return true;  // nothing there (any other trouble shows when binding)
    if (!S_ISSOCK(info.st_mode)) {
        m_error = QStringLiteral("%1 exists and is not a socket; it is left alone").arg(socketPath);
        return false;
    }
    QLocalSocket probe;
    probe.connectToServer(socketPath);
    if (probe.waitForConnected(Protocol::DiscoveryTimeoutMs)) {
        m_error = QStringLiteral("Another device already listens on %1").arg(socketPath);
        return false;
    }
    // Left behind by a device that crashed.
    if (::unlink(path.constData()) != 0) {
        m_error = QStringLiteral("Cannot remove the stale socket %1: %2").arg(socketPath, qt_error_string(errno));
        return false;
    }
    return true;
}

bool FrameServer::listen(const QString& socketPath)
{
    if (!Protocol::ensureSocketDirectory(QFileInfo(socketPath).absolutePath(), &m_error) || !clearSocketPath(socketPath))
        return false;
    const QByteArray path = QFile::encodeName(socketPath);
    sockaddr_un address {};
    address.sun_family = AF_UNIX;
    if (size_t(path.size()) >= sizeof address.sun_path) {
        m_error = QStringLiteral("The socket path %1 is too long").arg(socketPath);
        return false;
    }
    memcpy(address.sun_path, path.constData(), size_t(path.size()));

    // Our own listening socket rather than QLocalServer's, which closes for good when an
    // accept fails for want of descriptors.
    m_listener = ::socket(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0);
    struct stat info;
    const bool bound = m_listener >= 0 && ::bind(m_listener, reinterpret_cast<sockaddr*>(&address), sizeof address) == 0;
    // Private before anyone can connect.
    if (!bound || ::chmod(path.constData(), 0600) != 0 || ::listen(m_listener, SOMAXCONN) != 0
        || ::lstat(path.constData(), &info) != 0) {
        m_error = QStringLiteral("Cannot listen on %1: %2").arg(socketPath, qt_error_string(errno));
        if (bound)
            ::unlink(path.constData());
        if (m_listener >= 0)
            ::close(m_listener);
        m_listener = -1;
        return false;
    }
    m_socketDevice = info.st_dev;
    m_socketInode = info.st_ino;
    m_spare = openSpare();
    m_notifier = new QSocketNotifier(qintptr(m_listener), QSocketNotifier::Read, this);
    connect(m_notifier, &QSocketNotifier::activated, this, &FrameServer::onAcceptable);
    m_socketPath = socketPath;
    return true;
}

void FrameServer::close()
{
    m_acceptRetry.stop();
    delete m_notifier;
    m_notifier = nullptr;
    if (m_listener >= 0) {
        ::close(m_listener);
        m_listener = -1;
        // Only our own: a successor may already listen under the same name.
        const QByteArray path = QFile::encodeName(m_socketPath);
        struct stat info;
        if (::lstat(path.constData(), &info) == 0 && info.st_dev == m_socketDevice && info.st_ino == m_socketInode)
            ::unlink(path.constData());
    }
    if (m_spare >= 0)
        ::close(m_spare);
    m_spare = -1;
    const auto connections = findChildren<ServerConnection*>(QString(), Qt::FindDirectChildrenOnly);
    for (ServerConnection* connection : connections)
        connection->shutdown();
}

void FrameServer::setLatency(int milliseconds)
{
    m_latencyMs = milliseconds;
    const auto connections = findChildren<ServerConnection*>(QString(), Qt::FindDirectChildrenOnly);
    for (ServerConnection* connection : connections)
        connection->setLatency(milliseconds);
}

qint64 FrameServer::bufferedBytes() const
{
    qint64 total = 0;
    const auto connections = findChildren<ServerConnection*>(QString(), Qt::FindDirectChildrenOnly);
    for (const ServerConnection* connection : connections)
        total += connection->bufferedBytes();
    return total;
}

void FrameServer::onAcceptable()
{
    for (;;) {
        const int descriptor = ::accept4(m_listener, nullptr, nullptr, SOCK_NONBLOCK | SOCK_CLOEXEC);
        const int error = errno;
        if (descriptor >= 0) {
            admit(descriptor);
        } else if (error == EAGAIN || error == EWOULDBLOCK) {
            return;
        } else if ((error == EMFILE || error == ENFILE) && m_spare >= 0) {
            // Take the client with the spare descriptor and close it at once, rather than
            // leave it waiting for an answer that cannot come. (accept fails so even with
            // nobody waiting: then we are done.)
            ::close(m_spare);
            const int refused = ::accept4(m_listener, nullptr, nullptr, SOCK_CLOEXEC);
            if (refused >= 0) {
                noteRefusal(QStringLiteral("out of file descriptors"));
                ::close(refused);
            }
            m_spare = openSpare();
            if (refused < 0)
                return;
        } else if (error != EINTR && error != ECONNABORTED) {
            noteRefusal(qt_error_string(error));
            m_notifier->setEnabled(false);
            m_acceptRetry.start();
            return;
        }
    }
}

void FrameServer::admit(int descriptor)
{
    if (m_connections >= m_maxConnections) {
        noteRefusal(QStringLiteral("%1 connections are open, the limit").arg(m_connections));
        ::close(descriptor);
        return;
    }
    auto* socket = new QLocalSocket;
    if (!socket->setSocketDescriptor(descriptor)) {
        qWarning("Cannot serve a connection to %s: %s", qPrintable(m_socketPath), qPrintable(socket->errorString()));
        delete socket;
        ::close(descriptor);
        return;
    }
    if (m_refused > 0) {
        qWarning("Serving new connections to %s again, after refusing %d", qPrintable(m_socketPath), m_refused);
        m_refused = 0;
    }
    ++m_connections;
    auto* connection = new ServerConnection(socket, m_nextConnectionId++, m_handler, m_latencyMs, m_halfOpenTimeoutMs, this);
    connect(connection, &ServerConnection::closed, this, &FrameServer::onConnectionClosed);
}

void FrameServer::noteRefusal(const QString& reason)
{
    // Once per spell of refusals, however many clients knock.
    if (m_refused++ == 0)
        qWarning("Refusing new connections to %s: %s", qPrintable(m_socketPath), qPrintable(reason));
}

void FrameServer::onConnectionClosed(ServerConnection* connection)
{
    --m_connections;
    m_handler->connectionClosed(connection->id());
    connection->deleteLater();
    // A descriptor came free: clients waiting in the backlog need not wait for the retry.
    if (m_notifier && !m_notifier->isEnabled()) {
        m_acceptRetry.stop();
        m_notifier->setEnabled(true);
    }
}
