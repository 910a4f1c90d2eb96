#include "DeviceWindow.h"
#include "MifWriter.h"
#include "ModuleInfoDialog.h"
#include "ModuleInfoView.h"
#include "ModuleListView.h"
#include "Portlex.h"
#include "SaveXmlReport.h"
#include "SimulatorProcess.h"
#include "TestImage.h"
#include "TestSupport.h"

#include <QApplication>
#include <QDesktopServices>
#include <QPointer>
#include <QSettings>
#include <QTemporaryDir>
#include <QtTest>

Q_DECLARE_METATYPE(MifEntry)

namespace {

// Known to the class database beside the program.
constexpr quint32 Heap = 0x01011001;
// In no database.
constexpr quint32 Stranger = 0x7E000001;
constexpr quint32 OtherStranger = 0x7E000002;

const QString DeviceId = QStringLiteral("tools");
const QString OddModulePath = QStringLiteral("/usermod/odd/odd.mif");

// A module whose header states other counts than its lists hold, with known and unknown ids.
MifEntry oddModule()
{
    MifEntry entry;
    entry.classes = {Heap, Stranger};
    MifApplet applet;
    applet.classId = Heap;
    applet.baseId = 5;
    applet.appType = 5;
    applet.host = 0x0A0B0C0D;
    applet.privSet = 0x1234;
    applet.flags = 0x00F0;
    entry.applets = {applet};
    entry.externalClasses = {OtherStranger};
    entry.notifiers = {MifNotifier{Stranger, Heap, 0xFF00FF00}};
    entry.mimeTypes = {MifMimeType{Heap, Stranger, QStringLiteral("text/x-odd")}};
    entry.classCount = 9;
    entry.appletCount = 3;
    entry.externalClassCount = 4;
    entry.notificationCount = 1;
    entry.mimeTypeCount = 1;
    return entry;
}

// What the odd module shows: the counts as stored, then each table's rows (">" marks a
// cell aligned right).
const QStringList OddModuleLines = {
    "counts: 9|3|4|1|1",
    "_classIDTable: Heap|0x01011001|Kernel|Memory",
    "_classIDTable: not found|0x7E000001|unknown|unknown",
    "_appletTable: Heap|0x01011001|Kernel|Memory|>5|0x0005|0x0A0B0C0D|0x1234|0x00F0",
    "_externalClassesTable: not found|0x7E000002|unknown|unknown",
    "_notifiersTable: not found|0x7E000001|unknown|unknown|Heap|0x01011001|Kernel|Memory|0xFF00FF00",
    "_mimeTypeTable: text/x-odd|0x01011001|Heap|Kernel|Memory|0x7E000001|not found|unknown|unknown",
};

const QString OddModuleXml = QStringLiteral(
    "<!DOCTYPE zant-mif-entry>\n"
    "<mifEntry classCount=\"9\" appletCount=\"3\" extClassCount=\"4\" notificationCount=\"1\" mimeTypeCount=\"1\">\n"
    " <classes>\n"
    "  <class name=\"Heap\" id=\"0x01011001\" family=\"Kernel\" subfamily=\"Memory\"/>\n"
    "  <class name=\"not found\" id=\"0x7E000001\" family=\"unknown\" subfamily=\"unknown\"/>\n"
    " </classes>\n <applets>\n"
    "  <applet name=\"Heap\" id=\"0x01011001\" family=\"Kernel\" subfamily=\"Memory\" baseid=\"5\" apptype=\"0x0005\""
    " host=\"0x0A0B0C0D\" privset=\"0x1234\" flags=\"0x00F0\"/>\n"
    " </applets>\n <externalClasses>\n"
    "  <externalClass name=\"not found\" id=\"0x7E000002\" family=\"unknown\" subfamily=\"unknown\"/>\n"
    " </externalClasses>\n <notifiers>\n"
    "  <notifier typename=\"not found\" typeid=\"0x7E000001\" typefamily=\"unknown\" typesubfamily=\"unknown\""
    " notifiername=\"Heap\" notifierid=\"0x01011001\" notifierfamily=\"Kernel\" notifiersubfamily=\"Memory\""
    " mask=\"0xFF00FF00\"/>\n </notifiers>\n <mimetypes>\n"
    "  <mimetype value=\"text/x-odd\" handlerid=\"0x01011001\" handlername=\"Heap\" handlerfamily=\"Kernel\""
    " handlersubfamily=\"Memory\" baseid=\"0x7E000001\" basename=\"not found\" basefamily=\"unknown\""
    " basesubfamily=\"unknown\"/>\n </mimetypes>\n"
    "</mifEntry>\n");

QStringList viewLines(const ModuleInfoView* view)
{
    QStringList lines;
    QStringList counts;
    for (const QLineEdit* edit : {view->_classCount, view->_appletCount, view->_extClassCount, view->_notifierCount,
                                  view->_mimeTypeCount})
        counts << edit->text();
    if (!counts.join(QString()).isEmpty())
        lines << "counts: " + counts.join('|');
    for (const QTableWidget* table : {view->_classIDTable, view->_appletTable, view->_externalClassesTable,
                                      view->_notifiersTable, view->_mimeTypeTable}) {
        for (int row = 0; row < table->rowCount(); ++row) {
            QStringList cells;
            for (int column = 0; column < table->columnCount(); ++column) {
                const QTableWidgetItem* item = table->item(row, column);
                const bool right = item && (item->textAlignment() & Qt::AlignRight);
                cells << (right ? ">" : "") + (item ? item->text() : "<none>");
            }
            lines << table->objectName() + ": " + cells.join('|');
        }
    }
    return lines;
}

QList<ModuleInfoDialog*> openDialogs()
{
    QList<ModuleInfoDialog*> dialogs;
    for (QWidget* widget : QApplication::topLevelWidgets()) {
        if (auto* dialog = qobject_cast<ModuleInfoDialog*>(widget))
            dialogs << dialog;
    }
    return dialogs;
}

// The only dialog open, if it is shown on its own, not modal and with a size grip.
ModuleInfoDialog* theOpenDialog()
{
    const QList<ModuleInfoDialog*> dialogs = openDialogs();
    ModuleInfoDialog* dialog = dialogs.size() == 1 ? dialogs.first() : nullptr;
    return dialog && dialog->isVisible() && !dialog->isModal() && !dialog->parent() && dialog->isSizeGripEnabled()
        ? dialog : nullptr;
}

// A MIF container without the module header resource.
QByteArray containerWithoutModule()
{
    MifWriter writer;
    writer.addResource(0x4000, 1, "something else");
    return writer.data();
}

// Records the files the window hands to the desktop.
class DesktopSpy : public QObject
{
    Q_OBJECT
public:
    QList<QUrl> opened;
public slots:
    void open(const QUrl& url) { opened << url; }
};

} // namespace

// The module information view and dialog, alone and reached from a device window: what
// they show of an entry, where it comes from, its export, and where the dialogs open.
class ModuleInfoDialogTest : public QObject
{
    Q_OBJECT

    QTemporaryDir m_sockets;
    QTemporaryDir m_files;
    TestImage m_image;
    SimulatorProcess m_simulator{m_sockets.path()};
    QList<QPointer<DeviceWindow>> m_windows;

    DeviceWindow* openWindow()
    {
        auto* window = new DeviceWindow;
        m_windows << window;
        window->setDevice(DeviceId);
        window->show();
        return window;
    }

private slots:
    void initTestCase()
    {
        Q_INIT_RESOURCE(delvix);
        QCoreApplication::setOrganizationName("Norvale");
        QCoreApplication::setApplicationName("Delvix");
        const QByteArray odd = MifWriter::moduleData(oddModule());
        QVERIFY(TestSupport::writeFile(m_files.filePath("odd.mif"), odd));
        QVERIFY(TestSupport::writeFile(m_files.filePath("empty.mif"), containerWithoutModule()));
        QVERIFY(TestSupport::writeFile(m_files.filePath("garbage.mif"), "not a resource container at all"));

        m_image.fillDefault();
        m_image.writeFile("flash/usermod/odd/odd.mif", odd);
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        Portlex::Initialize();
        QVERIFY(m_simulator.connectDevice(m_image.path(), DeviceId));
    }
    void init() { QSettings().remove("ModuleInfoDialog"); }
    void cleanup()
    {
        qDeleteAll(m_windows);
        m_windows.clear();
        qDeleteAll(openDialogs());
    }

    // The same module given as an entry or read from a MIF file on disk (asked of the device:
    // moduleListDoubleClickOpensTheModule), replacing every row of an entry shown before.
    // "Save Module Info..." offers the file's module name with ".xml" and writes the export unchanged.
    void showsTheModule()
    {
        QTemporaryDir folder;
        QString caption;
        saveXmlReportDialogs().askFileName = [&](QWidget*, const QString& asked, const QString&, const QString&) {
            caption = asked;
            return folder.filePath("saved.xml");
        };
        MifEntry before;
        before.classes = {Stranger, OtherStranger};
        for (const bool fromFile : {false, true}) {
            ModuleInfoDialog dialog;
            dialog.show();
            QVERIFY(dialog._moduleInfoView->setMifEntry(before));
            if (fromFile)
                dialog.openMifFile(m_files.filePath("odd.mif"), "odd");
            else
                QVERIFY(dialog._moduleInfoView->setMifEntry(oddModule()));
            QCOMPARE(dialog.windowTitle(), fromFile ? QString("Module Info odd") : QString("Module Info"));
            QCOMPARE(viewLines(dialog._moduleInfoView), OddModuleLines);
            dialog._saveModInfoButton->click();
            QCOMPARE(TestSupport::readFile(folder.filePath("saved.xml")), OddModuleXml.toLocal8Bit());
            QVERIFY(dialog.isVisible());
        }
        saveXmlReportDialogs().askFileName = nullptr;
        QCOMPARE(caption, QString("Save fileodd.xml"));
    }

    // Nothing to show leaves the view empty; a device's failure is said above it with its code.
    // The title still names the module. Of files, only one that cannot be read is refused,
    // keeping what a view showed.
    void failuresLeaveTheViewEmpty_data()
    {
        QTest::addColumn<QString>("device");  // none: a file on disk
        QTest::addColumn<QString>("path");
        QTest::addColumn<bool>("read");
        QTest::addColumn<QString>("message");  // how it starts
        QTest::newRow("not a MIF") << "" << m_files.filePath("garbage.mif") << false << "";
        QTest::newRow("MIF without a module") << "" << m_files.filePath("empty.mif") << true << "";
        QTest::newRow("unknown device") << "nobody" << OddModulePath << false << "Error 1001: the device is not connected";
        QTest::newRow("module the device lacks") << DeviceId << "/usermod/none/none.mif" << false << "Error 1102";
    }
    void failuresLeaveTheViewEmpty()
    {
        QFETCH(QString, device);
        QFETCH(QString, path);
        QFETCH(bool, read);
        QFETCH(QString, message);
        ModuleInfoDialog dialog;
        if (device.isEmpty()) {
            ModuleInfoView view;
            view.setMifEntry(oddModule());
            QCOMPARE(view.loadMifFile(path), read);
            if (!read)
                QCOMPARE(viewLines(&view), OddModuleLines);
            dialog.openMifFile(path, "odd");
        } else {
            ModuleInfo module;
            module.name = "odd";
            module.path = path;
            dialog.openDeviceModule(device, module);
            QTRY_VERIFY(!dialog.isBusy());
        }
        QVERIFY2(message.isEmpty() ? dialog.message().isEmpty() : dialog.message().startsWith(message),
                 qPrintable(dialog.message()));
        QCOMPARE(dialog.windowTitle(), QString("Module Info odd"));
        QCOMPARE(viewLines(dialog._moduleInfoView), QStringList());
    }

    // A closed dialog leaves its place to the next one, unless that is off every screen.
    void placementOffEveryScreen()
    {
        QPointer<ModuleInfoDialog> first = new ModuleInfoDialog;
        first->show();
        first->move(9000, 9000);
        first->resize(520, 310);
        first->close();
        QTRY_VERIFY(first.isNull());
        // Reopened, it stands where it was closed: it does not walk.
        for (int opening = 0; opening < 2; ++opening) {
            QPointer<ModuleInfoDialog> dialog = new ModuleInfoDialog;
            QCOMPARE(QRect(dialog->pos(), dialog->size()), QRect(40, 40, 520, 310));
            dialog->show();
            dialog->close();
            QTRY_VERIFY(dialog.isNull());
        }
    }

    // A double-click in the device window's module list opens the module's own information.
    void moduleListDoubleClickOpensTheModule()
    {
        DeviceWindow* window = openWindow();
        window->action_Modules->trigger();
        QTableView* table = window->_moduleListView->_moduleTable;
        QTRY_VERIFY_WITH_TIMEOUT(window->_moduleListView->isComplete(), 20000);
        const QModelIndexList found = table->model()->match(table->model()->index(0, 0), Qt::DisplayRole, "odd", -1,
                                                            Qt::MatchExactly);
        QCOMPARE(found.size(), 1);
        table->scrollTo(found.first());
        // Through the window, as the platform delivers it: a widget-level double-click is never
        // paired with its press.
        const QPoint centre = table->visualRect(found.first()).center();
        QTest::mouseDClick(window->windowHandle(), Qt::LeftButton, {}, table->viewport()->mapTo(window, centre));

        ModuleInfoDialog* dialog = theOpenDialog();
        QVERIFY(dialog);
        QCOMPARE(dialog->windowTitle(), QString("Module Info odd"));
        QTRY_COMPARE(viewLines(dialog->_moduleInfoView), OddModuleLines);
    }

    // A device file's copy on this computer opens: one whose complete suffix is "mif", in
    // any case, as module information, any other on the desktop.
    void deviceFileOpensOnThePC_data()
    {
        QTest::addColumn<QString>("name");
        QTest::addColumn<QString>("opens");  // a dialog's title or "desktop"
        QTest::newRow("MIF") << "UPPER.MIF" << "Module Info UPPER";
        QTest::newRow("two suffixes") << "archive.old.mif" << "desktop";
    }
    void deviceFileOpensOnThePC()
    {
        QFETCH(QString, name);
        QFETCH(QString, opens);
        QTemporaryDir temporary;
        const QString local = temporary.filePath(name);
        QVERIFY(TestSupport::writeFile(local, MifWriter::moduleData(oddModule())));
        DesktopSpy desktop;
        QDesktopServices::setUrlHandler("file", &desktop, "open");
        openWindow()->onLocalCopyReady(local);
        QDesktopServices::unsetUrlHandler("file");

        QCOMPARE(desktop.opened, opens == "desktop" ? QList<QUrl>({QUrl::fromLocalFile(local)}) : QList<QUrl>());
        if (!opens.startsWith("Module")) {
            QCOMPARE(openDialogs().size(), 0);
            return;
        }
        QVERIFY(theOpenDialog());
        QCOMPARE(theOpenDialog()->windowTitle(), opens);
        QCOMPARE(viewLines(theOpenDialog()->_moduleInfoView), OddModuleLines);
    }
};

QTEST_MAIN(ModuleInfoDialogTest)
#include "tst_moduleinfodialog.moc"
