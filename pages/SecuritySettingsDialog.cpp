#include "SecuritySettingsDialog.h"

#include "EnsureWindowPlacementOnDesktop.h"

#include <QSettings>

namespace {

const QString SettingsGroup = QStringLiteral("SecuritySettingsDialog");

} // namespace

SecuritySettingsDialog::SecuritySettingsDialog(QWidget* parent)
    : QDialog(parent)
{
    setupUi(this);
    QSettings settings;
    settings.beginGroup(SettingsGroup);
    const QPoint position = settings.value("pos", QPoint(100, 100)).toPoint();
    const QSize size = settings.value("size", this->size()).toSize();
    settings.endGroup();
    resize(size);
    move(position);
    EnsureWindowPlacementOnDesktop(this);
}

SecuritySettingsDialog::~SecuritySettingsDialog()
{
    QSettings settings;
    settings.beginGroup(SettingsGroup);
    settings.setValue("pos", pos());
    settings.setValue("size", size());
    settings.endGroup();
}

void SecuritySettingsDialog::setDevice(const QString& deviceId)
{
    _securitySettings->setDevice(deviceId);
}
