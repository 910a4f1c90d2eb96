#pragma once

#include "DeviceFileSystemViewThread.h"
#include "FileTransferThread.h"
#include "GatewayComponentWidget.h"
#include "PageWorker.h"
#include "TickPacer.h"
#include "VolumeInfo.h"
#include "ui_DeviceFileSystemView.h"

#include <QHash>
#include <QIcon>
#include <QList>
#include <QPointer>
#include <QSet>
#include <QSharedPointer>
#include <QUrl>

#include <memory>

class DragOutWatcher;
class QProgressDialog;
class QTreeWidgetItem;
class _ZantDevice;

// The device file system page: a volume of the device (a chooser when it has several)
// with its properties above a tree of its folders and files. The worker crawls the volume
// folder by folder in an order that favours the user areas, and the tick grafts one
// fetched level per tick into the tree; a reload keeps the folders that were expanded and
// the entries that were selected. Every device action runs as a job of FileTransferThread
// behind a progress dialog (shown when it lasts) and ends in one message through
// timedStatusChanged: drops (planned by TransferPlan), drags out (their folder found by
// DragOutWatcher), files opened on this computer, runs and deletes.
class DeviceFileSystemView : public GatewayComponentWidget, public Ui::DeviceFileSystemViewClass
{
    Q_OBJECT

public:
    static constexpr int FirstTickMs = 100;
    static constexpr int IdleCapMs = 1000;
    // A job shorter than this shows no progress dialog.
    static constexpr int ProgressDelayMs = 500;

    explicit DeviceFileSystemView(QWidget* parent = nullptr);
    ~DeviceFileSystemView() override;

    // Shows the volume at mountPoint (empty: the first one) unless it is shown already.
    void selectVolume(const QString& mountPoint);
    // Copies the local files and folders of urls into targetDirectory on the device.
    void copyDropToDevice(const QString& targetDirectory, const QList<QUrl>& urls);

    const TickPacer& pacer() const;
    bool isTransferring() const;
    QString dropFolder() const;

public slots:
    QString componentName() override;
    void startComponent(const QString& deviceId) override;
    bool canSearch() override;
    bool search(const QString& text) override;
    void raisePriority() override;
    void lowerPriority() override;
    QString xmlReport() override;

    // Reads the shown volume again; the tree keeps its expanded folders that still exist
    // and its selection. False, doing nothing, before the page has its device.
    bool refresh() override;
    // Copies the device file into this run's private folder; localCopyReady names the copy.
    void openOnComputer(const QString& devicePath);

    void on__fsTree_itemCollapsed(QTreeWidgetItem* item);
    void on__fsTree_itemExpanded(QTreeWidgetItem* item);
    void on__fsTree_itemClicked(QTreeWidgetItem* item, int column);
    void on__fsTree_itemDoubleClicked(QTreeWidgetItem* item, int column);
    void onTimeElapse();
    void OnRunTriggered(QString path);
    void OnDeleteTriggered(QString path);

signals:
    void singleClick(QString fileEntry);
    // A file opened on this computer has arrived at localPath, to be shown there.
    void localCopyReady(QString localPath);
    // A job has ended (all done, failed or cancelled).
    void transferFinished();

private:
    // What follows a job's end besides its message.
    enum class After
    {
        Nothing,
        Reload, // the tree shows what the job changed
        Open    // the copy is handed on to be opened
    };

    void loadVolume(const QString& mountPoint, bool keepView);
    // Shows the volume the device answered with and starts its crawl.
    void showVolume(int result, const QSet<VolumeInfo>& volumes, const QString& mountPoint, bool keepView);
    void showVolumeFields();
    void rememberView();
    void graft(const FileSystemCrawl::Level& level);
    void onDropFolderFound(const QString& folder);
    // Copies the tree's selected entries into folder, asking before replacing.
    void copySelectionToPC(const QString& folder);
    // True, with a message, while a job runs.
    bool busy();
    void startTransfer(const QVector<FileTransferThread::Job>& jobs, After after);
    void onTransferSized(int files, quint64 bytes);
    void onTransferProgress(int file, quint64 bytes, const QString& name);
    void onTransferEnded(After after);
    void releaseTransfer();

    QSharedPointer<_ZantDevice> m_device;
    QIcon m_fileIcon;
    QIcon m_folderIcon;
    VolumeInfo m_volume;
    QList<VolumeInfo> m_volumes; // by mount point
    quint64 m_volumeRequest = 0; // the latest volume read; earlier answers are dropped
    QSharedPointer<FileSystemCrawl> m_crawl = QSharedPointer<FileSystemCrawl>::create();
    TickPacer m_pacer{0, IdleCapMs};
    QHash<QString, QTreeWidgetItem*> m_itemsByPath;
    // Of the view before a reload: expanded folders and selected entries not yet met again.
    QSet<QString> m_keepExpanded;
    QSet<QString> m_keepSelected;
    std::unique_ptr<DragOutWatcher> m_dragOut;
    QString m_dropFolder;
    FileTransferThread* m_transfer = nullptr;
    QPointer<QProgressDialog> m_progress;
    int m_transferFiles = 0;
    quint64 m_transferBytes = 0;
    // Last, so the worker is stopped before anything it reports to goes.
    PageWorker m_worker;
};
