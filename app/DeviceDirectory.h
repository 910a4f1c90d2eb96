#pragma once

#include <QList>
#include <QObject>
#include <QPair>
#include <QString>
#include <QThread>

#include <atomic>

class QTimer;

// The gateway's device list, kept current by a thread of its own: a device that accepts a
// connection but never answers holds up that thread's probe, never the owner's thread.
class DeviceDirectory : public QObject
{
    Q_OBJECT

public:
    // Probes at once, then every intervalMs.
    explicit DeviceDirectory(int intervalMs, QObject* parent = nullptr);
    // Waits for a probe under way, which ends within the discovery timeout.
    ~DeviceDirectory() override;

    // The answer of the latest probe: (display name, device id) in the gateway's order.
    QList<QPair<QString, QString>> devices() const { return m_devices; }
    // Probes again as soon as the thread is free; asks made before that probe starts make one.
    void refresh();

signals:
    // devices() differs from what it was.
    void changed();
    // A probe has ended, whether or not the list changed.
    void probed();

private:
    void probe();
    void publish(const QList<QPair<QString, QString>>& devices);

    QList<QPair<QString, QString>> m_devices;
    QThread m_thread;
    QTimer* m_timer;  // lives on m_thread, which deletes it as it ends
    std::atomic<bool> m_probeAsked { false };
};
