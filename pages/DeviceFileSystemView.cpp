#include "DeviceFileSystemView.h"

#include "CITreeWidgetItem.h"
#include "DragOutWatcher.h"
#include "FormatSize.h"
#include "Portlex.h"
#include "PrivateTempFolder.h"
#include "TransferPlan.h"
#include "WinVolumeMonitor.h"
#include "_ZantDevice.h"

#include <QFileInfo>
#include <QFutureWatcher>
#include <QHeaderView>
#include <QMessageBox>
#include <QProgressDialog>
#include <QPushButton>
#include <QtConcurrent/QtConcurrentRun>

#include <algorithm>

namespace {

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
    _volumeChooserLabel->hide();
    _volumeChooser->hide();
    connect(_volumeChooser, &QComboBox::activated, this,
            [this](int index) { selectVolume(_volumeChooser->itemData(index).toString()); });
    connect(_fsTree, &ZantFSTreeWidget::RunTriggered, this, &DeviceFileSystemView::OnRunTriggered);
    connect(_fsTree, &ZantFSTreeWidget::DeleteTriggered, this, &DeviceFileSystemView::OnDeleteTriggered);
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
    if (_fsTree->anchorPath().isEmpty())
        return;
    m_dragOut = std::make_unique<DragOutWatcher>(_fsTree->anchorPath(), WinVolumeMonitor::localDrives());
    connect(_fsTree, &ZantFSTreeWidget::SourceDropStart, m_dragOut.get(), &DragOutWatcher::dragStarted);
    connect(_fsTree, &ZantFSTreeWidget::SourceDropEnd, m_dragOut.get(), &DragOutWatcher::dragEnded);
    connect(_fsTree, &ZantFSTreeWidget::SourceDropCancelled, m_dragOut.get(), &DragOutWatcher::dragCancelled);
    connect(m_dragOut.get(), &DragOutWatcher::dropFolderFound, this, &DeviceFileSystemView::onDropFolderFound);
    connect(m_dragOut.get(), &DragOutWatcher::dropNotRecognized, this,
            [this] { emit timedStatusChanged(QStringLiteral("Drop target not recognized")); });
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
    if (!m_device || (!m_volume.mountPoint.isEmpty() && m_volume.mountPoint == mountPoint))
        return;
    loadVolume(mountPoint, false);
}

bool DeviceFileSystemView::refresh()
{
    if (!m_device)
        return false;
    loadVolume(m_volume.mountPoint, true);
    return true;
}

void DeviceFileSystemView::loadVolume(const QString& mountPoint, bool keepView)
{
    setStatus(QStringLiteral("Processing File System..."));
    // The device may take long to count its free space: the GUI thread does not wait for it.
    // The tree stays as it is until the answer comes.
    const quint64 request = ++m_volumeRequest;
    auto* answer = new QFutureWatcher<QPair<int, QSet<VolumeInfo>>>(this);
    connect(answer, &QFutureWatcherBase::finished, this, [this, answer, request, mountPoint, keepView] {
        answer->deleteLater();
        if (request == m_volumeRequest)
            showVolume(answer->result().first, answer->result().second, mountPoint, keepView);
    });
    answer->setFuture(QtConcurrent::run([device = m_device] {
        QSet<VolumeInfo> volumes;
        const int result = device->GetVolumes(volumes);
        return qMakePair(result, volumes);
    }));
}

void DeviceFileSystemView::showVolume(int result, const QSet<VolumeInfo>& volumes, const QString& mountPoint, bool keepView)
{
    if (result != 0 || volumes.isEmpty()) {
        // The fields keep what the device said last; the failure is no volume property.
        setStatus(result != 0 ? QStringLiteral("Could not read the volumes: error %1").arg(result)
                              : QStringLiteral("The device has no volume"));
        return;
    }
    // A set has no order of its own: "the first volume" is the one mounted highest.
    m_volumes = QList<VolumeInfo>(volumes.cbegin(), volumes.cend());
    std::sort(m_volumes.begin(), m_volumes.end(),
              [](const VolumeInfo& a, const VolumeInfo& b) { return a.mountPoint < b.mountPoint; });
    auto chosen = std::find_if(m_volumes.cbegin(), m_volumes.cend(),
                               [&mountPoint](const VolumeInfo& volume) { return volume.mountPoint == mountPoint; });
    // A volume that went away: the first one instead.
    if (chosen == m_volumes.cend())
        chosen = m_volumes.cbegin();
    if (keepView && chosen->mountPoint == m_volume.mountPoint) {
        rememberView();
    } else {
        m_keepExpanded.clear();
        m_keepSelected.clear();
    }
    m_volume = *chosen;
    showVolumeFields();

    // Without updates the view skips working out what each removal would repaint.
    _fsTree->setUpdatesEnabled(false);
    _fsTree->clear();
    _fsTree->setUpdatesEnabled(true);
    m_itemsByPath.clear();
    _fsTree->header()->setSortIndicator(0, Qt::AscendingOrder);
    _fsTree->setProperty("MountPoint", m_volume.mountPoint);
    m_crawl->restart(m_volume.mountPoint);
}

void DeviceFileSystemView::showVolumeFields()
{
    _volumeChooser->clear();
    for (const VolumeInfo& volume : std::as_const(m_volumes))
        _volumeChooser->addItem(QStringLiteral("%1 (%2)").arg(volume.friendlyName, volume.mountPoint), volume.mountPoint);
    _volumeChooser->setCurrentIndex(_volumeChooser->findData(m_volume.mountPoint));
    _volumeChooserLabel->setVisible(m_volumes.size() > 1);
    _volumeChooser->setVisible(m_volumes.size() > 1);
    _friendlyName->setText(m_volume.friendlyName);
    _fsMountPoint->setText(m_volume.mountPoint);
    _volumeSize->setText(formatSize(m_volume.volumeSize));
    _freeSpace->setText(formatSize(m_volume.freeSpace));
    _volumeId->setText(QString::number(m_volume.volumeId));
    _mounted->setChecked(m_volume.mounted);
    _removable->setChecked(m_volume.removable);
}

void DeviceFileSystemView::rememberView()
{
    // What an earlier reload has not met again yet is still wanted.
    for (QTreeWidgetItemIterator it(_fsTree); *it; ++it) {
        const QString path = (*it)->data(0, Qt::UserRole).toString();
        if ((*it)->isExpanded())
            m_keepExpanded.insert(path);
        if ((*it)->isSelected())
            m_keepSelected.insert(path);
    }
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
    QTreeWidgetItem* parent = m_itemsByPath.value(level->Path());
    if (parent)
        parent->addChildren(items);
    else
        _fsTree->addTopLevelItems(items);
    // A folder is expanded again once its children are in.
    if (parent && m_keepExpanded.remove(level->Path()))
        parent->setExpanded(true);
    if (m_keepSelected.isEmpty())
        return;
    for (QTreeWidgetItem* item : std::as_const(items)) {
        if (m_keepSelected.remove(item->data(0, Qt::UserRole).toString()))
            item->setSelected(true);
    }
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
        openOnComputer(item->data(0, Qt::UserRole).toString());
}

bool DeviceFileSystemView::busy()
{
    if (!m_transfer)
        return false;
    emit timedStatusChanged(QStringLiteral("Wait for the running copy to end"));
    return true;
}

void DeviceFileSystemView::openOnComputer(const QString& devicePath)
{
    const QString name = QFileInfo(devicePath).fileName();
    // A name like ".." would make the copy land outside the private folder.
    if (!m_device || !FileTransferThread::isPlainName(name) || busy())
        return;
    // Not the shared temporary folder itself: another user could plant a file or a link there
    // under the name the copy is about to take.
    const PrivateTempFolder& folder = PrivateTempFolder::forProgram();
    if (folder.path().isEmpty()) {
        emit timedStatusChanged(QStringLiteral("Could not open %1: %2").arg(name, folder.error()));
        return;
    }
    quint64 size = 0;
    for (QTreeWidgetItemIterator it(_fsTree); *it && size == 0; ++it) {
        if ((*it)->data(0, Qt::UserRole).toString() == devicePath)
            size = (*it)->data(1, Qt::UserRole).toULongLong();
    }
    startTransfer({{FileTransferThread::Job::ToPC, devicePath, folder.path() + QLatin1Char('/') + name, size}}, After::Open);
}

void DeviceFileSystemView::OnRunTriggered(QString path)
{
    if (m_device && !busy())
        startTransfer({{FileTransferThread::Job::Run, path, QString(), 0}}, After::Nothing);
}

void DeviceFileSystemView::OnDeleteTriggered(QString path)
{
    if (!m_device || busy())
        return;
    const QMessageBox::StandardButton answer = QMessageBox::question(
        this, QStringLiteral("Device File Delete"), QStringLiteral("Are you sure you want to delete ") + path,
        QMessageBox::Yes | QMessageBox::No, QMessageBox::No);
    if (answer == QMessageBox::Yes)
        startTransfer({{FileTransferThread::Job::Delete, path, QString(), 0}}, After::Reload);
}

void DeviceFileSystemView::copyDropToDevice(const QString& targetDirectory, const QList<QUrl>& urls)
{
    if (!m_device || busy())
        return;
    QStringList paths;
    for (const QUrl& url : urls)
        paths.append(url.toLocalFile());
    const TransferPlan plan = TransferPlan::forDrop(targetDirectory, paths, m_volume.freeSpace);
    switch (plan.outcome()) {
    case TransferPlan::Outcome::NoSpace:
        QMessageBox::warning(this, QStringLiteral("Not enough space on the device"),
                             QStringLiteral("The target does not have enough freespace to complete the copy"), QMessageBox::Ok);
        return;
    case TransferPlan::Outcome::NothingToCopy:
        QMessageBox::information(this, QStringLiteral("Files not Copied"),
                                 QStringLiteral("The dropped selection did not contain any copyable files."), QMessageBox::Ok);
        return;
    case TransferPlan::Outcome::Ready:
        startTransfer(plan.jobs(), After::Reload);
        return;
    }
}

void DeviceFileSystemView::onDropFolderFound(const QString& folder)
{
    m_dropFolder = folder;
    copySelectionToPC(folder);
}

void DeviceFileSystemView::copySelectionToPC(const QString& folder)
{
    if (!m_device || busy())
        return;
    QVector<TransferPlan::DeviceEntry> entries;
    const QList<QTreeWidgetItem*> selected = _fsTree->selectedItems();
    for (const QTreeWidgetItem* item : selected) {
        bool insideSelection = false;
        for (const QTreeWidgetItem* up = item->parent(); up && !insideSelection; up = up->parent())
            insideSelection = up->isSelected();
        entries.append({item->data(0, Qt::UserRole).toString(), item->text(0), item->type() == ZantFSTreeWidget::DirectoryItem,
                        item->data(1, Qt::UserRole).toULongLong(), insideSelection});
    }
    TransferPlan plan = TransferPlan::forDragOut(entries, folder);
    const QStringList existing = plan.existingTargets();
    if (!existing.isEmpty()) {
        QStringList names;
        for (const QString& target : existing)
            names.append(QFileInfo(target).fileName());
        QMessageBox ask(QMessageBox::Question, QStringLiteral("Replace Files"),
                        QStringLiteral("%1 already holds %2. Replace?").arg(folder, names.join(QStringLiteral(", "))),
                        QMessageBox::Yes | QMessageBox::No | QMessageBox::Cancel, this);
        ask.button(QMessageBox::Yes)->setText(QStringLiteral("Replace"));
        ask.button(QMessageBox::No)->setText(QStringLiteral("Skip"));
        const int answer = ask.exec();
        if (answer == QMessageBox::Cancel)
            return;
        if (answer == QMessageBox::No)
            plan.skipExisting();
    }
    if (plan.outcome() == TransferPlan::Outcome::Ready)
        startTransfer(plan.jobs(), After::Nothing);
}

void DeviceFileSystemView::startTransfer(const QVector<FileTransferThread::Job>& jobs, After after)
{
    m_transfer = new FileTransferThread(m_device, jobs, quint16(m_volume.volumeId & 0xFFFF));
    m_transferFiles = 0;
    m_transferBytes = 0;
    connect(m_transfer, &FileTransferThread::sized, this, &DeviceFileSystemView::onTransferSized);
    connect(m_transfer, &FileTransferThread::progress, this, &DeviceFileSystemView::onTransferProgress);
    connect(m_transfer, &QThread::finished, this, [this, after] { onTransferEnded(after); });

    // Shown only when the job lasts; modal to the window, which still repaints.
    m_progress = new QProgressDialog(this);
    const FileTransferThread::Job::Kind kind = jobs.first().kind;
    const bool copy = kind != FileTransferThread::Job::Run && kind != FileTransferThread::Job::Delete;
    m_progress->setWindowTitle(copy ? QStringLiteral("Copying files") : QStringLiteral("Waiting for the device"));
    m_progress->setLabelText(copy ? QString() : (kind == FileTransferThread::Job::Run ? QStringLiteral("Starting %1")
                                                                                       : QStringLiteral("Deleting %1"))
                                                    .arg(jobs.first().source));
    m_progress->setWindowModality(Qt::WindowModal);
    m_progress->setAutoClose(false);
    m_progress->setAutoReset(false);
    m_progress->setMinimumDuration(ProgressDelayMs);
    connect(m_progress, &QProgressDialog::canceled, m_transfer, &FileTransferThread::cancel, Qt::DirectConnection);
    setCursor(Qt::BusyCursor);
    m_transfer->start();
}

void DeviceFileSystemView::onTransferSized(int files, quint64 bytes)
{
    m_transferFiles = files;
    m_transferBytes = bytes;
    // Nothing to count: a busy bar.
    if (m_progress)
        m_progress->setRange(0, bytes == 0 ? 0 : std::max(1, kib(bytes)));
}

void DeviceFileSystemView::onTransferProgress(int file, quint64 bytes, const QString& name)
{
    if (!m_progress || m_progress->wasCanceled() || m_transferBytes == 0)
        return;
    m_progress->setLabelText(QStringLiteral("Copying file %1 of %2: %3\n%4 of %5")
                                 .arg(file + 1)
                                 .arg(m_transferFiles)
                                 .arg(name, formatSize(bytes), formatSize(m_transferBytes)));
    m_progress->setValue(kib(bytes));
}

void DeviceFileSystemView::onTransferEnded(After after)
{
    if (!m_transfer)
        return;
    m_transfer->wait();
    const QString summary = m_transfer->summary();
    const bool changed = m_transfer->changedDevice();
    const QStringList arrived = m_transfer->arrived();
    delete m_transfer;
    m_transfer = nullptr;
    unsetCursor();
    // Later: a modal dialog's setValue lets events through, so this may run inside it.
    if (m_progress) {
        m_progress->close();
        m_progress->deleteLater();
    }
    if (after == After::Open && !arrived.isEmpty())
        emit timedStatusChanged(QStringLiteral("Opening %1").arg(QFileInfo(arrived.first()).fileName()));
    else if (!summary.isEmpty())
        emit timedStatusChanged(summary);
    if (changed) {
        if (after == After::Reload)
            refresh();
        emit deviceContentChanged();
    }
    if (after == After::Open && !arrived.isEmpty())
        emit localCopyReady(arrived.first());
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
