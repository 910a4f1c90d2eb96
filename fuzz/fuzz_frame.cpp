// Feeds bytes to the frame decoder that both ends of a gateway connection use, in
// chunks of varying size, and decodes every frame it yields the way a receiver would:
// the handshake fields and, for answers, the result and the records of the operation.

#include "FrameDecoder.h"
#include "PayloadStream.h"
#include "RecordStreams.h"

#include <cstddef>
#include <cstdint>

namespace {

template <typename T>
void readAs(PayloadStream& in)
{
    T value;
    in >> value;
}

template <typename T>
void readListOf(PayloadStream& in)
{
    QVector<T> list;
    readList(in, list);
}

void decodePayload(const Frame& frame)
{
    PayloadStream in(frame.payload);
    if (frame.operation == quint32(Operation::Hello)) {
        quint16 version = 0;
        QString client;
        in >> version >> client;  // as the device reads a request
    }
    PayloadStream answer(frame.payload);
    qint32 result = 0;
    answer >> result;
    switch (Operation(frame.operation)) {
    case Operation::GetCache:
        readAs<DeviceCache>(answer);
        break;
    case Operation::GetModules:
        readListOf<ModuleInfo>(answer);
        break;
    case Operation::GetModuleMif:
        readAs<MifEntry>(answer);
        break;
    case Operation::GetLoadedModules:
        readListOf<LoadedModuleInfo>(answer);
        break;
    case Operation::GetProcesses:
        readListOf<ProcessInfo>(answer);
        break;
    case Operation::GetVolumes:
        readListOf<VolumeInfo>(answer);
        break;
    case Operation::GetRegistry:
        readListOf<RegistryInfo>(answer);
        break;
    case Operation::GetChildSettings:
        readAs<_SettingsInfo>(answer);
        break;
    case Operation::GetFileSystemLevel:
        readAs<_DirectoryInfo>(answer);
        break;
    case Operation::GetTepSigPrivs:
        readListOf<PriviledgeRecord>(answer);
        break;
    default:
        readAs<QString>(answer);
        break;
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    if (size == 0)
        return 0;
    const qsizetype chunk = 1 + data[0] % 97;
    const QByteArray stream = QByteArray::fromRawData(reinterpret_cast<const char*>(data + 1), qsizetype(size - 1));
    FrameDecoder decoder;
    for (qsizetype offset = 0; offset < stream.size(); offset += chunk) {
        decoder.feed(stream.mid(offset, chunk));
        Frame frame;
        FrameDecoder::Status status;
        while ((status = decoder.next(&frame)) == FrameDecoder::Status::Ready)
            decodePayload(frame);
        if (status == FrameDecoder::Status::Malformed)
            break;
    }
    return 0;
}
