#pragma once

#include "Frame.h"
#include "FrameDecoder.h"
#include "Protocol.h"

#include <QDeadlineTimer>
#include <QString>

#include <deque>
#include <functional>
#include <memory>

class QLocalSocket;

// One blocking connection from the calling thread to a device's socket. Needs no event
// loop: every wait is a blocking wait bounded by the call's deadline, which a StillWorking
// notice from the device renews for as long as the caller first allowed. Not shared
// between threads. After any failure the connection is dropped; the next call opens a
// new one. Connects only through a private socket folder of the user's own, and sends
// nothing to a device process of another user (Untrusted).
class DeviceConnection
{
public:
    // How long the gateway's calls wait for a sign of life: Protocol::CallTimeoutMs, or
    // less in tests that do not want to wait for a hung device that long.
    static int callTimeoutMs();
    static void setCallTimeoutMs(int milliseconds);

    explicit DeviceConnection(const QString& socketPath);
    ~DeviceConnection();
    DeviceConnection(const DeviceConnection&) = delete;
    DeviceConnection& operator=(const DeviceConnection&) = delete;

    QString socketPath() const { return m_socketPath; }
    // The Connect request (its payload) sent right after the handshake of every connection
    // this opens: a device serves a connection only after it accepted a Connect on it.
    // Empty (the default): none is sent.
    void setConnectRequest(const QByteArray& request) { m_connectRequest = request; }

    // Sends one request and waits for its answer. Returns the answer's result (or a client
    // error code) and stores the answer's fields after the result in body.
    qint32 call(Operation operation, const QByteArray& request, Protocol::RequestFlags flags, QByteArray* body,
                QDeadlineTimer deadline);

    // Bulk transfers: the stream requests of Protocol.h. download sends the request and
    // hands the bytes of each Data frame to sink as they come; upload sends the request,
    // then size bytes of the open file from its start as Data frames, and calls progress
    // with the bytes sent after each. A non-zero code from sink or progress ends the call
    // with that code, and the device's transfer with it: an upload is ended in step (the
    // device has removed its partial file when the call returns), a download by dropping
    // the connection. Every frame restarts the deadline.
    using DataSink = std::function<qint32(const char* data, qint64 size)>;
    using UploadProgress = std::function<qint32(quint64 sent)>;
    qint32 download(Operation operation, const QByteArray& request, const DataSink& sink, QDeadlineTimer deadline);
    qint32 upload(Operation operation, const QByteArray& request, int file, quint64 size,
                  const UploadProgress& progress, QDeadlineTimer deadline);

    // Discovery in two steps, so that many devices can be asked at once: start connects
    // and sends the handshake without waiting for it; finish waits for the answer.
    bool startHandshake();
    qint32 finishHandshake(QDeadlineTimer deadline);

    QString displayName() const { return m_displayName; }
    QString deviceId() const { return m_deviceId; }
    // What went wrong in the last failed call.
    QString errorString() const { return m_error; }

private:
    qint32 connectSocket();
    qint32 open(QDeadlineTimer deadline);
    bool usable();
    qint32 exchange(Operation operation, const QByteArray& request, Protocol::RequestFlags flags, QByteArray* body,
                    QDeadlineTimer deadline);
    qint32 send(Operation operation, const QByteArray& request, Protocol::RequestFlags flags, QDeadlineTimer deadline);
    qint32 receive(Operation operation, QByteArray* body, QDeadlineTimer deadline);
    // Sends a stream request, on a new connection if need be.
    qint32 sendStream(Operation operation, const QByteArray& request, QDeadlineTimer deadline);
    // Ends an upload stream at a frame boundary for a reason of this side (code), keeping
    // the connection in step.
    qint32 stopUpload(const Frame& header, qint32 code, QDeadlineTimer deadline);
    // The answer's result, its fields after the result into body.
    qint32 takeAnswer(const Frame& frame, Operation operation, QByteArray* body);
    // Raw stream access for bulk data, past the decoder: both fail the connection and
    // return the code on failure, else 0.
    qint32 readExactly(char* data, qint64 size, QDeadlineTimer deadline);
    qint32 writeAll(const char* data, qint64 size, QDeadlineTimer deadline);
    // Waits for the socket to be ready for POLLIN or POLLOUT; 0, or the failure's code.
    qint32 waitFor(short events, QDeadlineTimer deadline);
    bool answerWaiting();
    qint32 fail(qint32 code, const QString& message);
    bool answersPending(const Frame& frame, Operation operation) const;

    QString m_socketPath;
    QByteArray m_connectRequest;
    std::unique_ptr<QLocalSocket> m_socket;
    FrameDecoder m_decoder;
    quint32 m_nextRequestId = 1;
    std::deque<quint32> m_pending;  // request ids whose answers are still to come
    bool m_greeted = false;
    QString m_displayName;
    QString m_deviceId;
    QString m_error;
};
