#pragma once

#include "FrameDecoder.h"

#include <QObject>
#include <QTimer>

class QLocalSocket;
class RequestHandler;

// One client connection of a FrameServer.
class ServerConnection : public QObject
{
    Q_OBJECT

public:
    ServerConnection(QLocalSocket* socket, quint64 id, RequestHandler* handler, int latencyMs, int halfOpenTimeoutMs,
                     QObject* parent);

    quint64 id() const { return m_id; }
    void setLatency(int milliseconds) { m_latencyMs = milliseconds; }
    // Closes the socket; closed() follows.
    void shutdown();

signals:
    void closed(ServerConnection* connection);

private:
    void onReadyRead();
    void onDisconnected();
    // False when the connection has to close.
    bool dispatch(const Frame& frame);
    void answerHello(const Frame& frame);
    void send(const Frame& request, qint32 result, const QByteArray& body);
    void write(const QByteArray& bytes);
    void refuse(const QString& reason);
    void updateHalfOpenTimer();

    QLocalSocket* m_socket;
    quint64 m_id;
    RequestHandler* m_handler;
    int m_latencyMs;
    FrameDecoder m_decoder;
    QTimer m_halfOpenTimer;
    bool m_greeted = false;
    bool m_closing = false;
    bool m_reported = false;
};
