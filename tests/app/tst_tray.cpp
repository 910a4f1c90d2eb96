#include "Delvix.h"
#include "DeviceWindow.h"
#include "Portlex.h"
#include "PortlexErrors.h"
#include "Protocol.h"
#include "SimulatorProcess.h"
#include "SplashDialog.h"
#include "TestSupport.h"

#include <QApplication>
#include <QLabel>
#include <QMenu>
#include <QPointer>
#include <QSettings>
#include <QSystemTrayIcon>
#include <QTemporaryDir>
#include <QTest>
#include <QTimer>

#include <list>
#include <memory>

// The tray application on a display with a real tray host: the start-up balloon, the device
// menu, the connect step, Exit, and a device that accepts connections but never answers.
class TrayTest : public QObject
{
    Q_OBJECT

    QTemporaryDir m_sockets;
    std::list<SimulatorProcess> m_simulators;
    std::unique_ptr<Delvix> m_delvix;

    SimulatorProcess* startSimulator(const QString& image, const QString& id, const QStringList& extra = {})
    {
        SimulatorProcess& simulator = m_simulators.emplace_back(m_sockets.path());
        if (simulator.start(SimulatorProcess::sampleImage(image), id, extra))
            return &simulator;
        qWarning("%s", qPrintable(simulator.errorString()));
        return nullptr;
    }
    // Opens the tray menu as the tray does and returns the entries of its device section.
    QList<QAction*> openDeviceSection()
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
    // The device's entry in the menu as it opens now, null while it is not listed.
    QAction* entry(const QString& targetId)
    {
        for (QAction* action : openDeviceSection()) {
            if (action->property("TargetID").toString() == targetId)
                return action;
        }
        return nullptr;
    }
    // Chooses the device's entry once the menu lists it.
    bool choose(const QString& targetId)
    {
        return QTest::qWaitFor([&] {
            QAction* action = entry(targetId);
            if (action)
                action->trigger();
            return action;
        });
    }
    // A working device and, listed beside it, one that accepts connections but never answers
    // (a stopped simulator, as id hung); null if they do not start.
    SimulatorProcess* startHungBesideGood(const QString& id = "hung")
    {
        SimulatorProcess* hung = startSimulator("handset", id);
        if (!hung || !startSimulator("simulator", "good"))
            return nullptr;
        m_delvix = std::make_unique<Delvix>();
        if (!QTest::qWaitFor([this, &id] { return entry("good") && entry(id); }))
            return nullptr;
        hung->pause();
        return hung;
    }
    static QList<DeviceWindow*> deviceWindows()
    {
        QList<DeviceWindow*> windows;
        for (QWidget* widget : QApplication::topLevelWidgets()) {
            if (auto* window = qobject_cast<DeviceWindow*>(widget); window && window->isVisible())
                windows << window;
        }
        return windows;
    }
    // The texts of the balloon beside the tray icon, empty while none is shown.
    static QStringList balloon()
    {
        QStringList texts;
        for (QWidget* widget : QApplication::topLevelWidgets()) {
            if (widget->inherits("QBalloonTip") && widget->isVisible()) {
                for (const QLabel* label : widget->findChildren<QLabel*>())
                    texts << label->text();
            }
        }
        texts.removeAll(QString());
        return texts;
    }

private slots:
    void initTestCase()
    {
        Q_INIT_RESOURCE(delvix);
        QApplication::setOrganizationName("Norvale");
        QApplication::setApplicationName("Delvix");
        QTRY_VERIFY2_WITH_TIMEOUT(QSystemTrayIcon::isSystemTrayAvailable(), "no tray host on this display", 10000);
        // Listed devices are probed; a stale socket is left out.
        QVERIFY(TestSupport::makeStaleSocket(m_sockets.filePath("stale.sock")));
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        Portlex::Initialize();
    }
    void init()
    {
        QApplication::setQuitOnLastWindowClosed(false);
        QSettings().clear();
        QSettings().setValue("seen", 2);
    }
    void cleanup()
    {
        qDeleteAll(deviceWindows());
        m_delvix.reset();
        for (QWidget* widget : QApplication::topLevelWidgets()) {
            if (widget->inherits("QBalloonTip"))
                widget->close();
            else if (dynamic_cast<SplashDialog*>(widget))
                delete widget;
        }
        QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
        m_simulators.clear();
    }

    void balloonOnTheFirstTwoStarts()
    {
        QSettings().remove("seen");
        for (int start = 1; start <= 3; ++start) {
            m_delvix = std::make_unique<Delvix>();
            QCOMPARE(!balloon().isEmpty(), start <= 2);
            QCOMPARE(QSettings().value("seen").toInt(), std::min(start, 2));
            cleanup();
        }
    }

    void menuListsDevicesInReverseThenThePlaceholder()
    {
        QVERIFY(startSimulator("simulator", "alpha") && startSimulator("handset", "beta"));
        m_delvix = std::make_unique<Delvix>();
        QList<QPair<QString, QString>> listed;
        QCOMPARE(Portlex::GetDevices(listed), 2u);
        QTRY_COMPARE(openDeviceSection().size(), 2);
        QList<QPointer<QAction>> previous;
        for (int opening = 1; opening <= 2; ++opening) {
            const QList<QAction*> section = openDeviceSection();
            QCOMPARE(section.size(), 2);
            for (int i = 0; i < 2; ++i)
                QCOMPARE(section[i]->property("TargetID").toString(), listed[1 - i].second);
            for (const QPointer<QAction>& old : previous)
                QVERIFY2(!old, "entries of the last opening are deleted");
            previous = {section[0], section[1]};
        }
        m_simulators.clear();
        QTRY_VERIFY(openDeviceSection().size() == 1 && openDeviceSection().first()->property("TargetID").isNull());
        QVERIFY(!openDeviceSection().first()->isEnabled());
        QVERIFY(!previous[0] && !previous[1]);
    }

    // A device already connected is not connected again, so that the refusal it would now
    // give shows nothing; a refused connect shows its reason and opens nothing.
    void connectsOnceAndShowsRefusals()
    {
        SimulatorProcess* simulator = startSimulator("handset", "gamma");
        QVERIFY(simulator && startSimulator("simulator", "delta", {"--refuse-connect", "7:Handset is locked"}));
        m_delvix = std::make_unique<Delvix>();
        QVERIFY(choose("gamma"));
        QTRY_COMPARE(deviceWindows().size(), 1);
        simulator->stop();
        QVERIFY(simulator->start(SimulatorProcess::sampleImage("handset"), "gamma", {"--refuse-connect", "7:Handset is locked"}));
        QVERIFY(choose("gamma"));
        QTRY_COMPARE(deviceWindows().size(), 2);
        QVERIFY(balloon().isEmpty());

        QVERIFY(choose("delta"));
        QTRY_COMPARE(balloon(), QStringList({"Connect Failed", "Failure Code: (7) Handset is locked"}));
        QCOMPARE(deviceWindows().size(), 2);
    }

    // Each choice opens a window; Exit closes them all, storing their place, and ends the
    // event loop, with windows open or not.
    void exitEndsTheEventLoop_data()
    {
        QTest::addColumn<int>("windows");
        QTest::newRow("two windows open") << 2;
        QTest::newRow("no window open") << 0;
    }
    void exitEndsTheEventLoop()
    {
        QFETCH(int, windows);
        QVERIFY(startSimulator("handset", "epsilon"));
        m_delvix = std::make_unique<Delvix>();
        for (int i = 0; i < windows; ++i)
            QVERIFY(choose("epsilon"));
        QTRY_COMPARE(deviceWindows().size(), windows);
        QList<QPointer<DeviceWindow>> open;
        for (DeviceWindow* window : deviceWindows()) {
            window->resize(860, 700);
            open << window;
        }

        QTimer::singleShot(0, m_delvix->_actionExit, &QAction::trigger);
        QTimer guard;
        guard.callOnTimeout([] { QCoreApplication::exit(1); });
        guard.start(10000);
        QCOMPARE(QApplication::exec(), 0);
        QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
        for (const QPointer<DeviceWindow>& window : open)
            QVERIFY(!window);
        if (windows > 0)
            QCOMPARE(QSettings().value("Zantro USB Device: Kestrel K7/size").toSize(), QSize(860, 700));
    }

    // The hung device's connect runs beside the GUI: a working device connects and opens its
    // window meanwhile, and the busy cursor stays until the hung one times out. The menu's
    // probe, on a thread of its own, keeps listing the hung device until then.
    void hungDeviceNeverHoldsUpTheTray()
    {
        QVERIFY(startHungBesideGood());
        QAction* hung = entry("hung");
        QVERIFY(hung);
        hung->trigger();
        QVERIFY(QGuiApplication::overrideCursor());
        QCOMPARE(QGuiApplication::overrideCursor()->shape(), Qt::BusyCursor);
        QVERIFY(choose("good"));
        QTRY_COMPARE(deviceWindows().size(), 1);
        QVERIFY2(QGuiApplication::overrideCursor(), "the hung device's connect is still under way");

        QTRY_VERIFY_WITH_TIMEOUT(!balloon().isEmpty(), 2 * Protocol::CallTimeoutMs);
        QCOMPARE(balloon().value(0), QString("Connect Failed"));
        QVERIFY2(balloon().value(1).startsWith(QString("Failure Code: (%1) ").arg(PortlexError::Timeout)),
                 qPrintable(balloon().value(1)));
        QVERIFY(!QGuiApplication::overrideCursor());
        QCOMPARE(deviceWindows().size(), 1);
        QTRY_VERIFY(!entry("hung") && entry("good"));
    }

    // A connect that ends after Exit opens nothing; a program that ends meanwhile waits for it
    // and gives back the busy cursor. The hung device, apart from the earlier one, answers once
    // Exit was chosen.
    void exitDuringAConnect()
    {
        SimulatorProcess* hung = startHungBesideGood("hung-ends");
        QVERIFY(hung && entry("hung-ends"));
        entry("hung-ends")->trigger();
        QVERIFY(QGuiApplication::overrideCursor());
        m_delvix->_actionExit->trigger();
        hung->resume();
        m_delvix.reset();
        QTRY_VERIFY(!QGuiApplication::overrideCursor());
        QVERIFY(deviceWindows().isEmpty() && balloon().isEmpty());
    }
};

QTEST_MAIN(TrayTest)
#include "tst_tray.moc"
