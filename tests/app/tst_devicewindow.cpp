#include "DeviceConnection.h"
#include "DeviceWindow.h"
#include "LockStatusWidget.h"
#include "ModuleInfoDialog.h"
#include "ModuleListView.h"
#include "Portlex.h"
#include "SaveXmlReport.h"
#include "SecuritySettingsDialog.h"
#include "SimulatorProcess.h"
#include "StubPage.h"
#include "TestImage.h"
#include "TestSupport.h"

#include <QElapsedTimer>
#include <QLabel>
#include <QLineEdit>
#include <QLocale>
#include <QPointer>
#include <QScrollArea>
#include <QScrollBar>
#include <QSettings>
#include <QTemporaryDir>
#include <QTest>
#include <QTimer>
#include <QVBoxLayout>

namespace {

const QString Led = QStringLiteral(":/LockStatusWidget/Resources/%1.png");

// An expiry text as the C library's ctime writes it: the day of month padded with a blank.
QString ctimeText(const QDate& date)
{
    return QLocale::c().toString(date, QStringLiteral("ddd MMM "))
        + QString::number(date.day()).rightJustified(2, ' ') + QStringLiteral(" 20:00:00 ")
        + QString::number(date.year());
}

} // namespace

// A page the test drives by hand, to see what the window does with a page's signals.
class FakePage : public StubPage
{
public:
    using StubPage::StubPage;
    QString report;
    QStringList searches;
    int starts = 0, raises = 0, lowers = 0;

    void finish() { setStatus("Ready"); setState(Complete); }
    void startComponent(const QString&) override { ++starts; }
    bool canSearch() override { return isComplete(); }
    bool search(const QString& text) override { searches << text; return true; }
    void raisePriority() override { ++raises; }
    void lowerPriority() override { ++lowers; }
    QString xmlReport() override { return report; }
};

class DeviceWindowTest : public QObject
{
    Q_OBJECT

    QTemporaryDir m_sockets;
    SimulatorProcess m_simulator { m_sockets.path() }, m_handset { m_sockets.path() };
    QList<QPointer<DeviceWindow>> m_windows;

    DeviceWindow* openWindow(const QString& id, bool show = true)
    {
        auto* window = new DeviceWindow;
        m_windows << window;
        window->setDevice(id);
        window->setVisible(show);
        return window;
    }
    // A further stack slot with its own toolbar action, holding a fake page unless withPage is false.
    static QPair<FakePage*, QAction*> addSlot(DeviceWindow* window, bool withPage = true)
    {
        auto* slot = new QWidget;
        auto* page = withPage ? new FakePage(slot) : nullptr;
        (new QVBoxLayout(slot))->addWidget(page ? page : new QWidget);
        QAction* action = window->_toolbar->addAction("Extra");
        action->setCheckable(true);
        action->setData(window->_stackedWidget->addWidget(slot));
        return {page, action};
    }
    static QString statusText(DeviceWindow* window) { return window->_statusBar->findChild<QLabel*>("_status")->text(); }
    static LockStatusWidget* indicator(DeviceWindow* window) { return window->findChild<LockStatusWidget*>(); }

private slots:
    void initTestCase()
    {
        Q_INIT_RESOURCE(delvix);
        QCoreApplication::setOrganizationName("Norvale");
        QCoreApplication::setApplicationName("Delvix");
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        Portlex::Initialize();
        QVERIFY(m_simulator.connectDevice(SimulatorProcess::sampleImage("simulator"), "aurora"));
        QVERIFY(m_handset.connectDevice(SimulatorProcess::sampleImage("handset"), "kestrel"));
    }
    void init() { QSettings().clear(); }
    void cleanup()
    {
        qDeleteAll(m_windows);
        m_windows.clear();
    }

    void titleAndFirstStatus_data()
    {
        QTest::addColumn<QString>("id");
        QTest::addColumn<QString>("title");
        QTest::addColumn<QString>("status");
        QTest::addColumn<QString>("message");
        QTest::newRow("simulator") << "aurora" << "Delvix - Simulator Aurora" << "Ready" << "";
        QTest::newRow("USB handset") << "kestrel" << "Delvix - Device: Kestrel K7" << "Ready" << "";
        QTest::newRow("unknown device") << "no-such-device" << "Delvix - no-such-device" << "" << "Device not found";
    }
    void titleAndFirstStatus()
    {
        QFETCH(QString, id);
        QFETCH(QString, title);
        QFETCH(QString, status);
        QFETCH(QString, message);
        DeviceWindow* window = openWindow(id);
        QCOMPARE(window->windowTitle(), title);
        QCOMPARE(statusText(window), status);
        QCOMPARE(window->message(), message);
    }

    // Placement is stored per device name; a stored place off every screen is corrected.
    void geometryPerDevice()
    {
        QSettings settings;
        settings.setValue("Zantro USB Device: Kestrel K7/pos", QPoint(300, 200));
        QCOMPARE(openWindow("aurora", false)->geometry(), QRect(100, 100, 900, 600));
        settings.setValue("Zantro Simulator - Aurora/pos", QPoint(120, 90));
        settings.setValue("Zantro Simulator - Aurora/size", QSize(640, 480));
        QCOMPARE(openWindow("aurora", false)->geometry(), QRect(120, 90, 640, 480));
        settings.setValue("Zantro Simulator - Aurora/pos", QPoint(5000, 5000));
        QCOMPARE(openWindow("aurora", false)->pos(), QPoint(40, 40));

        QPointer<DeviceWindow> window = openWindow("kestrel");
        window->move(150, 60);
        window->resize(880, 690);
        QVERIFY(window->close());
        QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
        QVERIFY(!window);
        QCOMPARE(settings.value("Zantro USB Device: Kestrel K7/pos").toPoint(), QPoint(150, 60));
        QCOMPARE(settings.value("Zantro USB Device: Kestrel K7/size").toSize(), QSize(880, 690));

        // Windows of one place cascade, and each stores the place without its step.
        settings.setValue("Zantro USB Device: Kestrel K7/size", QSize(400, 300));
        const QPoint first = openWindow("kestrel")->pos();
        DeviceWindow* second = openWindow("kestrel");
        QCOMPARE(second->pos(), first + QPoint(DeviceWindow::CascadeOffset, DeviceWindow::CascadeOffset));
        QVERIFY(second->close());
        QCOMPARE(settings.value("Zantro USB Device: Kestrel K7/pos").toPoint(), first);
    }

    // Only the first two windows ever opened show the hint cursors: the module page's and the
    // enablement indicator's.
    void hintCursorOnTheFirstTwoWindows()
    {
        for (int number = 1; number <= 3; ++number) {
            DeviceWindow* window = openWindow("aurora");
            QCOMPARE(window->_modulePage->testAttribute(Qt::WA_SetCursor), number <= 2);
            QCOMPARE(window->findChild<LockStatusWidget*>()->cursor().shape(), number <= 2 ? Qt::BitmapCursor : Qt::ArrowCursor);
        }
    }

    void switchingAttachesAndDetaches()
    {
        DeviceWindow* window = openWindow("aurora");
        // Every slot shows its page or says that it has none.
        for (int index = 0; index < window->_stackedWidget->count(); ++index) {
            const auto* note = window->_stackedWidget->widget(index)->findChild<QLabel*>(QString(), Qt::FindDirectChildrenOnly);
            QVERIFY2(bool(window->pageAt(index)) != bool(note), qPrintable(QString("slot %1").arg(index)));
        }
        const auto [page, action] = addSlot(window);
        page->setStatus("Processing Device Modules");
        window->SetTimedStatus("Passing message");
        window->action_Phone_Information->trigger();  // already shown: nothing happens
        QCOMPARE(window->message(), QString("Passing message"));

        action->trigger();
        QCOMPARE(window->_stackedWidget->currentIndex(), action->data().toInt());
        QVERIFY(page->starts == 1 && page->raises == 1);
        QCOMPARE(statusText(window), QString("Processing Device Modules"));

        window->action_Phone_Information->trigger();
        QCOMPARE(page->lowers, 1);
        QCOMPARE(statusText(window), QString("Ready"));
        // A hidden page no longer reaches the status bar.
        page->setStatus("Hidden page talking");
        emit page->timedStatusChanged("Hidden page passing");
        QCOMPARE(statusText(window), QString("Ready"));
        QVERIFY(window->message().isEmpty());
        action->trigger();
        QCOMPARE(page->starts, 2);
        QCOMPARE(statusText(window), QString("Hidden page talking"));
    }

    void searchAndExportFollowThePage()
    {
        QTemporaryDir folder;
        int asked = 0;
        saveXmlReportDialogs().askFileName = [&](QWidget*, const QString&, const QString&, const QString&) {
            ++asked;
            return folder.filePath("report.xml");
        };
        DeviceWindow* window = openWindow("aurora");
        window->actionExport_to_XML->trigger();  // the phone information page exports its facts
        QCOMPARE(asked, 1);
        QVERIFY(TestSupport::readFile(folder.filePath("report.xml")).startsWith("<!DOCTYPE phone-info>\n"));
        const auto [page, action] = addSlot(window);
        auto* box = window->_toolbar->findChild<QLineEdit*>();
        page->report = "<zant-modules/>\n";
        action->trigger();
        page->setState(GatewayComponentWidget::Processing);
        QVERIFY(!box->isEnabled() && !window->actionExport_to_XML->isEnabled());
        page->finish();
        QVERIFY(box->isEnabled() && window->actionExport_to_XML->isEnabled());
        QTest::keyClicks(box, "abc");
        QCOMPARE(page->searches, QStringList({"a", "ab", "abc"}));
        window->actionExport_to_XML->trigger();
        saveXmlReportDialogs() = SaveXmlReportDialogs();
        QCOMPARE(asked, 2);
        QCOMPARE(TestSupport::readFile(folder.filePath("report.xml")), QByteArray("<zant-modules/>\n"));
        page->setState(GatewayComponentWidget::Failed);
        QVERIFY(!box->isEnabled() && box->text().isEmpty() && !window->actionExport_to_XML->isEnabled());

        // A slot without a page: no status, no search, no export.
        box->setEnabled(true);
        addSlot(window, false).second->trigger();
        QVERIFY(statusText(window).isEmpty() && !box->isEnabled() && !window->actionExport_to_XML->isEnabled());
    }

    // An action's result stays beside the status until the next action: the page's ticks do
    // not overwrite it, a search or a page switch ends it.
    void actionResultsStayUntilTheNextAction()
    {
        DeviceWindow* window = openWindow("aurora");
        const auto [page, action] = addSlot(window);
        action->trigger();
        page->finish();
        emit page->timedStatusChanged("Copied 3 files");
        page->setStatus("Processing");
        page->setStatus("Ready");
        QCOMPARE(QStringList({statusText(window), window->message()}), QStringList({"Ready", "Copied 3 files"}));
        QTest::keyClicks(window->_toolbar->findChild<QLineEdit*>(), "x");
        QVERIFY(window->message().isEmpty());
        emit page->timedStatusChanged("Error 1106: system folder");
        QCOMPARE(window->message(), QString("Error 1106: system folder"));
        window->action_Phone_Information->trigger();
        QVERIFY(window->message().isEmpty());
    }

    // What the indicator and the dialog show in each mode, the dialog opened by a click on
    // the indicator; "Lock" ends the mode it names (the service first), and the indicator
    // shows the outcome once the dialog is closed.
    void enablementThroughTheWindow_data()
    {
        QTest::addColumn<QString>("mode");
        QTest::addColumn<QString>("expiry");
        QTest::addColumn<QStringList>("indicator"); // text, LED, tool tip
        QTest::addColumn<QStringList>("panel"); // mode, expiry, privilege values...
        QTest::addColumn<QString>("afterLock");
        const QString soon = ctimeText(QDate::currentDate().addDays(30));
        const QString service = QStringLiteral("Developer Enabled Service"),
                      sig = QStringLiteral("Developer Enabled Signature");
        const QStringList priviledges = {"0x00000011", "0x12345678"};
        // The service's LED is green while 7 or more days are left; a day of month padded with a
        // blank (the 5th) reads too.
        const QDate today = QDate::currentDate(), later = today.addDays(40);
        const QList<std::tuple<const char*, QDate, QString>> services
            = {{"service 7 days", today.addDays(7), "GreenLED"},
                {"service 6 days", today.addDays(6), "YellowLED"},
                {"service padded day", QDate(later.year(), later.month(), 5), "GreenLED"}};
        for (const auto& [tag, date, led] : services) {
            const QString expiry = ctimeText(date);
            QTest::newRow(tag) << "service" << expiry
                               << QStringList {"DES Enabled", led, service + " expires:\n" + expiry}
                               << QStringList {service, expiry} + priviledges << "Simulator Enabled";
        }
        QTest::newRow("signature") << "signature" << soon
                                   << QStringList {"Sig Enabled", "Globe", sig + " expires:\n" + soon}
                                   << QStringList {sig, soon} << "Simulator Enabled";
        QTest::newRow("both") << "both" << soon
                              << QStringList {"Sig Enabled", "Globe", sig + " expires:\n" + soon}
                              << QStringList {sig, soon} << "Sig Enabled";
        QTest::newRow("none") << "none" << soon << QStringList {"Simulator Enabled", "UnlitLED", ""}
                              << QStringList {"Disabled???", ""} << "Simulator Enabled";
    }
    void enablementThroughTheWindow()
    {
        QFETCH(QString, mode);
        QFETCH(QString, expiry);
        QFETCH(QStringList, indicator);
        QFETCH(QStringList, panel);
        QFETCH(QString, afterLock);
        TestImage image;
        image.fillDefault();
        QByteArray profile = TestImage::defaultProfile();
        profile.replace(R"(mode="service")", "mode=\"" + mode.toUtf8() + '"');
        profile.replace("Sun Sep 19 20:00:00 2027", expiry.toUtf8());
        image.writeProfile(profile);
        SimulatorProcess simulator(m_sockets.path());
        const QString id = QString(QStringLiteral("lock-") + QTest::currentDataTag()).replace(' ', '-');
        QVERIFY(simulator.connectDevice(image.path(), id));

        DeviceWindow window;
        window.setDevice(id);
        window.show();
        auto* status = window.findChild<LockStatusWidget*>();
        QTRY_VERIFY(!status->isBusy());
        QCOMPARE(status->_modeStatus->text(), indicator.at(0));
        QCOMPARE(status->_ledStatus->pixmap().toImage(),
            QImage(Led.arg(indicator.at(1)))
                .convertToFormat(status->_ledStatus->pixmap().toImage().format()));
        QCOMPARE(status->toolTip(), indicator.at(2));

        QStringList shown;
        QTimer answered;
        connect(&answered, &QTimer::timeout, this, [&] {
            auto* dialog = window.findChild<SecuritySettingsDialog*>();
            const SecuritySettings* settings = dialog ? dialog->_securitySettings : nullptr;
            if (!settings || settings->isBusy())
                return;
            answered.stop();
            shown << settings->_unlockModeLabel->text() << settings->_expiresLabel->text();
            for (int row = 0; row < settings->_priviledgeTable->rowCount(); ++row)
                shown << settings->_priviledgeTable->item(row, 0)->text();
            settings->_lockButton->click();
            dialog->okButton->click();
        });
        answered.start(10);
        QTest::mouseClick(status->_modeStatus, Qt::LeftButton);
        QCOMPARE(shown, panel);
        QTRY_COMPARE(status->_modeStatus->text(), afterLock);
    }

    // The window hands the device record to these pages at once, shown or not.
    void recordPagesFillWhileHidden()
    {
        DeviceWindow* window = openWindow("kestrel");
        QTRY_COMPARE_WITH_TIMEOUT(window->_classListView->status(), QString("Ready"), 20000);
        QTRY_COMPARE_WITH_TIMEOUT(window->_familyTreeView->status(), QString("Ready"), 20000);
        QCOMPARE(window->_stackedWidget->currentIndex(), 0);
        QVERIFY(window->_classListView->_classIDTable->model()->rowCount() > 0);
        QVERIFY(window->_familyTreeView->_familyTree->topLevelItemCount() > 0);
        QVERIFY(window->_levelViewWidget->_levelDocuments->count() > 1);  // the prompt and the level files
    }

    void moduleDoubleClicksRoutedWhileShown()
    {
        DeviceWindow* window = openWindow("aurora");
        // Disconnecting the route tells whether it was there.
        const auto routed = [window] {
            return QObject::disconnect(window->_moduleListView, &ModuleListView::doubleClick, window,
                                       &DeviceWindow::onModuleInfoExamine);
        };
        QVERIFY(!routed());
        window->action_Modules->trigger();
        QVERIFY(routed());
        window->action_Phone_Information->trigger();
        window->action_Modules->trigger();
        window->action_Phone_Information->trigger();
        QVERIFY(!routed());
        window->action_Modules->trigger();
        QVERIFY(routed());
    }

    // Phone Information scrolls in a small window and shows every value in full.
    void phoneInformationScrolls()
    {
        DeviceWindow* window = openWindow("aurora");
        QLabel* model = window->_phoneInfoWidget->_model;
        QCOMPARE(model->text(), QString("Aurora Reference Simulator"));
        QTRY_VERIFY(model->width() >= model->sizeHint().width());
        window->resize(800, 500);
        auto* area = window->_phoneInfoWidget->findChild<QScrollArea*>();
        QTRY_VERIFY(area && area->verticalScrollBar()->maximum() > 0);
    }

    // A paused device: the dialogs and the indicator ask it off the GUI thread, which never
    // stalls for a whole call timeout; each says why its call failed, and the window counts the
    // device as gone until it answers again.
    void pausedDeviceNeverHoldsTheGui()
    {
        DeviceConnection::setCallTimeoutMs(1500);
        SimulatorProcess simulator(m_sockets.path());
        QVERIFY(simulator.connectDevice(SimulatorProcess::sampleImage("simulator"), "paused"));
        DeviceWindow* window = openWindow("paused");
        QTRY_VERIFY(!indicator(window)->isBusy());
        simulator.pause();
        QElapsedTimer clock;
        qint64 last = 0, longest = 0;
        QTimer heartbeat;
        connect(&heartbeat, &QTimer::timeout, this, [&] {
            longest = std::max(longest, clock.elapsed() - last);
            last = clock.elapsed();
        });
        clock.start();
        heartbeat.start(5);
        QPointer<ModuleInfoDialog> info = new ModuleInfoDialog;
        info->openDeviceModule("paused", ModuleInfo());
        SecuritySettingsDialog security;
        security.setDevice("paused");
        indicator(window)->setDevice("paused");
        QTRY_VERIFY_WITH_TIMEOUT(!info->isBusy() && !security._securitySettings->isBusy(), 10000);
        QTRY_COMPARE_WITH_TIMEOUT(statusText(window), QString("Device disconnected"), 10000);
        QVERIFY2(longest < DeviceConnection::callTimeoutMs(), qPrintable(QString::number(longest)));
        const QString failure = "Error 1002: the device did not answer in time";
        QCOMPARE(QStringList({info->message(), security._securitySettings->_unlockModeLabel->text()}), QStringList({failure, failure}));
        simulator.resume();
        QTRY_VERIFY_WITH_TIMEOUT(window->deviceConnected(), 15000);
        DeviceConnection::setCallTimeoutMs(Protocol::CallTimeoutMs);
        delete info;
    }

    // A device that goes away: the window says so, greys its pages, keeps their data without
    // error texts and takes no device action. The same id back: the pages ask again without
    // the window being reopened; so does Refresh, and a page whose data an action changed.
    void goneAndBack()
    {
        SimulatorProcess simulator(m_sockets.path());
        const QString image = SimulatorProcess::sampleImage("simulator");
        QVERIFY(simulator.connectDevice(image, "returning"));
        DeviceWindow* window = openWindow("returning");
        window->action_Modules->trigger();
        QTRY_COMPARE_WITH_TIMEOUT(window->_moduleListView->status(), QString("Ready"), 20000);
        const int modules = window->_moduleListView->_moduleTable->model()->rowCount();
        QPointer<ModuleListView> page = window->_moduleListView;
        simulator.kill();
        QTRY_COMPARE_WITH_TIMEOUT(statusText(window), QString("Device disconnected"), 15000);
        QCOMPARE(indicator(window)->_modeStatus->text(), QString("Disconnected"));
        QVERIFY(!window->_stackedWidget->isEnabled() && !indicator(window)->isEnabled()
                && !window->action_Security_Settings->isEnabled() && !window->actionExport_to_XML->isEnabled());
        QCOMPARE(page->_moduleTable->model()->rowCount(), modules);
        for (const QLabel* label : window->_phoneInfoWidget->findChildren<QLabel*>())
            QVERIFY2(!label->text().contains("Error") && !label->text().contains("not found"), qPrintable(label->text()));

        QVERIFY(simulator.start(image, "returning"));
        QTRY_VERIFY_WITH_TIMEOUT(window->deviceConnected(), 15000);
        QVERIFY(!page && window->_stackedWidget->isEnabled());
        QTRY_COMPARE_WITH_TIMEOUT(window->_moduleListView->status(), QString("Ready"), 20000);
        QCOMPARE(window->_moduleListView->_moduleTable->model()->rowCount(), modules);
        QCOMPARE(window->_phoneInfoWidget->_model->text(), QString("Aurora Reference Simulator"));
        QTRY_VERIFY(indicator(window)->isEnabled());

        page = window->_moduleListView;
        for (QAction* action : window->menu_View->actions()) {
            if (action->shortcut() == QKeySequence(QKeySequence::Refresh))
                action->trigger();
        }
        QVERIFY(!page);
        QTRY_COMPARE_WITH_TIMEOUT(window->_moduleListView->status(), QString("Ready"), 20000);
        window->action_Phone_Information->trigger();
        page = window->_moduleListView;
        emit window->_deviceFSView->deviceContentChanged();
        QVERIFY(page);
        window->action_Modules->trigger();
        QVERIFY(!page);
    }
};

QTEST_MAIN(DeviceWindowTest)
#include "tst_devicewindow.moc"
