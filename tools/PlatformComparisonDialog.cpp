#include "PlatformComparisonDialog.h"

#include "EnsureWindowPlacementOnDesktop.h"
#include "SaveXmlReport.h"

#include <QSettings>

namespace {

const QString SettingsGroup = QStringLiteral("PlatformComparisonDialog");

} // namespace

PlatformComparisonDialog::PlatformComparisonDialog(QWidget* parent)
    : QDialog(parent)
{
    setupUi(this);
    setAttribute(Qt::WA_DeleteOnClose);
    setWindowFlags(windowFlags() | Qt::WindowMinimizeButtonHint | Qt::WindowMaximizeButtonHint
        | Qt::WindowCloseButtonHint | Qt::WindowShadeButtonHint);
    connect(_closeButton, &QPushButton::released, this, &PlatformComparisonDialog::OnCloseButtonClicked);
    connect(
        _saveFileButton, &QPushButton::released, this, &PlatformComparisonDialog::OnSaveFileButtonClicked);

    QSettings settings;
    settings.beginGroup(SettingsGroup);
    const QPoint position = settings.value("pos", QPoint(100, 100)).toPoint();
    const QSize size = settings.value("size", QSize(900, 600)).toSize();
    settings.endGroup();
    move(position + QPoint(CascadeOffset, CascadeOffset));
    resize(size);
    EnsureWindowPlacementOnDesktop(this);
}

PlatformComparisonDialog::~PlatformComparisonDialog()
{
    QSettings settings;
    settings.beginGroup(SettingsGroup);
    settings.setValue("pos", pos());
    settings.setValue("size", size());
    settings.endGroup();
}

bool PlatformComparisonDialog::loadFile(const QString& path)
{
    return _platformView->loadScan(path);
}

void PlatformComparisonDialog::OnCloseButtonClicked()
{
    close();
}

void PlatformComparisonDialog::OnSaveFileButtonClicked()
{
    const QString text = _platformView->exportText();
    if (!text.isEmpty())
        saveXmlReport(this, QStringLiteral("PlatformComparison"), text);
}
