#include "PlatformClassIDDialog.h"

#include "CITableWidgetItem.h"
#include "EnsureWindowPlacementOnDesktop.h"
#include "FreeFormProgressDialog.h"
#include "NameLibrary.h"
#include "PlatformScanReport.h"
#include "SaveXmlReport.h"

#include <QHeaderView>
#include <QSettings>

namespace {

const QString SettingsGroup = QStringLiteral("PlatformClassDialog");

// Rows the header measures when it fits a column to its contents: a platform has tens of
// thousands of rows, and measuring every one would cost more than filling them.
constexpr int ResizeSampleRows = 200;

} // namespace

PlatformClassIDDialog::PlatformClassIDDialog(QWidget* parent)
    : QDialog(parent)
{
    setupUi(this);
    initializeLibrary();
    _platformClassTable->verticalHeader()->hide();
    _platformClassTable->verticalHeader()->setDefaultSectionSize(20);
    _platformClassTable->horizontalHeader()->setStretchLastSection(true);
    _platformClassTable->horizontalHeader()->setResizeContentsPrecision(ResizeSampleRows);

    QSettings settings;
    settings.beginGroup(SettingsGroup);
    const QPoint position = settings.value("pos", QPoint(100, 100)).toPoint();
    const QSize size = settings.value("size", QSize(900, 600)).toSize();
    settings.endGroup();
    move(position);
    resize(size);
    // The dialog is modal: lost on a screen that is gone, it would hold up the whole program.
    EnsureWindowPlacementOnDesktop(this);
}

PlatformClassIDDialog::~PlatformClassIDDialog()
{
    QSettings settings;
    settings.beginGroup(SettingsGroup);
    settings.setValue("pos", pos());
    settings.setValue("size", size());
    settings.endGroup();
}

void PlatformClassIDDialog::setProgressDialog(FreeFormProgressDialog* progress)
{
    m_progress = progress;
}

void PlatformClassIDDialog::populate(const std::vector<MifEntry>& entries)
{
    if (m_progress
        && FreeFormProgressDialog::progressCallback(
            m_progress, 0, int(entries.size()), tr("Processing MIF Entries")))
        return;

    // Every row at once: growing the table row by row costs a model change per row.
    qsizetype total = 0;
    for (const MifEntry& entry : entries)
        total += entry.classes.size();
    QTableWidget* table = _platformClassTable;
    table->setSortingEnabled(false);
    int row = table->rowCount();
    table->setRowCount(int(row + total));
    QVector<QStringList> scanned;
    scanned.reserve(total);

    int index = 0;
    for (const MifEntry& entry : entries) {
        ++index;
        if (m_progress
            && FreeFormProgressDialog::progressCallback(
                m_progress, index, -1, tr("Processing ") + entry.fileName)) {
            table->setRowCount(row);
            return;
        }
        for (const quint32 id : entry.classes) {
            QStringList cells = PlatformScanReport::cells(id, entry.filePath);
            for (int column = 0; column < cells.size(); ++column)
                table->setItem(row, column, new CITableWidgetItem(cells.at(column)));
            ++row;
            scanned.append(std::move(cells));
        }
    }

    // Sorted once, by class name, as sorting is switched on.
    table->horizontalHeader()->setSortIndicator(0, Qt::AscendingOrder);
    table->setSortingEnabled(true);
    table->resizeColumnsToContents();
    m_xml = PlatformScanReport::build(scanned).toXml();
}

void PlatformClassIDDialog::on__saveClassIDsButton_clicked()
{
    if (!m_xml.isEmpty())
        saveXmlReport(this, QStringLiteral("PlatformClassID.xml"), m_xml);
}
