#pragma once

#include "DeviceActions.h"
#include "FailurePlan.h"
#include "RequestHandler.h"

#include <QSet>
#include <QString>

class DeviceState;

// Answers the gateway's requests from a DeviceState: applies the lock requests a request
// carries, the --fail rules and a refused connection, then builds the answer that
// Protocol.h lists for the operation. A connection is served only after its Connect was
// accepted; before that every other request answers NotConnected and changes nothing.
class SimRequestHandler : public RequestHandler
{
public:
    explicit SimRequestHandler(DeviceState& state);

    // A refused Connect answers code with text as its status.
    void refuseConnect(qint32 code, const QString& text);
    void setFailurePlan(const FailurePlan& plan) { m_failures = plan; }
    DeviceActions& actions() { return m_actions; }

    QString displayName() const override;
    QString deviceId() const override;
    Answer handle(const Request& request) override;
    qint64 readStream(quint64 connectionId, quint32 transferId, char* data, qint64 max) override
    {
        return m_actions.readStream(connectionId, transferId, data, max);
    }
    qint32 writeStream(quint64 connectionId, quint32 transferId, const char* data, qint64 size) override
    {
        return m_actions.writeStream(connectionId, transferId, data, size);
    }
    void connectionClosed(quint64 connectionId) override;

    // The operations a request can carry, and their names (what --fail may name).
    static QList<Operation> operations();
    static QStringList operationNames();
    // The path a request names, or empty for operations that take none; false when the
    // payload does not hold one.
    static bool requestPath(const Request& request, QString& path);

private:
    Answer answerConnect();
    void applyLockRequests(Protocol::RequestFlags flags);
    Answer serve(const Request& request, const QString& path);
    Answer enablement(bool service);

    DeviceState& m_state;
    DeviceActions m_actions;
    FailurePlan m_failures;
    qint32 m_refuseCode = 0;
    QString m_refuseText;
    QSet<quint64> m_connected; // connections whose last Connect was accepted
};
