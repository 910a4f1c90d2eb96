#include "TransferPipeline.h"

#include "DeviceConnection.h"
#include "PayloadStream.h"
#include "PortlexErrors.h"

#include <QIODevice>

#include <algorithm>

namespace {

QDeadlineTimer chunkDeadline()
{
    return QDeadlineTimer(DeviceConnection::callTimeoutMs());
}

QByteArray chunkRequest(quint32 transferId, const char* data, qint64 length)
{
    QByteArray request;
    request.reserve(int(length) + 16);
    PayloadStream out(&request);
    out << transferId;
    out.writeBytes(data, uint(length));  // the QByteArray encoding, without a copy
    return request;
}

// KiB, rounded up, so that an int holds 2 TiB.
int kib(quint64 bytes)
{
    return int((bytes + 1023) / 1024);
}

// Tells the callback how far the transfer is; true when it asks to stop.
bool report(PortlexProgressCallback callback, void* context, int value, quint64 size)
{
    return callback && callback(context, value, kib(size), QString());
}

} // namespace

TransferPipeline::TransferPipeline(DeviceConnection& connection)
    : m_connection(connection)
{
}

qint32 TransferPipeline::upload(quint32 transferId, QIODevice& source, quint64 size, PortlexProgressCallback callback,
                                void* context)
{
    QByteArray buffer(int(Protocol::TransferChunkSize), Qt::Uninitialized);
    quint64 sent = 0;
    bool stop = report(callback, context, -1, size);
    while (sent < size && !stop) {
        const qint64 wanted = qint64(std::min<quint64>(size - sent, Protocol::TransferChunkSize));
        const qint64 got = source.read(buffer.data(), wanted);
        if (got != wanted) {
            const qint32 pending = drain(Operation::UploadChunk);
            return pending != 0 ? pending : qint32(PortlexError::LocalFileError);
        }
        qint32 result = m_connection.post(Operation::UploadChunk, chunkRequest(transferId, buffer.constData(), got),
                                          chunkDeadline());
        if (result != 0)
            return result;
        sent += quint64(got);
        if (m_connection.pendingAnswers() >= Window) {
            QByteArray body;
            result = m_connection.collect(Operation::UploadChunk, &body, chunkDeadline());
            if (result != 0)
                return result;
        }
        stop = report(callback, context, kib(sent), size);
    }
    const qint32 pending = drain(Operation::UploadChunk);
    return pending != 0 || !stop ? pending : qint32(PortlexError::Cancelled);
}

qint32 TransferPipeline::drain(Operation operation)
{
    qint32 first = 0;
    while (m_connection.pendingAnswers() > 0) {
        QByteArray body;
        const qint32 result = m_connection.collect(operation, &body, chunkDeadline());
        if (first == 0)
            first = result;
    }
    return first;
}

qint32 TransferPipeline::download(quint32 transferId, QIODevice& sink, quint64 size, PortlexProgressCallback callback,
                                  void* context)
{
    quint64 requested = 0;
    quint64 received = 0;
    if (report(callback, context, -1, size))
        return PortlexError::Cancelled;
    while (received < size) {
        while (requested < size && m_connection.pendingAnswers() < Window) {
            const quint32 wanted = quint32(std::min<quint64>(size - requested, Protocol::TransferChunkSize));
            QByteArray request;
            PayloadStream out(&request);
            out << transferId << wanted;
            const qint32 result = m_connection.post(Operation::CopyToPCChunk, request, chunkDeadline());
            if (result != 0)
                return result;
            requested += wanted;
        }
        QByteArray body;
        const qint32 result = m_connection.collect(Operation::CopyToPCChunk, &body, chunkDeadline());
        if (result != 0)
            return result;
        PayloadStream in(body);
        QByteArray bytes;
        in >> bytes;
        if (!in.ok() || quint64(bytes.size()) > size - received)
            return PortlexError::ProtocolError;
        if (bytes.isEmpty()) {
            // The file shrank on the device: what is pending is empty as well.
            const qint32 pending = drain(Operation::CopyToPCChunk);
            return pending != 0 ? pending : qint32(PortlexError::TransferIncomplete);
        }
        if (sink.write(bytes) != bytes.size()) {
            const qint32 pending = drain(Operation::CopyToPCChunk);
            return pending != 0 ? pending : qint32(PortlexError::LocalFileError);
        }
        received += quint64(bytes.size());
        if (report(callback, context, kib(received), size)) {
            const qint32 pending = drain(Operation::CopyToPCChunk);
            return pending != 0 ? pending : qint32(PortlexError::Cancelled);
        }
    }
    return 0;
}
