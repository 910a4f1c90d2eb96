#pragma once

#include "Frame.h"

#include <QObject>
#include <QTimer>

#include <optional>

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
    // The stream requests, once the handler accepted them.
    void startStream(const Frame& request);
    void sendDownload();
    // Bytes of a Data frame for the upload; none: the client stops it.
    void receiveUpload(quint32 requestId, const char* data, qint64 size);
    // Reading: a frame's header is complete; the frame is complete. False when the
    // connection closes.
    bool startFrame();
    bool finishFrame();
    void endStream(qint32 result);
    // Writes straight to the socket while nothing waits in its buffer; the rest is left
    // to the socket, which reports bytesWritten when it is out.
    void writeDirect(const char* data, qint64 size);
    void send(const Frame& request, qint32 result, const QByteArray& body);
    void sendStillWorking(quint32 requestId, quint32 operation);
    // Writes bytes after the connection's latency, if any.
    void deliver(const QByteArray& bytes);
    void write(const QByteArray& bytes);
    qint64 unsentBytes() const;
    void refuse(const QString& reason);
    void updateHalfOpenTimer();

    QLocalSocket* m_socket;
    quint64 m_id;
    RequestHandler* m_handler;
    int m_latencyMs;
    qint64 m_delayedBytes = 0;  // answers held back by the latency
    // The frame being read: its header fills first, then its payload; a Data frame's
    // payload passes through m_piece to the upload without being gathered.
    char m_header[Protocol::HeaderSize];
    qint64 m_headerFill = 0;
    Frame m_reading;
    qint64 m_payloadLeft = 0;
    QByteArray m_piece;
    // The stream being served: a download sends Data frames while the client takes them
    // (no requests are read meanwhile); an upload takes the request's Data frames.
    struct Stream
    {
        Frame request;  // empty payload
        quint32 transferId = 0;
        quint64 expected = 0;  // bytes an upload still waits for
    };
    std::optional<Stream> m_stream;
    QByteArray m_dataFrame;  // one Data frame of a download, built in place
    QTimer m_halfOpenTimer;
    bool m_greeted = false;
    bool m_paused = false;  // reading stopped until the client takes its answers
    bool m_throttled = false;  // reading an upload held back by the latency
    bool m_closing = false;
    bool m_reported = false;
};
