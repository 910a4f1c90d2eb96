#include "DeviceFileSystemView.h"

#include "CITreeWidgetItem.h"
#include "FormatSize.h"
#include "Portlex.h"
#include "WinVolumeMonitor.h"
#include "_ZantDevice.h"

#include <QDir>
#include <QFutureWatcher>
#include <QtConcurrent/QtConcurrentRun>
#include <QFile>
#include <QFileInfo>
#include <QHeaderView>
#include <QMessageBox>
#include <QProgressDialog>

#include <algorithm>

namespace {

// Never the mount point of a real volume: selecting with it always loads.
const QString FirstVolume = QStringLiteral("Start with first");

// Gathers the plain files below folder (no hidden or system entries, no links) and
// returns their total size.
quint64 gatherFolder(const QString& folder, QStringList& files)
{
    quint64 total = 0;
    const QFileInfoList entries = QDir(folder).entryInfoList(
        QDir::Files | QDir::Dirs | QDir::NoDotAndDotDot | QDir::NoSymLinks, QDir::NoSort);
    for (const QFileInfo& entry : entries) {
        if (entry.isDir()) {
            total += gatherFolder(entry.absoluteFilePath(), files);
        } else {
            total += quint64(entry.size());
            files.append(entry.absoluteFilePath());
        }
    }
    return total;
}

// target and a remainder joined by exactly one "/".
QString joinDevicePath(const QString& target, QString remainder)
{
    while (remainder.startsWith(QLatin1Char('/')))
        remainder.remove(0, 1);
    return target.endsWith(QLatin1Char('/')) ? target + remainder : target + QLatin1Char('/') + remainder;
}

int kib(quint64 bytes)
{
    return int((bytes + 1023) / 1024);
}

} // namespace

DeviceFileSystemView::DeviceFileSystemView(QWidget* parent)
    : GatewayComponentWidget(parent)
    , m_fileIcon(QStringLiteral(":/Resources/FileIcon.png"))
    , m_folderIcon(QStringLiteral(":/Resources/FolderIcon.png"))
{
    setStatus(QStringLiteral("Starting"));
    setupUi(this);
    connect(_fsTree, &ZantFSTreeWidget::RunTriggered, this, &DeviceFileSystemView::OnRunTriggered);
    connect(_fsTree, &ZantFSTreeWidget::DeleteTriggered, this, &DeviceFileSystemView::OnDeleteTriggered);
    if (!_fsTree->anchorPath().isEmpty()) {
        m_dragTimer.setSingleShot(true);
        connect(&m_dragTimer, &QTimer::timeout, this, &DeviceFileSystemView::on__dragTimerExpired);
        connect(_fsTree, &ZantFSTreeWidget::SourceDropStart, this, &DeviceFileSystemView::on__draggingStart);
        connect(_fsTree, &ZantFSTreeWidget::SourceDropEnd, this, &DeviceFileSystemView::on__draggingEnd);
        connect(_fsTree, &ZantFSTreeWidget::SourceDropCancelled, this, &DeviceFileSystemView::on__draggingCancelled);
    }
    // The tree sorts when its header is clicked, not after every insertion: a sorting tree
    // sorts itself whole after each one, which a crawl of thousands of levels cannot afford.
    // Levels come in already sorted by name.
    _fsTree->setSortingEnabled(false);
    QHeaderView* header = _fsTree->header();
    header->setSortIndicatorShown(true);
    header->setSectionsClickable(true);
    header->setSortIndicator(0, Qt::AscendingOrder);
    connect(header, &QHeaderView::sortIndicatorChanged, _fsTree, &QTreeWidget::sortItems);
    connect(&m_pacer, &TickPacer::timeout, this, &DeviceFileSystemView::onTimeElapse);
    m_pacer.armFirst(FirstTickMs);
}

DeviceFileSystemView::~DeviceFileSystemView()
{
    stopWatchers();
    releaseTransfer();
}

const TickPacer& DeviceFileSystemView::pacer() const
{
    return m_pacer;
}

bool DeviceFileSystemView::isTransferring() const
{
    return m_transfer != nullptr;
}

QString DeviceFileSystemView::dropFolder() const
{
    return m_dropFolder;
}

QString DeviceFileSystemView::componentName()
{
    return QStringLiteral("FileSystem");
}

void DeviceFileSystemView::startComponent(const QString& deviceId)
{
    // Shown again: the crawl goes on where it is.
    if (m_device)
        return;
    m_device = Portlex::GetDevice(deviceId);
    if (!m_device)
        return;
    selectVolume(QString());
    m_worker.start(new DeviceFileSystemViewThread(this, m_device, m_crawl), QThread::NormalPriority);
    startWatchers();
}

bool DeviceFileSystemView::canSearch()
{
    return false;
}

bool DeviceFileSystemView::search(const QString&)
{
    return false;
}

void DeviceFileSystemView::raisePriority()
{
    m_worker.setPriority(QThread::HighPriority);
}

void DeviceFileSystemView::lowerPriority()
{
    m_worker.setPriority(QThread::LowPriority);
}

// The file system is not part of the device's export.
QString DeviceFileSystemView::xmlReport()
{
    return QString();
}

void DeviceFileSystemView::selectVolume(const QString& mountPoint)
{
    if (!m_device)
        return;
    if (mountPoint.isEmpty())
        m_volume.mountPoint = FirstVolume;
    if (m_volume.mountPoint == mountPoint)
        return;
    // Without updates the view skips working out what each removal would repaint.
    _fsTree->setUpdatesEnabled(false);
    _fsTree->clear();
    _fsTree->setUpdatesEnabled(true);
    m_itemsByPath.clear();
    // What the crawl brings for the tree just cleared is dropped.
    m_crawl->restart(QString());
    setStatus(QStringLiteral("Processing File System..."));

    // The device may take long to count its free space: the GUI thread does not wait for it.
    const quint64 request = ++m_volumeRequest;
    auto* answer = new QFutureWatcher<QPair<int, QSet<VolumeInfo>>>(this);
    connect(answer, &QFutureWatcherBase::finished, this, [this, answer, request, mountPoint] {
        answer->deleteLater();
        if (request == m_volumeRequest)
            showVolume(answer->result().first, answer->result().second, mountPoint);
    });
    answer->setFuture(QtConcurrent::run([device = m_device] {
        QSet<VolumeInfo> volumes;
        const int result = device->GetVolumes(volumes);
        return qMakePair(result, volumes);
    }));
}

void DeviceFileSystemView::showVolume(int result, const QSet<VolumeInfo>& volumes, const QString& mountPoint)
{
    if (result != 0) {
        _friendlyName->setText(QStringLiteral("Volume not found."));
        setStatus(readyStatus());
        return;
    }
    // A set has no order of its own: "the first volume" is the one mounted highest.
    QList<VolumeInfo> ordered(volumes.cbegin(), volumes.cend());
    std::sort(ordered.begin(), ordered.end(),
              [](const VolumeInfo& a, const VolumeInfo& b) { return a.mountPoint < b.mountPoint; });
    const auto chosen = std::find_if(ordered.cbegin(), ordered.cend(), [&mountPoint](const VolumeInfo& volume) {
        return mountPoint.isEmpty() || volume.mountPoint == mountPoint;
    });
    if (chosen == ordered.cend()) {
        setStatus(readyStatus());
        return;
    }

    m_volume = *chosen;
    _friendlyName->setText(m_volume.friendlyName);
    _fsMountPoint->setText(m_volume.mountPoint);
    _volumeSize->setText(formatSize(m_volume.volumeSize));
    _freeSpace->setText(formatSize(m_volume.freeSpace));
    _volumeId->setText(QString::number(m_volume.volumeId));
    _mounted->setChecked(m_volume.mounted);
    _removable->setChecked(m_volume.removable);
    _fsTree->header()->setSortIndicator(0, Qt::AscendingOrder);
    _fsTree->setProperty("MountPoint", m_volume.mountPoint);
    m_crawl->restart(m_volume.mountPoint);
}

void DeviceFileSystemView::reloadVolume()
{
    const QString shown = m_volume.mountPoint;
    m_volume.mountPoint.clear();
    selectVolume(shown);
}

void DeviceFileSystemView::onTimeElapse()
{
    FileSystemCrawl::Level level;
    if (!m_crawl->levels().takeFirst(level)) {
        m_pacer.armIdle();
        return;
    }
    graft(level);
    m_pacer.armBusy(0);
}

void DeviceFileSystemView::graft(const FileSystemCrawl::Level& level)
{
    QList<QTreeWidgetItem*> items;
    items.reserve(level->files.size() + level->directories.size());
    for (const QSharedPointer<_FileInfo>& file : std::as_const(level->files)) {
        auto* item = new CITreeWidgetItem(ZantFSTreeWidget::FileItem);
        item->setText(0, file->Name());
        item->setIcon(0, m_fileIcon);
        item->setData(0, Qt::UserRole, file->Path());
        item->setText(1, formatSize(file->size));
        item->setToolTip(1, QString::number(file->size) + QStringLiteral(" bytes"));
        item->setData(1, Qt::UserRole, file->size);
        item->setText(2, file->Attributes());
        items.append(item);
    }
    for (const QSharedPointer<_DirectoryInfo>& folder : std::as_const(level->directories)) {
        auto* item = new CITreeWidgetItem(ZantFSTreeWidget::DirectoryItem);
        item->setText(0, folder->Name());
        item->setIcon(0, m_folderIcon);
        item->setData(0, Qt::UserRole, folder->Path());
        m_itemsByPath.insert(folder->Path(), item);
        items.append(item);
    }
    // In the order the tree's sort gives them.
    std::stable_sort(items.begin(), items.end(), [](const QTreeWidgetItem* a, const QTreeWidgetItem* b) { return *a < *b; });
    if (QTreeWidgetItem* parent = m_itemsByPath.value(level->Path()))
        parent->addChildren(items);
    else
        _fsTree->addTopLevelItems(items);
}

void DeviceFileSystemView::on__fsTree_itemCollapsed(QTreeWidgetItem*)
{
    _fsTree->resizeColumnToContents(0);
}

void DeviceFileSystemView::on__fsTree_itemExpanded(QTreeWidgetItem*)
{
    _fsTree->resizeColumnToContents(0);
}

void DeviceFileSystemView::on__fsTree_itemClicked(QTreeWidgetItem* item, int column)
{
    if (item && column == 0 && item->type() == ZantFSTreeWidget::FileItem)
        emit singleClick(item->data(0, Qt::UserRole).toString());
}

void DeviceFileSystemView::on__fsTree_itemDoubleClicked(QTreeWidgetItem* item, int column)
{
    if (item && column == 0 && item->type() == ZantFSTreeWidget::FileItem)
        emit doubleClick(item->data(0, Qt::UserRole).toString());
}

void DeviceFileSystemView::OnRunTriggered(QString path)
{
    if (m_device)
        m_device->RunApplication(path);
}

void DeviceFileSystemView::OnDeleteTriggered(QString path)
{
    if (!m_device)
        return;
    const QMessageBox::StandardButton answer = QMessageBox::question(
        this, QStringLiteral("Device File Delete"), QStringLiteral("Are you sure you want to delete ") + path,
        QMessageBox::Yes | QMessageBox::No, QMessageBox::No);
    if (answer != QMessageBox::Yes)
        return;
    m_device->DeleteDeviceFile(path);
    reloadVolume();
}

void DeviceFileSystemView::copyDropToDevice(const QString& targetDirectory, const QList<QUrl>& urls)
{
    if (!m_device)
        return;
    if (m_transfer) {
        emit timedStatusChanged(QStringLiteral("Wait for the running copy to end"));
        return;
    }
    QStringList files;
    QString base;
    quint64 total = 0;
    for (const QUrl& url : urls) {
        const QFileInfo dropped(url.toLocalFile());
        if (base.isEmpty())
            base = dropped.absolutePath();
        if (dropped.isDir()) {
            total += gatherFolder(dropped.absoluteFilePath(), files);
        } else if (dropped.isFile() && !dropped.isSymLink()) {
            total += quint64(dropped.size());
            files.append(dropped.absoluteFilePath());
        }
        if (total >= m_volume.freeSpace) {
            QMessageBox::warning(this, QStringLiteral("Not enough space on the device"),
                                 QStringLiteral("The target does not have enough freespace to complete the copy"),
                                 QMessageBox::Ok);
            return;
        }
    }
    if (files.isEmpty()) {
        QMessageBox::information(this, QStringLiteral("Files not Copied"),
                                 QStringLiteral("The dropped selection did not contain any copyable files."),
                                 QMessageBox::Ok);
        return;
    }
    files.sort();

    QVector<FileTransferThread::Job> jobs;
    jobs.reserve(files.size());
    for (const QString& source : std::as_const(files)) {
        // The dropped entries keep their names and inner layout below the target.
        const QString remainder = source.startsWith(base) ? source.mid(base.size()) : source;
        const bool package = source.endsWith(QLatin1String(".zantro"), Qt::CaseInsensitive);
        jobs.append({package ? FileTransferThread::Job::Install : FileTransferThread::Job::ToDevice, source,
                     joinDevicePath(targetDirectory, remainder), quint64(QFileInfo(source).size())});
    }
    startTransfer(jobs, true);
}

void DeviceFileSystemView::startWatchers()
{
    if (_fsTree->anchorPath().isEmpty())
        return;
    for (const QString& drive : WinVolumeMonitor::localDrives()) {
        auto* watcher = new WinVolumeMonitor(drive);
        connect(watcher, &WinVolumeMonitor::fileAddedEvent, this, &DeviceFileSystemView::on__desktopFileAdd);
        // Some file managers write under a passing name and rename when done.
        connect(watcher, &WinVolumeMonitor::fileNewNameEvent, this, &DeviceFileSystemView::on__desktopFileAdd);
        watcher->start();
        m_watchers.append(watcher);
    }
}

void DeviceFileSystemView::stopWatchers()
{
    for (WinVolumeMonitor* watcher : std::as_const(m_watchers))
        watcher->stop();
    qDeleteAll(m_watchers);
    m_watchers.clear();
}

void DeviceFileSystemView::on__draggingStart()
{
    m_dragActive = true;
    m_dropFolder.clear();
}

void DeviceFileSystemView::on__desktopFileAdd(QString path)
{
    // Only the shell's copy of the anchor itself, never a file that merely has it in its path.
    if (!m_dragActive || QFileInfo(path).fileName() != _fsTree->anchorFileName())
        return;
    QFile::remove(path);
    m_dropFolder = QFileInfo(path).absolutePath();
    m_dragActive = false;
    copySelectionToPC(m_dropFolder);
}

void DeviceFileSystemView::on__draggingEnd()
{
    m_dropPollCount = 0;
    m_dragTimer.start(DragPollMs);
}

void DeviceFileSystemView::on__dragTimerExpired()
{
    if (!m_dropFolder.isEmpty())
        return;
    if (++m_dropPollCount >= DragPolls) {
        m_dragActive = false;
        emit timedStatusChanged(QStringLiteral("Drop target not recognized"));
        return;
    }
    m_dragTimer.start(DragPollMs);
}

void DeviceFileSystemView::on__draggingCancelled()
{
    m_dragActive = false;
    m_dropFolder.clear();
}

void DeviceFileSystemView::copySelectionToPC(const QString& folder)
{
    if (!m_device)
        return;
    if (m_transfer) {
        emit timedStatusChanged(QStringLiteral("Wait for the running copy to end"));
        return;
    }
    QVector<FileTransferThread::Job> jobs;
    const QList<QTreeWidgetItem*> selected = _fsTree->selectedItems();
    for (const QTreeWidgetItem* item : selected) {
        // An entry inside a selected folder comes with its folder.
        bool insideSelection = false;
        for (const QTreeWidgetItem* up = item->parent(); up && !insideSelection; up = up->parent())
            insideSelection = up->isSelected();
        const QString name = item->text(0);
        if (insideSelection || !FileTransferThread::isPlainName(name))
            continue;
        const bool file = item->type() == ZantFSTreeWidget::FileItem;
        jobs.append({file ? FileTransferThread::Job::ToPC : FileTransferThread::Job::FolderToPC,
                     item->data(0, Qt::UserRole).toString(), folder + QLatin1Char('/') + name,
                     file ? item->data(1, Qt::UserRole).toULongLong() : 0});
    }
    if (!jobs.isEmpty())
        startTransfer(jobs, false);
}

void DeviceFileSystemView::startTransfer(const QVector<FileTransferThread::Job>& jobs, bool reloadAfter)
{
    m_transfer = new FileTransferThread(m_device, jobs, quint16(m_volume.volumeId & 0xFFFF));
    m_transferFiles = 0;
    m_transferBytes = 0;
    connect(m_transfer, &FileTransferThread::sized, this, &DeviceFileSystemView::onTransferSized);
    connect(m_transfer, &FileTransferThread::progress, this, &DeviceFileSystemView::onTransferProgress);
    connect(m_transfer, &FileTransferThread::fileDone, this, &GatewayComponentWidget::timedStatusChanged);
    connect(m_transfer, &QThread::finished, this, [this, reloadAfter] { onTransferEnded(reloadAfter); });

    // Shown only when the copy lasts; modal to the window, which still repaints.
    m_progress = new QProgressDialog(this);
    m_progress->setWindowTitle(QStringLiteral("Copying files"));
    m_progress->setWindowModality(Qt::WindowModal);
    m_progress->setAutoClose(false);
    m_progress->setAutoReset(false);
    m_progress->setMinimumDuration(ProgressDelayMs);
    connect(m_progress, &QProgressDialog::canceled, m_transfer, &FileTransferThread::cancel, Qt::DirectConnection);
    m_transfer->start();
}

void DeviceFileSystemView::onTransferSized(int files, quint64 bytes)
{
    m_transferFiles = files;
    m_transferBytes = bytes;
    if (m_progress)
        m_progress->setMaximum(std::max(1, kib(bytes)));
}

void DeviceFileSystemView::onTransferProgress(int file, quint64 bytes, const QString& name)
{
    if (!m_progress || m_progress->wasCanceled())
        return;
    m_progress->setLabelText(QStringLiteral("Copying file %1 of %2: %3\n%4 of %5")
                                 .arg(file + 1)
                                 .arg(m_transferFiles)
                                 .arg(name, formatSize(bytes), formatSize(m_transferBytes)));
    m_progress->setValue(kib(bytes));
}

void DeviceFileSystemView::onTransferEnded(bool reloadAfter)
{
    if (!m_transfer)
        return;
    m_transfer->wait();
    delete m_transfer;
    m_transfer = nullptr;
    // Later: a modal dialog's setValue lets events through, so this may run inside it.
    if (m_progress) {
        m_progress->close();
        m_progress->deleteLater();
    }
    if (reloadAfter)
        reloadVolume();
    emit transferFinished();
}

void DeviceFileSystemView::releaseTransfer()
{
    if (!m_transfer)
        return;
    disconnect(m_transfer, nullptr, this, nullptr);
    m_transfer->cancel();
    // A copy stops at its next chunk; an installation under way cannot be stopped and is
    // left to end on its own.
    if (m_transfer->wait(QDeadlineTimer(qint64(PageWorker::teardownWaitMs())))) {
        delete m_transfer;
    } else {
        connect(m_transfer, &QThread::finished, m_transfer, &QObject::deleteLater);
        if (m_transfer->isFinished())
            m_transfer->deleteLater();
    }
    m_transfer = nullptr;
}
