#pragma once

#include "ModuleInfo.h"
#include "WindowCascade.h"
#include "ui_ModuleInfoDialog.h"

#include <QDialog>

// The window of one module's information: the view, "Save Module Info..." and "Close". It
// shows one module for its whole life and deletes itself when closed; several open at once
// stand in a cascade of 20 pixel steps (WindowCascade).
class ModuleInfoDialog : public QDialog, public Ui::ModuleInfoDialogClass
{
    Q_OBJECT

public:
    static constexpr int CascadeOffset = 20;

    explicit ModuleInfoDialog(QWidget* parent = nullptr);
    ~ModuleInfoDialog() override;

    // A MIF file on the PC (a device file copied over); name is the module's name.
    void openMifFile(const QString& path, const QString& name);
    // The module's MIF as the device reads it, asked off the GUI thread: meanwhile the
    // dialog says it is reading; a device that is gone or refuses leaves the view empty
    // and the dialog shows the code and the device's reason.
    void openDeviceModule(const QString& deviceId, const ModuleInfo& moduleInfo);
    // The message above the view; hidden when there is none.
    QString message() const;
    // Until the device's answer came.
    bool isBusy() const { return m_busy; }

    // "Close": closes, and so deletes, the dialog (the button's accept() comes first).
    void on__okButton_clicked();

public slots:
    void on__saveModInfoButton_clicked();

private:
    void setModuleName(const QString& name);
    void showMessage(const QString& text);

    QString m_moduleName;
    WindowCascade m_placement;
    bool m_busy = false;
};
