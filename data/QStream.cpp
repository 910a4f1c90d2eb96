#include "QStream.h"

#include <QSysInfo>
#include <QtEndian>

QStream::QStream(int byteOrder)
    : m_byteOrder(byteOrder)
    , m_hostByteOrder(machineByteOrder())
{
}

QStream::~QStream() = default;

int QStream::machineByteOrder()
{
    static const int order = QSysInfo::ByteOrder == QSysInfo::LittleEndian ? LittleEndian : BigEndian;
    return order;
}

quint8 QStream::readUInt8()
{
    quint8 value = 0;
    return readBytes(reinterpret_cast<char*>(&value), sizeof value) ? value : 0;
}

quint8 QStream::readUInt8(quint8& value)
{
    value = readUInt8();
    return value;
}

quint16 QStream::readUInt16()
{
    quint16 value = 0;
    if (!readBytes(reinterpret_cast<char*>(&value), sizeof value))
        return 0;
    return swaps() ? qbswap(value) : value;
}

quint16 QStream::readUInt16(quint16& value)
{
    value = readUInt16();
    return value;
}

quint32 QStream::readUInt32()
{
    quint32 value = 0;
    if (!readBytes(reinterpret_cast<char*>(&value), sizeof value))
        return 0;
    return swaps() ? qbswap(value) : value;
}

quint32 QStream::readUInt32(quint32& value)
{
    value = readUInt32();
    return value;
}

void QStream::writeUInt32(quint32 value)
{
    if (swaps())
        value = qbswap(value);
    writeBytes(reinterpret_cast<const char*>(&value), sizeof value);
}

void QStream::writeUInt32(qint32 value)
{
    writeUInt32(quint32(value));
}

void QStream::writeUInt16(quint16 value)
{
    if (swaps())
        value = qbswap(value);
    writeBytes(reinterpret_cast<const char*>(&value), sizeof value);
}

void QStream::writeUInt16(qint16 value)
{
    writeUInt16(quint16(value));
}

void QStream::writeUInt8(quint8 value)
{
    writeBytes(reinterpret_cast<const char*>(&value), sizeof value);
}

void QStream::writeUInt8(qint8 value)
{
    writeUInt8(quint8(value));
}
