#include "LevelViewWidget.h"

#include "CITreeWidgetItem.h"
#include "DeviceCache.h"
#include "DisplayText.h"
#include "FamilyGrouping.h"
#include "LevelFiles.h"
#include "LevelCheck.h"
#include "NameLibrary.h"

#include <QFileInfo>
#include <QFutureWatcher>
#include <QHeaderView>
#include <QThreadPool>
#include <QTimer>
#include <QtConcurrent/QtConcurrentRun>

#include <algorithm>
#include <utility>

namespace {

enum Column
{
    FamilyColumn = FamilyGrouping::FamilyColumn,
    SubFamilyColumn = FamilyGrouping::SubFamilyColumn,
    NameColumn,
    IdColumn,
    ResultColumn
};

QTreeWidgetItem* classItem(const QStringList& cells)
{
    auto* item = new CITreeWidgetItem;
    item->setText(NameColumn, cells.value(FamilyReport::NameColumn));
    item->setText(IdColumn, cells.value(FamilyReport::IdColumn));
    const QString result = cells.value(FamilyReport::ResultColumn);
    item->setText(ResultColumn, result);
    item->setForeground(ResultColumn, QBrush(result == DisplayText::levelResult(true) ? Qt::green : Qt::red));
    return item;
}

} // namespace

// A level read off the GUI thread: the items of its families, in no tree. Those the page
// does not take (a read it dropped) go with the last reference.
struct LevelViewWidget::LevelRead
{
    LevelRead() = default;
    LevelRead(const LevelRead&) = delete;
    LevelRead& operator=(const LevelRead&) = delete;
    ~LevelRead() { qDeleteAll(families); }

    bool readable = false;
    QList<QTreeWidgetItem*> families;
};

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

void LevelViewWidget::setDeviceRecord(const DeviceCache* record)
{
    QStringList files;
    if (record)
        listLevelFiles(files);
    offerLevelFiles(record, files);
}

void LevelViewWidget::setDeviceRecord(const DeviceCache* record, const QString& levelsDirectory)
{
    QStringList files;
    if (record)
        listLevelFiles(levelsDirectory, files);
    offerLevelFiles(record, files);
}

void LevelViewWidget::offerLevelFiles(const DeviceCache* record, QStringList files)
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

void LevelViewWidget::onCurrentLevelChanged(int index)
{
    setStatus(QStringLiteral("Processing"));
    setState(Processing);
    // Whatever an earlier choice still reads is not shown.
    const quint64 request = ++m_request;
    // The prompt, or a choice before the record arrived, leaves the page processing.
    if (!m_record)
        return;
    const QString path = _levelDocuments->itemData(index).toString();
    if (path.isEmpty())
        return;

    auto* answer = new QFutureWatcher<std::shared_ptr<LevelRead>>(this);
    connect(answer, &QFutureWatcherBase::finished, this, [this, answer, request] {
        answer->deleteLater();
        if (request != m_request)
            return;
        const std::shared_ptr<LevelRead> level = answer->result();
        // Taking a large level out and putting the next one in are each about a frame's
        // work: they get a tick each (a timer, since a posted call would run in this turn of
        // the event loop, before the repaint).
        if (!level->readable || !takeShownLevel()) {
            showLevel(*level);
            return;
        }
        QTimer::singleShot(1, this, [this, level, request] {
            if (request == m_request)
                showLevel(*level);
        });
    });
    // The worker reads a copy of the classes: the device's record may change or go meanwhile.
    answer->setFuture(QtConcurrent::run(&LevelViewWidget::read, path, m_record->classes));
}

std::shared_ptr<LevelViewWidget::LevelRead> LevelViewWidget::read(const QString& path, const IdRecordMap& classes)
{
    auto level = std::make_shared<LevelRead>();
    QList<IdRecord> entries;
    QString error;
    level->readable = LevelCheck::check(path, classes, &entries, &error);
    if (level->readable)
        level->families = FamilyGrouping::items(FamilyReport::group(entries, LevelCheck::cells), classItem);
    return level;
}

void LevelViewWidget::showLevel(LevelRead& level)
{
    if (!level.readable) {
        setStatus(QStringLiteral("Level file not found"));
        setState(Failed);
        return;
    }
    _level1Tree->setUpdatesEnabled(false);
    takeShownLevel();
    // The families come sorted as the tree sorts them: the indicator is set without sorting.
    _level1Tree->addTopLevelItems(std::exchange(level.families, {}));
    _level1Tree->header()->setSortIndicator(FamilyColumn, Qt::AscendingOrder);
    _level1Tree->expandAll();
    for (int column = FamilyColumn; column <= IdColumn; ++column)
        _level1Tree->resizeColumnToContents(column);
    _level1Tree->setUpdatesEnabled(true);
    // The export follows the level shown, whatever an earlier export built.
    m_report.clear();
    setStatus(readyStatus());
    setState(Complete);
}

bool LevelViewWidget::takeShownLevel()
{
    if (_level1Tree->topLevelItemCount() == 0)
        return false;
    // Collapsed first: taking expanded rows out costs the view twice as much.
    _level1Tree->collapseAll();
    // The items go on a pool thread: deleting tens of thousands of them would hold up the
    // GUI thread as long as making them.
    const QList<QTreeWidgetItem*> shown = _level1Tree->invisibleRootItem()->takeChildren();
    QThreadPool::globalInstance()->start([shown] { qDeleteAll(shown); });
    return true;
}

QString LevelViewWidget::xmlReport()
{
    if (m_report.isEmpty())
        m_report = FamilyReport::levelReport(FamilyGrouping::families(_level1Tree, {NameColumn, IdColumn, ResultColumn})).toXml();
    return m_report;
}
