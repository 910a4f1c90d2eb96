#pragma once

#include "WindowCascade.h"
#include "ui_PlatformComparisonDialog.h"

#include <QDialog>

// The window of a platform scan comparison: the view, "Save to File..." and "Close". Several
// open at once stand in a cascade of 16 pixel steps (WindowCascade); it deletes itself when
// closed, storing its place and size then.
class PlatformComparisonDialog : public QDialog, public Ui::PlatformComparisonDialogClass
{
    Q_OBJECT

public:
    static constexpr int CascadeOffset = 16;

    explicit PlatformComparisonDialog(QWidget* parent = nullptr);
    ~PlatformComparisonDialog() override;

    bool loadFiles(const QStringList& paths);

public slots:
    void OnCloseButtonClicked();
    void OnSaveFileButtonClicked();

private:
    WindowCascade m_placement;
};
