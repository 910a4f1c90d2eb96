#pragma once

#include "GatewayComponentWidget.h"
#include "ModuleInfo.h"
#include "ui_DeviceWindow.h"

#include <QMainWindow>
#include <QSharedPointer>

class LockStatusWidget;
class QLabel;
class QLineEdit;
class QTimer;
class _ZantDevice;

// The window of one device: its pages in a stack, switched from the toolbar or the View
// menu, the current page's status in the status bar, a search box and the XML export.
class DeviceWindow : public QMainWindow, public Ui::DeviceWindowClass
{
    Q_OBJECT

public:
    // How long a passing status message stays before the page's status returns.
    static constexpr int TimedStatusMs = 3000;

    explicit DeviceWindow(QWidget* parent = nullptr);
    ~DeviceWindow() override;

    void setDevice(const QString& deviceId);
    void attachCurrentPage();
    void detachCurrentPage();

    // The page in a stack slot, or null while the slot holds no page yet.
    GatewayComponentWidget* pageAt(int index) const;

public slots:
    void SetStatus(QString statusString);
    void SetTimedStatus(QString statusMessage);
    void onFileSystemDoubleClick(QString path);
    void onComponentStateChange(GatewayComponentWidget::ComponentState state);
    void onSearch(QString searchChars);
    void onToolbarActionTriggered(QAction* triggerAction);
    void onLockStatusReleased();
    void onActionSecuritySettingsTriggered();
    void onModuleInfoExamine(ModuleInfo displayMe);
    void onTimedStatusExpire();
    void onWriteXMLFile();
    void onSaveSnapshot();
    void onCompareWithSnapshot();

protected:
    void closeEvent(QCloseEvent* event) override;

private:
    void buildStatusBar();
    void buildSearchBox();
    void fillEmptySlots();
    void showHintCursor();
    void restorePlacement(const QString& deviceName);
    // A queued signal of a page that is no longer shown.
    bool fromDetachedPage() const;

    QString m_deviceId;
    QSharedPointer<_ZantDevice> m_device;
    GatewayComponentWidget* m_currentPage = nullptr;
    QLabel* m_status = nullptr;
    LockStatusWidget* m_lockStatus = nullptr;
    QLabel* m_searchLabel = nullptr;
    QLineEdit* m_searchBox = nullptr;
    QTimer* m_timedStatusTimer = nullptr;
};
