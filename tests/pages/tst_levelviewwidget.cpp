#include "LevelFiles.h"
#include "LevelViewWidget.h"
#include "TreePageFixtures.h"

#include <QFileInfo>
#include <QSignalSpy>
#include <QTemporaryDir>
#include <QTest>

using namespace TreePageFixtures;

namespace {

// Classes of a small device: two families, one class unavailable.
DeviceCache smallDevice()
{
    return cacheOf({makeClass("0x01000001", "Player", "Media", "Audio"),
                    makeClass("0x01000002", "Camera", "media", "Video"),
                    makeClass("0x01000003", "Mixer", "Media", "audio", false),
                    makeClass("0x0100000A", "Heap", "Kernel", "Memory")});
}

const char* const SmallLevel = R"(<?xml version="1.0"?>
<level name="small">
  <Id value="0x01000002" name="Camera"/>
  <Id value="0x01000001" name="Player"/>
  <Other value="0x01000001" name="Skipped"/>
  <Id value="0x01000003" name="Mixer"/>
  <Id value="0x0100000a" name="FromFile"/>
  <Id value="0x01000099" name="Missing"/>
  <Id value="0x01000098" name="AlsoMissing"/>
</level>
)";

// The small level against the small device: families sorted, the rest in file order.
const QStringList SmallLevelTree = {
    "||||",
    " ||||",
    "  ||Missing|0x01000099|Not Found",
    "  ||AlsoMissing|0x01000098|Not Found",
    "Kernel||||",
    " |Memory|||",
    "  ||FromFile|0x0100000A|Found",
    "media||||",
    " |Video|||",
    "  ||Camera|0x01000002|Found",
    " |Audio|||",
    "  ||Player|0x01000001|Found",
    " |audio|||",
    "  ||Mixer|0x01000003|Not Found",
};

} // namespace

// The level page: its choice of level files, the check of a definition against the device's
// classes, its failures and its export.
class TestLevelViewWidget : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase()
    {
        QVERIFY(m_folder.isValid());
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_folder.path()));
        QVERIFY(Portlex::Initialize());
        m_smallLevel = writeFile("small.xml", SmallLevel);
        QVERIFY(!writeFile("broken.xml", "<level><Id value=\"0x01000001\"").isEmpty());
    }

    void cleanupTestCase()
    {
        Portlex::Destroy();
    }

    void startsCompleteWithThePrompt()
    {
        LevelViewWidget page;
        QCOMPARE(page.status(), QString("Ready"));
        QCOMPARE(page.state(), GatewayComponentWidget::Complete);
        QVERIFY(page.isComplete());
        QVERIFY(page.canSearch());
        QCOMPARE(page.componentName(), QString("LevelView"));
        QCOMPARE(page._levelDocuments->count(), 1);
        QCOMPARE(page._levelDocuments->itemText(0), QString("Select a level to begin"));
        QVERIFY(!page._levelDocuments->itemData(0).isValid());

        page.setDeviceRecord(nullptr);
        QCOMPARE(page._levelDocuments->count(), 1);
    }

    void offersTheLevelFiles()
    {
        QStringList files;
        listLevelFiles(files);
        QVERIFY(files.size() >= 2); // the shipped levels beside the program

        DeviceCache cache = smallDevice();
        LevelViewWidget page;
        QSignalSpy states(&page, &GatewayComponentWidget::stateChanged);
        page.setDeviceRecord(&cache);
        QCOMPARE(page._levelDocuments->count(), files.size() + 1);
        for (int i = 0; i < files.size(); ++i) {
            const QFileInfo info(files.at(i));
            QCOMPARE(page._levelDocuments->itemText(i + 1), info.baseName());
            QCOMPARE(page._levelDocuments->itemData(i + 1).toString(), info.absoluteFilePath());
        }
        // Offering is not choosing.
        QCOMPARE(page._levelDocuments->currentIndex(), 0);
        QCOMPARE(states.count(), 0);
    }

    void checksALevelAgainstTheClasses()
    {
        DeviceCache cache = smallDevice();
        LevelViewWidget page;
        page.setDeviceRecord(&cache);
        QSignalSpy states(&page, &GatewayComponentWidget::stateChanged);
        QSignalSpy statuses(&page, &GatewayComponentWidget::statusChanged);
        choose(page, m_smallLevel);

        QCOMPARE(treeLines(page._level1Tree), SmallLevelTree);
        QCOMPARE(statuses.count(), 2);
        QCOMPARE(statuses.at(0).at(0).toString(), QString("Processing"));
        QCOMPARE(statuses.at(1).at(0).toString(), QString("Ready"));
        QCOMPARE(states.count(), 2);
        QCOMPARE(page.state(), GatewayComponentWidget::Complete);

        QTreeWidget* tree = page._level1Tree;
        QTreeWidgetItemIterator it(tree);
        int classes = 0;
        for (; *it; ++it) {
            QTreeWidgetItem* item = *it;
            if (item->childCount() > 0) {
                QVERIFY2(item->isExpanded(), qPrintable(item->text(0) + item->text(1)));
                continue;
            }
            ++classes;
            const bool found = item->text(4) == "Found";
            QVERIFY(found || item->text(4) == "Not Found");
            QCOMPARE(item->foreground(4).color(), QColor(found ? Qt::green : Qt::red));
        }
        QCOMPARE(classes, 6);
    }

    void promptAfterALevelKeepsTheTree()
    {
        DeviceCache cache = smallDevice();
        LevelViewWidget page;
        page.setDeviceRecord(&cache);
        choose(page, m_smallLevel);
        page._levelDocuments->setCurrentIndex(0);
        QCOMPARE(page.status(), QString("Processing"));
        QCOMPARE(page.state(), GatewayComponentWidget::Processing);
        QVERIFY(!page.canSearch());
        QVERIFY(!page.isComplete());
        QCOMPARE(treeLines(page._level1Tree), SmallLevelTree);
    }

    void unreadableLevelKeepsTheTree_data()
    {
        QTest::addColumn<QString>("path");
        QTest::newRow("missing file") << "missing.xml";
        QTest::newRow("malformed file") << "broken.xml";
        QTest::newRow("a folder") << ".";
    }

    void unreadableLevelKeepsTheTree()
    {
        QFETCH(QString, path);
        DeviceCache cache = smallDevice();
        LevelViewWidget page;
        page.setDeviceRecord(&cache);
        choose(page, m_smallLevel);
        choose(page, QDir(m_folder.path()).filePath(path));
        QCOMPARE(page.status(), QString("Level file not found"));
        QCOMPARE(page.state(), GatewayComponentWidget::Failed);
        QVERIFY(!page.isComplete());
        QCOMPARE(treeLines(page._level1Tree), SmallLevelTree);
    }

    void choiceBeforeTheRecordStaysProcessing()
    {
        LevelViewWidget page;
        choose(page, m_smallLevel);
        QCOMPARE(page.status(), QString("Processing"));
        QCOMPARE(page.state(), GatewayComponentWidget::Processing);
        QCOMPARE(page._level1Tree->topLevelItemCount(), 0);
    }

    void searchesTheTree()
    {
        DeviceCache cache = smallDevice();
        LevelViewWidget page;
        page.setDeviceRecord(&cache);
        choose(page, m_smallLevel);
        page._level1Tree->collapseAll();

        QVERIFY(page.search("not found"));
        QStringList hits;
        for (const QTreeWidgetItem* item : page._level1Tree->selectedItems())
            hits.append(item->text(2));
        hits.sort();
        QCOMPARE(hits, QStringList({"AlsoMissing", "Missing", "Mixer"}));
        QVERIFY(!page.search("no"));
        QVERIFY(page._level1Tree->selectedItems().isEmpty());
    }

    void reportIsFrozenAtItsFirstCall()
    {
        DeviceCache cache = smallDevice();
        LevelViewWidget page;
        page.setDeviceRecord(&cache);
        const QString empty = "<!DOCTYPE levelreport>\n<device/>\n";
        QCOMPARE(page.xmlReport(), empty);
        choose(page, m_smallLevel);
        QCOMPARE(page.xmlReport(), empty);
    }

    void reportOfALevel()
    {
        DeviceCache cache = smallDevice();
        LevelViewWidget page;
        page.setDeviceRecord(&cache);
        choose(page, m_smallLevel);
        const QString expected = "<!DOCTYPE levelreport>\n"
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
                                 "</device>\n";
        QCOMPARE(page.xmlReport(), expected);
    }

    void simulatorSampleAgainstLevelTwo()
    {
        SimulatorProcess simulator(m_folder.path());
        const QSharedPointer<_ZantDevice> device = connectSample(simulator, "simulator", "aurora");
        QVERIFY(device);

        LevelViewWidget page;
        page.setDeviceRecord(&device->cache);
        const int index = page._levelDocuments->findText("Level-2");
        QVERIFY(index > 0);
        page._levelDocuments->setCurrentIndex(index);
        QCOMPARE(page.status(), QString("Ready"));

        int found = 0;
        int missing = 0;
        for (QTreeWidgetItemIterator it(page._level1Tree, QTreeWidgetItemIterator::NoChildren); *it; ++it) {
            const bool available = device->cache.classes.value((*it)->text(3)).available;
            QCOMPARE((*it)->text(4), QString(available ? "Found" : "Not Found"));
            (available ? found : missing)++;
        }
        // The sample lacks some level-2 classes.
        QVERIFY(found > 0);
        QVERIFY(missing > 0);
        QVERIFY(matchesExpected("levelreport-simulator-Level-2.0.xml", page.xmlReport()));
    }

private:
    QString writeFile(const QString& name, const QByteArray& text)
    {
        QFile file(QDir(m_folder.path()).filePath(name));
        if (!file.open(QIODevice::WriteOnly))
            return QString();
        file.write(text);
        return file.fileName();
    }

    // Adds path as a choice and chooses it, as the user does from the combo box.
    static void choose(LevelViewWidget& page, const QString& path)
    {
        page._levelDocuments->addItem(QFileInfo(path).baseName(), path);
        page._levelDocuments->setCurrentIndex(page._levelDocuments->count() - 1);
    }

    QTemporaryDir m_folder;
    QString m_smallLevel;
};

QTEST_MAIN(TestLevelViewWidget)
#include "tst_levelviewwidget.moc"
