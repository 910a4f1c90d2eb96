#include "QBinaryStream.h"

#include <QIODevice>

QBinaryStream::QBinaryStream(QIODevice* device)
    : QStream(LittleEndian)
    , m_device(device)
{
}

bool QBinaryStream::atEnd() const
{
    return m_device->atEnd();
}

bool QBinaryStream::hasError() const
{
    return m_failed || !m_device->isOpen();
}

bool QBinaryStream::readBytes(char* buffer, qint64 count)
{
    if (count < 0 || !m_device->isReadable() || m_device->read(buffer, count) != count) {
        m_failed = true;
        return false;
    }
    return true;
}

bool QBinaryStream::writeBytes(const char* buffer, qint64 count)
{
    if (count < 0 || !m_device->isWritable() || m_device->write(buffer, count) != count) {
        m_failed = true;
        return false;
    }
    return true;
}
