#include "Frame.h"

#include <QtEndian>

QByteArray Frame::encode() const
{
    Q_ASSERT(quint32(payload.size()) <= Protocol::MaxPayloadSize);
    QByteArray bytes(Protocol::HeaderSize + payload.size(), Qt::Uninitialized);
    uchar* header = reinterpret_cast<uchar*>(bytes.data());
    qToBigEndian<quint32>(Protocol::FrameMagic, header);
    qToBigEndian<quint32>(quint32(payload.size()), header + 4);
    qToBigEndian<quint16>(version, header + 8);
    qToBigEndian<quint16>(flags, header + 10);
    qToBigEndian<quint32>(requestId, header + 12);
    qToBigEndian<quint32>(operation, header + 16);
    memcpy(header + Protocol::HeaderSize, payload.constData(), payload.size());
    return bytes;
}
