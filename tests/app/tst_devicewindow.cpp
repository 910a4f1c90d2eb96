#include "DeviceWindow.h"
#include "Portlex.h"
#include "SaveXmlReport.h"
#include "SimulatorProcess.h"

#include <QDesktopServices>
#include <QLabel>
#include <QLineEdit>
#include <QPointer>
#include <QSettings>
#include <QTemporaryDir>
#include <QTest>
#include <QTimer>
#include <QVBoxLayout>

#include <memory>

// A page the test drives by hand, to see what the window does with a page's signals.
class FakePage : public GatewayComponentWidget
{
    Q_OBJECT

public:
    using GatewayComponentWidget::GatewayComponentWidget;

    QString report;
    QStringList searches;
    int starts = 0;
    int raises = 0;
    int lowers = 0;

    void finish()
    {
        setStatus("Ready");
        setState(Complete);
    }

public slots:
    QString componentName() override { return "ModuleList"; }
    void startComponent(const QString&) override { ++starts; }
    bool canSearch() override { return status() == "Ready"; }
    bool search(const QString& text) override
    {
        searches << text;
        return true;
    }
    void raisePriority() override { ++raises; }
    void lowerPriority() override { ++lowers; }
    bool isComplete() override { return statusIsReady(); }
    QString xmlReport() override { return report; }
};

// Records the files the window hands to the desktop.
class DesktopSpy : public QObject
{
    Q_OBJECT

public:
    QList<QUrl> opened;

public slots:
    void open(const QUrl& url) { opened << url; }
};

class DeviceWindowTest : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase();
    void init();
    void cleanup();
    void titleShortensTheMakersNames_data();
    void titleShortensTheMakersNames();
    void unknownDevice();
    void storedGeometry_data();
    void storedGeometry();
    void closingStoresGeometryAndDeletes();
    void hintCursorOnTheFirstTwoWindows();
    void choosingTheShownPageDoesNothing();
    void switchingAttachesAndDetaches();
    void slotsWithoutPage();
    void searchAndExportFollowThePage();
    void timedStatusRestoresAndRestarts();
    void exportAsksForTheCurrentPage();
    void deviceFileOpensOnThePC();
    void unusableDeviceFileOpensNothing_data();
    void unusableDeviceFileOpensNothing();

private:
    struct ExtraSlot
    {
        FakePage* page;
        QAction* action;
    };
    DeviceWindow* openWindow(const QString& id);
    // A further stack slot with its own toolbar action, holding a fake page unless empty.
    static ExtraSlot addSlot(DeviceWindow* window, bool withPage = true);
    static QString statusText(DeviceWindow* window);
    static QTimer* timedStatusTimer(DeviceWindow* window);

    QTemporaryDir m_sockets;
    std::unique_ptr<SimulatorProcess> m_simulator;
    std::unique_ptr<SimulatorProcess> m_handset;
    QList<QPointer<DeviceWindow>> m_windows;
};

void DeviceWindowTest::initTestCase()
{
    Q_INIT_RESOURCE(delvix);
    QCoreApplication::setOrganizationName("Norvale");
    QCoreApplication::setApplicationName("Delvix");
    QVERIFY(m_sockets.isValid());
    qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));

    m_simulator = std::make_unique<SimulatorProcess>(m_sockets.path());
    QVERIFY2(m_simulator->start(SimulatorProcess::sampleImage("simulator"), "aurora"),
             qPrintable(m_simulator->errorString()));
    m_handset = std::make_unique<SimulatorProcess>(m_sockets.path());
    QVERIFY2(m_handset->start(SimulatorProcess::sampleImage("handset"), "kestrel"),
             qPrintable(m_handset->errorString()));

    Portlex::Initialize();
    QList<QPair<QString, QString>> devices;
    QCOMPARE(Portlex::GetDevices(devices), 2u);
    for (const char* id : {"aurora", "kestrel"})
        QVERIFY2(Portlex::ConnectDevice(Portlex::GetDevice(id), QString(), QString()), qPrintable(Portlex::LastStatus()));
}

void DeviceWindowTest::init()
{
    QSettings().clear();
}

void DeviceWindowTest::cleanup()
{
    saveXmlReportDialogs() = SaveXmlReportDialogs();
    for (const QPointer<DeviceWindow>& window : m_windows)
        delete window;
    m_windows.clear();
}

DeviceWindow* DeviceWindowTest::openWindow(const QString& id)
{
    auto* window = new DeviceWindow;
    m_windows << window;
    window->setDevice(id);
    window->show();
    return window;
}

DeviceWindowTest::ExtraSlot DeviceWindowTest::addSlot(DeviceWindow* window, bool withPage)
{
    auto* slot = new QWidget;
    auto* layout = new QVBoxLayout(slot);
    FakePage* page = withPage ? new FakePage(slot) : nullptr;
    if (page)
        layout->addWidget(page);
    QAction* action = window->_toolbar->addAction("Extra");
    action->setCheckable(true);
    action->setData(window->_stackedWidget->addWidget(slot));
    return {page, action};
}

QString DeviceWindowTest::statusText(DeviceWindow* window)
{
    return window->_statusBar->findChild<QLabel*>("_status")->text();
}

QTimer* DeviceWindowTest::timedStatusTimer(DeviceWindow* window)
{
    for (QTimer* timer : window->findChildren<QTimer*>(QString(), Qt::FindDirectChildrenOnly)) {
        if (timer->isSingleShot() && timer->interval() == DeviceWindow::TimedStatusMs)
            return timer;
    }
    return nullptr;
}

void DeviceWindowTest::titleShortensTheMakersNames_data()
{
    QTest::addColumn<QString>("id");
    QTest::addColumn<QString>("title");
    QTest::newRow("simulator") << "aurora" << "Delvix - Simulator Aurora";
    QTest::newRow("USB handset") << "kestrel" << "Delvix - Device: Kestrel K7";
}

void DeviceWindowTest::titleShortensTheMakersNames()
{
    QFETCH(QString, id);
    QFETCH(QString, title);
    DeviceWindow* window = openWindow(id);
    QCOMPARE(window->windowTitle(), title);
    QCOMPARE(window->_stackedWidget->currentIndex(), 0);
    QCOMPARE(window->_phoneInfoWidget->status(), QString("Ready"));
    QCOMPARE(statusText(window), QString("Ready"));
}

void DeviceWindowTest::unknownDevice()
{
    DeviceWindow* window = openWindow("no-such-device");
    QCOMPARE(window->windowTitle(), QString("Delvix - no-such-device"));
    QCOMPARE(statusText(window), QString("Device not found"));
    QTimer* timer = timedStatusTimer(window);
    QVERIFY(timer && timer->isActive());
    QMetaObject::invokeMethod(timer, "timeout");
    QCOMPARE(statusText(window), window->_phoneInfoWidget->status());
    QVERIFY(window->_phoneInfoWidget->state() != GatewayComponentWidget::Complete);
}

void DeviceWindowTest::storedGeometry_data()
{
    QTest::addColumn<QVariant>("storedPos");
    QTest::addColumn<QVariant>("storedSize");
    QTest::addColumn<QPoint>("pos");
    QTest::addColumn<QSize>("size");
    QTest::newRow("nothing stored") << QVariant() << QVariant() << QPoint(100, 100) << QSize(900, 600);
    QTest::newRow("on the screen") << QVariant(QPoint(120, 90)) << QVariant(QSize(640, 480)) << QPoint(120, 90)
                                   << QSize(640, 480);
    QTest::newRow("off every screen") << QVariant(QPoint(5000, 5000)) << QVariant(QSize(640, 480)) << QPoint(40, 40)
                                      << QSize(640, 480);
}

void DeviceWindowTest::storedGeometry()
{
    QFETCH(QVariant, storedPos);
    QFETCH(QVariant, storedSize);
    QFETCH(QPoint, pos);
    QFETCH(QSize, size);
    QSettings settings;
    settings.beginGroup("Zantro Simulator - Aurora");
    if (storedPos.isValid()) {
        settings.setValue("pos", storedPos);
        settings.setValue("size", storedSize);
    }
    settings.endGroup();
    // The other device's group is not this window's.
    settings.beginGroup("Zantro USB Device: Kestrel K7");
    settings.setValue("pos", QPoint(300, 200));
    settings.endGroup();

    auto* window = new DeviceWindow;
    m_windows << window;
    window->setDevice("aurora");
    QCOMPARE(window->pos(), pos);
    QCOMPARE(window->size(), size);
}

void DeviceWindowTest::closingStoresGeometryAndDeletes()
{
    QPointer<DeviceWindow> window = openWindow("kestrel");
    window->move(150, 60);
    window->resize(880, 690);
    QVERIFY(window->close());
    QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
    QVERIFY(!window);

    QSettings settings;
    settings.beginGroup("Zantro USB Device: Kestrel K7");
    QCOMPARE(settings.value("pos").toPoint(), QPoint(150, 60));
    QCOMPARE(settings.value("size").toSize(), QSize(880, 690));
}

void DeviceWindowTest::hintCursorOnTheFirstTwoWindows()
{
    for (int number = 1; number <= 3; ++number) {
        DeviceWindow* window = openWindow("aurora");
        const bool hinted = number <= 2;
        QCOMPARE(window->_modulePage->testAttribute(Qt::WA_SetCursor), hinted);
        if (hinted) {
            QCOMPARE(window->_modulePage->cursor().shape(), Qt::BitmapCursor);
            QCOMPARE(window->_modulePage->cursor().hotSpot(), QPoint(5, 0));
        }
        QCOMPARE(QSettings().value("moduleseen").toInt(), std::min(number, 2));
    }
}

void DeviceWindowTest::choosingTheShownPageDoesNothing()
{
    DeviceWindow* window = openWindow("aurora");
    window->SetTimedStatus("Passing message");
    window->action_Phone_Information->trigger();
    // A detach would have stopped the timer and put the page's status back.
    QVERIFY(timedStatusTimer(window)->isActive());
    QCOMPARE(statusText(window), QString("Passing message"));
    QCOMPARE(window->_stackedWidget->currentIndex(), 0);
    QVERIFY(window->action_Phone_Information->isChecked());
}

void DeviceWindowTest::switchingAttachesAndDetaches()
{
    DeviceWindow* window = openWindow("aurora");
    const ExtraSlot extra = addSlot(window);
    FakePage* page = extra.page;
    QCOMPARE(window->pageAt(extra.action->data().toInt()), page);
    page->setStatus("Processing Device Modules");

    extra.action->trigger();
    QCOMPARE(window->_stackedWidget->currentIndex(), extra.action->data().toInt());
    QCOMPARE(page->starts, 1);
    QCOMPARE(page->raises, 1);
    QCOMPARE(statusText(window), QString("Processing Device Modules"));

    window->action_Phone_Information->trigger();
    QVERIFY(window->action_Phone_Information->isChecked());
    QCOMPARE(page->lowers, 1);
    QCOMPARE(statusText(window), QString("Ready"));
    // A hidden page no longer reaches the status bar.
    page->setStatus("Hidden page talking");
    emit page->timedStatusChanged("Hidden page passing");
    QCOMPARE(statusText(window), QString("Ready"));

    extra.action->trigger();
    QCOMPARE(page->starts, 2);
    QCOMPARE(statusText(window), QString("Hidden page talking"));
}

void DeviceWindowTest::slotsWithoutPage()
{
    DeviceWindow* window = openWindow("aurora");
    QCOMPARE(window->_stackedWidget->count(), 10);
    // Every slot shows its page or says that it has none.
    for (int index = 0; index < 10; ++index) {
        const auto* note = window->_stackedWidget->widget(index)->findChild<QLabel*>(QString(), Qt::FindDirectChildrenOnly);
        QVERIFY2(bool(window->pageAt(index)) != bool(note), qPrintable(QString("slot %1").arg(index)));
    }

    const ExtraSlot empty = addSlot(window, false);
    empty.action->trigger();
    QCOMPARE(window->_stackedWidget->currentIndex(), empty.action->data().toInt());
    QVERIFY(statusText(window).isEmpty());
    QVERIFY(!window->actionExport_to_XML->isEnabled());
    QVERIFY(!window->_toolbar->findChild<QLineEdit*>()->isEnabled());
    window->action_Phone_Information->trigger();
    QCOMPARE(statusText(window), QString("Ready"));
}

void DeviceWindowTest::searchAndExportFollowThePage()
{
    DeviceWindow* window = openWindow("aurora");
    const ExtraSlot extra = addSlot(window);
    FakePage* page = extra.page;
    auto* box = window->_toolbar->findChild<QLineEdit*>();
    extra.action->trigger();
    QVERIFY(!box->isEnabled());
    QVERIFY(!window->actionExport_to_XML->isEnabled());

    page->setState(GatewayComponentWidget::Processing);
    QVERIFY(!box->isEnabled());
    page->finish();
    QVERIFY(box->isEnabled());
    QVERIFY(window->actionExport_to_XML->isEnabled());

    QTest::keyClicks(box, "abc");
    QCOMPARE(page->searches, QStringList({"a", "ab", "abc"}));

    page->setState(GatewayComponentWidget::Failed);
    QVERIFY(!box->isEnabled());
    QVERIFY(box->text().isEmpty());
    QVERIFY(!window->actionExport_to_XML->isEnabled());
}

void DeviceWindowTest::timedStatusRestoresAndRestarts()
{
    DeviceWindow* window = openWindow("aurora");
    QTimer* timer = timedStatusTimer(window);
    QVERIFY(timer);

    window->SetTimedStatus("first");
    QCOMPARE(statusText(window), QString("first"));
    QVERIFY(timer->isActive());
    QTest::qWait(300);
    const int left = timer->remainingTime();
    window->SetTimedStatus("second");
    QCOMPARE(statusText(window), QString("second"));
    QVERIFY2(timer->remainingTime() > left, "a second message restarts the count");

    QMetaObject::invokeMethod(timer, "timeout");
    QCOMPARE(statusText(window), QString("Ready"));

    // Leaving a page ends its passing message.
    window->SetTimedStatus("third");
    addSlot(window).action->trigger();
    QVERIFY(!timer->isActive());
}

void DeviceWindowTest::exportAsksForTheCurrentPage()
{
    QTemporaryDir folder;
    QStringList captions;
    QStringList folders;
    QStringList filters;
    saveXmlReportDialogs().askFileName = [&](QWidget*, const QString& caption, const QString& start,
                                             const QString& filter) {
        captions << caption;
        folders << start;
        filters << filter;
        return folder.filePath("modules.xml");
    };

    DeviceWindow* window = openWindow("aurora");
    // The phone information page exports nothing, so nobody is asked.
    window->actionExport_to_XML->trigger();
    QVERIFY(captions.isEmpty());

    const ExtraSlot extra = addSlot(window);
    FakePage* page = extra.page;
    page->report = "<zant-modules/>\n";
    extra.action->trigger();
    page->finish();
    window->actionExport_to_XML->trigger();
    QCOMPARE(captions, QStringList("Save fileModuleList"));
    QCOMPARE(filters, QStringList("XML Files (*.xml)"));
    QCOMPARE(folders, QStringList(QCoreApplication::applicationDirPath()));
    QFile written(folder.filePath("modules.xml"));
    QVERIFY(written.open(QIODevice::ReadOnly));
    QCOMPARE(written.readAll(), QByteArray("<zant-modules/>\n"));

    window->actionExport_to_XML->trigger();
    QCOMPARE(folders.last(), folder.path());
}

void DeviceWindowTest::deviceFileOpensOnThePC()
{
    QTemporaryDir temporary;
    const QByteArray previous = qgetenv("TMPDIR");
    qputenv("TMPDIR", QFile::encodeName(temporary.path()));
    DesktopSpy desktop;
    QDesktopServices::setUrlHandler("file", &desktop, "open");
    DeviceWindow* window = openWindow("aurora");
    window->onFileSystemDoubleClick("/shared/readme.txt");
    QDesktopServices::unsetUrlHandler("file");
    qputenv("TMPDIR", previous);

    const QString local = temporary.filePath("readme.txt");
    QCOMPARE(desktop.opened, QList<QUrl>({QUrl::fromLocalFile(local)}));
    QFile copied(local);
    QFile original(SimulatorProcess::sampleImage("simulator") + "/flash/shared/readme.txt");
    QVERIFY(copied.open(QIODevice::ReadOnly) && original.open(QIODevice::ReadOnly));
    QCOMPARE(copied.readAll(), original.readAll());
}

void DeviceWindowTest::unusableDeviceFileOpensNothing_data()
{
    QTest::addColumn<QString>("path");
    QTest::newRow("missing file") << "/shared/no-such-file.txt";
    QTest::newRow("parent folder") << "/shared/..";
    QTest::newRow("folder path") << "/shared/";
}

void DeviceWindowTest::unusableDeviceFileOpensNothing()
{
    QFETCH(QString, path);
    DesktopSpy desktop;
    QDesktopServices::setUrlHandler("file", &desktop, "open");
    DeviceWindow* window = openWindow("aurora");
    window->onFileSystemDoubleClick(path);
    QDesktopServices::unsetUrlHandler("file");
    QVERIFY(desktop.opened.isEmpty());
}

QTEST_MAIN(DeviceWindowTest)
#include "tst_devicewindow.moc"
