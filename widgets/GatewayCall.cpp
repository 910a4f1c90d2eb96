#include "GatewayCall.h"

#include "PortlexErrors.h"

#include <QThreadPool>

namespace {

// Calls wait on devices: a few hung ones must leave room for the next.
constexpr int MaxCallsUnderWay = 8;

QThreadPool& pool()
{
    static QThreadPool* instance = [] {
        auto* created = new QThreadPool(QCoreApplication::instance());
        created->setMaxThreadCount(MaxCallsUnderWay);
        // A worker keeps its connections to the devices while it lives: let it end with its call.
        created->setExpiryTimeout(0);
        return created;
    }();
    return *instance;
}

} // namespace

void GatewayCall::start(std::function<void()> task)
{
    pool().start(std::move(task));
}

void GatewayCall::waitForDone()
{
    pool().waitForDone();
}

bool GatewayCall::deviceAbsent(int code)
{
    return code == PortlexError::Timeout || code == PortlexError::Unreachable;
}

QString GatewayCall::failureText(int code, const QString& reason)
{
    // The device's word counts for the codes it answers; the library's own codes say it all,
    // and a reason left over from an earlier call would mislead.
    const bool fromDevice = code < PortlexError::NotConnected || code >= PortlexError::BadRequest;
    QString why = fromDevice ? reason : QString();
    if (why.isEmpty()) {
        switch (code) {
        case PortlexError::NotConnected:
            why = QCoreApplication::translate("GatewayCall", "the device is not connected");
            break;
        case PortlexError::Timeout:
            why = QCoreApplication::translate("GatewayCall", "the device did not answer in time");
            break;
        case PortlexError::Unreachable:
            why = QCoreApplication::translate("GatewayCall", "the device is gone");
            break;
        default:
            break;
        }
    }
    const QString head = QCoreApplication::translate("GatewayCall", "Error %1").arg(code);
    return why.isEmpty() ? head : head + QStringLiteral(": ") + why;
}
