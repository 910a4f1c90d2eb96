#include "DeviceFileSystemView.h"
#include "DeviceFileSystemViewThread.h"
#include "PageFixtures.h"
#include "Portlex.h"
#include "PrivateTempFolder.h"
#include "SimulatorProcess.h"
#include "StubPage.h"
#include "TestSupport.h"
#include "TransferPlan.h"
#include "WinVolumeMonitor.h"
#include "_ZantDevice.h"

#include <QApplication>
#include <QMenu>
#include <QMessageBox>
#include <QMimeData>
#include <QProcess>
#include <QProgressDialog>
#include <QPushButton>
#include <QRegularExpression>
#include <QSemaphore>
#include <QSignalSpy>
#include <QTemporaryDir>
#include <QTimer>

#include <functional>

#include <sys/inotify.h>
#include <sys/stat.h>
#include <unistd.h>

using namespace PageFixtures;
using namespace TestSupport;

namespace {

const QString Volume = QStringLiteral("flash");

// The volume of the test device: every crawl priority, sizes either side of the kB limit,
// a module to run and a file at the top level.
bool writeImage(const QString& folder, quint64 volumeSize = 64 << 20)
{
    const QDir image(folder);
    const QList<QPair<QString, QByteArray>> files = {
        {"readme.txt", "read me"},         {"alpha/nine.bin", QByteArray(9998, 'n')},
        {"alpha/ten.bin", QByteArray(9999, 't')}, {"zeta/z.txt", "z"},
        {"err/e.log", "e"},                {"shared/s.txt", "s"},
        {"user/photos/p.jpg", "jpeg"},     {"usermod/app/APP.MOD", "code"}};
    for (const auto& file : files) {
        if (!writeFile(image.filePath(Volume + "/" + file.first), file.second))
            return false;
    }
    return writeFile(image.filePath("device.xml"),
                     "<device id=\"fs\" name=\"Files\" connection=\"simulator\">\n"
                     " <identity phoneName=\"Files\" targetId=\"0x0A1100FE\" zantVersion=\"3.2.9\"/>\n"
                     " <volume id=\"65537\" name=\"Flash\" mount=\"/\" folder=\"flash\" size=\""
                         + QByteArray::number(volumeSize) + "\"/>\n</device>\n");
}

// The levels in the order the crawl fetches them, with how many entries each shows.
const QList<QPair<QString, int>> CrawlOrder = {{"/", 7},       {"/usermod", 1}, {"/usermod/app", 1},
                                               {"/user", 1},   {"/user/photos", 1}, {"/err", 1},
                                               {"/shared", 1}, {"/alpha", 2},   {"/zeta", 1}};

QTreeWidgetItem* itemAt(QTreeWidget* tree, const QString& path)
{
    for (QTreeWidgetItemIterator it(tree); *it; ++it) {
        if ((*it)->data(0, Qt::UserRole).toString() == path)
            return *it;
    }
    return nullptr;
}

// Answers the next message box with a button and remembers its title and text.
class BoxAnswer
{
public:
    explicit BoxAnswer(QMessageBox::StandardButton button)
    {
        QObject::connect(&m_timer, &QTimer::timeout, [this, button] {
            if (auto* box = qobject_cast<QMessageBox*>(QApplication::activeModalWidget())) {
                seen = box->windowTitle() + "|" + box->text();
                box->button(button)->click();
                m_timer.stop();
            }
        });
        m_timer.start(10);
    }
    QString seen;

private:
    QTimer m_timer;
};

// Sends a drag of mime over the item at path (the empty space below the rows when empty) and
// drops it there; true when the tree accepted the drag.
bool dragAndDrop(QTreeWidget* tree, const QString& path, QMimeData* mime)
{
    QTreeWidgetItem* item = itemAt(tree, path);
    const QPoint at = item ? tree->visualItemRect(item).center() : QPoint(10, tree->viewport()->height() - 5);
    QDragEnterEvent enter(at, Qt::CopyAction, mime, Qt::LeftButton, Qt::NoModifier);
    QCoreApplication::sendEvent(tree->viewport(), &enter);
    if (!enter.isAccepted())
        return false;
    QDropEvent drop(at, Qt::CopyAction, mime, Qt::LeftButton, Qt::NoModifier);
    QCoreApplication::sendEvent(tree->viewport(), &drop);
    return true;
}

// Loses what the kernel queued once asked to, and says so as the kernel does when its
// queue overflows.
class LossyMonitor : public WinVolumeMonitor
{
public:
    using WinVolumeMonitor::WinVolumeMonitor;
    std::atomic<bool> lose{false};

protected:
    qint64 readEvents(char* buffer, qint64 size) override
    {
        const qint64 length = WinVolumeMonitor::readEvents(buffer, size);
        if (length <= 0 || !lose.exchange(false))
            return length;
        auto* overflow = reinterpret_cast<inotify_event*>(buffer);
        *overflow = inotify_event{};
        overflow->wd = -1;
        overflow->mask = IN_Q_OVERFLOW;
        return qint64(sizeof(inotify_event));
    }
};

// A plan's jobs as "kind source>target size" lines, local paths relative to base.
QStringList jobLines(const TransferPlan& plan, const QString& base)
{
    static const char* const kinds[] = {"copy", "install", "pull", "pull-folder", "run", "delete"};
    QStringList lines;
    for (const FileTransferThread::Job& job : plan.jobs())
        lines << QString("%1 %2>%3 %4").arg(kinds[job.kind], QString(job.source).remove(base), QString(job.target).remove(base)).arg(job.size);
    return lines;
}

} // namespace

// The file system page against real simulators: the crawl, the tree it fills, drops onto
// it, deletes, drags out through the drive watcher and cancelled copies; the watcher on a
// real folder; the private folder that device files are opened from.
class TestDeviceFileSystemView : public QObject
{
    Q_OBJECT

    QTemporaryDir m_home;
    QTemporaryDir m_sockets;
    QTemporaryDir m_local;
    std::unique_ptr<QTemporaryDir> m_image;
    std::unique_ptr<SimulatorProcess> m_simulator;

    // A fresh image served in place, so that the test sees the device's files.
    bool serve(const QStringList& arguments = {}, quint64 volumeSize = 64 << 20)
    {
        m_simulator.reset();
        m_image = std::make_unique<QTemporaryDir>();
        m_simulator = std::make_unique<SimulatorProcess>(m_sockets.path());
        return writeImage(m_image->path(), volumeSize)
            && m_simulator->connectDevice(m_image->path(), "fs", arguments, SimulatorProcess::Image::InPlace);
    }
    QString onDevice(const QString& path) const { return m_image->path() + "/" + Volume + path; }

    // A page shown on the device with its whole volume in the tree.
    std::unique_ptr<DeviceFileSystemView> filledPage()
    {
        auto page = std::make_unique<DeviceFileSystemView>();
        page->resize(800, 600);
        page->show();
        page->startComponent("fs");
        const bool filled = tickUntil(*page, [&page] {
            return itemAt(page->_fsTree, "/zeta/z.txt") && page->_fsTree->topLevelItemCount() == 7;
        });
        return filled ? std::move(page) : nullptr;
    }

private slots:
    void initTestCase()
    {
        // The page watches the home folder for drags out.
        qputenv("HOME", QFile::encodeName(m_home.path()));
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        QVERIFY(Portlex::Initialize());
    }

    void cleanupTestCase()
    {
        m_simulator.reset();
        Portlex::Destroy();
    }

    // The crawler fetches in priority order, skips a folder that fails and stops at
    // 0xDEADBEEF; the tree grows by one level per tick, each under its folder's item.
    void crawlAndTree_data()
    {
        QTest::addColumn<QString>("rule");
        QTest::addColumn<QStringList>("fetched");
        const QStringList all = {"/", "/usermod", "/usermod/app", "/user", "/user/photos", "/err", "/shared", "/alpha", "/zeta"};
        QTest::newRow("whole volume") << QString() << all;
        QTest::newRow("failing folder skipped") << "GetFileSystemLevel:/user=5"
                                                << QStringList{"/", "/usermod", "/usermod/app", "/err", "/shared", "/alpha", "/zeta"};
        QTest::newRow("0xDEADBEEF ends the crawl") << "GetFileSystemLevel:/err=0xDEADBEEF"
                                                   << QStringList{"/", "/usermod", "/usermod/app", "/user", "/user/photos"};
    }

    void crawlAndTree()
    {
        QFETCH(QString, rule);
        QFETCH(QStringList, fetched);
        QVERIFY(serve(rule.isEmpty() ? QStringList() : QStringList{"--fail", rule}));
        DeviceFileSystemView page;
        page.startComponent("fs");
        QTRY_COMPARE_WITH_TIMEOUT(page._friendlyName->text(), QString("Flash"), 20000);
        QCOMPARE(page._volumeId->text(), QString("65537"));

        // Each busy tick shows the next level in crawl order under its folder's item.
        int shown = 0;
        int before = 0;
        QStringList wrong;
        connect(&page.pacer(), &TickPacer::armed, this, [&](int ms) {
            const int now = int(treeLines(page._fsTree).size());
            if (ms == 0 && shown < fetched.size()) {
                const QString path = fetched.at(shown++);
                const auto level = std::find_if(CrawlOrder.cbegin(), CrawlOrder.cend(), [&](const auto& l) { return l.first == path; });
                if (now - before != level->second || (path != "/" && itemAt(page._fsTree, path)->childCount() != level->second))
                    wrong << path;
            } else if (now != before) {
                wrong << "unexpected level";
            }
            before = now;
        });
        QTRY_VERIFY_WITH_TIMEOUT(shown == fetched.size() && page.status() == "Ready", 20000);
        // Two empty ticks: nothing more comes.
        QTRY_VERIFY_WITH_TIMEOUT(page.pacer().lastArmed() >= 200, 20000);
        QCOMPARE(wrong, QStringList());
        if (rule.isEmpty()) {
            QCOMPARE(treeLines(page._fsTree),
                     QStringList({"alpha||", " nine.bin|9998 bytes|rw-", " ten.bin|9.76 kB|rw-", "err||", " e.log|1 bytes|rw-",
                                  "shared||", " s.txt|1 bytes|rw-", "user||", " photos||", "  p.jpg|4 bytes|rw-", "usermod||",
                                  " app||", "  APP.MOD|4 bytes|rwx", "zeta||", " z.txt|1 bytes|rw-", "readme.txt|7 bytes|rw-"}));
        }
    }

    // Run needs ".mod" in any letter case; Delete is always there. Clicks name files in
    // column 0 only. Run and Delete run as jobs, each ending in one message with the
    // device's reason on failure; Delete asks first, then reloads the volume keeping the
    // expanded folders and the selection.
    void menuRunAndDelete()
    {
        QVERIFY(serve({"--fail", "RunApplication:/usermod/app/APP.MOD=1104"}));
        const auto page = filledPage();
        QVERIFY(page);
        ZantFSTreeWidget* tree = page->_fsTree;
        QSignalSpy deletes(tree, &ZantFSTreeWidget::DeleteTriggered);
        for (const auto& [path, runs] : QList<QPair<QString, bool>>{{"/usermod/app/APP.MOD", true}, {"/readme.txt", false},
                                                                    {"/x.mod1/y", true}}) {
            std::unique_ptr<QMenu> menu(tree->contextMenuFor(path, nullptr));
            QCOMPARE(menu->actions().size(), 2);
            QCOMPARE(menu->actions().at(0)->isEnabled(), runs);
            BoxAnswer keep(QMessageBox::No);
            menu->actions().at(1)->trigger();
            QCOMPARE(deletes.takeLast().at(0).toString(), path);
        }
        QSignalSpy clicks(page.get(), &DeviceFileSystemView::singleClick);
        for (int column : {0, 1})
            emit tree->itemClicked(itemAt(tree, "/readme.txt"), column);
        emit tree->itemClicked(itemAt(tree, "/alpha"), 0);
        QCOMPARE(signalTexts(clicks), QStringList("/readme.txt"));

        QSignalSpy statuses(page.get(), &GatewayComponentWidget::timedStatusChanged);
        QSignalSpy finished(page.get(), &DeviceFileSystemView::transferFinished);
        QSignalSpy changed(page.get(), &DeviceFileSystemView::deviceContentChanged);
        page->OnRunTriggered("/readme.txt");
        QVERIFY(finished.wait(20000));
        page->OnRunTriggered("/usermod/app/APP.MOD");
        QVERIFY(finished.wait(20000));
        QCOMPARE(changed.count(), 0);

        itemAt(tree, "/alpha")->setExpanded(true);
        itemAt(tree, "/user")->setExpanded(true);
        itemAt(tree, "/user/photos/p.jpg")->setSelected(true);
        for (const auto button : {QMessageBox::No, QMessageBox::Yes}) {
            BoxAnswer answer(button);
            page->OnDeleteTriggered("/alpha/ten.bin");
            QCOMPARE(answer.seen, QString("Device File Delete|Are you sure you want to delete /alpha/ten.bin"));
        }
        QVERIFY(finished.wait(20000));
        QVERIFY(!QFileInfo::exists(onDevice("/alpha/ten.bin")));
        QCOMPARE(changed.count(), 1);
        QVERIFY(tickUntil(*page, [&] {
            return !itemAt(tree, "/alpha/ten.bin") && itemAt(tree, "/user/photos/p.jpg") && itemAt(tree, "/alpha/nine.bin");
        }));
        QVERIFY(itemAt(tree, "/alpha")->isExpanded() && itemAt(tree, "/user")->isExpanded());
        QVERIFY(!itemAt(tree, "/zeta")->isExpanded() && !itemAt(tree, "/user/photos")->isExpanded());
        QCOMPARE(tree->selectedItems(), QList<QTreeWidgetItem*>{itemAt(tree, "/user/photos/p.jpg")});
        QCOMPARE(signalTexts(statuses), QStringList({"Could not start /readme.txt: error 1107", "Could not start /usermod/app/APP.MOD: error 1104",
                                                     "Deleted /alpha/ten.bin"}));
    }

    // The handset's memory card: a chooser offers both volumes, the card is browsed and
    // copies go to it; a delete in a system folder is refused with the device's reason.
    // Without the device, the fields keep their values and the status says why.
    void volumesAndRefusals()
    {
        SimulatorProcess simulator(m_sockets.path());
        QVERIFY(simulator.connectDevice(SimulatorProcess::sampleImage("handset"), "hs"));
        DeviceFileSystemView page;
        page.show();
        page.startComponent("hs");
        QTRY_VERIFY_WITH_TIMEOUT(itemAt(page._fsTree, "/sys/mod") && page._volumeChooser->isVisible(), 20000);
        QStringList choices;
        for (int index = 0; index < page._volumeChooser->count(); ++index)
            choices << page._volumeChooser->itemText(index);
        QCOMPARE(choices, QStringList({"Internal Flash (/)", "Memory Card (/card)"}));

        QSignalSpy statuses(&page, &GatewayComponentWidget::timedStatusChanged);
        QSignalSpy finished(&page, &DeviceFileSystemView::transferFinished);
        BoxAnswer yes(QMessageBox::Yes);
        page.OnDeleteTriggered("/sys/mod");
        QVERIFY(finished.wait(20000));
        QCOMPARE(signalTexts(statuses), QStringList("Could not delete /sys/mod: /sys/mod refused: system module folders are read-only (error 1101)"));

        page._volumeChooser->activated(1);
        QVERIFY(tickUntil(page, [&] { return itemAt(page._fsTree, "/card/shared/music/track01.mp3") != nullptr; }));
        QCOMPARE(page._friendlyName->text(), QString("Memory Card"));
        QVERIFY(!itemAt(page._fsTree, "/sys"));
        QTemporaryDir folder;
        QVERIFY(writeFile(folder.filePath("note.txt"), "on the card"));
        page.copyDropToDevice("/card/user", {QUrl::fromLocalFile(folder.filePath("note.txt"))});
        QVERIFY(finished.wait(20000));
        QVERIFY(tickUntil(page, [&] { return itemAt(page._fsTree, "/card/user/note.txt") != nullptr; }));

        const QString size = page._volumeSize->text();
        simulator.kill();
        page.refresh();
        QTRY_COMPARE_WITH_TIMEOUT(page.status(), QString("Could not read the volumes: error 1003"), 20000);
        QCOMPARE(page._friendlyName->text() + page._volumeSize->text(), "Memory Card" + size);
        QVERIFY(itemAt(page._fsTree, "/card/user/note.txt"));
    }

    // A double-click copies the device file into this run's private folder as a job and
    // hands the copy on; a refused copy and a folder that cannot be made are reported.
    void openOnComputer_data()
    {
        QTest::addColumn<QString>("temporary"); // "file": TMPDIR names a file
        QTest::addColumn<QString>("rule");
        QTest::addColumn<QString>("message");
        QTest::newRow("no private folder") << "file" << QString() << "Could not open readme.txt: no private folder can be made in %: Not a directory";
        QTest::newRow("refused copy") << QString() << "CopyToPCBegin:/readme.txt=1104" << "Could not copy readme.txt: error 1104";
        QTest::newRow("opened") << QString() << QString() << "Opening readme.txt";
    }

    void openOnComputer()
    {
        QFETCH(QString, temporary);
        QFETCH(QString, rule);
        QFETCH(QString, message);
        QVERIFY(serve(rule.isEmpty() ? QStringList() : QStringList{"--fail", rule}));
        const auto page = filledPage();
        QVERIFY(page);
        QTemporaryDir base;
        const QString tmp = temporary == "file" ? base.filePath("file") : base.path();
        QVERIFY(writeFile(base.filePath("file"), "not a folder"));
        const QByteArray previous = qgetenv("TMPDIR");
        qputenv("TMPDIR", QFile::encodeName(tmp));
        QSignalSpy statuses(page.get(), &GatewayComponentWidget::timedStatusChanged);
        QSignalSpy copies(page.get(), &DeviceFileSystemView::localCopyReady);
        emit page->_fsTree->itemDoubleClicked(itemAt(page->_fsTree, "/readme.txt"), 0);
        QTRY_VERIFY_WITH_TIMEOUT(!statuses.isEmpty(), 20000);
        qputenv("TMPDIR", previous);
        QCOMPARE(signalTexts(statuses), QStringList(QString(message).replace("%", tmp)));
        QCOMPARE(copies.count(), message.startsWith("Opening") ? 1 : 0);
        if (!copies.isEmpty()) {
            const QString local = copies.first().first().toString();
            QCOMPARE(QFileInfo(local).absolutePath(), PrivateTempFolder::forProgram().path());
            QVERIFY(local.startsWith(base.filePath("delvix-" + QString::number(::geteuid()) + "/run-")));
            QCOMPARE(readFile(local), QByteArray("read me"));
        }
    }

    // Local files dropped on the tree: where they land, what is refused, the messages.
    void drop_data()
    {
        QTest::addColumn<QStringList>("local");   // files (trailing "/": an empty folder) to make
        QTest::addColumn<QStringList>("dropped"); // what is dragged; empty: plain text
        QTest::addColumn<QString>("onto");        // item path; empty: below the rows
        QTest::addColumn<QString>("simulator");   // a --fail rule
        QTest::addColumn<QString>("box");         // the message box shown
        QTest::addColumn<QStringList>("arrived"); // device file=local file with the same bytes
        QTest::addColumn<QStringList>("messages");

        QTest::newRow("folder keeps its name and layout")
            << QStringList{"drop/b.txt", "drop/sub/a.txt", "drop/.hidden"} << QStringList{"drop"} << "/alpha/nine.bin"
            << QString() << QString() << QStringList{"/alpha/drop/b.txt=drop/b.txt", "/alpha/drop/sub/a.txt=drop/sub/a.txt"}
            << QStringList{"Copied 2 files"};
        // The simulator takes "/alpha//drop" for "/alpha/drop": only a rule on the exact path tells.
        QTest::newRow("one slash between target and name")
            << QStringList{"drop/b.txt", "drop/sub/a.txt"} << QStringList{"drop"} << "/alpha" << "CopyToDeviceBegin:/alpha/drop/b.txt=1104"
            << QString() << QStringList{"/alpha/drop/sub/a.txt=drop/sub/a.txt"} << QStringList{"Copied 1 of 2 files; could not copy b.txt: error 1104"};
        QTest::newRow("top-level file means the root")
            << QStringList{"x.txt"} << QStringList{"x.txt"} << "/readme.txt" << QString() << QString()
            << QStringList{"/x.txt=x.txt"} << QStringList{"Copied 1 file"};
        QTest::newRow("package in capitals installed")
            << QStringList{"Tool.ZANTRO"} << QStringList{"Tool.ZANTRO"} << "/alpha" << QString() << QString()
            << QStringList() << QStringList{"Installed Tool.ZANTRO"};
        QTest::newRow("empty folder") << QStringList{"empty/"} << QStringList{"empty"} << "/alpha" << QString()
                                      << "Files not Copied|The dropped selection did not contain any copyable files."
                                      << QStringList() << QStringList();
        QTest::newRow("free space reached") << QStringList{"full.bin"} << QStringList{"full.bin"} << "/alpha" << QString()
                                            << "Not enough space on the device|The target does not have enough freespace to complete the copy"
                                            << QStringList() << QStringList();
        QTest::newRow("below the rows") << QStringList{"x.txt"} << QStringList{"x.txt"} << QString() << QString()
                                        << QString() << QStringList() << QStringList();
        QTest::newRow("plain text refused") << QStringList() << QStringList() << "/alpha" << QString() << QString()
                                            << QStringList() << QStringList();
    }

    void drop()
    {
        QFETCH(QStringList, local);
        QFETCH(QStringList, dropped);
        QFETCH(QString, onto);
        QFETCH(QString, simulator);
        QFETCH(QString, box);
        QFETCH(QStringList, arrived);
        QFETCH(QStringList, messages);
        QVERIFY(serve(simulator.isEmpty() ? QStringList() : QStringList{"--fail", simulator}, 1 << 20));
        QSet<VolumeInfo> volumes;
        QCOMPARE(Portlex::GetDevice("fs")->GetVolumes(volumes), 0);
        const quint64 free = volumes.begin()->freeSpace;

        QTemporaryDir folder;
        for (const QString& file : local) {
            const QString path = folder.filePath(file);
            if (file.endsWith('/'))
                QVERIFY(QDir().mkpath(path));
            else if (file.endsWith(".ZANTRO"))
                QCOMPARE(QProcess::execute(SimulatorProcess::executable(),
                                           {"pack", SimulatorProcess::sampleImage("handset") + "/card/usermod/carousel", path}), 0);
            else
                QVERIFY(writeFile(path, file == "full.bin" ? QByteArray(qsizetype(free), 'f')
                                                             : randomBytes(100, qHash(file))));
        }
        const QByteArray before = treeDigest(m_image->path());
        const auto page = filledPage();
        QVERIFY(page);
        // A reload keeps it open.
        itemAt(page->_fsTree, "/zeta")->setExpanded(true);
        QSignalSpy statuses(page.get(), &GatewayComponentWidget::timedStatusChanged);
        QSignalSpy finished(page.get(), &DeviceFileSystemView::transferFinished);
        auto* mime = new QMimeData;
        QList<QUrl> urls;
        for (const QString& entry : dropped)
            urls << QUrl::fromLocalFile(folder.filePath(entry));
        if (urls.isEmpty())
            mime->setText("plain");
        else
            mime->setUrls(urls);
        std::unique_ptr<QMimeData> owned(mime);

        BoxAnswer answer(QMessageBox::Ok);
        QCOMPARE(dragAndDrop(page->_fsTree, onto, mime), !dropped.isEmpty());
        if (!messages.isEmpty())
            QVERIFY(finished.wait(20000));
        QCOMPARE(answer.seen, box);
        QCOMPARE(signalTexts(statuses), messages.replaceInStrings("%", folder.path()));
        for (const QString& pair : arrived)
            QCOMPARE(readFile(onDevice(pair.section('=', 0, 0))), readFile(folder.filePath(pair.section('=', 1))));
        if (messages.isEmpty())
            QCOMPARE(treeDigest(m_image->path()), before);
        if (arrived.isEmpty())
            return;
        QVERIFY(tickUntil(*page, [&] {
            return itemAt(page->_fsTree, arrived.last().section('=', 0, 0)) && itemAt(page->_fsTree, "/zeta/z.txt");
        }));
        QVERIFY(itemAt(page->_fsTree, "/zeta")->isExpanded());
    }

    // A drag out ends where the anchor's copy appears: the copy goes and the selected device
    // files (a folder with its contents) arrive there byte for byte. Files already there are
    // replaced or kept as the user answers. Without the anchor the page gives up.
    void dragOut()
    {
        QVERIFY(serve());
        const auto page = filledPage();
        QVERIFY(page);
        const QString target = m_home.filePath("Desktop/target");
        QVERIFY(QDir().mkpath(target));
        QSignalSpy finished(page.get(), &DeviceFileSystemView::transferFinished);
        itemAt(page->_fsTree, "/user")->setSelected(true);
        itemAt(page->_fsTree, "/user/photos/p.jpg")->setSelected(true);
        itemAt(page->_fsTree, "/alpha/ten.bin")->setSelected(true);
        const QString anchor = target + "/" + page->_fsTree->anchorFileName();
        // The watcher may still be setting up: the anchor is dropped again until done() holds.
        const auto dragOnce = [&](const std::function<bool()>& done) {
            emit page->_fsTree->SourceDropStart();
            const bool seen = QTest::qWaitFor([&] {
                if (done())
                    return true;
                QFile::remove(anchor);
                QFile::copy(page->_fsTree->anchorPath(), anchor);
                return false;
            }, 20000);
            QFile::remove(anchor);
            return seen;
        };
        QVERIFY(dragOnce([&] { return finished.count() == 1; }));
        QCOMPARE(page->dropFolder(), target);
        QCOMPARE(treeEntries(target), QStringList({"ten.bin", "user", "user/photos", "user/photos/p.jpg"}));
        QCOMPARE(readFile(target + "/user/photos/p.jpg"), readFile(onDevice("/user/photos/p.jpg")));

        for (const auto button : {QMessageBox::No, QMessageBox::Yes}) {
            QVERIFY(writeFile(target + "/ten.bin", "mine"));
            BoxAnswer answer(button);
            QVERIFY(dragOnce([&] { return !answer.seen.isEmpty() && !page->isTransferring(); }));
            QCOMPARE(answer.seen, "Replace Files|" + target + " already holds user, ten.bin. Replace?");
            QCOMPARE(readFile(target + "/ten.bin"), button == QMessageBox::Yes ? readFile(onDevice("/alpha/ten.bin")) : "mine");
        }

        QSignalSpy statuses(page.get(), &GatewayComponentWidget::timedStatusChanged);
        emit page->_fsTree->SourceDropStart();
        emit page->_fsTree->SourceDropEnd();
        QTRY_COMPARE_WITH_TIMEOUT(signalTexts(statuses), QStringList("Drop target not recognized"), 20000);
    }

    // Cancel stops the copy under way: files before it stay, it leaves nothing, later ones
    // are not copied.
    void cancelledDrop()
    {
        QVERIFY(serve({"--latency", "50"}, 256 << 20));
        QTemporaryDir folder;
        QVERIFY(writeFile(folder.filePath("a.bin"), "first"));
        QVERIFY(writeFile(folder.filePath("b.bin"), randomBytes(64 << 20, 7)));
        QVERIFY(writeFile(folder.filePath("c.bin"), "last"));
        const auto page = filledPage();
        QVERIFY(page);
        QSignalSpy statuses(page.get(), &GatewayComponentWidget::timedStatusChanged);
        QSignalSpy finished(page.get(), &DeviceFileSystemView::transferFinished);
        page->copyDropToDevice("/zeta", {QUrl::fromLocalFile(folder.filePath("a.bin")), QUrl::fromLocalFile(folder.filePath("b.bin")),
                                         QUrl::fromLocalFile(folder.filePath("c.bin"))});
        QProgressDialog* progress = page->findChild<QProgressDialog*>();
        QVERIFY(progress);
        QTRY_VERIFY_WITH_TIMEOUT(progress->isVisible() && progress->value() > 1024, 20000);
        progress->findChild<QPushButton*>()->click();
        QVERIFY(finished.wait(20000));
        QCOMPARE(signalTexts(statuses), QStringList("Copied 1 of 3 files; could not copy b.bin: The upload was stopped on this side (error 1010); Cancelled"));
        QCOMPARE(treeEntries(onDevice("/zeta")), QStringList({"a.bin", "z.txt"}));
    }

    // The watcher reports adds, removals and renames below its root with "/" paths, skips
    // hidden folders (also those made later), walks the tree again when the kernel lost
    // events and ends on stop() while nothing happens.
    void watcher()
    {
        QTemporaryDir root;
        QVERIFY(QDir().mkpath(root.filePath("sub/deep")) && QDir().mkpath(root.filePath(".hidden")));
        LossyMonitor monitor(root.path());
        QStringList events;
        const auto record = [&events](const char* kind) {
            return [&events, kind](const QString& path) { events << QString(kind) + " " + path; };
        };
        connect(&monitor, &WinVolumeMonitor::fileAddedEvent, this, record("file+"));
        connect(&monitor, &WinVolumeMonitor::directoryAddedEvent, this, record("dir+"));
        connect(&monitor, &WinVolumeMonitor::fileRemovedEvent, this, record("file-"));
        connect(&monitor, &WinVolumeMonitor::fileOldNameEvent, this, record("old"));
        connect(&monitor, &WinVolumeMonitor::fileNewNameEvent, this, record("new"));
        monitor.start();
        QTRY_COMPARE(monitor.watchedFolders(), 3);

        QVERIFY(writeFile(root.filePath(".hidden/h.txt"), "h"));
        QVERIFY(QDir().mkdir(root.filePath(".late")));
        QVERIFY(writeFile(root.filePath(".late/l.txt"), "l"));
        QVERIFY(writeFile(root.filePath("sub/deep/a.txt"), "a"));
        QVERIFY(QDir().mkdir(root.filePath("new")));
        QTRY_COMPARE(monitor.watchedFolders(), 4);
        QVERIFY(writeFile(root.filePath(".late/m.txt"), "m"));
        QVERIFY(writeFile(root.filePath("new/b.txt"), "b"));
        QVERIFY(QFile::rename(root.filePath("new/b.txt"), root.filePath("new/c.txt")));
        QVERIFY(QFile::remove(root.filePath("new/c.txt")));
        QVERIFY(QDir().rmdir(root.filePath("new")));
        const QString r = root.path();
        const QStringList expected = {"dir+ " + r + "/.late", "file+ " + r + "/sub/deep/a.txt", "dir+ " + r + "/new",
                                      "file+ " + r + "/new/b.txt", "old " + r + "/new/b.txt", "new " + r + "/new/c.txt",
                                      "file- " + r + "/new/c.txt", "file- " + r + "/new"};
        QTRY_COMPARE(events.filter(QRegularExpression("^(file\\+|dir\\+|old|new|file-) ")), expected);
        QCOMPARE(monitor.watchedFolders(), 3);

        // What the kernel lost, a new folder's creation among it, is found by walking again.
        monitor.lose = true;
        QVERIFY(QDir().mkdir(root.filePath("during")));
        QTRY_COMPARE_WITH_TIMEOUT(monitor.watchedFolders(), 4, 20000);
        QVERIFY(!monitor.lose);
        QVERIFY(!events.contains("dir+ " + r + "/during"));
        QVERIFY(writeFile(root.filePath("during/seen.txt"), "s"));
        QTRY_VERIFY_WITH_TIMEOUT(events.contains("file+ " + r + "/during/seen.txt"), 20000);

        monitor.stop();
        QVERIFY(monitor.wait(10000));
    }

    // The folder device files are opened from: this user's own, made so, never one planted;
    // each run's folder inside it goes with its contents.
    void privateTempFolder_data()
    {
        QTest::addColumn<QString>("planted"); // what already stands under the usual name
        QTest::addColumn<bool>("reused");
        QTest::newRow("nothing") << QString() << true;
        QTest::newRow("own private folder") << "private" << true;
        QTest::newRow("folder open to all") << "open" << false;
        QTest::newRow("link to another folder") << "link" << false;
        QTest::newRow("another user's folder") << "foreign" << false;
        QTest::newRow("a file") << "file" << false;
    }

    void privateTempFolder()
    {
        QFETCH(QString, planted);
        QFETCH(bool, reused);
        QTemporaryDir base;
        const QString usual = base.filePath("delvix-" + QString::number(::geteuid()));
        const QString elsewhere = base.filePath("elsewhere");
        QVERIFY(QDir().mkdir(elsewhere));
        const QByteArray path = QFile::encodeName(usual);
        if (planted == "private" || planted == "open" || planted == "foreign")
            QCOMPARE(::mkdir(path.constData(), planted == "private" ? 0700 : 0777), 0);
        if (planted == "open")
            QCOMPARE(::chmod(path.constData(), 0777), 0);
        if (planted == "foreign" && ::lchown(path.constData(), 65534, 65534) != 0)
            QSKIP("files cannot be given to another user here");
        if (planted == "link")
            QVERIFY(QFile::link(elsewhere, usual));
        if (planted == "file")
            QVERIFY(writeFile(usual, "x"));

        QString run;
        QString user;
        {
            const PrivateTempFolder folder(base.path());
            QCOMPARE(folder.userFolder() == usual, reused);
            run = folder.path();
            user = folder.userFolder();
            QCOMPARE(QFileInfo(run).absolutePath(), folder.userFolder());
            for (const QString& made : {folder.userFolder(), run}) {
                struct stat status {};
                QCOMPARE(::lstat(QFile::encodeName(made).constData(), &status), 0);
                QVERIFY(S_ISDIR(status.st_mode));
                QCOMPARE(status.st_uid, ::geteuid());
                QCOMPARE(status.st_mode & 0777, 0700u);
            }
            QVERIFY(writeFile(run + "/opened.txt", "o"));
        }
        // A fallback folder is this run's alone and goes too.
        QVERIFY(!QFileInfo::exists(run));
        QCOMPARE(QFileInfo::exists(user), reused);
        QCOMPARE(treeEntries(elsewhere), QStringList());
    }

    // Drops: dropped entries keep their names and layout below the target, joined by one
    // "/"; hidden entries and links inside folders stay behind; packages are installed; the
    // free space must exceed the files. Drags out: what a selected folder brings is not asked
    // for again, names that cannot be local names are skipped, existing targets are found.
    void transferPlan()
    {
        QTemporaryDir local;
        const QString l = local.path();
        for (const char* file : {"drop/b.txt", "drop/sub/a.txt", "drop/.hidden", "Tool.ZANTRO"})
            QVERIFY(writeFile(local.filePath(file), "12345"));
        QVERIFY(QFile::link(local.filePath("drop/b.txt"), local.filePath("drop/link.txt")));
        const QStringList dropped = {l + "/drop", l + "/Tool.ZANTRO", l + "/missing"};
        QCOMPARE(jobLines(TransferPlan::forDrop("/alpha", dropped, 16), l),
                 QStringList({"install /Tool.ZANTRO>/alpha/Tool.ZANTRO 5", "copy /drop/b.txt>/alpha/drop/b.txt 5",
                              "copy /drop/sub/a.txt>/alpha/drop/sub/a.txt 5"}));
        for (const char* target : {"/", "/card/"})
            QCOMPARE(jobLines(TransferPlan::forDrop(target, {l + "/drop/b.txt"}, 6), l), QStringList(QString("copy /drop/b.txt>%1b.txt 5").arg(target)));
        QCOMPARE(TransferPlan::forDrop("/alpha", dropped, 15).outcome(), TransferPlan::Outcome::NoSpace);
        QCOMPARE(TransferPlan::forDrop("/alpha", {l + "/drop/link.txt", l + "/missing"}, 100).outcome(),
                 TransferPlan::Outcome::NothingToCopy);

        const QVector<TransferPlan::DeviceEntry> entries = {{"/user", "user", true, 0, false},
                                                            {"/user/p.jpg", "p.jpg", false, 4, true},
                                                            {"/a/..", "..", false, 1, false},
                                                            {"/alpha/ten.bin", "ten.bin", false, 9999, false}};
        QVERIFY(writeFile(local.filePath("out/ten.bin"), "mine"));
        QVERIFY(QFile::link(local.filePath("gone"), local.filePath("out/user")));
        TransferPlan out = TransferPlan::forDragOut(entries, l + "/out");
        QCOMPARE(jobLines(out, l), QStringList({"pull-folder /user>/out/user 0", "pull /alpha/ten.bin>/out/ten.bin 9999"}));
        QCOMPARE(out.existingTargets(), QStringList({l + "/out/user", l + "/out/ten.bin"}));
        out.skipExisting();
        QCOMPARE(out.outcome(), TransferPlan::Outcome::NothingToCopy);
    }
};

QTEST_MAIN(TestDeviceFileSystemView)
#include "tst_devicefilesystemview.moc"
