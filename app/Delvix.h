#pragma once

#include "ui_Delvix.h"

#include <QDialog>
#include <QHash>
#include <QThreadPool>

class DeviceDirectory;
class DeviceListWindow;
class QMenu;
class QSystemTrayIcon;

// The program's presence in the system tray: a hidden dialog that owns the tray icon and its
// menu. The menu lists the gateway devices as last probed in the background, rebuilt at every
// opening and whenever the list changes; choosing one connects to it off the GUI thread and
// opens a device window. A device that does not answer never holds up the GUI. Without a tray
// the same entries live in a main window (DeviceListWindow), whose closing is Exit.
class Delvix : public QDialog, public Ui::DelvixClass
{
    Q_OBJECT

public:
    enum class Shell
    {
        Tray,   // the tray icon and its menu
        Window, // a main window instead, for desktops without a tray
    };
    explicit Delvix(Shell shell = Shell::Tray, QWidget* parent = nullptr);
    // Waits for connects under way, which end within their call timeouts.
    ~Delvix() override;

private slots:
    void onTriggered(bool checked);
    void onAboutToShow();
    void onActionExit();
    void on__actionProcess_Platform_triggered();
    void on__actionCompare_Platforms_triggered();

private:
    void createTrayIcon();
    void showDevices();
    void connectToDevice(const QString& targetId);
    void connectFinished(const QString& targetId, const QString& failure);
    void openDeviceWindow(const QString& targetId);
    void showAbout();

    void createWindow();

    QSystemTrayIcon* m_trayIcon = nullptr;
    DeviceListWindow* m_window = nullptr; // no parent: a top-level window of its own
    QMenu* m_trayMenu = nullptr;
    DeviceDirectory* m_directory = nullptr;
    // Target id -> windows to open once its connect under way succeeds.
    QHash<QString, int> m_connecting;
    bool m_exiting = false;
    QThreadPool m_connects;
};
