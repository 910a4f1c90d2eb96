#include "SnapshotDiffDialog.h"

#include <QDialogButtonBox>
#include <QHeaderView>
#include <QLabel>
#include <QTableWidget>
#include <QVBoxLayout>

#include <algorithm>

namespace {

enum Column
{
    KindColumn,
    ChangeColumn,
    KeyColumn,
    BeforeColumn,
    AfterColumn,
    ColumnCount
};

constexpr int MaximumColumnWidth = 300;

QColor changeColour(SnapshotDiff::Change change)
{
    switch (change) {
    case SnapshotDiff::Added:
        return QColor(0xdf, 0xf2, 0xdc);
    case SnapshotDiff::Removed:
        return QColor(0xf6, 0xdb, 0xdb);
    case SnapshotDiff::Changed:
        break;
    }
    return QColor(0xfb, 0xf0, 0xcf);
}

} // namespace

SnapshotDiffDialog::SnapshotDiffDialog(const SnapshotDiff& difference, const QString& snapshotName, QWidget* parent)
    : QDialog(parent)
{
    setWindowTitle(tr("Compare with Snapshot - %1").arg(snapshotName));
    setSizeGripEnabled(true);
    resize(900, 520);
    auto* layout = new QVBoxLayout(this);
    // The counts line of the command line's text: its first line.
    m_summary = new QLabel(difference.text().section(QLatin1Char('\n'), 0, 0), this);
    m_summary->setWordWrap(true);
    layout->addWidget(m_summary);

    m_table = new QTableWidget(int(difference.differences().size()), ColumnCount, this);
    m_table->setHorizontalHeaderLabels({tr("Kind"), tr("Change"), tr("What"), tr("In Snapshot"), tr("On Device")});
    m_table->verticalHeader()->setVisible(false);
    m_table->verticalHeader()->setDefaultSectionSize(20);
    m_table->setEditTriggers(QAbstractItemView::NoEditTriggers);
    m_table->setSelectionBehavior(QAbstractItemView::SelectRows);
    QHash<QString, QString> titles;
    for (const auto& kind : SnapshotDiff::kinds())
        titles.insert(kind.first, kind.second);
    int row = 0;
    for (const SnapshotDiff::Difference& entry : difference.differences()) {
        const QStringList cells {titles.value(entry.kind), SnapshotDiff::changeName(entry.change), entry.key, entry.before,
                                 entry.after};
        for (int column = 0; column < ColumnCount; ++column) {
            auto* item = new QTableWidgetItem(cells.at(column));
            item->setBackground(changeColour(entry.change));
            item->setToolTip(cells.at(column));
            m_table->setItem(row, column, item);
        }
        ++row;
    }
    // A hash would push the device's column out of sight: long texts are cut, whole in the tool tip.
    m_table->resizeColumnsToContents();
    for (int column = 0; column < ColumnCount; ++column)
        m_table->setColumnWidth(column, std::min(m_table->columnWidth(column), MaximumColumnWidth));
    m_table->horizontalHeader()->setStretchLastSection(true);
    layout->addWidget(m_table);

    auto* buttons = new QDialogButtonBox(QDialogButtonBox::Close, this);
    connect(buttons, &QDialogButtonBox::rejected, this, &QDialog::reject);
    layout->addWidget(buttons);
}

QString SnapshotDiffDialog::summary() const
{
    return m_summary->text();
}
