#include "ModuleInfoDialog.h"

#include "GatewayCall.h"
#include "Portlex.h"
#include "PortlexErrors.h"
#include "SaveXmlReport.h"


namespace {

struct MifAnswer
{
    int code = 0;
    QString reason;
    MifEntry entry;
};

} // namespace

ModuleInfoDialog::ModuleInfoDialog(QWidget* parent)
    : QDialog(parent)
    , m_placement(QStringLiteral("ModuleInfoDialog"), CascadeOffset)
{
    setupUi(this);
    setAttribute(Qt::WA_DeleteOnClose);
    // The button's object name does not match this handler's, so it is not bound by name.
    connect(okButton, &QPushButton::clicked, this, &ModuleInfoDialog::on__okButton_clicked);

    m_placement.restore(this, QPoint(100, 100), QSize(600, 350));
}

ModuleInfoDialog::~ModuleInfoDialog()
{
    m_placement.save(this);
}

void ModuleInfoDialog::setModuleName(const QString& name)
{
    m_moduleName = name;
    setWindowTitle(QStringLiteral("Module Info ") + name);
}

void ModuleInfoDialog::showMessage(const QString& text)
{
    _message->setText(text);
    _message->setVisible(!text.isEmpty());
}

QString ModuleInfoDialog::message() const
{
    return _message->text();
}

void ModuleInfoDialog::openMifFile(const QString& path, const QString& name)
{
    setModuleName(name);
    _moduleInfoView->loadMifFile(path);
}

void ModuleInfoDialog::openDeviceModule(const QString& deviceId, const ModuleInfo& moduleInfo)
{
    setModuleName(moduleInfo.name);
    const QSharedPointer<_ZantDevice> device = Portlex::GetDevice(deviceId);
    if (!device) {
        showMessage(GatewayCall::failureText(PortlexError::NotConnected, QString()));
        return;
    }
    m_busy = true;
    _saveModInfoButton->setEnabled(false);
    showMessage(tr("Reading the module's information from the device..."));
    setCursor(Qt::BusyCursor);
    const QString path = moduleInfo.path;
    GatewayCall::run(
        this,
        [device, path] {
            MifAnswer answer;
            answer.code = device->GetModuleMif(path, answer.entry, &answer.reason);
            return answer;
        },
        [this](const MifAnswer& answer) {
            m_busy = false;
            unsetCursor();
            if (answer.code != 0) {
                showMessage(GatewayCall::failureText(answer.code, answer.reason));
                return;
            }
            showMessage(QString());
            _saveModInfoButton->setEnabled(true);
            _moduleInfoView->setMifEntry(answer.entry);
        });
}

void ModuleInfoDialog::on__saveModInfoButton_clicked()
{
    saveXmlReport(this, m_moduleName + QStringLiteral(".xml"), _moduleInfoView->mifEntryXml());
}

void ModuleInfoDialog::on__okButton_clicked()
{
    close();
}
