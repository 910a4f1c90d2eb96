#include "Delvix.h"
#include "DeviceWindow.h"
#include "Portlex.h"
#include "SimulatorProcess.h"
#include "SplashDialog.h"

#include <QApplication>
#include <QLabel>
#include <QMenu>
#include <QPointer>
#include <QSettings>
#include <QSystemTrayIcon>
#include <QTemporaryDir>
#include <QTest>

#include <algorithm>
#include <list>
#include <memory>

// The tray application on a display with a real tray host: the start-up balloon, the device
// menu, the connect step and Exit.
class TrayTest : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase();
    void init();
    void cleanup();
    void balloonOnTheFirstTwoStarts();
    void menuListsDevicesInReverseThenThePlaceholder();
    void everyChoiceOpensAWindow();
    void connectedDeviceIsNotConnectedAgain();
    void refusedConnectShowsItsReason();
    void exitClosesEveryWindow();

private:
    SimulatorProcess* startSimulator(const QString& image, const QString& id, const QStringList& extra = {});
    // Opens the tray menu as the tray does and returns the entries of its device section.
    QList<QAction*> openDeviceSection();
    QAction* deviceEntry(const QString& targetId);
    static QList<DeviceWindow*> deviceWindows();
    // The texts of the balloon beside the tray icon, empty while none is shown.
    static QStringList balloon();
    static void dismissBalloon();

    QTemporaryDir m_sockets;
    std::list<SimulatorProcess> m_simulators;
    std::unique_ptr<Delvix> m_delvix;
};

void TrayTest::initTestCase()
{
    Q_INIT_RESOURCE(delvix);
    QApplication::setOrganizationName("Norvale");
    QApplication::setApplicationName("Delvix");
    QApplication::setQuitOnLastWindowClosed(false);
    QTRY_VERIFY2_WITH_TIMEOUT(QSystemTrayIcon::isSystemTrayAvailable(), "no tray host on this display", 10000);
    QVERIFY(m_sockets.isValid());
    qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
    Portlex::Initialize();
}

void TrayTest::init()
{
    QSettings().clear();
    QSettings().setValue("seen", 2);
}

void TrayTest::cleanup()
{
    for (DeviceWindow* window : deviceWindows())
        delete window;
    m_delvix.reset();
    dismissBalloon();
    for (QWidget* widget : QApplication::topLevelWidgets()) {
        if (dynamic_cast<SplashDialog*>(widget))
            delete widget;
    }
    m_simulators.clear();
}

SimulatorProcess* TrayTest::startSimulator(const QString& image, const QString& id, const QStringList& extra)
{
    m_simulators.emplace_back(m_sockets.path());
    SimulatorProcess& simulator = m_simulators.back();
    if (!simulator.start(SimulatorProcess::sampleImage(image), id, extra)) {
        qWarning("%s", qPrintable(simulator.errorString()));
        return nullptr;
    }
    return &simulator;
}

QList<QAction*> TrayTest::openDeviceSection()
{
    auto* menu = m_delvix->findChild<QMenu*>();
    QMetaObject::invokeMethod(menu, "aboutToShow");
    QList<QAction*> section;
    bool inSection = false;
    for (QAction* action : menu->actions()) {
        const int role = action->data().toInt();
        if (role == 2 || role == 3)
            inSection = role == 2;
        else if (inSection)
            section << action;
    }
    return section;
}

QAction* TrayTest::deviceEntry(const QString& targetId)
{
    for (QAction* action : openDeviceSection()) {
        if (action->property("TargetID").toString() == targetId)
            return action;
    }
    return nullptr;
}

QList<DeviceWindow*> TrayTest::deviceWindows()
{
    QList<DeviceWindow*> windows;
    for (QWidget* widget : QApplication::topLevelWidgets()) {
        if (auto* window = qobject_cast<DeviceWindow*>(widget); window && window->isVisible())
            windows << window;
    }
    return windows;
}

QStringList TrayTest::balloon()
{
    QStringList texts;
    for (QWidget* widget : QApplication::topLevelWidgets()) {
        if (widget->inherits("QBalloonTip") && widget->isVisible()) {
            for (const QLabel* label : widget->findChildren<QLabel*>()) {
                if (!label->text().isEmpty())
                    texts << label->text();
            }
        }
    }
    return texts;
}

void TrayTest::dismissBalloon()
{
    for (QWidget* widget : QApplication::topLevelWidgets()) {
        if (widget->inherits("QBalloonTip"))
            widget->close();
    }
    QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
}

void TrayTest::balloonOnTheFirstTwoStarts()
{
    QSettings().remove("seen");
    const QString ready = "Zantro Delvix is ready.  Right click to interrogate any gateway enabled device or simulator.";
    for (int start = 1; start <= 3; ++start) {
        m_delvix = std::make_unique<Delvix>();
        QVERIFY(!m_delvix->isVisible());
        const QWidgetList windows = QApplication::topLevelWidgets();
        QVERIFY(std::any_of(windows.begin(), windows.end(), [](QWidget* window) {
            return dynamic_cast<SplashDialog*>(window) && window->isVisible();
        }));
        QCOMPARE(balloon(), start <= 2 ? QStringList({"Delvix", ready}) : QStringList());
        QCOMPARE(QSettings().value("seen").toInt(), std::min(start, 2));
        m_delvix.reset();
        dismissBalloon();
    }
}

void TrayTest::menuListsDevicesInReverseThenThePlaceholder()
{
    QVERIFY(startSimulator("simulator", "alpha"));
    QVERIFY(startSimulator("handset", "beta"));
    m_delvix = std::make_unique<Delvix>();
    QList<QPair<QString, QString>> listed;
    QCOMPARE(Portlex::GetDevices(listed), 2u);

    QList<QPointer<QAction>> previous;
    for (int opening = 1; opening <= 2; ++opening) {
        const QList<QAction*> section = openDeviceSection();
        QCOMPARE(section.size(), 2);
        for (int i = 0; i < 2; ++i) {
            QCOMPARE(section[i]->text(), listed[1 - i].first);
            QCOMPARE(section[i]->property("TargetID").toString(), listed[1 - i].second);
            QCOMPARE(section[i]->data().toInt(), 999);
        }
        for (const QPointer<QAction>& old : previous)
            QVERIFY2(!old, "entries of the last opening are deleted");
        previous = {section[0], section[1]};
    }

    auto* menu = m_delvix->findChild<QMenu*>();
    const QList<QAction*> all = menu->actions();
    QCOMPARE(all.first()->text(), QString("About"));
    QCOMPARE(all[1]->text(), QString("Scan Platform Class IDs"));
    QCOMPARE(all[2]->text(), QString("Compare Platforms"));
    QCOMPARE(all.last()->text(), QString("E&xit"));

    m_simulators.clear();
    const QList<QAction*> empty = openDeviceSection();
    QCOMPARE(empty.size(), 1);
    QCOMPARE(empty[0]->text(), QString("No Gateway Devices Available"));
    QCOMPARE(empty[0]->toolTip(), QString("Attach a gateway device or run the Simulator"));
    QVERIFY(!empty[0]->isEnabled());
    QVERIFY(!previous[0] && !previous[1]);
}

void TrayTest::everyChoiceOpensAWindow()
{
    QVERIFY(startSimulator("simulator", "alpha"));
    m_delvix = std::make_unique<Delvix>();
    deviceEntry("alpha")->trigger();
    deviceEntry("alpha")->trigger();
    const QList<DeviceWindow*> windows = deviceWindows();
    QCOMPARE(windows.size(), 2);
    for (DeviceWindow* window : windows)
        QCOMPARE(window->windowTitle(), QString("Delvix - Simulator Aurora"));
}

void TrayTest::connectedDeviceIsNotConnectedAgain()
{
    SimulatorProcess* simulator = startSimulator("handset", "gamma");
    QVERIFY(simulator);
    m_delvix = std::make_unique<Delvix>();
    deviceEntry("gamma")->trigger();
    QCOMPARE(deviceWindows().size(), 1);

    // The same device now refuses every connect: a second connect would show no window.
    simulator->stop();
    QVERIFY(simulator->start(SimulatorProcess::sampleImage("handset"), "gamma",
                             {"--refuse-connect", "7:Handset is locked"}));
    deviceEntry("gamma")->trigger();
    QCOMPARE(deviceWindows().size(), 2);
    QVERIFY(balloon().isEmpty());
}

void TrayTest::refusedConnectShowsItsReason()
{
    QVERIFY(startSimulator("simulator", "delta", {"--refuse-connect", "7:Handset is locked"}));
    m_delvix = std::make_unique<Delvix>();
    deviceEntry("delta")->trigger();
    QVERIFY(deviceWindows().isEmpty());
    QCOMPARE(balloon(), QStringList({"Connect Failed", "Failure Code: (7) Handset is locked"}));
}

void TrayTest::exitClosesEveryWindow()
{
    QVERIFY(startSimulator("handset", "epsilon"));
    m_delvix = std::make_unique<Delvix>();
    deviceEntry("epsilon")->trigger();
    deviceEntry("epsilon")->trigger();
    QList<QPointer<DeviceWindow>> windows;
    for (DeviceWindow* window : deviceWindows()) {
        window->resize(860, 700);
        windows << window;
    }
    QCOMPARE(windows.size(), 2);

    m_delvix->_actionExit->trigger();
    QVERIFY(QApplication::quitOnLastWindowClosed());
    QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
    for (const QPointer<DeviceWindow>& window : windows)
        QVERIFY(!window);
    QSettings settings;
    settings.beginGroup("Zantro USB Device: Kestrel K7");
    QCOMPARE(settings.value("size").toSize(), QSize(860, 700));
    QApplication::setQuitOnLastWindowClosed(false);
}

QTEST_MAIN(TrayTest)
#include "tst_tray.moc"
