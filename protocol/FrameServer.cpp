#include "FrameServer.h"

#include "ServerConnection.h"

#include <QFileInfo>
#include <QLocalServer>
#include <QLocalSocket>

#include <sys/stat.h>

FrameServer::FrameServer(RequestHandler* handler, QObject* parent)
    : QObject(parent), m_handler(handler), m_server(new QLocalServer(this)), m_halfOpenTimeoutMs(Protocol::HalfOpenTimeoutMs)
{
    connect(m_server, &QLocalServer::newConnection, this, &FrameServer::onNewConnection);
}

FrameServer::~FrameServer()
{
    close();
}

bool FrameServer::listen(const QString& socketPath)
{
    const QFileInfo info(socketPath);
    if (!Protocol::ensureSocketDirectory(info.absolutePath(), &m_error))
        return false;
    if (info.exists() || info.isSymLink()) {
        QLocalSocket probe;
        probe.connectToServer(socketPath);
        if (probe.waitForConnected(Protocol::DiscoveryTimeoutMs)) {
            m_error = QStringLiteral("Another device already listens on %1").arg(socketPath);
            return false;
        }
        QLocalServer::removeServer(socketPath);
    }
    if (!m_server->listen(socketPath)) {
        m_error = m_server->errorString();
        return false;
    }
    if (::chmod(QFile::encodeName(socketPath).constData(), 0600) != 0) {
        m_error = QStringLiteral("Cannot restrict the socket %1 to its owner").arg(socketPath);
        m_server->close();
        return false;
    }
    m_socketPath = socketPath;
    return true;
}

void FrameServer::close()
{
    m_server->close();
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

void FrameServer::onNewConnection()
{
    while (QLocalSocket* socket = m_server->nextPendingConnection()) {
        auto* connection = new ServerConnection(socket, m_nextConnectionId++, m_handler, m_latencyMs, m_halfOpenTimeoutMs, this);
        connect(connection, &ServerConnection::closed, this, &FrameServer::onConnectionClosed);
    }
}

void FrameServer::onConnectionClosed(ServerConnection* connection)
{
    m_handler->connectionClosed(connection->id());
    connection->deleteLater();
}
