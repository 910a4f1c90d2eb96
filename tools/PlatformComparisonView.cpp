#include "PlatformComparisonView.h"

#include "CITableWidgetItem.h"
#include "NameLibrary.h"
#include "PlatformScanFile.h"
#include "PlatformTools.h"

#include <QGuiApplication>
#include <QHeaderView>
#include <QScopeGuard>

namespace {

constexpr int IdColumn = 1;
// The class's index in the comparison, kept on its id cell.
constexpr int ClassIndexRole = Qt::UserRole + 1;
constexpr int ResizeSampleRows = 200;

} // namespace

PlatformComparisonView::PlatformComparisonView(QWidget* parent)
    : QFrame(parent)
{
    initializeLibrary();
    setupUi(this);
    m_checkIcon = QIcon(QStringLiteral(":/Resources/CheckBoxIcon.png"));
    _comparisonTable->verticalHeader()->setDefaultSectionSize(20);
    _comparisonTable->horizontalHeader()->setResizeContentsPrecision(ResizeSampleRows);
    // Loads sort by class name, A to Z (a fresh header would sort Z to A).
    _comparisonTable->horizontalHeader()->setSortIndicator(0, Qt::AscendingOrder);
    connect(_differencesOnly, &QCheckBox::toggled, this, &PlatformComparisonView::showDifferencesOnly);
}

bool PlatformComparisonView::loadScan(const QString& path)
{
    QGuiApplication::setOverrideCursor(Qt::WaitCursor);
    const auto restoreCursor = qScopeGuard([] { QGuiApplication::restoreOverrideCursor(); });

    const PlatformScanFile file = PlatformScanFile::read(path);
    if (file.status == PlatformScanFile::Unreadable)
        return false;
    const int column = addScanColumn(file.header);

    QTableWidget* table = _comparisonTable;
    table->setUpdatesEnabled(false);
    table->setSortingEnabled(false);
    const auto resume = qScopeGuard([this, table] {
        table->setUpdatesEnabled(true);
        table->setSortingEnabled(true);
        m_rowsIndexed = false;
        table->resizeColumnsToContents();
        showDifferencesOnly(_differencesOnly->isChecked());
        refreshSummary();
    });
    if (file.status == PlatformScanFile::WrongFormat) {
        informUser(this, tr("File Format Error"), path + tr(" is not the right format."));
        return false;
    }
    addScanEntries(column, file.entries);
    return true;
}

int PlatformComparisonView::addScanColumn(const QString& header)
{
    const int column = FixedColumns + m_comparison.addScan(header);
    // A table that gains a column moves its cells once per row, which costs rows squared: a
    // spare column is added, hidden, while the table is still empty and used by the next scan.
    QTableWidget* table = _comparisonTable;
    if (table->columnCount() <= column)
        table->setColumnCount(column + 1);
    if (table->rowCount() == 0) {
        table->setColumnCount(column + 2);
        table->setColumnHidden(column + 1, true);
    }
    table->setHorizontalHeaderItem(column, new QTableWidgetItem(header));
    table->setColumnHidden(column, false);
    return column;
}

void PlatformComparisonView::indexRows()
{
    m_rowOfClass = QVector<int>(m_comparison.classes().size(), -1);
    for (int row = 0; row < _comparisonTable->rowCount(); ++row)
        m_rowOfClass[_comparisonTable->item(row, IdColumn)->data(ClassIndexRole).toInt()] = row;
    m_rowsIndexed = true;
}

void PlatformComparisonView::addScanEntry(
    int column, const QString& name, const QString& value, const QString& family, const QString& subfamily)
{
    addScanEntries(column, {{name, value, family, subfamily}});
}

void PlatformComparisonView::addScanEntries(int column, const QVector<PlatformScanFile::Entry>& entries)
{
    const int scan = column - FixedColumns;
    if (scan < 0 || scan >= m_comparison.scans().size())
        return;
    QTableWidget* table = _comparisonTable;
    // A sorting table would move a row as its cells are set; loadScan has switched it off.
    const bool sorting = table->isSortingEnabled();
    table->setSortingEnabled(false);
    if (!m_rowsIndexed)
        indexRows();

    const int known = int(m_comparison.classes().size());
    QVector<int> marked;
    marked.reserve(entries.size());
    for (const PlatformScanFile::Entry& entry : entries)
        marked.append(m_comparison.add(scan, entry.name, entry.value, entry.family, entry.subFamily));

    // The new classes' rows come at once: growing the table row by row costs a model change per row.
    int row = table->rowCount();
    table->setRowCount(row + int(m_comparison.classes().size()) - known);
    for (int index = known; index < m_comparison.classes().size(); ++index, ++row) {
        const ScanComparison::Class& added = m_comparison.classes().at(index);
        int cell = 0;
        for (const QString& text : {added.name, added.id, added.family, added.subFamily})
            table->setItem(row, cell++, new CITableWidgetItem(text));
        table->item(row, IdColumn)->setData(ClassIndexRole, index);
        m_rowOfClass.append(row);
    }
    for (const int index : marked) {
        auto* check = new QTableWidgetItem(m_checkIcon, QString());
        check->setTextAlignment(Qt::AlignCenter);
        table->setItem(m_rowOfClass.at(index), column, check);
    }

    if (sorting) {
        table->setSortingEnabled(true);
        m_rowsIndexed = false;
    }
}

void PlatformComparisonView::showDifferencesOnly(bool on)
{
    if (!m_rowsIndexed)
        indexRows();
    for (int index = 0; index < m_rowOfClass.size(); ++index)
        _comparisonTable->setRowHidden(m_rowOfClass.at(index), on && m_comparison.isInEveryScan(index));
}

void PlatformComparisonView::refreshSummary()
{
    _summaryLabel->setText(m_comparison.summary());
}

QString PlatformComparisonView::exportText() const
{
    return m_comparison.scans().isEmpty() ? QString() : m_comparison.report().toXml();
}
