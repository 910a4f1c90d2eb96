#include "DeviceDirectory.h"

#include "Portlex.h"

#include <QTimer>

DeviceDirectory::DeviceDirectory(int intervalMs, QObject* parent)
    : QObject(parent)
    , m_timer(new QTimer)
{
    m_timer->setInterval(intervalMs);
    m_timer->moveToThread(&m_thread);
    connect(m_timer, &QTimer::timeout, m_timer, [this] { probe(); });
    connect(&m_thread, &QThread::finished, m_timer, &QObject::deleteLater);
    m_thread.setObjectName("DeviceDirectory");
    m_thread.start();
    refresh();
}

DeviceDirectory::~DeviceDirectory()
{
    m_thread.quit();
    m_thread.wait();
}

void DeviceDirectory::refresh()
{
    if (!m_probeAsked.exchange(true))
        QMetaObject::invokeMethod(m_timer, [this] { probe(); }, Qt::QueuedConnection);
}

// On the directory's thread.
void DeviceDirectory::probe()
{
    m_probeAsked = false;
    QList<QPair<QString, QString>> found;
    Portlex::GetDevices(found);
    QMetaObject::invokeMethod(this, [this, found] { publish(found); }, Qt::QueuedConnection);
    // The next periodic probe is a whole interval after this one, however it was asked for.
    m_timer->start();
}

void DeviceDirectory::publish(const QList<QPair<QString, QString>>& devices)
{
    const bool differs = devices != m_devices;
    m_devices = devices;
    if (differs)
        emit changed();
    emit probed();
}
