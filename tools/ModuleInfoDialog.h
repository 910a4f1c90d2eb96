#pragma once

#include "ModuleInfo.h"
#include "ui_ModuleInfoDialog.h"

#include <QDialog>

// The window of one module's information: the view, "Save Module Info..." and "Close". It
// shows one module for its whole life, deletes itself when closed, and opens 20 pixels right
// and down from where the last one closed.
class ModuleInfoDialog : public QDialog, public Ui::ModuleInfoDialogClass
{
    Q_OBJECT

public:
    static constexpr int CascadeOffset = 20;

    explicit ModuleInfoDialog(QWidget* parent = nullptr);
    ~ModuleInfoDialog() override;

    // A MIF file on the PC (a device file copied over); name is the module's name.
    void openMifFile(const QString& path, const QString& name);
    // The module's MIF as the device reads it. A device that is gone or cannot answer
    // leaves the view empty, without a message.
    void openDeviceModule(const QString& deviceId, const ModuleInfo& moduleInfo);

    // "Close": closes, and so deletes, the dialog (the button's accept() comes first).
    void on__okButton_clicked();

public slots:
    void on__saveModInfoButton_clicked();

private:
    void setModuleName(const QString& name);

    QString m_moduleName;
};
