#pragma once

#include "Frame.h"

#include <QByteArray>
#include <QString>

// Cuts a byte stream into frames. Used by both ends of a connection; everything it reads
// comes from the peer and is checked before use.
class FrameDecoder
{
public:
    enum class Status
    {
        NeedMore,   // no complete frame buffered yet
        Ready,      // a frame was taken out
        Malformed,  // the stream cannot be framed; the connection must close
    };

    // A frame announcing more than maxPayload bytes is malformed: a device takes requests
    // of at most Protocol::MaxRequestSize, a client answers of up to MaxPayloadSize.
    explicit FrameDecoder(quint32 maxPayload = Protocol::MaxPayloadSize) : m_maxPayload(maxPayload) {}

    void feed(const QByteArray& bytes);
    Status next(Frame* frame);
    // Hands over up to max buffered bytes not yet taken as frames, for a reader that
    // goes on reading the stream itself.
    qint64 take(char* data, qint64 max);

    // Reads a header (HeaderSize bytes): its fields into frame (payload untouched) and the
    // payload's size; false with a reason in error when it cannot start a frame.
    static bool parseHeader(const char* header, quint32 maxPayload, Frame* frame, quint32* size, QString* error);

    // True while bytes of an unfinished frame are buffered.
    bool hasPartialFrame() const { return m_buffer.size() > m_offset; }
    // Memory the buffered bytes take, read or not.
    qsizetype bufferedBytes() const { return m_buffer.size(); }
    QString errorString() const { return m_error; }
    void clear();

private:
    quint32 m_maxPayload;
    QByteArray m_buffer;
    qsizetype m_offset = 0;  // start of the first unread byte
    QString m_error;
};
