#include "ServerConnection.h"

#include "PortlexErrors.h"
#include "RequestHandler.h"

#include <QLocalSocket>
#include <QPointer>
#include <QtDebug>

#include <memory>

namespace {

// At most one whole request is read from the socket at a time.
constexpr qint64 ReadSize = Protocol::HeaderSize + Protocol::MaxRequestSize;

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
    return unsentBytes() + m_decoder.bufferedBytes() + m_socket->bytesAvailable();
}

qint64 ServerConnection::unsentBytes() const
{
    return m_socket->bytesToWrite() + m_delayedBytes;
}

void ServerConnection::onReadyRead()
{
    Frame frame;
    while (!m_closing) {
        // A client that does not take its answers gets no more served; what it sends
        // meanwhile waits in the kernel.
        m_paused = unsentBytes() > MaxUnsentBytes;
        if (m_paused)
            break;
        const FrameDecoder::Status status = m_decoder.next(&frame);
        if (status == FrameDecoder::Status::Malformed) {
            refuse(m_decoder.errorString());
            return;
        }
        if (status == FrameDecoder::Status::Ready) {
            if (!dispatch(frame))
                return;
        } else if (m_socket->bytesAvailable() > 0) {
            m_decoder.feed(m_socket->read(ReadSize));
        } else {
            break;
        }
    }
    updateHalfOpenTimer();
}

void ServerConnection::resumeWhenDrained()
{
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
    send(frame, answer.result, answer.body);
    return true;
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
        out << qint32(PortlexError::IoError);
    } else {
        out << result;
        out.writeRawData(body.constData(), int(body.size()));
    }
    const QByteArray bytes = answer.encode();
    if (m_latencyMs > 0 && request.operation != quint32(Operation::Hello)) {
        m_delayedBytes += bytes.size();
        QTimer::singleShot(m_latencyMs, this, [this, bytes] {
            m_delayedBytes -= bytes.size();
            write(bytes);
            resumeWhenDrained();
        });
    } else {
        write(bytes);
    }
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
    const bool halfOpen = !m_greeted || (m_decoder.hasPartialFrame() && !m_paused);
    if (!halfOpen)
        m_halfOpenTimer.stop();
    else if (!m_halfOpenTimer.isActive())
        m_halfOpenTimer.start();
}
