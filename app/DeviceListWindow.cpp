#include "DeviceListWindow.h"

#include "DeviceDirectory.h"

#include <QCloseEvent>

namespace {

// The role of an item's device id; the placeholder has none.
const int TargetIdRole = Qt::UserRole;

} // namespace

DeviceListWindow::DeviceListWindow(DeviceDirectory* directory, QWidget* parent)
    : QMainWindow(parent)
    , m_directory(directory)
{
    setupUi(this);
    connect(m_directory, &DeviceDirectory::changed, this, &DeviceListWindow::showDevices);
    connect(_devices, &QListWidget::itemActivated, this, &DeviceListWindow::chooseCurrent);
    connect(_devices, &QListWidget::currentItemChanged, this, &DeviceListWindow::updateOpen);
    connect(_open, &QPushButton::clicked, this, &DeviceListWindow::chooseCurrent);
    showDevices();
}

void DeviceListWindow::showConnectFailed(const QString& failure)
{
    _statusBar->showMessage(tr("Connect Failed: %1").arg(failure));
}

void DeviceListWindow::closeEvent(QCloseEvent* event)
{
    event->accept();
    emit closeRequested();
}

// Rebuilt from the directory's latest answer; the chosen device stays chosen while listed.
void DeviceListWindow::showDevices()
{
    const QListWidgetItem* current = _devices->currentItem();
    const QString chosen = current ? current->data(TargetIdRole).toString() : QString();
    _devices->clear();
    const QList<QPair<QString, QString>> devices = m_directory->devices();
    if (devices.isEmpty()) {
        auto* placeholder = new QListWidgetItem(tr("No Gateway Devices Available"), _devices);
        placeholder->setToolTip(tr("Attach a gateway device or run the Simulator"));
        placeholder->setFlags(Qt::NoItemFlags);
    }
    for (const auto& device : devices) {
        auto* item = new QListWidgetItem(device.first, _devices);
        item->setData(TargetIdRole, device.second);
        item->setToolTip(device.second);
        if (device.second == chosen || (chosen.isEmpty() && _devices->count() == 1))
            _devices->setCurrentItem(item);
    }
    updateOpen();
}

void DeviceListWindow::chooseCurrent()
{
    const QListWidgetItem* item = _devices->currentItem();
    if (!item || item->data(TargetIdRole).isNull())
        return;
    _statusBar->clearMessage();
    emit deviceChosen(item->data(TargetIdRole).toString());
}

void DeviceListWindow::updateOpen()
{
    const QListWidgetItem* item = _devices->currentItem();
    _open->setEnabled(item && !item->data(TargetIdRole).isNull());
}
