#include "ModuleInfoView.h"

#include "MifEntryReport.h"
#include "MifReader.h"
#include "NameLibrary.h"

#include <QFileInfo>
#include <QHeaderView>

namespace {

// Rows the header measures when it fits a column to its contents: a module with thousands
// of classes would otherwise cost a measurement of every row.
constexpr int ResizeSampleRows = 100;

void fillTable(QTableWidget* table, const MifEntryReport::Section& section)
{
    table->clearContents();
    table->setRowCount(0);
    table->setRowCount(int(section.rows.size()));
    for (int row = 0; row < section.rows.size(); ++row) {
        const QStringList& cells = section.rows.at(row);
        for (int column = 0; column < cells.size(); ++column) {
            auto* item = new QTableWidgetItem(cells.at(column));
            if (column == section.numberColumn)
                item->setTextAlignment(Qt::AlignRight | Qt::AlignVCenter);
            table->setItem(row, column, item);
        }
    }
    table->resizeColumnsToContents();
}

} // namespace

ModuleInfoView::ModuleInfoView(QWidget* parent)
    : QWidget(parent)
{
    initializeLibrary();
    setupUi(this);
    for (QTableWidget* table : {_classIDTable, _appletTable, _externalClassesTable, _notifiersTable, _mimeTypeTable}) {
        table->verticalHeader()->setSectionResizeMode(QHeaderView::Fixed);
        table->horizontalHeader()->setResizeContentsPrecision(ResizeSampleRows);
    }
}

bool ModuleInfoView::loadMifFile(const QString& path)
{
    MifReader reader;
    if (!reader.readFile(path))
        return false;
    if (reader.decodeModule(m_entry)) {
        m_entry.fileName = QFileInfo(path).fileName();
        m_entry.filePath = path;
        refresh();
    }
    return true;
}

bool ModuleInfoView::setMifEntry(const MifEntry& entry)
{
    m_entry = entry;
    refresh();
    return true;
}

void ModuleInfoView::refresh()
{
    _classCount->setText(QString::number(m_entry.classCount));
    _appletCount->setText(QString::number(m_entry.appletCount));
    _extClassCount->setText(QString::number(m_entry.externalClassCount));
    _notifierCount->setText(QString::number(m_entry.notificationCount));
    _mimeTypeCount->setText(QString::number(m_entry.mimeTypeCount));

    const QVector<MifEntryReport::Section> sections = MifEntryReport::sections(m_entry);
    const QList<QTableWidget*> tables = {_classIDTable, _appletTable, _externalClassesTable, _notifiersTable,
                                         _mimeTypeTable};
    for (int i = 0; i < tables.size(); ++i)
        fillTable(tables.at(i), sections.at(i));
}

QString ModuleInfoView::mifEntryXml() const
{
    return MifEntryReport::build(m_entry).toXml();
}
