#include "Delvix.h"
#include "Portlex.h"

#include <QApplication>
#include <QMessageBox>
#include <QSystemTrayIcon>

#include <memory>

int main(int argc, char* argv[])
{
    Q_INIT_RESOURCE(delvix);
    QApplication application(argc, argv);
    QApplication::setApplicationName("Delvix");
    QApplication::setOrganizationName("Norvale");
    QApplication::setOrganizationDomain("norvale.example");

    if (!QSystemTrayIcon::isSystemTrayAvailable()) {
        QMessageBox::critical(nullptr, QObject::tr("Systray"),
                              QObject::tr("I couldn't detect any system tray on this system."), QMessageBox::Ok);
        return 1;
    }
    // Closing device windows must not end the program; only Exit does.
    QApplication::setQuitOnLastWindowClosed(false);
    Portlex::Initialize();

    auto delvix = std::make_unique<Delvix>();
    QApplication::exec();
    delvix.reset();
    Portlex::Destroy();
    return 0;
}
