#include "Delvix.h"

#include "AboutDialog.h"
#include "DelvixVersion.h"
#include "DeviceDirectory.h"
#include "DeviceListWindow.h"
#include "DeviceWindow.h"
#include "PlatformTools.h"
#include "Portlex.h"
#include "SplashDialog.h"

#include <QApplication>
#include <QGuiApplication>
#include <QMenu>
#include <QSettings>
#include <QSystemTrayIcon>

#include <algorithm>

namespace {

const char* const Version = DELVIX_VERSION;

// How often the device list is probed while nobody asks for it.
const int DeviceProbeIntervalMs = 1000;
// Connects wait on devices, not on the processor: a few hung ones must not hold up the next.
const int MaxConnectsUnderWay = 8;

// What each menu action carries as data; the menu logic keys on it.
enum MenuRole : uint
{
    PlainEntry = 0,
    AboutEntry = 1,
    DeviceSectionStart = 2,
    DeviceSectionEnd = 3,
    DeviceEntry = 999
};

QString notice()
{
    return QStringLiteral("\u00a9 Norvale. All rights reserved.");
}

} // namespace

Delvix::Delvix(Shell shell, QWidget* parent)
    : QDialog(parent)
{
    // A pool thread keeps its connections to the devices while it lives: let it end with its connect.
    m_connects.setExpiryTimeout(0);
    m_connects.setMaxThreadCount(MaxConnectsUnderWay);

    auto* splash = new SplashDialog(":/Resources/splash.png", notice(), Version);
    splash->show();
    splash->startCloseTimer(3500);

    setWindowFlags(windowFlags() & ~Qt::WindowContextHelpButtonHint);
    setupUi(this);
    _actionNoDevices->setEnabled(false);
    m_directory = new DeviceDirectory(DeviceProbeIntervalMs, this);
    connect(m_directory, &DeviceDirectory::changed, this, [this] { showDevices(); });
    createTrayIcon();
    hide();

    _actionAbout->setData(AboutEntry);
    connect(_actionAbout, &QAction::triggered, this, &Delvix::onTriggered);
    if (shell == Shell::Window) {
        createWindow();
        return;
    }
    m_trayIcon->show();

    QSettings settings;
    const int seen = settings.value("seen", 0).toInt();
    if (seen < 2) {
        m_trayIcon->showMessage("Delvix",
                                tr("Zantro Delvix is ready.  Right click to interrogate any gateway enabled "
                                   "device or simulator."),
                                QSystemTrayIcon::Information, 10000);
        settings.setValue("seen", seen + 1);
    }
}

Delvix::~Delvix()
{
    delete m_window;
    m_trayIcon->hide();
    m_connects.waitForDone();
    // Connects that ended while this waited never report back: give back their busy cursors here.
    for (int i = 0; i < m_connecting.size(); ++i)
        QGuiApplication::restoreOverrideCursor();
}

void Delvix::createTrayIcon()
{
    m_trayMenu = new QMenu(this);
    connect(m_trayMenu, &QMenu::aboutToShow, this, &Delvix::onAboutToShow);
    m_trayMenu->addAction(_actionAbout);
    m_trayMenu->addAction(_actionProcess_Platform);
    m_trayMenu->addAction(_actionCompare_Platforms);
    m_trayMenu->addSeparator()->setData(DeviceSectionStart);
    m_trayMenu->addAction(_actionNoDevices);
    m_trayMenu->addSeparator()->setData(DeviceSectionEnd);
    m_trayMenu->addAction(_actionExit);
    connect(_actionExit, &QAction::triggered, this, &Delvix::onActionExit);

    m_trayIcon = new QSystemTrayIcon(this);
    m_trayIcon->setContextMenu(m_trayMenu);
    m_trayIcon->setIcon(QIcon(":/Resources/TrayIcon.png"));
}

void Delvix::createWindow()
{
    m_window = new DeviceListWindow(m_directory);
    m_window->_menuFile->addAction(_actionExit);
    m_window->_menuTools->addActions({_actionProcess_Platform, _actionCompare_Platforms});
    m_window->_menuHelp->addAction(_actionAbout);
    connect(m_window, &DeviceListWindow::deviceChosen, this, &Delvix::connectToDevice);
    connect(m_window, &DeviceListWindow::closeRequested, this, [this] {
        if (!m_exiting)
            onActionExit();
    });
    m_window->show();
}

void Delvix::onAboutToShow()
{
    showDevices();
    m_directory->refresh();
}

void Delvix::showDevices()
{
    bool inSection = false;
    QAction* sectionEnd = nullptr;
    for (QAction* action : m_trayMenu->actions()) {
        const uint role = action->data().toUInt();
        if (role == DeviceSectionStart) {
            inSection = true;
        } else if (role == DeviceSectionEnd) {
            sectionEnd = action;
            inSection = false;
        } else if (inSection) {
            m_trayMenu->removeAction(action);
            if (role == DeviceEntry)
                delete action;
        }
    }

    const QList<QPair<QString, QString>> devices = m_directory->devices();
    if (devices.isEmpty()) {
        m_trayMenu->insertAction(sectionEnd, _actionNoDevices);
        return;
    }
    // Each entry goes above the one before it, so the menu lists the devices in reverse.
    QAction* before = sectionEnd;
    for (const auto& device : devices) {
        auto* entry = new QAction(device.first, this);
        connect(entry, &QAction::triggered, this, &Delvix::onTriggered);
        entry->setData(DeviceEntry);
        entry->setProperty("TargetID", device.second);
        m_trayMenu->insertAction(before, entry);
        before = entry;
    }
}

void Delvix::onTriggered(bool)
{
    auto* action = qobject_cast<QAction*>(sender());
    if (!action)
        return;
    switch (action->data().toUInt()) {
    case PlainEntry:
    case DeviceSectionStart:
        break;
    case AboutEntry:
        showAbout();
        break;
    default:
        connectToDevice(action->property("TargetID").toString());
    }
}

void Delvix::showAbout()
{
    AboutDialog about(":/Resources/about.png", notice(), Version);
    about.setComponents({"Portlex.dll\t0.9.0.3", "Skinwell.dll\t1.0.0.1"});
    about.setModal(true);
    about.exec();
}

void Delvix::connectToDevice(const QString& targetId)
{
    const QSharedPointer<_ZantDevice> device = Portlex::GetDevice(targetId);
    if (!device)
        return;
    if (device->Connected()) {
        openDeviceWindow(targetId);
        return;
    }
    // One connect per device at a time: each choice made meanwhile adds a window to open.
    if (auto pending = m_connecting.find(targetId); pending != m_connecting.end()) {
        ++*pending;
        return;
    }
    m_connecting.insert(targetId, 1);
    QGuiApplication::setOverrideCursor(Qt::BusyCursor);
    m_connects.start([this, device, targetId] {
        QString failure;
        int code = 0;
        QString reason;
        if (!Portlex::ConnectDevice(device, QString(), QString(), &code, &reason))
            failure = QString("Failure Code: (%1) ").arg(code) + reason;
        QMetaObject::invokeMethod(this, [this, targetId, failure] { connectFinished(targetId, failure); },
                                  Qt::QueuedConnection);
    });
}

void Delvix::connectFinished(const QString& targetId, const QString& failure)
{
    QGuiApplication::restoreOverrideCursor();
    const int windows = m_connecting.take(targetId);
    if (m_exiting)
        return;
    if (!failure.isEmpty() && m_window) {
        m_window->showConnectFailed(failure);
        return;
    }
    if (!failure.isEmpty()) {
        m_trayIcon->showMessage(tr("Connect Failed"), failure, QSystemTrayIcon::Information, 2500);
        return;
    }
    for (int i = 0; i < windows; ++i)
        openDeviceWindow(targetId);
}

void Delvix::openDeviceWindow(const QString& targetId)
{
    auto* window = new DeviceWindow;
    window->setDevice(targetId);
    window->show();
}

void Delvix::onActionExit()
{
    // A connect that ends from now on opens nothing.
    m_exiting = true;
    QApplication::setQuitOnLastWindowClosed(true);
    for (QWidget* window : QApplication::topLevelWidgets())
        window->close();
    // Qt ends the loop when the last visible window closes; with none open, nothing would.
    const QWidgetList left = QApplication::topLevelWidgets();
    if (std::none_of(left.begin(), left.end(), [](const QWidget* window) { return window->isVisible(); }))
        QCoreApplication::quit();
}

void Delvix::on__actionProcess_Platform_triggered()
{
    scanPlatformClassIds();
}

void Delvix::on__actionCompare_Platforms_triggered()
{
    comparePlatformScans();
}
