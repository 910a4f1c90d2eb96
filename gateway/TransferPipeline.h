#pragma once

#include "ProgressCallback.h"
#include "Protocol.h"

#include <QtGlobal>

class DeviceConnection;
class QIODevice;

// Moves the bytes of one open transfer over a device connection, keeping a few chunk
// requests in flight so that round trips do not bound the speed. Every chunk gets the
// full call timeout, so a long transfer is never cut for taking long as a whole. A
// failure other than a transport failure leaves the connection in step (no answers
// pending), so that the transfer can be ended on it.
class TransferPipeline
{
public:
    static constexpr int Window = 4;  // chunk requests in flight

    explicit TransferPipeline(DeviceConnection& connection);

    // Sends size bytes of source as UploadChunk requests of the transfer. A source that
    // cannot be read gives LocalFileError after every pending answer was collected, so the
    // connection stays usable for the UploadAbort that should follow.
    // Both report to callback (see _ZantDevice::CopyFileToPC); a callback that answers
    // true ends the transfer with Cancelled, again with no answer pending.
    qint32 upload(quint32 transferId, QIODevice& source, quint64 size, PortlexProgressCallback callback = nullptr,
                  void* context = nullptr);
    // Receives size bytes of the transfer into sink; fewer bytes is TransferIncomplete.
    qint32 download(quint32 transferId, QIODevice& sink, quint64 size, PortlexProgressCallback callback = nullptr,
                    void* context = nullptr);

private:
    // Collects every pending answer; the first failure, else 0.
    qint32 drain(Operation operation);

    DeviceConnection& m_connection;
};
