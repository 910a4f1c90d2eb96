#include "QVectorStream.h"

#include <cstring>

QVectorStream::QVectorStream(const QByteArray& data, int byteOrder)
    : QStream(byteOrder)
    , m_data(data)
{
}

bool QVectorStream::readBytes(char* buffer, qint64 count)
{
    if (count < 0 || count > m_data.size() - m_position) {
        m_atEnd = true;
        m_error = true;
        return false;
    }
    if (count > 0)
        std::memcpy(buffer, m_data.constData() + m_position, size_t(count));
    m_position += count;
    return true;
}

bool QVectorStream::writeBytes(const char* buffer, qint64 count)
{
    if (count < 0) {
        m_error = true;
        return false;
    }
    m_data.append(buffer, qsizetype(count));
    return true;
}
