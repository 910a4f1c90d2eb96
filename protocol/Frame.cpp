#include "Frame.h"

#include <QtEndian>

QByteArray Frame::encode() const
{
    Q_ASSERT(quint32(payload.size()) <= Protocol::MaxPayloadSize);
    QByteArray bytes(Protocol::HeaderSize + payload.size(), Qt::Uninitialized);
    encodeHeader(bytes.data(), quint32(payload.size()));
    memcpy(bytes.data() + Protocol::HeaderSize, payload.constData(), payload.size());
    return bytes;
}

void Frame::encodeHeader(char* out, quint32 payloadSize) const
{
    uchar* header = reinterpret_cast<uchar*>(out);
    qToBigEndian<quint32>(Protocol::FrameMagic, header);
    qToBigEndian<quint32>(payloadSize, header + 4);
    qToBigEndian<quint16>(version, header + 8);
    qToBigEndian<quint16>(flags, header + 10);
    qToBigEndian<quint32>(requestId, header + 12);
    qToBigEndian<quint32>(operation, header + 16);
}
