#pragma once

#include "RequestHandler.h"

#include <QObject>
#include <QString>
#include <QTimer>

#include <sys/types.h>

class QSocketNotifier;
class ServerConnection;

// Serves one device on a local socket: accepts connections, performs the handshake,
// decodes requests, hands them to the RequestHandler and writes back the answers. A
// connection that misbehaves (bad frame, oversized frame, no handshake, a frame left half
// sent) is closed on its own; the others keep being served. Clients beyond the connection
// limit, or arriving while the process is out of descriptors, are refused (closed at
// once) and the socket keeps listening. Lives on one thread with an event loop.
class FrameServer : public QObject
{
    Q_OBJECT

public:
    static constexpr int DefaultMaxConnections = 256;

    explicit FrameServer(RequestHandler* handler, QObject* parent = nullptr);
    ~FrameServer() override;

    // Listens on socketPath (mode 0600) inside a private folder (see
    // Protocol::ensureSocketDirectory). A stale socket file is replaced; a socket someone
    // still listens on, or anything that is not a socket, is left alone and refused.
    bool listen(const QString& socketPath);
    // Stops listening, closes every connection and removes the socket file.
    void close();

    QString socketPath() const { return m_socketPath; }
    QString errorString() const { return m_error; }

    // Delays every answer but the handshake's, without blocking other connections.
    void setLatency(int milliseconds);
    // How long a connection may stay without a handshake or with a partial frame.
    void setHalfOpenTimeout(int milliseconds) { m_halfOpenTimeoutMs = milliseconds; }
    void setMaxConnections(int connections) { m_maxConnections = connections; }
    // Bytes all connections hold in memory (see ServerConnection::bufferedBytes).
    qint64 bufferedBytes() const;

private:
    bool clearSocketPath(const QString& socketPath);
    void onAcceptable();
    void admit(int descriptor);
    void noteRefusal(const QString& reason);
    void onConnectionClosed(ServerConnection* connection);

    RequestHandler* m_handler;
    int m_listener = -1;
    QSocketNotifier* m_notifier = nullptr;
    // Given up for a moment to accept, and so refuse, a client while out of descriptors.
    int m_spare = -1;
    QTimer m_acceptRetry;
    dev_t m_socketDevice = 0;
    ino_t m_socketInode = 0;
    QString m_socketPath;
    QString m_error;
    quint64 m_nextConnectionId = 1;
    int m_connections = 0;
    int m_maxConnections = DefaultMaxConnections;
    int m_refused = 0;  // since the last connection was admitted
    int m_latencyMs = 0;
    int m_halfOpenTimeoutMs;
};
