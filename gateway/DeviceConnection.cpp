#include "DeviceConnection.h"

#include "PayloadStream.h"
#include "PortlexErrors.h"

#include <QLocalSocket>

#include <sys/socket.h>

#include <cerrno>

DeviceConnection::DeviceConnection(const QString& socketPath)
    : m_socketPath(socketPath)
{
}

DeviceConnection::~DeviceConnection() = default;

qint32 DeviceConnection::call(Operation operation, const QByteArray& request, Protocol::RequestFlags flags,
                              QByteArray* body, QDeadlineTimer deadline)
{
    if (!usable()) {
        const qint32 opened = open(deadline);
        if (opened != 0)
            return opened;
    }
    return exchange(operation, request, flags, body, deadline);
}

qint32 DeviceConnection::post(Operation operation, const QByteArray& request, QDeadlineTimer deadline)
{
    if (m_pending.empty() && !usable()) {
        const qint32 opened = open(deadline);
        if (opened != 0)
            return opened;
    }
    if (!m_socket)
        return PortlexError::Unreachable;
    return send(operation, request, Protocol::NoFlags, deadline);
}

qint32 DeviceConnection::collect(Operation operation, QByteArray* body, QDeadlineTimer deadline)
{
    if (!m_socket || m_pending.empty())
        return fail(PortlexError::ProtocolError, QStringLiteral("No answer is pending"));
    return receive(operation, body, deadline);
}

bool DeviceConnection::startHandshake()
{
    m_greeted = false;
    m_decoder.clear();
    m_pending.clear();
    m_socket = std::make_unique<QLocalSocket>();
    m_socket->connectToServer(m_socketPath);
    if (m_socket->state() == QLocalSocket::UnconnectedState) {
        fail(PortlexError::Unreachable, QStringLiteral("No device listens on %1: %2").arg(m_socketPath, m_socket->errorString()));
        return false;
    }
    return true;
}

qint32 DeviceConnection::finishHandshake(QDeadlineTimer deadline)
{
    if (!m_socket)
        return PortlexError::Unreachable;
    if (m_socket->state() != QLocalSocket::ConnectedState && !m_socket->waitForConnected(deadline.remainingTime()))
        return fail(PortlexError::Unreachable, QStringLiteral("No device listens on %1").arg(m_socketPath));
    Protocol::widenSocketBuffers(m_socket->socketDescriptor());

    QByteArray hello;
    PayloadStream out(&hello);
    out << Protocol::ProtocolVersion << QStringLiteral("portlex");
    QByteArray body;
    const qint32 result = exchange(Operation::Hello, hello, Protocol::NoFlags, &body, deadline);
    if (!m_socket)
        return result;  // the exchange failed and said why
    PayloadStream in(body);
    if (result == PortlexError::VersionMismatch) {
        QString message;
        in >> message;
        return fail(result, message.isEmpty() ? QStringLiteral("The device speaks another protocol version") : message);
    }
    if (result != 0)
        return fail(result, QStringLiteral("The device refused the handshake (%1)").arg(result));
    in >> m_displayName >> m_deviceId;
    if (!in.ok())
        return fail(PortlexError::ProtocolError, QStringLiteral("Unreadable handshake answer"));
    m_greeted = true;
    return 0;
}

qint32 DeviceConnection::open(QDeadlineTimer deadline)
{
    if (!startHandshake())
        return PortlexError::Unreachable;
    return finishHandshake(deadline);
}

bool DeviceConnection::usable()
{
    if (!m_socket || !m_greeted || m_socket->state() != QLocalSocket::ConnectedState)
        return false;
    // A device that went away since the last call shows up as end of file now; bytes
    // nobody asked for (or answers still owed to a cut pipeline) mean the stream is out of step. Either way, start afresh. One
    // non-blocking peek tells both apart from a healthy idle connection.
    char probe;
    const ssize_t peeked = ::recv(int(m_socket->socketDescriptor()), &probe, 1, MSG_PEEK | MSG_DONTWAIT);
    const bool idle = peeked < 0 && (errno == EAGAIN || errno == EWOULDBLOCK);
    if (!idle || !m_pending.empty() || m_decoder.hasPartialFrame() || m_socket->bytesAvailable() > 0) {
        m_socket.reset();
        return false;
    }
    return true;
}

qint32 DeviceConnection::exchange(Operation operation, const QByteArray& request, Protocol::RequestFlags flags,
                                  QByteArray* body, QDeadlineTimer deadline)
{
    const qint32 sent = send(operation, request, flags, deadline);
    if (sent != 0)
        return sent;
    return receive(operation, body, deadline);
}

qint32 DeviceConnection::send(Operation operation, const QByteArray& request, Protocol::RequestFlags flags,
                              QDeadlineTimer deadline)
{
    if (quint32(request.size()) > Protocol::MaxPayloadSize)
        return fail(PortlexError::InvalidArgument, QStringLiteral("Request of %1 bytes exceeds the frame limit").arg(request.size()));
    Frame frame;
    frame.flags = quint16(flags.toInt());
    frame.requestId = m_nextRequestId++;
    frame.operation = quint32(operation);
    frame.payload = request;
    m_pending.push_back(frame.requestId);

    const QByteArray bytes = frame.encode();
    if (m_socket->write(bytes) != bytes.size())
        return fail(PortlexError::Unreachable, QStringLiteral("The device closed the connection"));
    m_socket->flush();
    while (m_socket->bytesToWrite() > 0) {
        if (!m_socket->waitForBytesWritten(int(deadline.remainingTime())))
            return fail(m_socket->state() == QLocalSocket::ConnectedState ? PortlexError::Timeout : PortlexError::Unreachable,
                        QStringLiteral("The device did not take the request within %1 ms").arg(Protocol::CallTimeoutMs));
    }
    return 0;
}

qint32 DeviceConnection::receive(Operation operation, QByteArray* body, QDeadlineTimer deadline)
{
    Frame frame;
    for (;;) {
        const FrameDecoder::Status status = m_decoder.next(&frame);
        if (status == FrameDecoder::Status::Ready)
            break;
        if (status == FrameDecoder::Status::Malformed)
            return fail(PortlexError::ProtocolError, m_decoder.errorString());
        if (m_socket->bytesAvailable() == 0 && !m_socket->waitForReadyRead(int(deadline.remainingTime()))) {
            if (m_socket->state() != QLocalSocket::ConnectedState)
                return fail(PortlexError::Unreachable, QStringLiteral("The device closed the connection"));
            return fail(PortlexError::Timeout, QStringLiteral("The device did not answer within %1 ms").arg(Protocol::CallTimeoutMs));
        }
        m_decoder.feed(m_socket->readAll());
    }

    // A refused handshake comes in the device's own version; everything else in ours.
    const bool versionOk = frame.version == Protocol::ProtocolVersion || operation == Operation::Hello;
    if (!versionOk || m_pending.empty() || frame.requestId != m_pending.front() || frame.operation != quint32(operation))
        return fail(PortlexError::ProtocolError, QStringLiteral("Answer does not match the request"));
    m_pending.pop_front();
    PayloadStream in(frame.payload);
    qint32 result = 0;
    in >> result;
    if (!in.ok())
        return fail(PortlexError::ProtocolError, QStringLiteral("Answer without a result"));
    *body = frame.payload.mid(sizeof(qint32));
    return result;
}

qint32 DeviceConnection::fail(qint32 code, const QString& message)
{
    m_error = message;
    m_greeted = false;
    m_decoder.clear();
    m_pending.clear();
    m_socket.reset();
    return code;
}
