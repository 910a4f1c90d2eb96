#pragma once

#include "ui_SecuritySettingsDialog.h"

#include <QDialog>

// "Developer Mode Management": the enablement panel in a modal dialog that remembers where
// it was and how large.
class SecuritySettingsDialog : public QDialog, public Ui::SecuritySettingsDialogClass
{
    Q_OBJECT

public:
    explicit SecuritySettingsDialog(QWidget* parent = nullptr);
    ~SecuritySettingsDialog() override;

    void setDevice(const QString& deviceId);
};
