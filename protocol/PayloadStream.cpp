#include "PayloadStream.h"

#include "Protocol.h"

#include <QIODevice>

PayloadStream::PayloadStream(const QByteArray& payload)
    : QDataStream(payload)
{
    setVersion(Protocol::StreamVersion);
    setByteOrder(QDataStream::LittleEndian);
}

PayloadStream::PayloadStream(QByteArray* payload)
    : QDataStream(payload, QIODevice::WriteOnly | QIODevice::Append)
{
    setVersion(Protocol::StreamVersion);
    setByteOrder(QDataStream::LittleEndian);
}
