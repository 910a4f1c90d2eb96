#include "ClassListView.h"
#include "FamilyTreeView.h"
#include "FormatSize.h"
#include "IdFormat.h"
#include "LevelViewWidget.h"
#include "PageFixtures.h"
#include "PhoneInfoWidget.h"
#include "RecordTableModel.h"
#include "TestSupport.h"

#include <QFileInfo>
#include <QHeaderView>
#include <QLabel>
#include <QSignalSpy>
#include <QTemporaryDir>

using namespace PageFixtures;

namespace {

// Classes of a small device: two families, one class unavailable.
DeviceCache smallDevice()
{
    return cacheOf({makeClass("0x01000001", "Player", "Media", "Audio"), makeClass("0x01000002", "Camera", "media", "Video"),
                    makeClass("0x01000003", "Mixer", "Media", "audio", false), makeClass("0x0100000A", "Heap", "Kernel", "Memory")});
}

// Adds path as a choice and chooses it, as the user does from the combo box.
void choose(LevelViewWidget& page, const QString& path)
{
    page._levelDocuments->addItem(QFileInfo(path).baseName(), path);
    page._levelDocuments->setCurrentIndex(page._levelDocuments->count() - 1);
}

// The same, then waits for the read, which runs on a pool thread.
bool chooseAndWait(LevelViewWidget& page, const QString& path)
{
    choose(page, path);
    return QTest::qWaitFor([&page] { return page.state() != GatewayComponentWidget::Processing; }, 30000);
}

// Family, sub-family, class count and the first and last class name of every sub-family.
QStringList groupSummary(const QTreeWidget* tree)
{
    QStringList lines;
    for (int f = 0; f < tree->topLevelItemCount(); ++f) {
        const QTreeWidgetItem* family = tree->topLevelItem(f);
        for (int s = 0; s < family->childCount(); ++s) {
            const QTreeWidgetItem* sub = family->child(s);
            lines.append(QString("%1/%2: %3, %4..%5")
                             .arg(family->text(0), sub->text(1))
                             .arg(sub->childCount())
                             .arg(sub->child(0)->text(2), sub->child(sub->childCount() - 1)->text(2)));
        }
    }
    return lines;
}

int classItems(const QTreeWidget* tree)
{
    int classes = 0;
    for (QTreeWidgetItemIterator it(const_cast<QTreeWidget*>(tree)); *it; ++it)
        classes += (*it)->parent() && (*it)->parent()->parent() ? 1 : 0;
    return classes;
}

enum Column { NameColumn, IdColumn, FamilyColumn, SubFamilyColumn, AvailableColumn, PathColumn };

DeviceCache numberedClasses(int count)
{
    QList<IdRecord> classes;
    for (int k = 0; k < count; ++k)
        classes.append(makeClass(formatId(0x7E000001 + quint32(k)), QString("Class %1").arg(k), "F", "S"));
    return cacheOf(classes);
}

} // namespace

// The pages filled from the device's record alone: the class id list (progress, clicks, the
// export, a record that comes late or goes), the family tree (grouping of the available
// classes, the order of the families while the tree fills, the export), the level page (its
// choice of level files, the check of a definition against the classes, its failures and
// export) and the phone information (every label and box from its key, the format tables,
// the size texts).
class TestRecordPages : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase()
    {
        m_small = m_folder.filePath("small.xml");
        QVERIFY(TestSupport::writeFile(m_small, R"(<level name="small">
  <Id value="0x01000002" name="Camera"/>
  <Id value="0x01000001" name="Player"/>
  <Id value="0x01000003" name="Mixer"/>
  <Id value="0x0100000a" name="FromFile"/>
  <Id value="0x01000099" name="Missing"/>
  <Id value="0x01000098" name="AlsoMissing"/>
</level>
)"));
    }

    // Time slices: after every tick the table holds the next classes in ascending id order,
    // the status counts them and the state stays Processing; the last tick sorts by name,
    // says "Ready" and completes. Each page counts its own rows.
    void fillsInTimeSlices_data()
    {
        QTest::addColumn<int>("classes");
        QTest::newRow("none") << 0;
        QTest::newRow("one") << 1;
        QTest::newRow("many slices") << 30000;
    }

    void fillsInTimeSlices()
    {
        QFETCH(int, classes);
        DeviceCache cache = numberedClasses(classes);
        QStringList arrival; // ids in ascending order: the order the worker queues them
        for (const IdRecord& record : std::as_const(cache.classes))
            arrival.append(record.id);
        for (int pass = 0; pass < 2; ++pass) {
            const int threads = TestSupport::threadCount();
            ClassListView page;
            QSignalSpy statuses(&page, &GatewayComponentWidget::statusChanged);
            QSignalSpy states(&page, &GatewayComponentWidget::stateChanged);
            page.setDeviceRecord(&cache);
            // The worker has queued every class.
            QTRY_COMPARE(TestSupport::threadCount(), threads);
            for (int ticks = 0; !page.isComplete() && ticks <= classes; ++ticks) {
                page.onTimeElapse();
                if (page.isComplete())
                    break;
                const int shown = page.model()->rowCount();
                QCOMPARE(columnTexts(page.model(), IdColumn), arrival.mid(0, shown));
                QCOMPARE(page.state(), GatewayComponentWidget::Processing);
                QVERIFY(!page.canSearch() && !page._classIDTable->isSortingEnabled());
                if (shown > 0)
                    QCOMPARE(page.status(), QString("Processed %1 classes").arg(shown));
            }
            QVERIFY(page.isComplete());
            const QStringList texts = signalTexts(statuses);
            QCOMPARE(texts.first(), QString("Processing Class IDs"));
            QCOMPARE(texts.last(), QString("Ready"));
            // The counter rises and ends on the true count.
            QStringList counted = texts.mid(1, texts.size() - 2);
            QCOMPARE(counted.isEmpty(), classes == 0);
            if (classes > 0)
                QCOMPARE(counted.last(), QString("Processed %1 classes").arg(classes));
            for (int i = 1; i < counted.size(); ++i)
                QVERIFY(counted[i - 1].section(' ', 1, 1).toInt() < counted[i].section(' ', 1, 1).toInt());
            QCOMPARE(signalTexts(states), QStringList({"Processing", "Complete"}));
            QVERIFY(page.canSearch() && page._classIDTable->isSortingEnabled());
            QCOMPARE(page.model()->rowCount(), classes);
            // "Class 10" before "Class 2": names sort as text.
            if (classes > 10)
                QCOMPARE(columnTexts(page.model(), NameColumn).mid(0, 3), QStringList({"Class 0", "Class 1", "Class 10"}));
        }
    }

    void clicksEmitTheCellText()
    {
        DeviceCache cache = cacheOf({makeClass("0x00000001", "First", "F", "S"), makeClass("0x00000002", "Second", "F", "S")});
        ClassListView page;
        page.resize(800, 400);
        page.show();
        page.setDeviceRecord(&cache);
        QVERIFY(fillByHand(page));
        QVERIFY(QTest::qWaitForWindowExposed(&page));
        QTableView* table = page._classIDTable;
        QSignalSpy singles(&page, &ClassListView::singleClick);
        QSignalSpy doubles(&page, &ClassListView::doubleClick);
        QTest::mouseClick(table->viewport(), Qt::LeftButton, {}, table->visualRect(page.model()->index(1, IdColumn)).center());
        const QPoint first = table->visualRect(page.model()->index(0, NameColumn)).center();
        QTest::mouseClick(table->viewport(), Qt::LeftButton, {}, first);
        QTest::mouseDClick(table->viewport(), Qt::LeftButton, {}, first);
        QCOMPARE(signalTexts(singles), QStringList({"0x00000002", "First"}));
        QCOMPARE(signalTexts(doubles), QStringList("First"));
    }

    // Rows and export: "unknown" for empty names, the path, the table's order, escaping.
    void exportFollowsTheSortAndIsFrozen()
    {
        DeviceCache cache = cacheOf({makeClass("0x00000002", "Beta", "F", "", true, "/usermod/b/b.mif"),
                                     makeClass("0x00000001", "alpha <1>", "F & G", "S", true, "zkernel"),
                                     makeClass("0x00000003", "", "", "", false)});
        cache.deviceData.zantVersion = "3.2.9";
        cache.deviceData.hardware.insert("Model", "\"Slim\"");
        ClassListView page;
        page.setDeviceRecord(&cache);
        QVERIFY(fillByHand(page));
        page._classIDTable->sortByColumn(IdColumn, Qt::DescendingOrder);
        QCOMPARE(columnTexts(page.model(), AvailableColumn), QStringList({"No", "Yes", "Yes"}));
        const QString report = page.xmlReport();
        QCOMPARE(report, QString("<!DOCTYPE zant-class-ids>\n"
                                 "<ZTOINFO>\n"
                                 " <ZTOVERSION version=\"3.2.9\" target=\"0x0A110021\" manufacturer=\"Zantro &amp; Sons\" "
                                 "model=\"&quot;Slim&quot;\"/>\n <ZantHeaderDataList>\n"
                                 "  <ZTOId path=\"\" subfamily=\"unknown\" family=\"unknown\" value=\"0x00000003\" name=\"unknown\"/>\n"
                                 "  <ZTOId path=\"/usermod/b/b.mif\" subfamily=\"unknown\" family=\"F\" value=\"0x00000002\" name=\"Beta\"/>\n"
                                 "  <ZTOId path=\"zkernel\" subfamily=\"S\" family=\"F &amp; G\" value=\"0x00000001\" "
                                 "name=\"alpha &lt;1&gt;\"/>\n </ZantHeaderDataList>\n</ZTOINFO>\n"));
        page._classIDTable->sortByColumn(NameColumn, Qt::AscendingOrder);
        QCOMPARE(page.xmlReport(), report);
    }

    // Without a record the page waits and its export keeps its shape, frozen even when a record
    // comes later; that record, and the device with it, may go while the worker walks it.
    void recordComesLateAndGoesEarly()
    {
        ClassListView page;
        page.setDeviceRecord(nullptr);
        page.onTimeElapse();
        QCOMPARE(page.status(), QString("Starting"));
        const QString expected("<!DOCTYPE zant-class-ids>\n<ZTOINFO>\n"
                               " <ZTOVERSION version=\"\" target=\"\" manufacturer=\"\" model=\"\"/>\n"
                               " <ZantHeaderDataList/>\n</ZTOINFO>\n");
        QCOMPARE(page.xmlReport(), expected);
        auto cache = std::make_unique<DeviceCache>(numberedClasses(400));
        page.setDeviceRecord(cache.get());
        QVERIFY(tickUntil(page, [&] { return page.model()->rowCount() > 0; }));
        cache.reset();
        QVERIFY(fillByHand(page));
        QCOMPARE(page.model()->rowCount(), 400);
        QCOMPARE(page.xmlReport(), expected);
    }

    // Closing the window in the middle of a fill: the page goes with rows still queued, its
    // worker ends, and nothing is touched afterwards.
    void destroyedWhileFillingEndsItsWorker()
    {
        DeviceCache cache = numberedClasses(30000);
        const int threads = TestSupport::threadCount();
        auto page = std::make_unique<ClassListView>();
        page->setDeviceRecord(&cache);
        QVERIFY(tickUntil(*page, [&] { return page->model()->rowCount() > 0; }));
        QVERIFY(!page->isComplete());
        page.reset();
        QTRY_COMPARE(TestSupport::threadCount(), threads);
        QTest::qWait(20);
    }

    // Families sorted without regard to case and named as first met; sub-families keep
    // their case; the rest in the order the classes came (ascending ids).
    void groupsByFamilyAndSubFamily()
    {
        DeviceCache cache = cacheOf({
            makeClass("0x00000001", "Player", "Media", "Audio"),
            makeClass("0x00000002", "Camera", "media", "Video"),
            makeClass("0x00000003", "Mixer", "MEDIA", "audio"),
            makeClass("0x00000004", "Tuner", "Media", "Audio"),
            makeClass("0x00000005", "", "", ""),
            makeClass("0x00000006", "Hidden", "Media", "Audio", false),
            makeClass("0x00000007", "Clock", "zeta", "Time"),
            makeClass("0x00000008", "Heap", "alpha", "Memory"),
            makeClass("0x00000009", "Ghost", "Phantom", "Spooky", false),
        });
        FamilyTreeView page;
        QSignalSpy states(&page, &GatewayComponentWidget::stateChanged);
        QSignalSpy statuses(&page, &GatewayComponentWidget::statusChanged);
        page.setDeviceRecord(&cache);
        // Left to its own timer.
        QTRY_VERIFY_WITH_TIMEOUT(page.isComplete(), 30000);
        QCOMPARE(signalTexts(statuses), QStringList({"Processing Class IDs", "Processed 7 classes", "Ready"}));
        QCOMPARE(treeLines(page._familyTree),
                 QStringList({"alpha|||", " |Memory||", "  ||Heap|0x00000008", "Media|||", " |Audio||", "  ||Player|0x00000001",
                              "  ||Tuner|0x00000004", " |Video||", "  ||Camera|0x00000002", " |audio||", "  ||Mixer|0x00000003",
                              "unknown|||", " |unknown||", "  ||unknown|0x00000005", "zeta|||", " |Time||", "  ||Clock|0x00000007"}));
        QCOMPARE(signalTexts(states), QStringList({"Processing", "Complete"}));
        QVERIFY(page._familyTree->isSortingEnabled());
    }

    // Ticked by hand: after every tick the tree holds exactly the classes its status counts,
    // its families in order; the counts climb to the true one, then "Ready". Destroying a
    // page in the middle of its fill ends its worker.
    void familyTreeFillsInTimeSlices()
    {
        QList<IdRecord> records;
        const QStringList families = {"beta", "Alpha", "ALPHA"};
        for (int k = 0; k < 2400; ++k)
            records.append(makeClass(formatId(0x7E000001 + quint32(k)), QString("Class %1").arg(k), families.at(k % 3),
                                     QString("S%1").arg(k / 1200)));
        DeviceCache cache = cacheOf(records);
        FamilyTreeView page;
        QSignalSpy statuses(&page, &GatewayComponentWidget::statusChanged);
        page.setDeviceRecord(&cache);
        QStringList mismatches;
        QVERIFY(tickUntil(page, [&] {
            const QString counted = QString("Processed %1 classes").arg(classItems(page._familyTree));
            if (page.status().startsWith("Processed") && page.status() != counted)
                mismatches.append(page.status() + " with " + counted);
            for (int f = 1; f < page._familyTree->topLevelItemCount(); ++f) {
                if (*page._familyTree->topLevelItem(f) < *page._familyTree->topLevelItem(f - 1))
                    mismatches.append("families out of order");
            }
            return page.isComplete();
        }));
        QCOMPARE(mismatches, QStringList());
        const QStringList texts = signalTexts(statuses);
        QCOMPARE(texts.first(), QString("Processing Class IDs"));
        QCOMPARE(texts.mid(texts.size() - 2), QStringList({"Processed 2400 classes", "Ready"}));
        int previous = 0;
        for (const QString& text : texts.mid(1, texts.size() - 2)) {
            const int count = text.section(' ', 1, 1).toInt();
            QVERIFY2(text == QString("Processed %1 classes").arg(count) && count > previous, qPrintable(text));
            previous = count;
        }
        QCOMPARE(groupSummary(page._familyTree),
                 QStringList({"Alpha/S0: 800, Class 1..Class 1199", "Alpha/S1: 800, Class 1201..Class 2399",
                              "beta/S0: 400, Class 0..Class 1197", "beta/S1: 400, Class 1200..Class 2397"}));

        DeviceCache large = numberedClasses(20000);
        const int threads = TestSupport::threadCount();
        auto filling = std::make_unique<FamilyTreeView>();
        filling->setDeviceRecord(&large);
        QVERIFY(tickUntil(*filling, [&] { return filling->_familyTree->topLevelItemCount() > 0; }));
        QVERIFY(!filling->isComplete());
        filling.reset();
        QTRY_COMPARE(TestSupport::threadCount(), threads);
    }

    // The export follows the tree as the user sorted it, frozen at the first call; without
    // a record it keeps its shape. A device without available classes completes, empty.
    void exportFollowsTheTreeAndIsFrozen()
    {
        FamilyTreeView empty;
        QCOMPARE(empty.xmlReport(), QString("<!DOCTYPE familyTree>\n<deviceTree device=\"\" manufacturer=\"\"/>\n"));
        for (DeviceCache none : {cacheOf({}), cacheOf({makeClass("0x00000001", "A", "F", "S", false)})}) {
            FamilyTreeView page;
            page.setDeviceRecord(&none);
            QVERIFY(fillByHand(page));
            QCOMPARE(page._familyTree->topLevelItemCount(), 0);
        }
        DeviceCache cache = cacheOf({makeClass("0x00000001", "alpha", "Media", "Audio"),
                                     makeClass("0x00000002", "Beta", "Media", "Audio"),
                                     makeClass("0x00000003", "Heap", "Kernel", "Memory")});
        FamilyTreeView page;
        page.setDeviceRecord(&cache);
        QVERIFY(fillByHand(page));
        // As a click on the header does: by name, without regard to case.
        page._familyTree->header()->setSortIndicator(2, Qt::DescendingOrder);
        const QString expected = "<!DOCTYPE familyTree>\n"
                                 "<deviceTree device=\"0x0A110021\" manufacturer=\"Zantro &amp; Sons\">\n"
                                 " <family name=\"Kernel\">\n  <subfamily name=\"Memory\">\n"
                                 "   <class name=\"Heap\" classid=\"0x00000003\"/>\n"
                                 "  </subfamily>\n </family>\n <family name=\"Media\">\n  <subfamily name=\"Audio\">\n"
                                 "   <class name=\"Beta\" classid=\"0x00000002\"/>\n"
                                 "   <class name=\"alpha\" classid=\"0x00000001\"/>\n"
                                 "  </subfamily>\n </family>\n</deviceTree>\n";
        QCOMPARE(page.xmlReport(), expected);
        page._familyTree->sortByColumn(2, Qt::AscendingOrder);
        delete page._familyTree->topLevelItem(0);
        QCOMPARE(page.xmlReport(), expected);
    }

    // Sorted by name whatever order the folder lists them in, letter case aside. Offering is
    // not choosing.
    void offersTheLevelFiles()
    {
        QTemporaryDir levels;
        for (const char* name : {"b-level.xml", "C.xml.bak", "a-level.xml", "Alpha.xml", "notes.txt"})
            QVERIFY(TestSupport::writeFile(levels.filePath(name), "<level/>"));
        DeviceCache cache = smallDevice();
        LevelViewWidget page;
        QSignalSpy states(&page, &GatewayComponentWidget::stateChanged);
        page.setDeviceRecord(nullptr, levels.path());
        QCOMPARE(page._levelDocuments->count(), 1);
        page.setDeviceRecord(&cache, levels.path());
        QStringList texts;
        for (int i = 1; i < page._levelDocuments->count(); ++i)
            texts << page._levelDocuments->itemText(i) + "=" + page._levelDocuments->itemData(i).toString();
        QCOMPARE(texts, QStringList({"a-level=" + levels.filePath("a-level.xml"), "Alpha=" + levels.filePath("Alpha.xml"),
                                     "b-level=" + levels.filePath("b-level.xml"), "C=" + levels.filePath("C.xml.bak")}));
        QCOMPARE(page._levelDocuments->currentIndex(), 0);
        QCOMPARE(states.count(), 0);
    }

    // Families sorted, the rest in file order, every branch open. An export before a choice,
    // or of an earlier level, never stands for the level shown; an unreadable one keeps it.
    void checksALevelAgainstTheClasses()
    {
        const QString first = m_folder.filePath("first.xml");
        QVERIFY(TestSupport::writeFile(first, R"(<level><Id value="0x01000001" name="Player"/></level>)"));
        DeviceCache cache = smallDevice();
        LevelViewWidget page;
        page.setDeviceRecord(&cache);
        QCOMPARE(page.xmlReport(), QString("<!DOCTYPE levelreport>\n<device/>\n"));
        QVERIFY(chooseAndWait(page, first));
        QCOMPARE(page.xmlReport(), QString("<!DOCTYPE levelreport>\n<device>\n <family name=\"Media\">\n  <subfamily name=\"Audio\">\n"
                                           "   <class name=\"Player\" classid=\"0x01000001\" available=\"Found\"/>\n"
                                           "  </subfamily>\n </family>\n</device>\n"));
        QSignalSpy statuses(&page, &GatewayComponentWidget::statusChanged);
        QVERIFY(chooseAndWait(page, m_small));
        QCOMPARE(signalTexts(statuses), QStringList({"Processing", "Ready"}));
        QCOMPARE(treeLines(page._level1Tree),
                 QStringList({"||||", " ||||", "  ||Missing|0x01000099|Not Found", "  ||AlsoMissing|0x01000098|Not Found",
                              "Kernel||||", " |Memory|||", "  ||FromFile|0x0100000A|Found", "media||||", " |Video|||",
                              "  ||Camera|0x01000002|Found", " |Audio|||", "  ||Player|0x01000001|Found", " |audio|||",
                              "  ||Mixer|0x01000003|Not Found"}));
        for (QTreeWidgetItemIterator it(page._level1Tree, QTreeWidgetItemIterator::NoChildren); *it; ++it)
            QCOMPARE((*it)->foreground(4).color(), QColor((*it)->text(4) == "Found" ? Qt::green : Qt::red));
        QCOMPARE(page.state(), GatewayComponentWidget::Complete);
        for (QTreeWidgetItemIterator it(page._level1Tree, QTreeWidgetItemIterator::HasChildren); *it; ++it)
            QVERIFY((*it)->isExpanded());
        const QString report = page.xmlReport();
        QCOMPARE(report, QString("<!DOCTYPE levelreport>\n"
                                 "<device>\n <family name=\"\">\n  <subfamily name=\"\">\n"
                                 "   <class name=\"Missing\" classid=\"0x01000099\" available=\"Not Found\"/>\n"
                                 "   <class name=\"AlsoMissing\" classid=\"0x01000098\" available=\"Not Found\"/>\n"
                                 "  </subfamily>\n </family>\n <family name=\"Kernel\">\n  <subfamily name=\"Memory\">\n"
                                 "   <class name=\"FromFile\" classid=\"0x0100000A\" available=\"Found\"/>\n"
                                 "  </subfamily>\n </family>\n <family name=\"media\">\n  <subfamily name=\"Video\">\n"
                                 "   <class name=\"Camera\" classid=\"0x01000002\" available=\"Found\"/>\n"
                                 "  </subfamily>\n  <subfamily name=\"Audio\">\n"
                                 "   <class name=\"Player\" classid=\"0x01000001\" available=\"Found\"/>\n"
                                 "  </subfamily>\n  <subfamily name=\"audio\">\n"
                                 "   <class name=\"Mixer\" classid=\"0x01000003\" available=\"Not Found\"/>\n"
                                 "  </subfamily>\n </family>\n</device>\n"));
        // Choosing a level that cannot be read, or the prompt again, keeps the tree and its export.
        const QStringList tree = treeLines(page._level1Tree);
        QVERIFY(chooseAndWait(page, m_folder.filePath("missing.xml")));
        QCOMPARE(page.status(), QString("Level file not found"));
        QCOMPARE(page.state(), GatewayComponentWidget::Failed);
        QVERIFY(!page.isComplete() && !page.canSearch());
        QCOMPARE(treeLines(page._level1Tree), tree);
        QCOMPARE(page.xmlReport(), report);
        page._levelDocuments->setCurrentIndex(0);
        QCOMPARE(page.status(), QString("Processing"));
        QCOMPARE(page.state(), GatewayComponentWidget::Processing);
        QVERIFY(!page.isComplete() && !page.canSearch());
        QCOMPARE(treeLines(page._level1Tree), tree);
    }

    // A choice before the record stays processing. Of two choices in a row the page shows
    // the later, whatever the reads of both bring.
    void latestChoiceIsShown()
    {
        LevelViewWidget page;
        choose(page, m_small);
        QCOMPARE(page.status(), QString("Processing"));
        QCOMPARE(page._level1Tree->topLevelItemCount(), 0);
        DeviceCache cache = smallDevice();
        page.setDeviceRecord(&cache);
        choose(page, m_small);
        QVERIFY(chooseAndWait(page, m_folder.filePath("missing.xml")));
        QCOMPARE(page.status(), QString("Level file not found"));
        QTest::qWait(50);
        QCOMPARE(page._level1Tree->topLevelItemCount(), 0);
        QCOMPARE(page.state(), GatewayComponentWidget::Failed);
    }

    void formatSize()
    {
        const QList<QPair<quint64, QString>> sizes = {
            {9998, "9998 bytes"},           {9999, "9.76 kB"},           {1048575, "1024.00 kB"},
            {1048576, "1.00 MB"},           {1073741823, "1024.00 MB"},  {1073741824, "1.00 GB"},
            {~0ULL, "17179869184.00 GB"},
        };
        for (const auto& [bytes, text] : sizes)
            QCOMPARE(::formatSize(bytes), text);
    }

    void filledFromRecord()
    {
        DeviceCache cache;
        DeviceData& data = cache.deviceData;
        data.phoneName = "<b>Kestrel</b> & co";
        data.zantVersion = "4.2.1";
        data.hardware = {{"Manufacturer", "Norvale"}, {"IMEI", "490154203237518"}, {"FlipPhone", "Yes"}, {"Vibrate", "yes"},
                         {"HeapMemory", "10240"}, {"HeapFree", "9998"}, {"FSTotal", "lots"}, {"FSAvail", "-1"}};
        data.image = {{"PNG", "Yes"}, {"BMP", "Yes"}, {"JPEG", "No"}};
        data.video = {{"MPEG4", "Yes"}};
        PhoneInfoWidget page;
        QSignalSpy states(&page, &GatewayComponentWidget::stateChanged);
        page.setDeviceRecord(nullptr);
        QCOMPARE(states.count(), 0);
        page.setDeviceRecord(&cache);

        // Device texts are shown as they are, never as markup. Sizes: a number, the bytes
        // threshold, text that is no number, a negative count.
        const QList<QPair<const char*, QString>> labels = {
            {"_manufacturer", "Norvale"}, {"_imei", "490154203237518"}, {"_phoneName", "<b>Kestrel</b> & co"},
            {"_zantVersion", "4.2.1"}, {"_totalMemory", "10.00 kB"}, {"_freeMemory", "9998 bytes"},
            {"_fsSpace", "0 bytes"}, {"_fsFree", "0 bytes"},
        };
        for (const auto& [name, text] : labels) {
            const QLabel* label = page.findChild<QLabel*>(name);
            QVERIFY2(label && label->text() == text && label->textFormat() == Qt::PlainText, name);
        }
        // Only the exact "Yes" checks a box.
        QVERIFY(page._flipPhone->isChecked());
        QVERIFY(!page._vibrate->isChecked() && !page._locationSupport->isChecked() && !page._penSupport->isChecked());
        // Formats sorted by name, each beside its own value.
        QCOMPARE(columnTexts(page._imageFormats, 0), (QStringList{"BMP", "JPEG", "PNG"}));
        QCOMPARE(columnTexts(page._imageFormats, 1), (QStringList{"Yes", "No", "Yes"}));
        QCOMPARE(columnTexts(page._videoFormats, 0), QStringList{"MPEG4"});
        QCOMPARE(page._audioFormats->rowCount(), 0);
        QCOMPARE(page.status(), QString("Ready"));
        QCOMPARE(signalTexts(states), QStringList{"Complete"});

        // A second record replaces the rows and the texts.
        data.image = {{"GIF", "No"}, {"AVIF", "Yes"}, {"TIFF", "Yes"}};
        data.hardware.remove("IMEI");
        page.setDeviceRecord(&cache);
        QCOMPARE(columnTexts(page._imageFormats, 0), (QStringList{"AVIF", "GIF", "TIFF"}));
        QCOMPARE(columnTexts(page._imageFormats, 1), (QStringList{"Yes", "No", "Yes"}));
        QCOMPARE(page._imei->text(), QString());
    }

private:
    QTemporaryDir m_folder;
    QString m_small;
};

QTEST_MAIN(TestRecordPages)
#include "tst_recordpages.moc"
