#include "ServerConnection.h"

#include "PortlexErrors.h"
#include "RequestHandler.h"

#include <QLocalSocket>
#include <QtDebug>

ServerConnection::ServerConnection(QLocalSocket* socket, quint64 id, RequestHandler* handler, int latencyMs,
                                   int halfOpenTimeoutMs, QObject* parent)
    : QObject(parent), m_socket(socket), m_id(id), m_handler(handler), m_latencyMs(latencyMs)
{
    m_socket->setParent(this);
    Protocol::widenSocketBuffers(m_socket->socketDescriptor());
    connect(m_socket, &QLocalSocket::readyRead, this, &ServerConnection::onReadyRead);
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

void ServerConnection::onReadyRead()
{
    if (m_closing)
        return;
    m_decoder.feed(m_socket->readAll());
    Frame frame;
    for (;;) {
        const FrameDecoder::Status status = m_decoder.next(&frame);
        if (status == FrameDecoder::Status::NeedMore)
            break;
        if (status == FrameDecoder::Status::Malformed) {
            refuse(m_decoder.errorString());
            return;
        }
        if (!dispatch(frame))
            return;
    }
    updateHalfOpenTimer();
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
    const Answer answer = m_handler->handle(request);
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
    if (m_latencyMs > 0 && request.operation != quint32(Operation::Hello))
        QTimer::singleShot(m_latencyMs, this, [this, bytes] { write(bytes); });
    else
        write(bytes);
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
    const bool halfOpen = !m_greeted || m_decoder.hasPartialFrame();
    if (!halfOpen)
        m_halfOpenTimer.stop();
    else if (!m_halfOpenTimer.isActive())
        m_halfOpenTimer.start();
}
