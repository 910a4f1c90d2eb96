#pragma once

#include "ui_Delvix.h"

#include <QDialog>

class QMenu;
class QSystemTrayIcon;

// The program's presence in the system tray: a hidden dialog that owns the tray icon and its
// menu. The menu lists the gateway devices afresh at every opening; choosing one connects to
// it and opens a device window.
class Delvix : public QDialog, public Ui::DelvixClass
{
    Q_OBJECT

public:
    explicit Delvix(QWidget* parent = nullptr);

private slots:
    void onTriggered(bool checked);
    void onAboutToShow();
    void onActionExit();

private:
    void createTrayIcon();
    void connectToDevice(const QString& targetId);
    void showAbout();

    QSystemTrayIcon* m_trayIcon = nullptr;
    QMenu* m_trayMenu = nullptr;
};
