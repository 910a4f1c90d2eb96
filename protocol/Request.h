#pragma once

#include "Protocol.h"

#include <QByteArray>

// One decoded request as a device's RequestHandler receives it.
struct Request
{
    quint64 connectionId = 0;   // stable for the life of one client connection
    Operation operation = Operation::Hello;
    Protocol::RequestFlags flags;
    QByteArray payload;         // the request fields listed in Protocol.h
};
