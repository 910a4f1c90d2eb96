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

    // Sorted by name whatever order the folder lists them in (created here neither sorted
    // nor in reverse), letter case aside.
    void offersTheLevelFilesSorted()
    {
        QTemporaryDir levels;
        const QStringList created = {"b-level.xml", "C.xml.bak", "a-level.xml", "Alpha.xml", "notes.txt"};
        for (const QString& name : created)
            QVERIFY(TestSupport::writeFile(levels.filePath(name), "<level/>"));
        DeviceCache cache = smallDevice();
        LevelViewWidget page;
        QSignalSpy states(&page, &GatewayComponentWidget::stateChanged);
        page.setDeviceRecord(nullptr, levels.path());
        QCOMPARE(page._levelDocuments->count(), 1);
        page.setDeviceRecord(&cache, levels.path());
        QStringList texts, paths;
        for (int i = 1; i < page._levelDocuments->count(); ++i) {
            texts << page._levelDocuments->itemText(i);
            paths << page._levelDocuments->itemData(i).toString();
        }
        QCOMPARE(texts, QStringList({"a-level", "Alpha", "b-level", "C"}));
        QCOMPARE(paths, QStringList({levels.filePath("a-level.xml"), levels.filePath("Alpha.xml"),
                                     levels.filePath("b-level.xml"), levels.filePath("C.xml.bak")}));
        // Offering is not choosing.
        QCOMPARE(page._levelDocuments->currentIndex(), 0);
        QCOMPARE(states.count(), 0);
    }

    // Without a folder, the levels beside the program are offered.
    void offersTheShippedLevels()
    {
        QStringList files;
        listLevelFiles(files);
        QVERIFY(files.size() >= 2);
        files.sort(Qt::CaseInsensitive);
        DeviceCache cache = smallDevice();
        LevelViewWidget page;
        page.setDeviceRecord(&cache);
        QStringList paths;
        for (int i = 1; i < page._levelDocuments->count(); ++i)
            paths << page._levelDocuments->itemData(i).toString();
        QCOMPARE(paths, files);
    }

    // Families sorted, the rest in file order, every branch open; the export shows it.
    void checksALevelAgainstTheClasses()
    {
        DeviceCache cache = smallDevice();
        LevelViewWidget page;
        page.setDeviceRecord(&cache);
        QSignalSpy statuses(&page, &GatewayComponentWidget::statusChanged);
        choose(page, m_small);
        QCOMPARE(signalTexts(statuses), QStringList({"Processing", "Ready"}));
        QCOMPARE(page.state(), GatewayComponentWidget::Complete);
        for (QTreeWidgetItemIterator it(page._level1Tree, QTreeWidgetItemIterator::HasChildren); *it; ++it)
            QVERIFY((*it)->isExpanded());
        QCOMPARE(page.xmlReport(), QString("<!DOCTYPE levelreport>\n"
                                           "<device>\n"
                                           " <family name=\"\">\n"
                                           "  <subfamily name=\"\">\n"
                                           "   <class name=\"Missing\" classid=\"0x01000099\" available=\"Not Found\"/>\n"
                                           "   <class name=\"AlsoMissing\" classid=\"0x01000098\" available=\"Not Found\"/>\n"
                                           "  </subfamily>\n"
                                           " </family>\n"
                                           " <family name=\"Kernel\">\n"
                                           "  <subfamily name=\"Memory\">\n"
                                           "   <class name=\"FromFile\" classid=\"0x0100000A\" available=\"Found\"/>\n"
                                           "  </subfamily>\n"
                                           " </family>\n"
                                           " <family name=\"media\">\n"
                                           "  <subfamily name=\"Video\">\n"
                                           "   <class name=\"Camera\" classid=\"0x01000002\" available=\"Found\"/>\n"
                                           "  </subfamily>\n"
                                           "  <subfamily name=\"Audio\">\n"
                                           "   <class name=\"Player\" classid=\"0x01000001\" available=\"Found\"/>\n"
                                           "  </subfamily>\n"
                                           "  <subfamily name=\"audio\">\n"
                                           "   <class name=\"Mixer\" classid=\"0x01000003\" available=\"Not Found\"/>\n"
                                           "  </subfamily>\n"
                                           " </family>\n"
                                           "</device>\n"));
    }

    // An export taken before a choice, or of an earlier level, never stands for the level shown.
    void exportFollowsTheLevelShown()
    {
        const QString first = m_folder.filePath("first.xml");
        const QString second = m_folder.filePath("second.xml");
        QVERIFY(TestSupport::writeFile(first, R"(<level><Id value="0x01000001" name="Player"/></level>)"));
        QVERIFY(TestSupport::writeFile(second, R"(<level><Id value="0x01000099" name="Missing"/></level>)"));
        DeviceCache cache = smallDevice();
        LevelViewWidget page;
        page.setDeviceRecord(&cache);
        QCOMPARE(page.xmlReport(), QString("<!DOCTYPE levelreport>\n<device/>\n"));

        choose(page, first);
        const QString firstReport = page.xmlReport();
        QCOMPARE(firstReport, QString("<!DOCTYPE levelreport>\n"
                                      "<device>\n"
                                      " <family name=\"Media\">\n"
                                      "  <subfamily name=\"Audio\">\n"
                                      "   <class name=\"Player\" classid=\"0x01000001\" available=\"Found\"/>\n"
                                      "  </subfamily>\n"
                                      " </family>\n"
                                      "</device>\n"));
        choose(page, second);
        const QString secondReport = page.xmlReport();
        QVERIFY(secondReport != firstReport);
        QCOMPARE(secondReport, QString("<!DOCTYPE levelreport>\n"
                                       "<device>\n"
                                       " <family name=\"\">\n"
                                       "  <subfamily name=\"\">\n"
                                       "   <class name=\"Missing\" classid=\"0x01000099\" available=\"Not Found\"/>\n"
                                       "  </subfamily>\n"
                                       " </family>\n"
                                       "</device>\n"));
        // A level that cannot be read keeps the tree, and the export with it.
        choose(page, m_folder.filePath("missing.xml"));
        QCOMPARE(page.xmlReport(), secondReport);
    }

    // Going back to the prompt, or choosing a level that cannot be read, keeps the tree.
    void laterChoiceKeepsTheTree_data()
    {
        QTest::addColumn<QString>("path");
        QTest::addColumn<QString>("status");
        QTest::addColumn<GatewayComponentWidget::ComponentState>("state");
        QTest::newRow("prompt") << "" << "Processing" << GatewayComponentWidget::Processing;
        QTest::newRow("unreadable") << "missing.xml" << "Level file not found" << GatewayComponentWidget::Failed;
    }

    void laterChoiceKeepsTheTree()
    {
        QFETCH(QString, path);
        QFETCH(QString, status);
        QFETCH(GatewayComponentWidget::ComponentState, state);
        DeviceCache cache = smallDevice();
        LevelViewWidget page;
        page.setDeviceRecord(&cache);
        choose(page, m_small);
        const QStringList tree = treeLines(page._level1Tree);
        QVERIFY(!tree.isEmpty());
        if (path.isEmpty())
            page._levelDocuments->setCurrentIndex(0);
        else
            choose(page, m_folder.filePath(path));
        QCOMPARE(page.status(), status);
        QCOMPARE(page.state(), state);
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
