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
    // Requests stay unread (in the kernel) while more answer bytes than this wait to be
    // taken by the client: a few chunks, so pipelined transfers never stall on it.
    static constexpr qint64 MaxUnsentBytes = 4 * qint64(Protocol::TransferChunkSize);

    ServerConnection(QLocalSocket* socket, quint64 id, RequestHandler* handler, int latencyMs, int halfOpenTimeoutMs,
                     QObject* parent);

    quint64 id() const { return m_id; }
    void setLatency(int milliseconds) { m_latencyMs = milliseconds; }
    // Closes the socket; closed() follows.
    void shutdown();
    // Bytes this connection holds in memory: answers not yet sent and requests read but
    // not yet served.
    qint64 bufferedBytes() const;

signals:
    void closed(ServerConnection* connection);

private:
    void onReadyRead();
    void onDisconnected();
    void resumeWhenDrained();
    // False when the connection has to close.
    bool dispatch(const Frame& frame);
    void answerHello(const Frame& frame);
    void send(const Frame& request, qint32 result, const QByteArray& body);
    void sendStillWorking(quint32 requestId, quint32 operation);
    void write(const QByteArray& bytes);
    qint64 unsentBytes() const;
    void refuse(const QString& reason);
    void updateHalfOpenTimer();

    QLocalSocket* m_socket;
    quint64 m_id;
    RequestHandler* m_handler;
    int m_latencyMs;
    qint64 m_delayedBytes = 0;  // answers held back by the latency
    FrameDecoder m_decoder { Protocol::MaxRequestSize };
    QTimer m_halfOpenTimer;
    bool m_greeted = false;
    bool m_paused = false;  // reading stopped until the client takes its answers
    bool m_closing = false;
    bool m_reported = false;
};
