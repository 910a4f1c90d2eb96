#pragma once

#include "QStream.h"

class QIODevice;

// A little-endian stream over a device (usually a QFile) that its owner has
// opened and keeps open for the stream's lifetime.
class QBinaryStream : public QStream
{
public:
    explicit QBinaryStream(QIODevice* device);

    bool atEnd() const override;
    bool hasError() const override;
    bool readBytes(char* buffer, qint64 count) override;
    bool writeBytes(const char* buffer, qint64 count) override;

private:
    QIODevice* m_device;
    bool m_failed = false;
};
