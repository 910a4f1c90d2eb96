#pragma once

#include "MifEntry.h"
#include "ui_PlatformClassIDDialog.h"

#include <QDialog>
#include <vector>

class FreeFormProgressDialog;

// Every class that a platform build's MIF files export, one row per file and class, named
// through the class database, and the same list as a "platform-scan" document in scan order.
class PlatformClassIDDialog : public QDialog, public Ui::PlatformClassIDDialogClass
{
    Q_OBJECT

public:
    explicit PlatformClassIDDialog(QWidget* parent = nullptr);
    ~PlatformClassIDDialog() override;

    // Where populate reports its progress; null for none.
    void setProgressDialog(FreeFormProgressDialog* progress);
    // Fills the table and builds the document. A cancel through the progress dialog keeps
    // the rows so far, unsorted, and leaves the document empty.
    void populate(const std::vector<MifEntry>& entries);
    // Empty until a populate ran to its end.
    QString xmlText() const { return m_xml; }

public slots:
    // Saves the document as "PlatformClassID.xml"; nothing while it is empty.
    void on__saveClassIDsButton_clicked();

private:
    FreeFormProgressDialog* m_progress = nullptr;
    QString m_xml;
};
