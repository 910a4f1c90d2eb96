#pragma once

#include "ui_DeviceListWindow.h"

#include <QMainWindow>

class DeviceDirectory;

// The main window on a desktop without a system tray (or when asked for): the devices the
// directory lists, kept current, and the tray menu's other entries in its menus. Activating
// a device (double-click, Enter or Open) asks for its device window; closing the window asks
// to end the program.
class DeviceListWindow : public QMainWindow, public Ui::DeviceListWindowClass
{
    Q_OBJECT

public:
    explicit DeviceListWindow(DeviceDirectory* directory, QWidget* parent = nullptr);

    // Why a connect failed, shown until the next device is chosen.
    void showConnectFailed(const QString& failure);

signals:
    void deviceChosen(const QString& targetId);
    void closeRequested();

protected:
    void closeEvent(QCloseEvent* event) override;

private:
    void showDevices();
    void chooseCurrent();
    void updateOpen();

    DeviceDirectory* m_directory;
};
