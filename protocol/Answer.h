#pragma once

#include "PayloadStream.h"
#include "RecordStreams.h"

#include <QByteArray>

// A device's answer to one request: the result and the fields that follow it.
struct Answer
{
    qint32 result = 0;
    QByteArray body;   // the answer fields after the result, as listed in Protocol.h

    static Answer failure(qint32 code, const QByteArray& body = QByteArray())
    {
        Answer answer;
        answer.result = code;
        answer.body = body;
        return answer;
    }

    // Result 0 followed by values, each written with its stream operator.
    template <typename... Values>
    static Answer success(const Values&... values)
    {
        Answer answer;
        PayloadStream out(&answer.body);
        ((out << values), ...);
        return answer;
    }
};
