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
#include <QSharedPointer>
#include <QTimer>
#include <QUrl>

class QProgressDialog;
class QTreeWidgetItem;
class WinVolumeMonitor;
class _ZantDevice;

// The device file system page: the first volume of the device with its properties above a
// tree of its folders and files. The worker crawls the volume folder by folder in an order
// that favours the user areas, and the tick grafts one fetched level per tick into the
// tree. Local files dropped on the tree are copied to the device (packages installed), the
// tree's menu runs or deletes an entry, and a drag out of the tree copies the selected
// device files into the local folder where the drag's anchor file landed. Copies run off
// the GUI thread behind a progress dialog that can cancel them.
class DeviceFileSystemView : public GatewayComponentWidget, public Ui::DeviceFileSystemViewClass
{
    Q_OBJECT

public:
    static constexpr int FirstTickMs = 100;
    static constexpr int IdleCapMs = 1000;
    static constexpr int DragPollMs = 500;
    static constexpr quint32 DragPolls = 10;
    // A copy shorter than this shows no progress dialog.
    static constexpr int ProgressDelayMs = 500;

    explicit DeviceFileSystemView(QWidget* parent = nullptr);
    ~DeviceFileSystemView() override;

    // Shows the volume at mountPoint (empty: the first one) unless it is shown already.
    void selectVolume(const QString& mountPoint);
    // Reads the shown volume again and rebuilds the tree from its root.
    void reloadVolume();
    // Copies the local files and folders of urls into targetDirectory on the device.
    void copyDropToDevice(const QString& targetDirectory, const QList<QUrl>& urls);

    // The drag-out steps. Not slots: connected by hand, they would otherwise be taken
    // for form connections by name.
    void on__draggingStart();
    void on__draggingEnd();
    void on__draggingCancelled();
    void on__desktopFileAdd(QString path);
    void on__dragTimerExpired();

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

    void on__fsTree_itemCollapsed(QTreeWidgetItem* item);
    void on__fsTree_itemExpanded(QTreeWidgetItem* item);
    void on__fsTree_itemClicked(QTreeWidgetItem* item, int column);
    void on__fsTree_itemDoubleClicked(QTreeWidgetItem* item, int column);
    void onTimeElapse();
    void OnRunTriggered(QString path);
    void OnDeleteTriggered(QString path);

signals:
    void singleClick(QString fileEntry);
    void doubleClick(QString fileEntry);
    // A drop or drag-out copy has ended (all files done, or cancelled).
    void transferFinished();

private:
    // Shows the volume the device answered with and starts its crawl.
    void showVolume(int result, const QSet<VolumeInfo>& volumes, const QString& mountPoint);
    void graft(const FileSystemCrawl::Level& level);
    void startWatchers();
    void stopWatchers();
    // Copies the tree's selected entries into folder (a recognised drag-out target).
    void copySelectionToPC(const QString& folder);
    void startTransfer(const QVector<FileTransferThread::Job>& jobs, bool reloadAfter);
    void onTransferSized(int files, quint64 bytes);
    void onTransferProgress(int file, quint64 bytes, const QString& name);
    void onTransferEnded(bool reloadAfter);
    void releaseTransfer();

    QSharedPointer<_ZantDevice> m_device;
    QIcon m_fileIcon;
    QIcon m_folderIcon;
    VolumeInfo m_volume;
    quint64 m_volumeRequest = 0; // the latest volume read; earlier answers are dropped
    QSharedPointer<FileSystemCrawl> m_crawl = QSharedPointer<FileSystemCrawl>::create();
    TickPacer m_pacer{0, IdleCapMs};
    QHash<QString, QTreeWidgetItem*> m_itemsByPath;
    QList<WinVolumeMonitor*> m_watchers;
    bool m_dragActive = false;
    QString m_dropFolder;
    quint32 m_dropPollCount = 0;
    QTimer m_dragTimer;
    FileTransferThread* m_transfer = nullptr;
    QPointer<QProgressDialog> m_progress;
    int m_transferFiles = 0;
    quint64 m_transferBytes = 0;
    // Last, so the worker is stopped before anything it reports to goes.
    PageWorker m_worker;
};
