#include "PlatformComparisonDialog.h"

#include "SaveXmlReport.h"

PlatformComparisonDialog::PlatformComparisonDialog(QWidget* parent)
    : QDialog(parent)
    , m_placement(QStringLiteral("PlatformComparisonDialog"), CascadeOffset)
{
    setupUi(this);
    setAttribute(Qt::WA_DeleteOnClose);
    setWindowFlags(windowFlags() | Qt::WindowMinimizeButtonHint | Qt::WindowMaximizeButtonHint
        | Qt::WindowCloseButtonHint | Qt::WindowShadeButtonHint);
    connect(_closeButton, &QPushButton::released, this, &PlatformComparisonDialog::OnCloseButtonClicked);
    connect(
        _saveFileButton, &QPushButton::released, this, &PlatformComparisonDialog::OnSaveFileButtonClicked);

    m_placement.restore(this, QPoint(100, 100), QSize(900, 600));
}

PlatformComparisonDialog::~PlatformComparisonDialog()
{
    m_placement.save(this);
}

bool PlatformComparisonDialog::loadFiles(const QStringList& paths)
{
    return _platformView->loadScans(paths);
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
