#include "DeviceWindow.h"

#include "DeviceDirectory.h"
#include "DeviceFileSystemView.h"
#include "GatewayCall.h"
#include "LockStatusWidget.h"
#include "ModuleInfoDialog.h"
#include "Portlex.h"
#include "SaveXmlReport.h"
#include "SecuritySettingsDialog.h"
#include "WindowCascade.h"
#include "SnapshotActions.h"

#include <QActionGroup>
#include <QApplication>
#include <QCloseEvent>
#include <QDesktopServices>
#include <QFileInfo>
#include <QLabel>
#include <QLineEdit>
#include <QPointer>
#include <QSettings>
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

// The indexes of the stack, as the form orders them.
enum Slot
{
    PhoneInfoSlot = 0,
    ModuleSlot = 1,
    ClassSlot = 2,
    SettingsSlot = 3,
    RegistrySlot = 4,
    FileSystemSlot = 5,
    FamilySlot = 6,
    ProcessSlot = 7,
    LoadedModuleSlot = 8,
    LevelSlot = 9,
    SlotCount = 10
};

// The pages built from the device record, which only a new connect refreshes.
const QSet<int> RecordSlots = {PhoneInfoSlot, ClassSlot, FamilySlot, LevelSlot};
// The pages whose data an install, a delete or a run can change.
const QSet<int> ContentSlots = {ModuleSlot, ClassSlot, FamilySlot, RegistrySlot, LevelSlot, FileSystemSlot};

QSet<int> allSlots()
{
    QSet<int> indexes;
    for (int index = 0; index < SlotCount; ++index)
        indexes.insert(index);
    return indexes;
}

struct ConnectAnswer
{
    int code = 0;
    QString reason;
    QSharedPointer<const DeviceCache> cache;
};

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
    m_refreshAction = new QAction(tr("&Refresh"), this);
    m_refreshAction->setShortcut(QKeySequence::Refresh);
    connect(m_refreshAction, &QAction::triggered, this, &DeviceWindow::refreshCurrentPage);
    menu_View->addAction(m_refreshAction);
    menu_View->addAction(_toolbar->toggleViewAction());

    connect(actionE_xit, &QAction::triggered, this, &QWidget::close);
    connect(_toolbar, &QToolBar::actionTriggered, this, &DeviceWindow::onToolbarActionTriggered);
    connect(actionExport_to_XML, &QAction::triggered, this, &DeviceWindow::onWriteXMLFile);
    connect(_actionSaveSnapshot, &QAction::triggered, this, &DeviceWindow::onSaveSnapshot);
    connect(_actionCompareWithSnapshot, &QAction::triggered, this, &DeviceWindow::onCompareWithSnapshot);
    connect(action_Security_Settings, &QAction::triggered, this, &DeviceWindow::onActionSecuritySettingsTriggered);
    _stackedWidget->setCurrentIndex(0);

    fillEmptySlots();
    for (int index = 0; index < _stackedWidget->count(); ++index) {
        if (GatewayComponentWidget* page = pageAt(index))
            preparePage(page);
    }
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
    m_message = new QLabel(_statusBar);
    m_message->setObjectName("_message");
    m_message->setTextInteractionFlags(Qt::TextSelectableByMouse);
    _statusBar->addWidget(m_message, 1);
    m_lockStatus = new LockStatusWidget(_statusBar);
    _statusBar->addPermanentWidget(m_lockStatus);
    connect(m_lockStatus, &QAbstractButton::released, this, &DeviceWindow::onLockStatusReleased);
    connect(m_lockStatus, &LockStatusWidget::failed, this, [this](int code, const QString& text) {
        if (GatewayCall::deviceAbsent(code))
            markGone();
        else
            showMessage(text);
    });
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
    // A new search is a new action: the last one's message goes.
    connect(m_searchBox, &QLineEdit::textEdited, this, [this] { showMessage(QString()); });
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
        // Filled by the connect that opened the window, which has handed the device over.
        m_cache = m_device->cache();
        m_placement = std::make_unique<WindowCascade>(m_device->name, CascadeOffset);
        m_placement->restore(this, QPoint(100, 100), QSize(900, 600));
        m_lockStatus->setDevice(deviceId);
        _phoneInfoWidget->startComponent(deviceId);
        for (int index : RecordSlots)
            preparePage(pageAt(index));
        m_directory = new DeviceDirectory(ProbeIntervalMs, this);
        connect(m_directory, &DeviceDirectory::probed, this, &DeviceWindow::onDirectoryProbed);
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

void DeviceWindow::preparePage(GatewayComponentWidget* page)
{
    if (!page)
        return;
    connect(page, &GatewayComponentWidget::deviceContentChanged, this, &DeviceWindow::onDeviceContentChanged,
            Qt::UniqueConnection);
    if (!m_device)
        return;
    if (page == _phoneInfoWidget)
        _phoneInfoWidget->setDeviceRecord(m_cache.data());
    else if (page == _classListView)
        _classListView->setDeviceRecord(m_cache.data());
    else if (page == _levelViewWidget)
        _levelViewWidget->setDeviceRecord(m_cache.data());
    else if (page == _familyTreeView)
        _familyTreeView->setDeviceRecord(m_cache.data());
}

void DeviceWindow::attachCurrentPage()
{
    if (!m_currentPage)
        return;
    connect(m_currentPage, &GatewayComponentWidget::statusChanged, this, &DeviceWindow::SetStatus);
    connect(m_currentPage, &GatewayComponentWidget::timedStatusChanged, this, &DeviceWindow::SetTimedStatus);
    connect(m_currentPage, &GatewayComponentWidget::stateChanged, this, &DeviceWindow::onComponentStateChange);
    if (m_currentPage == _moduleListView)
        connect(_moduleListView, &ModuleListView::doubleClick, this, &DeviceWindow::onModuleInfoExamine);
    if (m_currentPage == _deviceFSView)
        connect(_deviceFSView, &DeviceFileSystemView::localCopyReady, this, &DeviceWindow::onLocalCopyReady);
    m_shownSlots.insert(_stackedWidget->currentIndex());
    m_currentPage->raisePriority();
    m_currentPage->startComponent(m_deviceId);
    onComponentStateChange(m_currentPage->state());
    SetStatus(m_currentPage->status());
}

void DeviceWindow::detachCurrentPage()
{
    if (!m_currentPage)
        return;
    showMessage(QString());
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
    if (m_staleSlots.remove(index) && deviceConnected())
        requery({index});
    m_currentPage = pageAt(index);
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
    const bool complete = state == GatewayComponentWidget::Complete && m_currentPage && deviceConnected();
    const bool searchable = complete && m_currentPage->canSearch();
    m_searchLabel->setEnabled(searchable);
    m_searchBox->setEnabled(searchable);
    m_searchBox->setText(searchable ? m_currentPage->searchText() : QString());
    actionExport_to_XML->setEnabled(complete && m_currentPage->isComplete());
}

void DeviceWindow::SetStatus(QString statusString)
{
    // While the device is away, that is what the status says, whatever the pages find.
    if (fromDetachedPage() || !deviceConnected())
        return;
    m_status->setText(statusString);
}

void DeviceWindow::SetTimedStatus(QString statusMessage)
{
    if (fromDetachedPage())
        return;
    showMessage(statusMessage);
}

void DeviceWindow::showMessage(const QString& text)
{
    m_message->setText(text);
    m_message->setToolTip(text);
}

QString DeviceWindow::message() const
{
    return m_message->text();
}

void DeviceWindow::onLockStatusReleased()
{
    onActionSecuritySettingsTriggered();
}

void DeviceWindow::onActionSecuritySettingsTriggered()
{
    if (!deviceConnected())
        return;
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
    if (!deviceConnected())
        return;
    ModuleInfoDialog* dialog = newModuleInfoDialog();
    dialog->openDeviceModule(m_deviceId, displayMe);
    dialog->show();
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

void DeviceWindow::onLocalCopyReady(QString local)
{
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
    if (m_placement)
        m_placement->save(this);
    deleteLater();
    event->accept();
}

void DeviceWindow::onDirectoryProbed()
{
    bool listed = false;
    for (const auto& device : m_directory->devices())
        listed = listed || device.second == m_deviceId;
    if (!listed) {
        if (++m_missedProbes >= MissedProbesForGone)
            markGone();
        return;
    }
    m_missedProbes = 0;
    if (m_link == Link::Gone)
        reconnect(allSlots());
}

void DeviceWindow::markGone()
{
    if (m_link != Link::Gone)
        setLink(Link::Gone);
}

void DeviceWindow::setLink(Link link)
{
    m_link = link;
    const bool connected = link == Link::Connected;
    // The pages keep what they showed, greyed, and take no action while the device is away.
    _stackedWidget->setEnabled(connected);
    action_Security_Settings->setEnabled(connected);
    m_refreshAction->setEnabled(connected);
    switch (link) {
    case Link::Gone:
        m_lockStatus->showDisconnected();
        m_status->setText(tr("Device disconnected"));
        break;
    case Link::Returning:
        m_status->setText(tr("Connecting again..."));
        break;
    case Link::Connected:
        m_lockStatus->setDevice(m_deviceId);
        if (m_currentPage)
            m_status->setText(m_currentPage->status());
        break;
    }
    onComponentStateChange(m_currentPage ? m_currentPage->state() : GatewayComponentWidget::Starting);
}

void DeviceWindow::reconnect(const QSet<int>& indexes)
{
    if (!m_device || m_link == Link::Returning)
        return;
    const Link before = m_link;
    setLink(Link::Returning);
    const QSharedPointer<_ZantDevice> device = m_device;
    GatewayCall::run(
        this,
        [device] {
            ConnectAnswer answer;
            if (Portlex::ConnectDevice(device, QString(), QString(), &answer.code, &answer.reason))
                answer.cache = device->cache();
            return answer;
        },
        [this, indexes, before](const ConnectAnswer& answer) {
            if (answer.code != 0) {
                // A device that is not there is gone; one that answers but refuses stays as it was.
                const bool absent = GatewayCall::deviceAbsent(answer.code) || before == Link::Gone;
                setLink(absent ? Link::Gone : before);
                showMessage(GatewayCall::failureText(answer.code, answer.reason));
                return;
            }
            rebuildPages(indexes, answer.cache);
            setLink(Link::Connected);
        });
}

void DeviceWindow::requery(const QSet<int>& indexes)
{
    QSet<int> replaced;
    for (int index : indexes) {
        GatewayComponentWidget* page = pageAt(index);
        if (page && !RecordSlots.contains(index) && page->refresh())
            continue;
        replaced.insert(index);
    }
    if (replaced.intersects(RecordSlots))
        reconnect(replaced);
    else if (!replaced.isEmpty())
        rebuildPages(replaced, nullptr);
}

void DeviceWindow::rebuildPages(const QSet<int>& indexes, const QSharedPointer<const DeviceCache>& record)
{
    const int shown = _stackedWidget->currentIndex();
    const bool reattach = indexes.contains(shown) && m_currentPage;
    if (reattach)
        detachCurrentPage();
    QSet<int> built;
    for (int index : indexes) {
        GatewayComponentWidget* old = pageAt(index);
        m_staleSlots.remove(index);
        if (!old)
            continue;
        // After a return, a page that can refresh in place keeps what the user opened in it.
        if (record && !RecordSlots.contains(index) && old->refresh())
            continue;
        // Its worker stops before the record it may read is replaced.
        delete old;
        built.insert(index);
    }
    if (record)
        m_cache = record;
    for (int index : built) {
        QWidget* slot = _stackedWidget->widget(index);
        GatewayComponentWidget* page = createPage(index, slot);
        slot->layout()->addWidget(page);
        preparePage(page);
        // A page that was shown asks again at once, shown or not.
        if (index != shown && m_shownSlots.contains(index)) {
            page->startComponent(m_deviceId);
            page->lowerPriority();
        }
    }
    if (reattach) {
        m_currentPage = pageAt(shown);
        attachCurrentPage();
    }
}

GatewayComponentWidget* DeviceWindow::createPage(int index, QWidget* slot)
{
    switch (index) {
    case PhoneInfoSlot:
        return _phoneInfoWidget = new PhoneInfoWidget(slot);
    case ModuleSlot:
        return _moduleListView = new ModuleListView(slot);
    case ClassSlot:
        return _classListView = new ClassListView(slot);
    case SettingsSlot:
        return _settingsTreeView = new ISettingsTreeView(slot);
    case RegistrySlot:
        return _registryListView = new RegistryListView(slot);
    case FileSystemSlot:
        return _deviceFSView = new DeviceFileSystemView(slot);
    case FamilySlot:
        return _familyTreeView = new FamilyTreeView(slot);
    case ProcessSlot:
        return _processView = new ProcessView(slot);
    case LoadedModuleSlot:
        return _loadedModuleView = new LoadedModuleView(slot);
    default:
        return _levelViewWidget = new LevelViewWidget(slot);
    }
}

void DeviceWindow::refreshCurrentPage()
{
    if (!deviceConnected())
        return;
    showMessage(QString());
    requery({_stackedWidget->currentIndex()});
}

void DeviceWindow::onDeviceContentChanged()
{
    // The page that made the change shows it itself; the others ask when next shown.
    for (int index : ContentSlots) {
        if (index != _stackedWidget->currentIndex())
            m_staleSlots.insert(index);
    }
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
