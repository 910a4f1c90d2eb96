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
    for (const PlatformScanFile::Entry& entry : file.entries)
        addScanEntry(column, entry.name, entry.value, entry.family, entry.subFamily);
    return true;
}

int PlatformComparisonView::addScanColumn(const QString& header)
{
    m_comparison.addScan(header);
    const int column = _comparisonTable->columnCount();
    _comparisonTable->setColumnCount(column + 1);
    _comparisonTable->setHorizontalHeaderItem(column, new QTableWidgetItem(header));
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
    const int scan = column - FixedColumns;
    if (scan < 0 || scan >= m_comparison.scans().size())
        return;
    QTableWidget* table = _comparisonTable;
    // A sorting table would move a row as its cells are set; loadScan has switched it off.
    const bool sorting = table->isSortingEnabled();
    table->setSortingEnabled(false);
    if (!m_rowsIndexed)
        indexRows();

    bool added = false;
    const int index = m_comparison.add(scan, name, value, family, subfamily, &added);
    int row = -1;
    if (added) {
        row = table->rowCount();
        table->insertRow(row);
        int cell = 0;
        for (const QString& text : {name, value, family, subfamily})
            table->setItem(row, cell++, new CITableWidgetItem(text));
        table->item(row, IdColumn)->setData(ClassIndexRole, index);
        m_rowOfClass.append(row);
    } else {
        row = m_rowOfClass.at(index);
    }
    auto* check = new QTableWidgetItem(m_checkIcon, QString());
    check->setTextAlignment(Qt::AlignCenter);
    table->setItem(row, column, check);

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
    return m_comparison.scans().isEmpty() ? QString() : m_comparison.xml();
}
