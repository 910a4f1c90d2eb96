#include "Delvix.h"
#include "DeviceListWindow.h"
#include "DeviceWindow.h"
#include "Portlex.h"
#include "SimulatorProcess.h"
#include "SplashDialog.h"

#include <QApplication>
#include <QPointer>
#include <QProcess>
#include <QSystemTrayIcon>
#include <QTemporaryDir>
#include <QTest>
#include <QTimer>

#include <list>
#include <memory>

// Delvix on a display without a tray host: the program opens its main window instead of
// giving up, the window lists the devices and opens their windows, and closing it ends the
// program as Exit does.
class MainWindowTest : public QObject
{
    Q_OBJECT

    QTemporaryDir m_sockets;
    std::list<SimulatorProcess> m_simulators;
    std::unique_ptr<Delvix> m_delvix;

    bool startSimulator(const QString& image, const QString& id, const QStringList& extra = {})
    {
        return m_simulators.emplace_back(m_sockets.path()).start(SimulatorProcess::sampleImage(image), id, extra);
    }
    template <typename Window>
    static QList<Window*> shown()
    {
        QList<Window*> windows;
        for (QWidget* widget : QApplication::topLevelWidgets()) {
            if (auto* window = qobject_cast<Window*>(widget); window && window->isVisible())
                windows << window;
        }
        return windows;
    }
    // The list as shown, each row as "text|device id" (no id for the placeholder).
    static QStringList rows(const DeviceListWindow* window)
    {
        QStringList texts;
        for (int i = 0; i < window->_devices->count(); ++i)
            texts << window->_devices->item(i)->text() + '|' + window->_devices->item(i)->data(Qt::UserRole).toString();
        return texts;
    }
    // Activates the row of targetId as a double-click or Enter does.
    static bool activate(DeviceListWindow* window, const QString& targetId)
    {
        for (int i = 0; i < window->_devices->count(); ++i) {
            QListWidgetItem* item = window->_devices->item(i);
            if (item->data(Qt::UserRole).toString() == targetId) {
                window->_devices->setCurrentItem(item);
                emit window->_devices->itemActivated(item);
                return true;
            }
        }
        return false;
    }

private slots:
    void initTestCase()
    {
        Q_INIT_RESOURCE(delvix);
        QVERIFY2(!QSystemTrayIcon::isSystemTrayAvailable(), "this display must have no tray host");
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        Portlex::Initialize();
        QApplication::setQuitOnLastWindowClosed(false);
    }
    void cleanup()
    {
        m_delvix.reset();
        qDeleteAll(shown<DeviceWindow>());
        QWidgetList splashes = QApplication::topLevelWidgets();
        splashes.removeIf([](QWidget* widget) { return !dynamic_cast<SplashDialog*>(widget); });
        qDeleteAll(splashes);
        m_simulators.clear();
    }

    // The program itself, started here, shows its main window rather than a message that it
    // found no tray.
    void programOpensItsWindowWithoutATray()
    {
        QProcess delvix;
        delvix.start(QCoreApplication::applicationDirPath() + "/delvix");
        QVERIFY(delvix.waitForStarted());
        const QStringList search{"search", "--onlyvisible", "--pid", QString::number(delvix.processId()), "--name", "^Delvix$"};
        const bool found = QTest::qWaitFor([&] { return QProcess::execute("xdotool", search) == 0; }, 10000);
        delvix.kill();
        delvix.waitForFinished();
        QVERIFY2(found, "no visible window called Delvix (xdotool, from scripts/setup, looks for it)");
    }

    // The list follows the gateway: devices in its order, the placeholder when none is left.
    // Activating a device opens its window; a refusal says why in the status bar and opens
    // nothing. The menus hold the tray menu's other entries.
    void listsDevicesAndOpensTheirWindows()
    {
        QVERIFY(startSimulator("handset", "alpha"));
        QVERIFY(startSimulator("simulator", "beta", {"--refuse-connect", "7:Handset is locked"}));
        m_delvix = std::make_unique<Delvix>(Delvix::Shell::Window);
        QCOMPARE(shown<DeviceListWindow>().size(), 1);
        DeviceListWindow* main = shown<DeviceListWindow>().first();
        QStringList entries;
        for (const QMenu* menu : {main->_menuFile, main->_menuTools, main->_menuHelp})
            for (const QAction* action : menu->actions())
                entries << action->text();
        QCOMPARE(entries, QStringList({"E&xit", "Scan Platform Class IDs", "Compare Platforms", "About"}));
        QTRY_COMPARE(rows(main), QStringList({"Zantro USB Device: Kestrel K7|alpha", "Zantro Simulator - Aurora|beta"}));

        QVERIFY(activate(main, "beta"));
        QTRY_COMPARE(main->_statusBar->currentMessage(), QString("Connect Failed: Failure Code: (7) Handset is locked"));
        QVERIFY(shown<DeviceWindow>().isEmpty());
        QVERIFY(activate(main, "alpha"));
        QVERIFY2(main->_statusBar->currentMessage().isEmpty(), "a new choice clears the last failure");
        QTRY_COMPARE(shown<DeviceWindow>().size(), 1);
        QVERIFY2(shown<DeviceWindow>().first()->windowTitle().contains("Kestrel K7"), "the chosen device's window");

        QVERIFY(main->_open->isEnabled());
        m_simulators.clear();
        QTRY_COMPARE(rows(main), QStringList({"No Gateway Devices Available|"}));
        QVERIFY(!main->_open->isEnabled());
    }

    // Closing the main window is Exit (whose own path the tray test follows): the device
    // windows close too and the event loop ends.
    void closingEndsTheProgram()
    {
        QVERIFY(startSimulator("handset", "gamma"));
        m_delvix = std::make_unique<Delvix>(Delvix::Shell::Window);
        DeviceListWindow* main = shown<DeviceListWindow>().value(0);
        QVERIFY(main);
        QTRY_COMPARE(rows(main), QStringList({"Zantro USB Device: Kestrel K7|gamma"}));
        QVERIFY(activate(main, "gamma"));
        QTRY_COMPARE(shown<DeviceWindow>().size(), 1);
        const QPointer<DeviceWindow> device = shown<DeviceWindow>().first();

        QTimer::singleShot(0, main, &QWidget::close);
        QTimer guard;
        guard.callOnTimeout([] { QCoreApplication::exit(1); });
        guard.start(10000);
        QCOMPARE(QApplication::exec(), 0);
        QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
        QVERIFY(!device && !main->isVisible());
    }
};

QTEST_MAIN(MainWindowTest)
#include "tst_mainwindow.moc"
