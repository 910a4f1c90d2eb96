#pragma once

#include "Protocol.h"

#include <QByteArray>

// One protocol frame: the header fields and the payload.
struct Frame
{
    quint16 version = Protocol::ProtocolVersion;
    quint16 flags = 0;
    quint32 requestId = 0;
    quint32 operation = 0;
    QByteArray payload;

    // Header and payload as they go on the wire. The payload must not exceed
    // Protocol::MaxPayloadSize.
    QByteArray encode() const;
    // Writes the header of a frame with payloadSize bytes to out (HeaderSize bytes), for a
    // sender that puts the payload behind it itself.
    void encodeHeader(char* out, quint32 payloadSize) const;
};
