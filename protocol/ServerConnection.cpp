#include "ServerConnection.h"

#include "FrameDecoder.h"
#include "PayloadStream.h"
#include "PortlexErrors.h"
#include "RequestHandler.h"

#include <QLocalSocket>
#include <QPointer>
#include <QtDebug>

#include <sys/socket.h>

#include <algorithm>
#include <cerrno>
#include <memory>

namespace {

// At most one whole request is read from the socket at a time.
constexpr qint64 ReadSize = Protocol::HeaderSize + Protocol::MaxRequestSize;

bool isDownload(const Frame& request)
{
    return request.operation == quint32(Operation::CopyToPCStream);
}

bool isStream(quint32 operation)
{
    return operation == quint32(Operation::CopyToPCStream) || operation == quint32(Operation::UploadStream);
}

} // namespace

ServerConnection::ServerConnection(QLocalSocket* socket, quint64 id, RequestHandler* handler, int latencyMs,
                                   int halfOpenTimeoutMs, QObject* parent)
    : QObject(parent), m_socket(socket), m_id(id), m_handler(handler), m_latencyMs(latencyMs)
{
    m_socket->setParent(this);
    // Unbounded, the socket would pull in whatever the client sends, served or not.
    m_socket->setReadBufferSize(ReadSize);
    Protocol::widenSocketBuffers(m_socket->socketDescriptor());
    connect(m_socket, &QLocalSocket::readyRead, this, &ServerConnection::onReadyRead);
    connect(m_socket, &QLocalSocket::bytesWritten, this, &ServerConnection::resumeWhenDrained);
    connect(m_socket, &QLocalSocket::disconnected, this, &ServerConnection::onDisconnected);
    m_halfOpenTimer.setSingleShot(true);
    m_halfOpenTimer.setInterval(halfOpenTimeoutMs);
    connect(&m_halfOpenTimer, &QTimer::timeout, this, [this] { refuse(QStringLiteral("idle while half open")); });
    m_halfOpenTimer.start();
    if (m_socket->bytesAvailable() > 0)
        QMetaObject::invokeMethod(this, &ServerConnection::onReadyRead, Qt::QueuedConnection);
}

void ServerConnection::shutdown()
{
    m_closing = true;
    m_halfOpenTimer.stop();
    m_socket->abort();
    onDisconnected();  // abort() reports only a socket that was still connected
}

qint64 ServerConnection::bufferedBytes() const
{
    return unsentBytes() + m_reading.payload.size() + m_piece.size() + m_socket->bytesAvailable();
}

qint64 ServerConnection::unsentBytes() const
{
    return m_socket->bytesToWrite() + m_delayedBytes;
}

void ServerConnection::onReadyRead()
{
    while (!m_closing) {
        // A client that does not take its answers gets no more served; what it sends
        // meanwhile waits in the kernel.
        m_paused = unsentBytes() > MaxUnsentBytes || (m_stream && isDownload(m_stream->request)) || m_throttled;
        if (m_paused || m_socket->bytesAvailable() == 0)
            break;
        if (m_headerFill < Protocol::HeaderSize) {
            m_headerFill += std::max<qint64>(m_socket->read(m_header + m_headerFill, Protocol::HeaderSize - m_headerFill), 0);
            if (m_headerFill < Protocol::HeaderSize || !startFrame())
                continue;
        } else if (m_reading.flags & Protocol::DataFlag) {
            // File bytes go to the upload as they come, not gathered into frames first.
            const qint64 got = m_socket->read(m_piece.data(), std::min<qint64>(m_piece.size(), m_payloadLeft));
            if (got > 0) {
                m_payloadLeft -= got;
                receiveUpload(m_reading.requestId, m_piece.constData(), got);
            }
        } else {
            const qint64 offset = m_reading.payload.size() - m_payloadLeft;
            m_payloadLeft -= std::max<qint64>(m_socket->read(m_reading.payload.data() + offset, m_payloadLeft), 0);
        }
        if (m_payloadLeft == 0 && !finishFrame())
            return;
    }
    updateHalfOpenTimer();
}

bool ServerConnection::startFrame()
{
    quint32 size = 0;
    QString error;
    if (!FrameDecoder::parseHeader(m_header, Protocol::MaxRequestSize, &m_reading, &size, &error)) {
        refuse(error);
        return false;
    }
    m_payloadLeft = size;
    if (m_reading.flags & Protocol::DataFlag) {
        if (!m_greeted || m_reading.version != Protocol::ProtocolVersion) {
            refuse(QStringLiteral("data frame outside a stream"));
            return false;
        }
        m_piece.resize(std::min<qint64>(size, Protocol::TransferChunkSize));
        m_reading.payload.clear();
    } else {
        m_reading.payload.resize(size);
    }
    return true;
}

bool ServerConnection::finishFrame()
{
    m_headerFill = 0;
    if (m_reading.flags & Protocol::DataFlag) {
        // An empty one is the client's stop.
        if (m_piece.isEmpty()) {
            receiveUpload(m_reading.requestId, nullptr, 0);
        } else if (m_latencyMs > 0) {
            // A slow device takes an upload's frames as slowly as it answers.
            m_throttled = true;
            QTimer::singleShot(m_latencyMs, this, [this] {
                m_throttled = false;
                onReadyRead();
            });
        }
        return true;
    }
    const bool open = dispatch(m_reading);
    m_reading.payload.clear();
    return open;
}

void ServerConnection::resumeWhenDrained()
{
    if (m_stream && isDownload(m_stream->request)) {
        sendDownload();
        return;
    }
    if (m_paused && !m_closing && unsentBytes() <= MaxUnsentBytes) {
        m_paused = false;
        // Requests already in the socket's buffer raise no new readyRead.
        QMetaObject::invokeMethod(this, &ServerConnection::onReadyRead, Qt::QueuedConnection);
    }
}

void ServerConnection::onDisconnected()
{
    if (m_reported)
        return;
    m_reported = true;
    m_closing = true;
    m_halfOpenTimer.stop();
    emit closed(this);
}

bool ServerConnection::dispatch(const Frame& frame)
{
    if (frame.operation == quint32(Operation::Hello)) {
        answerHello(frame);
        return m_greeted;
    }
    if (!m_greeted) {
        refuse(QStringLiteral("request before the handshake"));
        return false;
    }
    if (frame.version != Protocol::ProtocolVersion) {
        refuse(QStringLiteral("frame of protocol version %1 after the handshake").arg(frame.version));
        return false;
    }
    if (!Protocol::isKnownOperation(frame.operation)) {
        send(frame, PortlexError::UnknownOperation, QByteArray());
        return true;
    }
    Request request;
    request.connectionId = m_id;
    request.operation = static_cast<Operation>(frame.operation);
    request.flags = Protocol::RequestFlags(frame.flags);
    request.payload = frame.payload;
    const auto answering = std::make_shared<bool>(true);
    request.keepAlive = [connection = QPointer<ServerConnection>(this), answering, id = frame.requestId,
                         operation = frame.operation] {
        if (*answering && connection)
            connection->sendStillWorking(id, operation);
    };
    const Answer answer = m_handler->handle(request);
    *answering = false;
    if (answer.result == 0 && isStream(frame.operation))
        startStream(frame);
    else
        send(frame, answer.result, answer.body);
    return true;
}

void ServerConnection::startStream(const Frame& request)
{
    Stream stream;
    stream.request = request;
    stream.request.payload.clear();
    PayloadStream in(request.payload);
    in >> stream.transferId;
    if (!isDownload(request))
        in >> stream.expected;
    if (!in.ok()) {
        send(request, PortlexError::BadRequest, QByteArray());
        return;
    }
    m_stream = stream;
    if (isDownload(request))
        sendDownload();
    else if (stream.expected == 0)
        endStream(0);
}

void ServerConnection::sendDownload()
{
    Frame header = m_stream->request;
    header.flags = Protocol::DataFlag;
    m_dataFrame.resize(Protocol::HeaderSize + Protocol::TransferChunkSize);
    // One frame at a time, and only once the last is out: the client sets the pace.
    while (m_stream && !m_closing && unsentBytes() == 0) {
        const qint64 got = m_handler->readStream(m_id, m_stream->transferId, m_dataFrame.data() + Protocol::HeaderSize,
                                                 Protocol::TransferChunkSize);
        if (got <= 0) {
            endStream(qint32(-got));
            return;
        }
        header.encodeHeader(m_dataFrame.data(), quint32(got));
        if (m_latencyMs > 0)
            deliver(m_dataFrame.left(Protocol::HeaderSize + got));
        else
            writeDirect(m_dataFrame.constData(), Protocol::HeaderSize + got);
    }
}

void ServerConnection::receiveUpload(quint32 requestId, const char* data, qint64 size)
{
    // Data of a stream answered already (refused early) is dropped, as the client may
    // still be finishing it.
    if (!m_stream || isDownload(m_stream->request) || requestId != m_stream->request.requestId)
        return;
    const qint32 result = m_handler->writeStream(m_id, m_stream->transferId, data, size);
    m_stream->expected -= std::min<quint64>(m_stream->expected, quint64(size));
    if (result != 0 || m_stream->expected == 0)
        endStream(result);
}

void ServerConnection::endStream(qint32 result)
{
    const Frame request = m_stream->request;
    m_stream.reset();
    send(request, result, QByteArray());
    // Requests that came while a download was sent raise no new readyRead.
    QMetaObject::invokeMethod(this, &ServerConnection::onReadyRead, Qt::QueuedConnection);
}

void ServerConnection::writeDirect(const char* data, qint64 size)
{
    ssize_t written = 0;
    if (m_socket->bytesToWrite() == 0) {
        written = ::send(int(m_socket->socketDescriptor()), data, size_t(size), MSG_NOSIGNAL | MSG_DONTWAIT);
        if (written < 0 && errno != EAGAIN && errno != EWOULDBLOCK) {
            refuse(QStringLiteral("the client went away during a download"));
            return;
        }
        written = std::max<ssize_t>(written, 0);
    }
    if (written < size)
        m_socket->write(data + written, size - written);
}

void ServerConnection::answerHello(const Frame& frame)
{
    PayloadStream in(frame.payload);
    quint16 version = 0;
    QString clientName;
    in >> version >> clientName;
    if (!in.ok()) {
        refuse(QStringLiteral("unreadable handshake"));
        return;
    }
    if (version != Protocol::ProtocolVersion || frame.version != Protocol::ProtocolVersion) {
        const QString message = QStringLiteral("Protocol version %1 is not supported; this device speaks version %2")
                                    .arg(version)
                                    .arg(Protocol::ProtocolVersion);
        QByteArray body;
        PayloadStream out(&body);
        out << message;
        send(frame, PortlexError::VersionMismatch, body);
        m_closing = true;
        m_halfOpenTimer.stop();
        m_socket->disconnectFromServer();  // after the answer is written
        return;
    }
    m_greeted = true;
    QByteArray body;
    PayloadStream out(&body);
    out << m_handler->displayName() << m_handler->deviceId();
    send(frame, 0, body);
}

void ServerConnection::send(const Frame& request, qint32 result, const QByteArray& body)
{
    Frame answer;
    answer.requestId = request.requestId;
    answer.operation = request.operation;
    PayloadStream out(&answer.payload);
    if (quint32(body.size()) > Protocol::MaxPayloadSize - sizeof(qint32)) {
        qWarning("Answer to %s exceeds the frame limit", qPrintable(Protocol::operationName(Operation(request.operation))));
        // Refused with why, so that the user reads more than a bare code.
        out << qint32(PortlexError::Refused)
            << QStringLiteral("The answer (%1 bytes) is larger than the frame limit of %2 bytes")
                   .arg(body.size())
                   .arg(Protocol::MaxPayloadSize);
    } else {
        out << result;
        out.writeRawData(body.constData(), int(body.size()));
    }
    if (request.operation == quint32(Operation::Hello))
        write(answer.encode());
    else
        deliver(answer.encode());
}

void ServerConnection::deliver(const QByteArray& bytes)
{
    if (m_latencyMs <= 0) {
        write(bytes);
        return;
    }
    m_delayedBytes += bytes.size();
    QTimer::singleShot(m_latencyMs, this, [this, bytes] {
        m_delayedBytes -= bytes.size();
        write(bytes);
        resumeWhenDrained();
    });
}

void ServerConnection::sendStillWorking(quint32 requestId, quint32 operation)
{
    if (m_closing)
        return;
    Frame notice;
    notice.flags = Protocol::StillWorking;
    notice.requestId = requestId;
    notice.operation = operation;
    write(notice.encode());
}

void ServerConnection::write(const QByteArray& bytes)
{
    m_socket->write(bytes);
    // Hand the answer to the kernel now rather than on the next event loop pass.
    m_socket->flush();
}

void ServerConnection::refuse(const QString& reason)
{
    qWarning("Closing connection %llu: %s", m_id, qPrintable(reason));
    shutdown();
}

void ServerConnection::updateHalfOpenTimer()
{
    if (m_closing)
        return;
    // A frame left unread by back-pressure is the device's doing, not the client's.
    const bool halfOpen = !m_greeted || (m_headerFill > 0 && !m_paused);
    if (!halfOpen)
        m_halfOpenTimer.stop();
    else if (!m_halfOpenTimer.isActive())
        m_halfOpenTimer.start();
}
