#include "LevelViewWidget.h"

#include "CITreeWidgetItem.h"
#include "DeviceCache.h"
#include "FamilyGrouping.h"
#include "LevelFiles.h"
#include "LevelReport.h"
#include "NameLibrary.h"

#include <QFileInfo>

#include <algorithm>

namespace {

enum Column
{
    FamilyColumn = FamilyGrouping::FamilyColumn,
    SubFamilyColumn = FamilyGrouping::SubFamilyColumn,
    NameColumn,
    IdColumn,
    ResultColumn
};

} // namespace

LevelViewWidget::LevelViewWidget(QWidget* parent)
    : GatewayComponentWidget(parent)
{
    // Nothing chosen yet is a complete page.
    setStatus(readyStatus());
    setState(Complete);
    initializeLibrary();
    setupUi(this);
    connect(_levelDocuments, &QComboBox::currentIndexChanged, this, &LevelViewWidget::onCurrentLevelChanged);
}

void LevelViewWidget::setDeviceRecord(DeviceCache* record)
{
    QStringList files;
    if (record)
        listLevelFiles(files);
    offerLevelFiles(record, files);
}

void LevelViewWidget::setDeviceRecord(DeviceCache* record, const QString& levelsDirectory)
{
    QStringList files;
    if (record)
        listLevelFiles(levelsDirectory, files);
    offerLevelFiles(record, files);
}

void LevelViewWidget::offerLevelFiles(DeviceCache* record, QStringList files)
{
    m_record = record;
    if (!record)
        return;
    // A folder listing has no useful order of its own: by name, whichever level folder holds the file.
    std::sort(files.begin(), files.end(), [](const QString& a, const QString& b) {
        const QString nameA = QFileInfo(a).fileName(), nameB = QFileInfo(b).fileName();
        const int order = nameA.compare(nameB, Qt::CaseInsensitive);
        return order != 0 ? order < 0 : (nameA != nameB ? nameA < nameB : a < b);
    });
    for (const QString& file : std::as_const(files)) {
        const QFileInfo info(file);
        _levelDocuments->addItem(info.baseName(), info.absoluteFilePath());
    }
}

QString LevelViewWidget::componentName()
{
    return QStringLiteral("LevelView");
}

void LevelViewWidget::startComponent(const QString&)
{
}

bool LevelViewWidget::canSearch()
{
    return state() == Complete;
}

bool LevelViewWidget::search(const QString& text)
{
    return applyTreeSearch(text, _level1Tree);
}

void LevelViewWidget::raisePriority()
{
}

void LevelViewWidget::lowerPriority()
{
}

bool LevelViewWidget::isComplete()
{
    return statusIsReady();
}

void LevelViewWidget::onCurrentLevelChanged(int index)
{
    setStatus(QStringLiteral("Processing"));
    setState(Processing);
    // The prompt, or a choice before the record arrived, leaves the page processing.
    if (!m_record)
        return;
    const QString path = _levelDocuments->itemData(index).toString();
    if (path.isEmpty())
        return;

    QList<IdRecord> entries;
    QString error;
    if (!LevelReport::check(path, m_record->classes, &entries, &error)) {
        setStatus(QStringLiteral("Level file not found"));
        setState(Failed);
        return;
    }

    _level1Tree->clear();
    for (const IdRecord& entry : std::as_const(entries))
        insertEntry(entry);
    _level1Tree->setUpdatesEnabled(false);
    _level1Tree->sortByColumn(FamilyColumn, Qt::AscendingOrder);
    _level1Tree->expandAll();
    for (int column = FamilyColumn; column <= IdColumn; ++column)
        _level1Tree->resizeColumnToContents(column);
    _level1Tree->setUpdatesEnabled(true);
    // The export follows the level shown, whatever an earlier export built.
    m_report.clear();
    setStatus(readyStatus());
    setState(Complete);
}

void LevelViewWidget::insertEntry(const IdRecord& entry)
{
    QTreeWidgetItem* subFamily = nullptr;
    QTreeWidgetItem* family = FamilyGrouping::findFamily(_level1Tree, entry.family);
    if (!family) {
        family = new CITreeWidgetItem;
        family->setText(FamilyColumn, entry.family);
        subFamily = FamilyGrouping::addSubFamily(family, entry.subFamily);
        _level1Tree->addTopLevelItem(family);
    } else {
        subFamily = FamilyGrouping::findSubFamily(family, entry.subFamily);
        if (!subFamily)
            subFamily = FamilyGrouping::addSubFamily(family, entry.subFamily);
    }

    auto* item = new CITreeWidgetItem;
    item->setText(NameColumn, entry.name);
    item->setText(IdColumn, entry.id);
    item->setText(ResultColumn, LevelReport::resultText(entry));
    item->setForeground(ResultColumn, QBrush(entry.available ? Qt::green : Qt::red));
    subFamily->addChild(item);
}

QString LevelViewWidget::xmlReport()
{
    if (m_report.isEmpty())
        m_report = FamilyReport::levelReport(FamilyGrouping::families(_level1Tree, {NameColumn, IdColumn, ResultColumn})).toXml();
    return m_report;
}
