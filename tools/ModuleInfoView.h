#pragma once

#include "MifEntry.h"
#include "ui_ModuleInfoView.h"

#include <QWidget>

// One module's information file (its MIF entry) in five tabbed tables, every id named
// through the class database, and the same entry as a "zant-mif-entry" document. The
// counts are shown as the module states them, not recomputed from the lists.
class ModuleInfoView : public QWidget, public Ui::ModuleInfoViewClass
{
    Q_OBJECT

public:
    explicit ModuleInfoView(QWidget* parent = nullptr);

    // Reads the MIF file at path. False, with the view as it was, when the file cannot be
    // read; true otherwise, and the module is shown when the file has a module header.
    bool loadMifFile(const QString& path);
    bool setMifEntry(const MifEntry& entry);
    // Shows the entry: counts, then the five tables from scratch.
    void refresh();
    // Never empty: the root element with the five counts is always written.
    QString mifEntryXml() const;

private:
    MifEntry m_entry;
};
