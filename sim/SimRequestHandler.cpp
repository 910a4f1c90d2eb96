#include "SimRequestHandler.h"

#include "DeviceState.h"
#include "PortlexErrors.h"

namespace {

template <typename List>
Answer listAnswer(const List& list)
{
    Answer answer;
    PayloadStream out(&answer.body);
    writeList(out, list);
    return answer;
}

// Connect answers carry a status text whatever the result.
Answer statusFailure(qint32 code, const QString& statusText)
{
    QByteArray body;
    PayloadStream out(&body);
    out << statusText;
    return Answer::failure(code, body);
}

} // namespace

SimRequestHandler::SimRequestHandler(DeviceState& state)
    : m_state(state), m_actions(state)
{
}

void SimRequestHandler::refuseConnect(qint32 code, const QString& text)
{
    m_refuseCode = code;
    m_refuseText = text;
}

QString SimRequestHandler::displayName() const
{
    return m_state.profile().displayName();
}

QString SimRequestHandler::deviceId() const
{
    return m_state.profile().id;
}

QList<Operation> SimRequestHandler::operations()
{
    QList<Operation> list;
    for (quint32 value = 0; value < 256; ++value) {
        if (Protocol::isKnownOperation(value) && Operation(value) != Operation::Hello)
            list.append(Operation(value));
    }
    return list;
}

QStringList SimRequestHandler::operationNames()
{
    QStringList names;
    for (Operation operation : operations())
        names.append(Protocol::operationName(operation));
    return names;
}

bool SimRequestHandler::requestPath(const Request& request, QString& path)
{
    path.clear();
    switch (request.operation) {
    case Operation::GetModuleMif:
    case Operation::GetChildSettings:
    case Operation::GetFileSystemLevel:
    case Operation::CopyToPCBegin:
    case Operation::CopyToDeviceBegin:
    case Operation::RunApplication:
    case Operation::DeleteDeviceFile: {
        PayloadStream in(request.payload);
        in >> path;
        return in.ok();
    }
    default:
        return true;
    }
}

void SimRequestHandler::connectionClosed(quint64 connectionId)
{
    m_connected.remove(connectionId);
    m_actions.connectionClosed(connectionId);
}

Answer SimRequestHandler::handle(const Request& request)
{
    if (request.operation == Operation::Connect) {
        const Answer answer = answerConnect();
        if (answer.result == 0) {
            m_connected.insert(request.connectionId);
            applyLockRequests(request.flags);
        } else {
            m_connected.remove(request.connectionId);
        }
        return answer;
    }
    // Before an accepted Connect the device answers, but neither serves nor takes a lock request.
    if (!m_connected.contains(request.connectionId))
        return Answer::failure(PortlexError::NotConnected);
    applyLockRequests(request.flags);

    QString path;
    if (!requestPath(request, path))
        return Answer::failure(PortlexError::BadRequest);
    qint32 code = 0;
    if (m_failures.match(Protocol::operationName(request.operation), path, code))
        return Answer::failure(code);
    return serve(request, path);
}

Answer SimRequestHandler::answerConnect()
{
    qint32 code = 0;
    if (m_failures.match(Protocol::operationName(Operation::Connect), QString(), code))
        return statusFailure(code, QStringLiteral("Connection refused by --fail"));
    if (m_refuseCode != 0)
        return statusFailure(m_refuseCode, m_refuseText);
    return Answer::success(QStringLiteral("Connected to %1").arg(displayName()));
}

void SimRequestHandler::applyLockRequests(Protocol::RequestFlags flags)
{
    if (flags.testFlag(Protocol::ServiceLockRequest))
        m_state.lockService();
    if (flags.testFlag(Protocol::SignatureLockRequest))
        m_state.lockSignature();
}

Answer SimRequestHandler::serve(const Request& request, const QString& path)
{
    switch (request.operation) {
    case Operation::GetCache:
        return Answer::success(m_state.cache());
    case Operation::GetModules:
        return listAnswer(m_state.modules());
    case Operation::GetModuleMif: {
        MifEntry entry;
        const qint32 result = m_state.moduleMif(path, entry);
        return result == 0 ? Answer::success(entry) : Answer::failure(result);
    }
    case Operation::GetLoadedModules:
        return listAnswer(m_state.loadedModules());
    case Operation::GetProcesses:
        return listAnswer(m_state.processes());
    case Operation::GetVolumes:
        return listAnswer(m_state.volumes());
    case Operation::GetRegistry:
        return listAnswer(m_state.registry());
    case Operation::GetChildSettings: {
        _SettingsInfo node(QString(), path);
        const qint32 result = m_state.childSettings(path, node);
        return result == 0 ? Answer::success(node) : Answer::failure(result);
    }
    case Operation::GetFileSystemLevel: {
        _DirectoryInfo level;
        const qint32 result = m_state.fileSystemLevel(path, level);
        return result == 0 ? Answer::success(level) : Answer::failure(result);
    }
    case Operation::GetTepSigPrivs:
        return listAnswer(m_state.tepPriviledges());
    case Operation::TepStatus:
        return enablement(true);
    case Operation::GlobalTestSigStatus:
        return enablement(false);
    default:
        if (DeviceActions::isAction(request.operation))
            return m_actions.handle(request);
        return Answer::failure(PortlexError::UnknownOperation);
    }
}

Answer SimRequestHandler::enablement(bool service)
{
    QString mode;
    QString owner;
    QString expiry;
    const EnablementStatus status = service ? m_state.tepStatus(mode, owner, expiry)
                                            : m_state.globalTestSigStatus(mode, owner, expiry);
    return Answer::success(qint32(status), mode, owner, expiry);
}
