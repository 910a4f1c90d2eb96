#pragma once

#include "Answer.h"
#include "PortlexErrors.h"
#include "Request.h"

#include <QString>

// What a device implements to be served by a FrameServer. All calls arrive on the
// server's thread, one at a time.
class RequestHandler
{
public:

    virtual ~RequestHandler() = default;

    // Identity given in the answer to Hello.
    virtual QString displayName() const = 0;
    virtual QString deviceId() const = 0;

    // Every request after the handshake. Unknown operations never arrive here.
    virtual Answer handle(const Request& request) = 0;

    // Bulk data of the stream requests (CopyToPCStream, UploadStream), once handle() has
    // accepted the request.
    // Up to max bytes of the open download into data: the count, 0 at the end of the file,
    // or a negative error code (the transfer is over).
    virtual qint64 readStream(quint64 connectionId, quint32 transferId, char* data, qint64 max)
    {
        Q_UNUSED(connectionId) Q_UNUSED(transferId) Q_UNUSED(data) Q_UNUSED(max)
        return -qint64(PortlexError::UnknownOperation);
    }
    // Bytes for the open upload: 0, or an error code (the transfer is over). No bytes (size
    // 0): the client stops the upload, which ends the transfer.
    virtual qint32 writeStream(quint64 connectionId, quint32 transferId, const char* data, qint64 size)
    {
        Q_UNUSED(connectionId) Q_UNUSED(transferId) Q_UNUSED(data) Q_UNUSED(size)
        return PortlexError::UnknownOperation;
    }

    // The connection is gone; its open transfers must be discarded.
    virtual void connectionClosed(quint64 connectionId) { Q_UNUSED(connectionId); }
};
