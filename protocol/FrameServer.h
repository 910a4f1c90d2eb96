#pragma once

#include "RequestHandler.h"

#include <QObject>
#include <QString>

class QLocalServer;
class ServerConnection;

// Serves one device on a local socket: accepts connections, performs the handshake,
// decodes requests, hands them to the RequestHandler and writes back the answers. A
// connection that misbehaves (bad frame, oversized frame, no handshake, a frame left half
// sent) is closed on its own; the others keep being served. Lives on one thread with an
// event loop.
class FrameServer : public QObject
{
    Q_OBJECT

public:
    explicit FrameServer(RequestHandler* handler, QObject* parent = nullptr);
    ~FrameServer() override;

    // Listens on socketPath (mode 0600) inside a folder of mode 0700, created if missing.
    // A stale socket file is replaced; a socket someone still listens on is not.
    bool listen(const QString& socketPath);
    // Stops listening, closes every connection and removes the socket file.
    void close();

    QString socketPath() const { return m_socketPath; }
    QString errorString() const { return m_error; }

    // Delays every answer but the handshake's, without blocking other connections.
    void setLatency(int milliseconds);
    // How long a connection may stay without a handshake or with a partial frame.
    void setHalfOpenTimeout(int milliseconds) { m_halfOpenTimeoutMs = milliseconds; }

private:
    void onNewConnection();
    void onConnectionClosed(ServerConnection* connection);

    RequestHandler* m_handler;
    QLocalServer* m_server;
    QString m_socketPath;
    QString m_error;
    quint64 m_nextConnectionId = 1;
    int m_latencyMs = 0;
    int m_halfOpenTimeoutMs;
};
