#include "FrameDecoder.h"

#include <QtEndian>

#include <algorithm>
#include <cstring>

void FrameDecoder::feed(const QByteArray& bytes)
{
    // Drop consumed bytes before growing, so the buffer holds at most one frame's worth.
    if (m_offset > 0) {
        m_buffer.remove(0, m_offset);
        m_offset = 0;
    }
    m_buffer.append(bytes);
}

FrameDecoder::Status FrameDecoder::next(Frame* frame)
{
    if (!m_error.isEmpty())
        return Status::Malformed;
    const qsizetype available = m_buffer.size() - m_offset;
    if (available < Protocol::HeaderSize)
        return Status::NeedMore;

    quint32 size = 0;
    if (!parseHeader(m_buffer.constData() + m_offset, m_maxPayload, frame, &size, &m_error))
        return Status::Malformed;
    if (available - Protocol::HeaderSize < qsizetype(size))
        return Status::NeedMore;

    frame->payload = m_buffer.mid(m_offset + Protocol::HeaderSize, size);
    m_offset += Protocol::HeaderSize + size;
    if (m_offset == m_buffer.size()) {
        m_buffer.clear();
        m_offset = 0;
    }
    return Status::Ready;
}

qint64 FrameDecoder::take(char* data, qint64 max)
{
    const qint64 count = std::min<qint64>(max, m_buffer.size() - m_offset);
    if (count <= 0)
        return 0;
    memcpy(data, m_buffer.constData() + m_offset, size_t(count));
    m_offset += count;
    if (m_offset == m_buffer.size()) {
        m_buffer.clear();
        m_offset = 0;
    }
    return count;
}

bool FrameDecoder::parseHeader(const char* bytes, quint32 maxPayload, Frame* frame, quint32* size, QString* error)
{
    const uchar* header = reinterpret_cast<const uchar*>(bytes);
    const quint32 magic = qFromBigEndian<quint32>(header);
    if (magic != Protocol::FrameMagic) {
        *error = QStringLiteral("Not a protocol frame (magic 0x%1)").arg(magic, 8, 16, QLatin1Char('0'));
        return false;
    }
    *size = qFromBigEndian<quint32>(header + 4);
    if (*size > maxPayload) {
        *error = QStringLiteral("Frame of %1 bytes exceeds the limit of %2 bytes").arg(*size).arg(maxPayload);
        return false;
    }
    frame->version = qFromBigEndian<quint16>(header + 8);
    frame->flags = qFromBigEndian<quint16>(header + 10);
    frame->requestId = qFromBigEndian<quint32>(header + 12);
    frame->operation = qFromBigEndian<quint32>(header + 16);
    return true;
}

void FrameDecoder::clear()
{
    m_buffer.clear();
    m_offset = 0;
    m_error.clear();
}
