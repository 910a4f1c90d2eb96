#include "DeviceConnection.h"

#include "PayloadStream.h"
#include "PortlexErrors.h"

#include <QFileInfo>
#include <QLocalSocket>

#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>

namespace {

std::atomic<int> callTimeout { Protocol::CallTimeoutMs };

} // namespace

int DeviceConnection::callTimeoutMs()
{
    return callTimeout.load();
}

void DeviceConnection::setCallTimeoutMs(int milliseconds)
{
    callTimeout = milliseconds;
}

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

qint32 DeviceConnection::sendStream(Operation operation, const QByteArray& request, QDeadlineTimer deadline)
{
    if (!usable()) {
        const qint32 opened = open(deadline);
        if (opened != 0)
            return opened;
    }
    return send(operation, request, Protocol::NoFlags, deadline);
}

qint32 DeviceConnection::download(Operation operation, const QByteArray& request, const DataSink& sink,
                                  QDeadlineTimer deadline)
{
    qint32 result = sendStream(operation, request, deadline);
    if (result != 0)
        return result;
    const qint64 patience = deadline.remainingTime();
    QDeadlineTimer working(patience * Protocol::StillWorkingLimit);
    QByteArray data(int(Protocol::TransferChunkSize), Qt::Uninitialized);
    for (;;) {
        char header[Protocol::HeaderSize];
        if ((result = readExactly(header, Protocol::HeaderSize, deadline)) != 0)
            return result;
        Frame frame;
        quint32 size = 0;
        QString error;
        if (!FrameDecoder::parseHeader(header, Protocol::MaxPayloadSize, &frame, &size, &error))
            return fail(PortlexError::ProtocolError, error);
        if (!answersPending(frame, operation))
            return fail(PortlexError::ProtocolError, QStringLiteral("Frame does not match the request"));
        deadline.setRemainingTime(patience);
        if (frame.flags & Protocol::DataFlag) {
            if (size > Protocol::TransferChunkSize)
                return fail(PortlexError::ProtocolError, QStringLiteral("Data frame of %1 bytes").arg(size));
            if ((result = readExactly(data.data(), size, deadline)) != 0)
                return result;
            if ((result = sink(data.constData(), size)) != 0)
                return fail(result, QStringLiteral("The download was stopped on this side"));
            working.setRemainingTime(patience * Protocol::StillWorkingLimit);
            continue;
        }
        if (frame.flags & Protocol::StillWorking) {
            if (working.hasExpired())
                return fail(PortlexError::Timeout, QStringLiteral("The device kept working for %1 ms without sending").arg(patience * Protocol::StillWorkingLimit));
            continue;
        }
        frame.payload.resize(size);
        if ((result = readExactly(frame.payload.data(), size, deadline)) != 0)
            return result;
        QByteArray body;
        return takeAnswer(frame, operation, &body);
    }
}

qint32 DeviceConnection::upload(Operation operation, const QByteArray& request, int file, quint64 size,
                                const UploadProgress& progress, QDeadlineTimer deadline)
{
    qint32 result = sendStream(operation, request, deadline);
    if (result != 0)
        return result;
    const qint64 patience = deadline.remainingTime();
    Frame header;
    header.flags = Protocol::DataFlag;
    header.requestId = m_pending.back();
    header.operation = quint32(operation);
    QByteArray frame(int(Protocol::HeaderSize + Protocol::TransferChunkSize), Qt::Uninitialized);
    quint64 sent = 0;
    // An answer before the end is a refusal: stop sending and read it.
    while (sent < size && !answerWaiting()) {
        const quint32 length = quint32(std::min<quint64>(size - sent, Protocol::TransferChunkSize));
        qint64 read = 0;
        while (read < length) {
            const ssize_t got = ::pread(file, frame.data() + Protocol::HeaderSize + read, length - read, off_t(sent + read));
            if (got <= 0 && !(got < 0 && errno == EINTR))
                return stopUpload(header, PortlexError::LocalFileError, deadline);
            read += std::max<ssize_t>(got, 0);
        }
        header.encodeHeader(frame.data(), length);
        if ((result = writeAll(frame.constData(), Protocol::HeaderSize + length, deadline)) != 0)
            return result;
        sent += length;
        deadline.setRemainingTime(patience);
        if (progress && (result = progress(sent)) != 0)
            return stopUpload(header, result, deadline);
    }
    QByteArray body;
    return receive(operation, &body, deadline);
}

qint32 DeviceConnection::stopUpload(const Frame& header, qint32 code, QDeadlineTimer deadline)
{
    // An empty Data frame ends the upload on the device, which removes what it received
    // before it answers: when this returns, nothing of the file is left there.
    char empty[Protocol::HeaderSize];
    header.encodeHeader(empty, 0);
    QByteArray body;
    if (writeAll(empty, Protocol::HeaderSize, deadline) == 0)
        receive(Operation(header.operation), &body, deadline);
    m_error = QStringLiteral("The upload was stopped on this side");
    return code;
}

bool DeviceConnection::startHandshake()
{
    return connectSocket() == 0;
}

qint32 DeviceConnection::connectSocket()
{
    m_greeted = false;
    m_decoder.clear();
    m_pending.clear();
    const QString folder = QFileInfo(m_socketPath).absolutePath();
    QString unsafe;
    if (!QFileInfo::exists(folder))
        return fail(PortlexError::Unreachable, QStringLiteral("No device listens on %1: no such folder").arg(m_socketPath));
    if (!Protocol::checkSocketDirectory(folder, &unsafe))
        return fail(PortlexError::Untrusted, unsafe);
    m_socket = std::make_unique<QLocalSocket>();
    m_socket->connectToServer(m_socketPath);
    if (m_socket->state() == QLocalSocket::UnconnectedState)
        return fail(PortlexError::Unreachable,
                    QStringLiteral("No device listens on %1: %2").arg(m_socketPath, m_socket->errorString()));
    return 0;
}

qint32 DeviceConnection::finishHandshake(QDeadlineTimer deadline)
{
    if (!m_socket)
        return PortlexError::Unreachable;
    if (m_socket->state() != QLocalSocket::ConnectedState && !m_socket->waitForConnected(deadline.remainingTime()))
        return fail(PortlexError::Unreachable, QStringLiteral("No device listens on %1").arg(m_socketPath));
    // Whoever listens there learns nothing from us unless it is our own user's process.
    ucred peer {};
    socklen_t length = sizeof peer;
    if (::getsockopt(int(m_socket->socketDescriptor()), SOL_SOCKET, SO_PEERCRED, &peer, &length) != 0)
        return fail(PortlexError::Untrusted, QStringLiteral("Cannot tell who runs the device on %1").arg(m_socketPath));
    if (peer.uid != ::geteuid())
        return fail(PortlexError::Untrusted,
                    QStringLiteral("The device on %1 runs as another user (uid %2)").arg(m_socketPath).arg(peer.uid));
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
        return fail(result, QStringLiteral("The device refused the handshake"));
    in >> m_displayName >> m_deviceId;
    if (!in.ok())
        return fail(PortlexError::ProtocolError, QStringLiteral("Unreadable handshake answer"));
    m_greeted = true;
    return 0;
}

qint32 DeviceConnection::open(QDeadlineTimer deadline)
{
    const qint32 connected = connectSocket();
    const qint32 greeted = connected != 0 ? connected : finishHandshake(deadline);
    if (greeted != 0 || m_connectRequest.isEmpty())
        return greeted;
    QByteArray body;
    const qint32 accepted = exchange(Operation::Connect, m_connectRequest, Protocol::NoFlags, &body, deadline);
    if (accepted == 0 || !m_socket)
        return accepted;  // done, or the exchange failed and said why
    QString status;
    PayloadStream in(body);
    in >> status;
    return fail(accepted, QStringLiteral("The device refused the connection: %1").arg(status));
}

bool DeviceConnection::usable()
{
    if (!m_socket || !m_greeted || m_socket->state() != QLocalSocket::ConnectedState)
        return false;
    // A device that went away since the last call shows up as end of file now; bytes
    // nobody asked for (or answers still owed to a cut stream) mean the stream is out of step. Either way, start afresh. One
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
    if (quint32(request.size()) > Protocol::MaxRequestSize)
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
                        QStringLiteral("The device did not take the request in time"));
    }
    return 0;
}

qint32 DeviceConnection::receive(Operation operation, QByteArray* body, QDeadlineTimer deadline)
{
    // The caller's time is a limit on silence: each StillWorking notice grants it afresh,
    // up to StillWorkingLimit times that time in all.
    const qint64 patience = deadline.remainingTime();
    const QDeadlineTimer working(patience * Protocol::StillWorkingLimit);
    Frame frame;
    for (;;) {
        const FrameDecoder::Status status = m_decoder.next(&frame);
        if (status == FrameDecoder::Status::Ready) {
            if ((frame.flags & Protocol::StillWorking) == 0)
                break;
            if (!answersPending(frame, operation))
                return fail(PortlexError::ProtocolError, QStringLiteral("Notice does not match the request"));
            if (working.hasExpired())
                return fail(PortlexError::Timeout, QStringLiteral("The device kept working for %1 ms without answering").arg(patience * Protocol::StillWorkingLimit));
            deadline.setRemainingTime(std::min(patience, working.remainingTime()));
            continue;
        }
        if (status == FrameDecoder::Status::Malformed)
            return fail(PortlexError::ProtocolError, m_decoder.errorString());
        if (m_socket->bytesAvailable() == 0 && !m_socket->waitForReadyRead(int(deadline.remainingTime()))) {
            if (m_socket->state() != QLocalSocket::ConnectedState)
                return fail(PortlexError::Unreachable, QStringLiteral("The device closed the connection"));
            return fail(PortlexError::Timeout, QStringLiteral("The device gave no sign of life for %1 ms").arg(patience));
        }
        m_decoder.feed(m_socket->readAll());
    }

    return takeAnswer(frame, operation, body);
}

qint32 DeviceConnection::takeAnswer(const Frame& frame, Operation operation, QByteArray* body)
{
    if (!answersPending(frame, operation))
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

qint32 DeviceConnection::waitFor(short events, QDeadlineTimer deadline)
{
    pollfd watched { int(m_socket->socketDescriptor()), events, 0 };
    for (;;) {
        const int ready = ::poll(&watched, 1, int(std::max<qint64>(deadline.remainingTime(), 0)));
        if (ready > 0)
            return 0;
        if (ready == 0)
            return fail(PortlexError::Timeout, QStringLiteral("The device gave no sign of life in time"));
        if (errno != EINTR)
            return fail(PortlexError::Unreachable, QStringLiteral("The connection failed"));
    }
}

qint32 DeviceConnection::readExactly(char* data, qint64 size, QDeadlineTimer deadline)
{
    // What the decoder or the socket object hold already comes first.
    qint64 done = m_decoder.take(data, size);
    if (done < size && m_socket->bytesAvailable() > 0)
        done += std::max<qint64>(m_socket->read(data + done, size - done), 0);
    const int descriptor = int(m_socket->socketDescriptor());
    while (done < size) {
        const ssize_t got = ::recv(descriptor, data + done, size_t(size - done), MSG_DONTWAIT);
        if (got > 0) {
            done += got;
        } else if (got == 0) {
            return fail(PortlexError::Unreachable, QStringLiteral("The device closed the connection"));
        } else if (errno == EAGAIN || errno == EWOULDBLOCK) {
            const qint32 waited = waitFor(POLLIN, deadline);
            if (waited != 0)
                return waited;
        } else if (errno != EINTR) {
            return fail(PortlexError::Unreachable, QStringLiteral("The connection failed"));
        }
    }
    return 0;
}

qint32 DeviceConnection::writeAll(const char* data, qint64 size, QDeadlineTimer deadline)
{
    const int descriptor = int(m_socket->socketDescriptor());
    qint64 done = 0;
    while (done < size) {
        const ssize_t written = ::send(descriptor, data + done, size_t(size - done), MSG_NOSIGNAL | MSG_DONTWAIT);
        if (written >= 0) {
            done += written;
        } else if (errno == EAGAIN || errno == EWOULDBLOCK) {
            const qint32 waited = waitFor(POLLOUT, deadline);
            if (waited != 0)
                return waited;
        } else if (errno != EINTR) {
            return fail(PortlexError::Unreachable, QStringLiteral("The device closed the connection"));
        }
    }
    return 0;
}

bool DeviceConnection::answerWaiting()
{
    char probe;
    return m_decoder.hasPartialFrame() || m_socket->bytesAvailable() > 0
        || ::recv(int(m_socket->socketDescriptor()), &probe, 1, MSG_PEEK | MSG_DONTWAIT) > 0;
}

bool DeviceConnection::answersPending(const Frame& frame, Operation operation) const
{
    // A refused handshake comes in the device's own version; everything else in ours.
    const bool versionOk = frame.version == Protocol::ProtocolVersion || operation == Operation::Hello;
    return versionOk && !m_pending.empty() && frame.requestId == m_pending.front() && frame.operation == quint32(operation);
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
