#pragma once

#include <QByteArray>
#include <QDataStream>

// A QDataStream over a frame payload with the pinned encoding both sides use.
class PayloadStream : public QDataStream
{
public:
    explicit PayloadStream(const QByteArray& payload);  // reads
    explicit PayloadStream(QByteArray* payload);        // appends

    // True when every read so far succeeded.
    bool ok() const { return status() == QDataStream::Ok; }
};
