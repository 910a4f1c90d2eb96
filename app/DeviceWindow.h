#pragma once

#include "DeviceCache.h"
#include "GatewayComponentWidget.h"
#include "ModuleInfo.h"
#include "ui_DeviceWindow.h"

#include <QMainWindow>
#include <QSet>
#include <QSharedPointer>

#include <memory>

class DeviceDirectory;
class LockStatusWidget;
class WindowCascade;
class QLabel;
class QLineEdit;
class _ZantDevice;
struct DeviceCache;

// The window of one device: its pages in a stack, switched from the toolbar or the View
// menu, the current page's status in the status bar, action results in a message beside it
// that stays until the next action, a search box and the XML export.
//
// The window watches its device through the gateway's device list, probed off the GUI
// thread. A device missing from MissedProbesForGone probes in a row, or one that does not
// answer a call, is gone: the status bar says "Device disconnected", the indicator is grey,
// the pages keep their data greyed and the device's actions are off. When a device with the
// same id is listed again, the window connects again and replaces its pages by new ones,
// which ask the device afresh (a page that can refresh in place does so instead).
class DeviceWindow : public QMainWindow, public Ui::DeviceWindowClass
{
    Q_OBJECT

public:
    // How often the device list is probed.
    static constexpr int ProbeIntervalMs = 1000;
    static constexpr int MissedProbesForGone = 2;
    // The step of the cascade of windows opened at one place.
    static constexpr int CascadeOffset = 24;

    explicit DeviceWindow(QWidget* parent = nullptr);
    ~DeviceWindow() override;

    void setDevice(const QString& deviceId);
    void attachCurrentPage();
    void detachCurrentPage();

    // The page in a stack slot, or null while the slot holds no page yet.
    GatewayComponentWidget* pageAt(int index) const;

    // False while the device is gone or being connected again.
    bool deviceConnected() const { return m_link == Link::Connected; }
    // The action result shown until the next action; empty when there is none.
    QString message() const;

public slots:
    void SetStatus(QString statusString);
    // An action's result: shown beside the status until the next action.
    void SetTimedStatus(QString statusMessage);
    // Opens a device file's copy on this computer (a module's information file in its window).
    void onLocalCopyReady(QString local);
    void onComponentStateChange(GatewayComponentWidget::ComponentState state);
    void onSearch(QString searchChars);
    void onToolbarActionTriggered(QAction* triggerAction);
    void onLockStatusReleased();
    void onActionSecuritySettingsTriggered();
    void onModuleInfoExamine(ModuleInfo displayMe);
    void onWriteXMLFile();
    // View -> Refresh: the current page asks the device again.
    void refreshCurrentPage();
    // What the device holds has changed (an install, a delete, a run): the pages that show
    // it ask again when they are next shown.
    void onDeviceContentChanged();
    void onSaveSnapshot();
    void onCompareWithSnapshot();

protected:
    void closeEvent(QCloseEvent* event) override;

private:
    void buildStatusBar();
    void buildSearchBox();
    void fillEmptySlots();
    void showHintCursor();
    // A queued signal of a page that is no longer shown.
    bool fromDetachedPage() const;
    void showMessage(const QString& text);

    enum class Link
    {
        Connected,
        Gone,
        Returning
    };
    void onDirectoryProbed();
    void markGone();
    void setLink(Link link);
    // Connects again and refills the device record, off the GUI thread, then replaces the
    // pages in indexes (all of them after a return).
    void reconnect(const QSet<int>& indexes);
    // Asks the device again for the pages in slots: in place where a page can, else by a
    // new page; pages that read the device record wait for a fresh record first.
    void requery(const QSet<int>& indexes);
    // New pages in indexes; record, when given, replaces the device record once the old pages are gone.
    void rebuildPages(const QSet<int>& indexes, const QSharedPointer<const DeviceCache>& record);
    GatewayComponentWidget* createPage(int index, QWidget* slot);
    void preparePage(GatewayComponentWidget* page);

    QString m_deviceId;
    QSharedPointer<_ZantDevice> m_device;
    QSharedPointer<const DeviceCache> m_cache;  // the record the pages read, held while they do
    GatewayComponentWidget* m_currentPage = nullptr;
    QLabel* m_status = nullptr;
    QLabel* m_message = nullptr;
    LockStatusWidget* m_lockStatus = nullptr;
    QLabel* m_searchLabel = nullptr;
    QLineEdit* m_searchBox = nullptr;
    QAction* m_refreshAction = nullptr;
    DeviceDirectory* m_directory = nullptr;
    Link m_link = Link::Connected;
    int m_missedProbes = 0;
    std::unique_ptr<WindowCascade> m_placement;  // stored per device name
    // Slots whose page asks again when next shown.
    QSet<int> m_staleSlots;
    // Slots whose page has been shown (and so started).
    QSet<int> m_shownSlots;
};
