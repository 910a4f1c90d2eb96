#include "DeviceWindow.h"

#include "DeviceFileSystemView.h"
#include "EnsureWindowPlacementOnDesktop.h"
#include "LockStatusWidget.h"
#include "ModuleInfoDialog.h"
#include "Portlex.h"
#include "PrivateTempFolder.h"
#include "SaveXmlReport.h"
#include "SecuritySettingsDialog.h"
#include "SnapshotActions.h"

#include <QActionGroup>
#include <QCloseEvent>
#include <QCoreApplication>
#include <QDesktopServices>
#include <QDir>
#include <QFileInfo>
#include <QLabel>
#include <QLineEdit>
#include <QPointer>
#include <QSettings>
#include <QTimer>
#include <QUrl>

namespace {

// The maker's long display names are shortened in the title.
QString titleFor(const QString& deviceName)
{
    QString shown = deviceName;
    shown.replace("Zantro Simulator -", "Simulator", Qt::CaseInsensitive);
    shown.replace("Zantro USB Device:", "Device:", Qt::CaseInsensitive);
    return "Delvix - " + shown;
}

// Module information windows stand on their own: no parent, modeless, resizable.
ModuleInfoDialog* newModuleInfoDialog()
{
    auto* dialog = new ModuleInfoDialog;
    dialog->setSizeGripEnabled(true);
    return dialog;
}

QWidget* fixedSpacer(int width, int height, QWidget* parent)
{
    auto* spacer = new QWidget(parent);
    spacer->setFixedSize(width, height);
    return spacer;
}

} // namespace

DeviceWindow::DeviceWindow(QWidget* parent)
    : QMainWindow(parent)
{
    setWindowFlags((windowFlags() & ~Qt::WindowContextHelpButtonHint) | Qt::WindowMinimizeButtonHint
                   | Qt::WindowMaximizeButtonHint);
    setAttribute(Qt::WA_DeleteOnClose);

    setupUi(this);
    m_timedStatusTimer = new QTimer(this);
    m_timedStatusTimer->setSingleShot(true);
    m_timedStatusTimer->setInterval(TimedStatusMs);
    connect(m_timedStatusTimer, &QTimer::timeout, this, &DeviceWindow::onTimedStatusExpire);
    _toolbar->setMinimumHeight(40);

    const QList<QPair<QAction*, int>> pageActions = {
        {action_Phone_Information, 0}, {action_Modules, 1},         {action_Class_IDs, 2},
        {action_ISettings, 3},         {action_Registry, 4},         {actionDevice_File_System, 5},
        {action_Family_Tree, 6},       {_actionThreads, 7},          {_actionLoaded_Modules, 8},
        {_actionLevelView, 9}};
    for (const auto& pageAction : pageActions)
        pageAction.first->setData(pageAction.second);
    actionExport_to_XML->setData(-1);

    buildStatusBar();
    SetStatus(tr("Ready"));

    buildSearchBox();
    auto* pageGroup = new QActionGroup(_toolbar);
    pageGroup->setExclusive(true);
    for (QAction* action : {action_Phone_Information, action_Modules, action_Class_IDs, action_Family_Tree,
                            action_ISettings, action_Registry, _actionThreads, _actionLoaded_Modules,
                            actionDevice_File_System, _actionLevelView})
        pageGroup->addAction(action);
    action_Phone_Information->setChecked(true);
    menu_View->addAction(_toolbar->toggleViewAction());

    connect(actionE_xit, &QAction::triggered, this, &QWidget::close);
    connect(_toolbar, &QToolBar::actionTriggered, this, &DeviceWindow::onToolbarActionTriggered);
    connect(actionExport_to_XML, &QAction::triggered, this, &DeviceWindow::onWriteXMLFile);
    connect(_actionSaveSnapshot, &QAction::triggered, this, &DeviceWindow::onSaveSnapshot);
    connect(_actionCompareWithSnapshot, &QAction::triggered, this, &DeviceWindow::onCompareWithSnapshot);
    connect(action_Security_Settings, &QAction::triggered, this, &DeviceWindow::onActionSecuritySettingsTriggered);
    _stackedWidget->setCurrentIndex(0);

    fillEmptySlots();
    showHintCursor();
    Portlex::Ref();
}

DeviceWindow::~DeviceWindow()
{
    Portlex::Deref();
}

void DeviceWindow::buildStatusBar()
{
    _statusBar->addWidget(fixedSpacer(10, 10, _statusBar));
    m_status = new QLabel(_statusBar);
    m_status->setObjectName("_status");
    m_status->setSizePolicy(QSizePolicy::Fixed, QSizePolicy::Fixed);
    m_status->setMinimumWidth(160);
    _statusBar->addWidget(m_status);
    m_lockStatus = new LockStatusWidget(_statusBar);
    _statusBar->addPermanentWidget(m_lockStatus);
    connect(m_lockStatus, &QAbstractButton::released, this, &DeviceWindow::onLockStatusReleased);
}

void DeviceWindow::buildSearchBox()
{
    auto* stretch = new QLabel(_toolbar);
    stretch->setMinimumWidth(100);
    stretch->setSizePolicy(QSizePolicy::Expanding, QSizePolicy::Preferred);
    _toolbar->addWidget(stretch);

    m_searchLabel = new QLabel(tr("Search"), _toolbar);
    QFont font("MS Shell Dlg 2", 10, QFont::Black);
    font.setKerning(true);
    m_searchLabel->setFont(font);
    _toolbar->addWidget(m_searchLabel);
    _toolbar->addWidget(fixedSpacer(6, 10, _toolbar));

    m_searchBox = new QLineEdit(_toolbar);
    m_searchBox->setMinimumWidth(120);
    m_searchBox->setSizePolicy(QSizePolicy::Preferred, QSizePolicy::Fixed);
    _toolbar->addWidget(m_searchBox);
    _toolbar->addWidget(fixedSpacer(20, 10, _toolbar));

    connect(m_searchBox, &QLineEdit::textEdited, this, &DeviceWindow::onSearch);
    m_searchLabel->setEnabled(false);
    m_searchBox->setEnabled(false);
}

// A slot whose page is not built yet says so instead of showing an empty frame.
void DeviceWindow::fillEmptySlots()
{
    for (int index = 0; index < _stackedWidget->count(); ++index) {
        if (pageAt(index))
            continue;
        QWidget* slot = _stackedWidget->widget(index);
        auto* note = new QLabel(tr("This page is not available in this version of Delvix."), slot);
        note->setAlignment(Qt::AlignCenter);
        note->setEnabled(false);
        slot->layout()->addWidget(note);
    }
}

// The first two windows ever show a hint cursor over the module list.
void DeviceWindow::showHintCursor()
{
    QSettings settings;
    const int seen = settings.value("moduleseen", 0).toInt();
    if (seen >= 2)
        return;
    _modulePage->setCursor(QCursor(QPixmap(":/Resources/InfoCursor.png"), 5, 0));
    settings.setValue("moduleseen", seen + 1);
}

GatewayComponentWidget* DeviceWindow::pageAt(int index) const
{
    QWidget* slot = _stackedWidget->widget(index);
    return slot ? slot->findChild<GatewayComponentWidget*>(QString(), Qt::FindDirectChildrenOnly) : nullptr;
}

void DeviceWindow::setDevice(const QString& deviceId)
{
    m_deviceId = deviceId;
    m_device = Portlex::GetDevice(deviceId);
    if (m_device) {
        restorePlacement(m_device->name);
        m_lockStatus->setDevice(deviceId);
        _phoneInfoWidget->startComponent(deviceId);
        _phoneInfoWidget->setDeviceRecord(&m_device->cache);
        _classListView->setDeviceRecord(&m_device->cache);
        _levelViewWidget->setDeviceRecord(&m_device->cache);
        _familyTreeView->setDeviceRecord(&m_device->cache);
    }

    _stackedWidget->setCurrentIndex(0);
    m_currentPage = _phoneInfoWidget;
    attachCurrentPage();

    if (m_device) {
        setWindowTitle(titleFor(m_device->name));
    } else {
        setWindowTitle("Delvix - " + deviceId);
        SetTimedStatus(tr("Device not found"));
    }
}

void DeviceWindow::restorePlacement(const QString& deviceName)
{
    QSettings settings;
    settings.beginGroup(deviceName);
    const QPoint position = settings.value("pos", QPoint(100, 100)).toPoint();
    const QSize size = settings.value("size", QSize(900, 600)).toSize();
    settings.endGroup();
    resize(size);
    move(position);
    EnsureWindowPlacementOnDesktop(this);
}

void DeviceWindow::attachCurrentPage()
{
    if (!m_currentPage)
        return;
    connect(m_currentPage, &GatewayComponentWidget::statusChanged, this, &DeviceWindow::SetStatus);
    connect(m_currentPage, &GatewayComponentWidget::timedStatusChanged, this, &DeviceWindow::SetTimedStatus);
    connect(m_currentPage, &GatewayComponentWidget::stateChanged, this, &DeviceWindow::onComponentStateChange);
    m_currentPage->raisePriority();
    m_currentPage->startComponent(m_deviceId);
    onComponentStateChange(m_currentPage->state());
    SetStatus(m_currentPage->status());
}

void DeviceWindow::detachCurrentPage()
{
    if (!m_currentPage)
        return;
    m_timedStatusTimer->stop();
    m_currentPage->lowerPriority();
    disconnect(m_currentPage, nullptr, this, nullptr);
    m_currentPage = nullptr;
}

bool DeviceWindow::fromDetachedPage() const
{
    const auto* page = qobject_cast<const GatewayComponentWidget*>(sender());
    return page && page != m_currentPage;
}

void DeviceWindow::onToolbarActionTriggered(QAction* triggerAction)
{
    bool isPage = false;
    const int index = triggerAction->data().toInt(&isPage);
    if (!isPage || index < 0 || index >= _stackedWidget->count() || index == _stackedWidget->currentIndex())
        return;
    detachCurrentPage();
    _stackedWidget->setCurrentIndex(index);
    m_currentPage = pageAt(index);
    if (m_currentPage == _moduleListView)
        connect(_moduleListView, &ModuleListView::doubleClick, this, &DeviceWindow::onModuleInfoExamine);
    if (m_currentPage == _deviceFSView)
        connect(_deviceFSView, &DeviceFileSystemView::doubleClick, this, &DeviceWindow::onFileSystemDoubleClick);
    attachCurrentPage();
    if (!m_currentPage) {
        onComponentStateChange(GatewayComponentWidget::Starting);
        SetStatus(QString());
    }
}

void DeviceWindow::onComponentStateChange(GatewayComponentWidget::ComponentState state)
{
    if (fromDetachedPage())
        return;
    const bool complete = state == GatewayComponentWidget::Complete && m_currentPage;
    const bool searchable = complete && m_currentPage->canSearch();
    m_searchLabel->setEnabled(searchable);
    m_searchBox->setEnabled(searchable);
    m_searchBox->setText(searchable ? m_currentPage->searchText() : QString());
    actionExport_to_XML->setEnabled(complete && m_currentPage->isComplete());
}

void DeviceWindow::SetStatus(QString statusString)
{
    if (fromDetachedPage())
        return;
    m_status->setText(statusString);
    QCoreApplication::processEvents();
}

void DeviceWindow::SetTimedStatus(QString statusMessage)
{
    if (fromDetachedPage())
        return;
    m_timedStatusTimer->start();
    m_status->setText(statusMessage);
    QCoreApplication::processEvents();
}

void DeviceWindow::onLockStatusReleased()
{
    onActionSecuritySettingsTriggered();
}

void DeviceWindow::onActionSecuritySettingsTriggered()
{
    // Exit closes every window while the dialog runs: after it, nothing of this window is
    // touched unless it is still there.
    const QString deviceId = m_deviceId;
    const QPointer<LockStatusWidget> indicator = m_lockStatus;
    const QPointer<SecuritySettingsDialog> dialog = new SecuritySettingsDialog(this);
    dialog->setDevice(deviceId);
    dialog->exec();
    delete dialog;
    // A lock just requested travels with this question, so the indicator shows the outcome.
    if (indicator)
        indicator->setDevice(deviceId);
}

void DeviceWindow::onModuleInfoExamine(ModuleInfo displayMe)
{
    ModuleInfoDialog* dialog = newModuleInfoDialog();
    dialog->openDeviceModule(m_deviceId, displayMe);
    dialog->show();
}

void DeviceWindow::onTimedStatusExpire()
{
    if (m_currentPage)
        m_status->setText(m_currentPage->status());
}

void DeviceWindow::onSearch(QString searchChars)
{
    if (m_currentPage)
        m_currentPage->search(searchChars);
}

void DeviceWindow::onWriteXMLFile()
{
    if (!m_currentPage)
        return;
    const QString report = m_currentPage->xmlReport();
    if (!report.isEmpty())
        saveXmlReport(this, m_currentPage->componentName(), report);
}

void DeviceWindow::onFileSystemDoubleClick(QString path)
{
    const QSharedPointer<_ZantDevice> device = Portlex::GetDevice(m_deviceId);
    const QString fileName = QFileInfo(path).fileName();
    // A name like ".." would make the copy land outside the temporary folder.
    if (!device || fileName.isEmpty() || fileName == "." || fileName == "..")
        return;
    // Not the shared temporary folder itself: another user could plant a file or a link there
    // under the name the copy is about to take.
    const QString folder = privateTempFolder(QDir::tempPath());
    if (folder.isEmpty())
        return;
    const QString local = folder + QLatin1Char('/') + fileName;
    if (device->CopyFileToPC(path, local) != 0)
        return;
    // A module's information file opens in the module information window, not on the desktop.
    const QFileInfo copied(local);
    if (copied.completeSuffix().compare(QLatin1String("mif"), Qt::CaseInsensitive) == 0) {
        ModuleInfoDialog* dialog = newModuleInfoDialog();
        dialog->openMifFile(local, copied.baseName());
        dialog->show();
        return;
    }
    QDesktopServices::openUrl(QUrl::fromLocalFile(local));
}

void DeviceWindow::closeEvent(QCloseEvent* event)
{
    if (m_device) {
        QSettings settings;
        settings.beginGroup(m_device->name);
        settings.setValue("pos", pos());
        settings.setValue("size", size());
        settings.endGroup();
    }
    deleteLater();
    event->accept();
}

void DeviceWindow::onSaveSnapshot()
{
    if (m_device)
        SnapshotActions::save(this, m_device, m_deviceId);
}

void DeviceWindow::onCompareWithSnapshot()
{
    if (m_device)
        SnapshotActions::compare(this, m_device, m_deviceId);
}
