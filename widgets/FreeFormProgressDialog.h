#pragma once

#include "ui_FreeFormProgressDialog.h"

#include <QDialog>

// A modeless progress window driven through the gateway's progress callback: the callback
// sets the bar and the step text, and answers whether the user asked to cancel.
class FreeFormProgressDialog : public QDialog, public Ui::FreeFormProgressDialogClass
{
    Q_OBJECT

public:
    explicit FreeFormProgressDialog(QWidget* parent = nullptr);

    // Of the gateway's callback type; context is the dialog. Must run on the GUI thread.
    static bool progressCallback(void* context, int value, int maximum, const QString& text);

public slots:
    void on__cancelButton_clicked();

private:
    bool m_cancelRequested = false;
};
