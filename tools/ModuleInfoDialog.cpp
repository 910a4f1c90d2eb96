#include "ModuleInfoDialog.h"

#include "EnsureWindowPlacementOnDesktop.h"
#include "Portlex.h"
#include "SaveXmlReport.h"

#include <QSettings>

namespace {

const QString SettingsGroup = QStringLiteral("ModuleInfoDialog");

} // namespace

ModuleInfoDialog::ModuleInfoDialog(QWidget* parent)
    : QDialog(parent)
{
    setupUi(this);
    setAttribute(Qt::WA_DeleteOnClose);
    // The button's object name does not match this handler's, so it is not bound by name.
    connect(okButton, &QPushButton::clicked, this, &ModuleInfoDialog::on__okButton_clicked);

    QSettings settings;
    settings.beginGroup(SettingsGroup);
    const QPoint position = settings.value("pos", QPoint(100, 100)).toPoint();
    const QSize size = settings.value("size", QSize(600, 350)).toSize();
    settings.endGroup();
    move(position + QPoint(CascadeOffset, CascadeOffset));
    resize(size);
    EnsureWindowPlacementOnDesktop(this);
}

ModuleInfoDialog::~ModuleInfoDialog()
{
    QSettings settings;
    settings.beginGroup(SettingsGroup);
    settings.setValue("pos", pos());
    settings.setValue("size", size());
    settings.endGroup();
}

void ModuleInfoDialog::setModuleName(const QString& name)
{
    m_moduleName = name;
    setWindowTitle(QStringLiteral("Module Info ") + name);
}

void ModuleInfoDialog::openMifFile(const QString& path, const QString& name)
{
    setModuleName(name);
    _moduleInfoView->loadMifFile(path);
}

void ModuleInfoDialog::openDeviceModule(const QString& deviceId, const ModuleInfo& moduleInfo)
{
    Portlex::Ref();
    setModuleName(moduleInfo.name);
    if (const QSharedPointer<_ZantDevice> device = Portlex::GetDevice(deviceId)) {
        MifEntry entry;
        if (device->GetModuleMif(moduleInfo.path, entry) == 0)
            _moduleInfoView->setMifEntry(entry);
    }
    Portlex::Deref();
}

void ModuleInfoDialog::on__saveModInfoButton_clicked()
{
    saveXmlReport(this, m_moduleName + QStringLiteral(".xml"), _moduleInfoView->mifEntryXml());
}

void ModuleInfoDialog::on__okButton_clicked()
{
    close();
}
