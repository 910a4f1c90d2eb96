#pragma once

#include "DeviceState.h"

#include <QObject>
#include <QTemporaryDir>

#include <memory>

class FrameServer;
class SimOptions;
class SimRequestHandler;

// zantro-sim serving one device: loads the image (or a fresh copy of it), listens on the
// device's socket, and on SIGINT or SIGTERM closes every connection, removes the socket
// and ends the event loop.
class SimulatorDaemon : public QObject
{
    Q_OBJECT

public:
    explicit SimulatorDaemon(QObject* parent = nullptr);
    ~SimulatorDaemon() override;

    bool start(const SimOptions& options);
    QString errorString() const { return m_error; }
    QString socketPath() const;
    // The folder being served: the image, or its fresh copy under --reset.
    QString servedImage() const { return m_servedImage; }

    static QString socketName(const QString& deviceId) { return deviceId + QStringLiteral(".sock"); }

signals:
    void stopped();

private:
    bool fail(const QString& message);
    void stop();

    DeviceState m_state;
    std::unique_ptr<QTemporaryDir> m_copy;
    std::unique_ptr<SimRequestHandler> m_handler;
    FrameServer* m_server = nullptr;
    QString m_servedImage;
    QString m_error;
};
