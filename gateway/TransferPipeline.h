#pragma once

#include <QtGlobal>

class DeviceConnection;
class QIODevice;

// Moves the bytes of one open transfer over a device connection, keeping a few chunk
// requests in flight so that round trips do not bound the speed. Every chunk gets the
// full call timeout, so a long transfer is never cut for taking long as a whole.
class TransferPipeline
{
public:
    static constexpr int Window = 4;  // chunk requests in flight

    explicit TransferPipeline(DeviceConnection& connection);

    // Sends size bytes of source as UploadChunk requests of the transfer. A source that
    // cannot be read gives LocalFileError after every pending answer was collected, so the
    // connection stays usable for the UploadAbort that should follow.
    qint32 upload(quint32 transferId, QIODevice& source, quint64 size);
    // Receives size bytes of the transfer into sink; fewer bytes is TransferIncomplete.
    qint32 download(quint32 transferId, QIODevice& sink, quint64 size);

private:
    qint32 drain();

    DeviceConnection& m_connection;
};
