#include "SimulatorDaemon.h"

#include "DataFolders.h"
#include "FrameServer.h"
#include "ImageCopy.h"
#include "SignalPipe.h"
#include "SimOptions.h"
#include "SimRequestHandler.h"

#include <QDir>
#include <QFileInfo>

SimulatorDaemon::SimulatorDaemon(QObject* parent)
    : QObject(parent)
{
}

SimulatorDaemon::~SimulatorDaemon()
{
    delete m_server; // before the handler it calls
}

bool SimulatorDaemon::fail(const QString& message)
{
    m_error = message;
    return false;
}

QString SimulatorDaemon::socketPath() const
{
    return m_server ? m_server->socketPath() : QString();
}

bool SimulatorDaemon::start(const SimOptions& options)
{
    QString imageDir = options.imageDir;
    if (!QFileInfo(QDir(imageDir).filePath(QStringLiteral("device.xml"))).isFile())
        return fail(QStringLiteral("%1 is not a device image (no device.xml)").arg(imageDir));
    if (options.reset) {
        // Copies left by simulators that were killed go first.
        ImageCopy::removeOrphanedCopies(QDir::tempPath());
        m_copy = std::make_unique<QTemporaryDir>(ImageCopy::copyTemplate(QDir::tempPath()));
        QString error;
        if (!m_copy->isValid() || !ImageCopy::copyTree(imageDir, m_copy->path(), &error))
            return fail(QStringLiteral("cannot copy the image: %1").arg(error.isEmpty() ? m_copy->errorString() : error));
        imageDir = m_copy->path();
    }

    const QString namesDir = options.namesDir.isEmpty() ? DataFolders::nameDatabaseFolder() : options.namesDir;
    // Errors name the image the user gave, not its temporary copy.
    if (!m_state.load(imageDir, namesDir))
        return fail(m_copy ? m_state.errorString().replace(m_copy->path(), options.imageDir) : m_state.errorString());
    m_servedImage = imageDir;
    if (!options.deviceId.isEmpty())
        m_state.setId(options.deviceId);

    m_handler = std::make_unique<SimRequestHandler>(m_state);
    if (options.refuseCode != 0)
        m_handler->refuseConnect(options.refuseCode, options.refuseText);
    m_handler->setFailurePlan(options.failures);
    m_handler->actions().setRunLifetime(options.runLifetimeMs);
    m_handler->actions().sweepLeftovers();

    auto* signalPipe = new SignalPipe(this);
    if (!signalPipe->install())
        return fail(QStringLiteral("cannot catch SIGINT and SIGTERM"));
    connect(signalPipe, &SignalPipe::received, this, &SimulatorDaemon::stop);

    const QString socketDir = options.socketDir.isEmpty() ? Protocol::socketDirectory() : options.socketDir;
    m_server = new FrameServer(m_handler.get());
    m_server->setLatency(options.latencyMs);
    if (!m_server->listen(QDir(socketDir).filePath(socketName(m_state.profile().id))))
        return fail(m_server->errorString());
    return true;
}

void SimulatorDaemon::stop()
{
    if (m_server)
        m_server->close();
    emit stopped();
}
