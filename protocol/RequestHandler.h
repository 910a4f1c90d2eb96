#pragma once

#include "Answer.h"
#include "Request.h"

#include <QString>

// What a device implements to be served by a FrameServer. All calls arrive on the
// server's thread, one at a time.
class RequestHandler
{
public:
    virtual ~RequestHandler() = default;

    // Identity given in the answer to Hello.
    virtual QString displayName() const = 0;
    virtual QString deviceId() const = 0;

    // Every request after the handshake. Unknown operations never arrive here.
    virtual Answer handle(const Request& request) = 0;

    // The connection is gone; its open transfers must be discarded.
    virtual void connectionClosed(quint64 connectionId) { Q_UNUSED(connectionId); }
};
