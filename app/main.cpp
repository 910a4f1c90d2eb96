#include "Delvix.h"
#include "DelvixVersion.h"
#include "Portlex.h"

#include <QApplication>
#include <QCommandLineParser>
#include <QSystemTrayIcon>

#include <memory>

int main(int argc, char* argv[])
{
    Q_INIT_RESOURCE(delvix);
    QApplication application(argc, argv);
    QApplication::setApplicationName("Delvix");
    QApplication::setApplicationVersion(DELVIX_VERSION);
    QApplication::setOrganizationName("Norvale");
    QApplication::setOrganizationDomain("norvale.example");
    // The desktop matches the windows to the installed entry (and its icon) by this name.
    QGuiApplication::setDesktopFileName("org.norvale.Delvix");

    QCommandLineParser parser;
    parser.setApplicationDescription(QObject::tr("Explore Zantro handsets and simulators."));
    parser.addHelpOption();
    parser.addVersionOption();
    const QCommandLineOption window("window", QObject::tr("Open the main window instead of the system tray icon."));
    parser.addOption(window);
    parser.process(application);

    // Closing device windows must not end the program; only Exit (or closing the main window) does.
    QApplication::setQuitOnLastWindowClosed(false);
    Portlex::Initialize();

    // Most desktops show no tray out of the box: the main window stands in for it there.
    const bool trayless = parser.isSet(window) || !QSystemTrayIcon::isSystemTrayAvailable();
    auto delvix = std::make_unique<Delvix>(trayless ? Delvix::Shell::Window : Delvix::Shell::Tray);
    QApplication::exec();
    delvix.reset();
    Portlex::Destroy();
    return 0;
}
