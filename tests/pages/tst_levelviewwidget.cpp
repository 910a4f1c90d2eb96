#include "LevelFiles.h"
#include "LevelViewWidget.h"
#include "PageFixtures.h"
#include "TestSupport.h"

#include <QFileInfo>
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

} // namespace

// The level page: its choice of level files, the check of a definition against the device's
// classes, its failures and its export.
class TestLevelViewWidget : public QObject
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

    // Sorted by name whatever order the folder lists them in, letter case aside; without a
    // folder, the levels beside the program. Offering is not choosing.
    void offersTheLevelFiles()
    {
        QTemporaryDir levels;
        for (const char* name : {"b-level.xml", "C.xml.bak", "a-level.xml", "Alpha.xml", "notes.txt"})
            QVERIFY(TestSupport::writeFile(levels.filePath(name), "<level/>"));
        DeviceCache cache = smallDevice();
        LevelViewWidget page, shipped;
        QSignalSpy states(&page, &GatewayComponentWidget::stateChanged);
        page.setDeviceRecord(nullptr, levels.path());
        QCOMPARE(page._levelDocuments->count(), 1);
        page.setDeviceRecord(&cache, levels.path());
        QStringList texts, files;
        for (int i = 1; i < page._levelDocuments->count(); ++i)
            texts << page._levelDocuments->itemText(i) + "=" + page._levelDocuments->itemData(i).toString();
        QCOMPARE(texts, QStringList({"a-level=" + levels.filePath("a-level.xml"), "Alpha=" + levels.filePath("Alpha.xml"),
                                     "b-level=" + levels.filePath("b-level.xml"), "C=" + levels.filePath("C.xml.bak")}));
        QCOMPARE(page._levelDocuments->currentIndex(), 0);
        QCOMPARE(states.count(), 0);
        listLevelFiles(files);
        QVERIFY(files.size() >= 2);
        files.sort(Qt::CaseInsensitive);
        shipped.setDeviceRecord(&cache);
        texts.clear();
        for (int i = 1; i < shipped._levelDocuments->count(); ++i)
            texts << shipped._levelDocuments->itemData(i).toString();
        QCOMPARE(texts, files);
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
        choose(page, first);
        QCOMPARE(page.xmlReport(), QString("<!DOCTYPE levelreport>\n<device>\n <family name=\"Media\">\n  <subfamily name=\"Audio\">\n"
                                           "   <class name=\"Player\" classid=\"0x01000001\" available=\"Found\"/>\n"
                                           "  </subfamily>\n </family>\n</device>\n"));
        QSignalSpy statuses(&page, &GatewayComponentWidget::statusChanged);
        choose(page, m_small);
        QCOMPARE(signalTexts(statuses), QStringList({"Processing", "Ready"}));
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
        choose(page, m_folder.filePath("missing.xml"));
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

    void choiceBeforeTheRecordStaysProcessing()
    {
        LevelViewWidget page;
        choose(page, m_small);
        QCOMPARE(page.status(), QString("Processing"));
        QCOMPARE(page._level1Tree->topLevelItemCount(), 0);
    }

private:
    QTemporaryDir m_folder;
    QString m_small;
};

QTEST_MAIN(TestLevelViewWidget)
#include "tst_levelviewwidget.moc"
