#include "FrameDecoder.h"

#include <QtEndian>

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

    const uchar* header = reinterpret_cast<const uchar*>(m_buffer.constData() + m_offset);
    const quint32 magic = qFromBigEndian<quint32>(header);
    if (magic != Protocol::FrameMagic) {
        m_error = QStringLiteral("Not a protocol frame (magic 0x%1)").arg(magic, 8, 16, QLatin1Char('0'));
        return Status::Malformed;
    }
    const quint32 size = qFromBigEndian<quint32>(header + 4);
    if (size > m_maxPayload) {
        m_error = QStringLiteral("Frame of %1 bytes exceeds the limit of %2 bytes").arg(size).arg(m_maxPayload);
        return Status::Malformed;
    }
    if (available - Protocol::HeaderSize < qsizetype(size))
        return Status::NeedMore;

    frame->version = qFromBigEndian<quint16>(header + 8);
    frame->flags = qFromBigEndian<quint16>(header + 10);
    frame->requestId = qFromBigEndian<quint32>(header + 12);
    frame->operation = qFromBigEndian<quint32>(header + 16);
    frame->payload = m_buffer.mid(m_offset + Protocol::HeaderSize, size);
    m_offset += Protocol::HeaderSize + size;
    if (m_offset == m_buffer.size()) {
        m_buffer.clear();
        m_offset = 0;
    }
    return Status::Ready;
}

void FrameDecoder::clear()
{
    m_buffer.clear();
    m_offset = 0;
    m_error.clear();
}
