#pragma once

#include "Protocol.h"

#include <QByteArray>

#include <functional>

// One decoded request as a device's RequestHandler receives it.
struct Request
{
    quint64 connectionId = 0;   // stable for the life of one client connection
    Operation operation = Operation::Hello;
    Protocol::RequestFlags flags;
    QByteArray payload;         // the request fields listed in Protocol.h
    // Tells the client, at once, that the request is still being worked on, so that its
    // timeout starts afresh. Call it on the server's thread, at least every few seconds,
    // during work that may outlast Protocol::CallTimeoutMs; a no-op once answered, and in
    // a Request that no connection made.
    std::function<void()> keepAlive = [] {};
};
