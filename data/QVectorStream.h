#pragma once

#include "QStream.h"

#include <QByteArray>

// A stream over bytes in memory. Reads advance a position; writes append.
// A read that does not fit copies nothing, keeps the position and sets both
// the end and the error flag.
class QVectorStream : public QStream
{
public:
    explicit QVectorStream(const QByteArray& data = QByteArray(), int byteOrder = LittleEndian);

    bool atEnd() const override { return m_atEnd; }
    bool hasError() const override { return m_error; }
    bool readBytes(char* buffer, qint64 count) override;
    bool writeBytes(const char* buffer, qint64 count) override;

    const QByteArray& data() const { return m_data; }
    qint64 position() const { return m_position; }

private:
    QByteArray m_data;
    qint64 m_position = 0;
    bool m_atEnd = false;
    bool m_error = false;
};
