#include "FreeFormProgressDialog.h"

#include "ProgressCallback.h"

#include <QCoreApplication>

#include <type_traits>

static_assert(std::is_same_v<decltype(&FreeFormProgressDialog::progressCallback), PortlexProgressCallback>,
              "progressCallback must be usable as the gateway's progress callback");

FreeFormProgressDialog::FreeFormProgressDialog(QWidget* parent)
    : QDialog(parent)
{
    setupUi(this);
    setWindowFlag(Qt::WindowContextHelpButtonHint, false);
}

void FreeFormProgressDialog::on__cancelButton_clicked()
{
    m_cancelRequested = true;
}

bool FreeFormProgressDialog::progressCallback(void* context, int value, int maximum, const QString& text)
{
    auto* dialog = static_cast<FreeFormProgressDialog*>(context);
    if (!dialog)
        return false;

    bool stop = false;
    if (value == -1) {
        if (maximum != -1) {
            dialog->_progressBar->setRange(0, maximum);
            dialog->_progressBar->setValue(0);
            dialog->m_cancelRequested = false;
        }
    } else {
        dialog->_progressBar->setValue(value);
        stop = dialog->m_cancelRequested;
    }
    if (!text.isEmpty())
        dialog->_progressText->setText(text);

    // Lets the bar repaint and a click on Cancel be seen by the next report.
    QCoreApplication::processEvents();
    return stop;
}
