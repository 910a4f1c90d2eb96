#include "DeviceWindow.h"
#include "FamilyTreeView.h"
#include "LevelFiles.h"
#include "LevelViewWidget.h"
#include "TreePageFixtures.h"

#include <QHeaderView>
#include <QLabel>
#include <QPointer>
#include <QSignalSpy>
#include <QTemporaryDir>
#include <QTest>

using namespace TreePageFixtures;

// The family tree page: grouping, the worker's filtering, its pacing, search and export,
// on records built here and on the classes a real simulator reports.
class TestFamilyTreeView : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase()
    {
        QVERIFY(m_sockets.isValid());
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        QVERIFY(Portlex::Initialize());
    }

    void cleanupTestCase()
    {
        Portlex::Destroy();
    }

    void startsWaitingForItsRecord()
    {
        FamilyTreeView page;
        QCOMPARE(page.status(), QString("Starting"));
        QCOMPARE(page.state(), GatewayComponentWidget::Starting);
        QCOMPARE(page.componentName(), QString("FamilyTree"));
        QVERIFY(page._familyTree->isSortingEnabled());
        QCOMPARE(page._familyTree->sortColumn(), 0);
        QCOMPARE(page._familyTree->header()->sortIndicatorOrder(), Qt::AscendingOrder);
        // The first tick comes with the record, and a null record brings none.
        QVERIFY(!page.pacer().isArmed());
        page.setDeviceRecord(nullptr);
        QVERIFY(!page.pacer().isArmed());
        QVERIFY(!page.canSearch());
        QVERIFY(!page.isComplete());
        page.startComponent("anything");
        QCOMPARE(page.status(), QString("Starting"));
    }

    void groupsByFamilyAndSubFamily()
    {
        DeviceCache cache = cacheOf({
            makeClass("0x00000001", "Player", "Media", "Audio"),
            makeClass("0x00000002", "Camera", "media", "Video"),     // same family, other case
            makeClass("0x00000003", "Mixer", "MEDIA", "audio"),      // sub-families keep their case
            makeClass("0x00000004", "Tuner", "Media", "Audio"),
            makeClass("0x00000005", "", "", ""),                     // nothing known
            makeClass("0x00000006", "Hidden", "Media", "Audio", false),
            makeClass("0x00000007", "Clock", "zeta", "Time"),
            makeClass("0x00000008", "Heap", "alpha", "Memory"),
            makeClass("0x00000009", "Ghost", "Phantom", "Spooky", false),
        });
        FamilyTreeView page;
        QSignalSpy states(&page, &GatewayComponentWidget::stateChanged);
        page.setDeviceRecord(&cache);
        QCOMPARE(page.pacer().lastArmed(), FamilyTreeView::FirstTickMs);
        QVERIFY(waitReady(page));

        // Families sorted without regard to case, named as first met; the rest in the
        // order the classes came (ascending ids).
        const QStringList expected = {
            "alpha|||",
            " |Memory||",
            "  ||Heap|0x00000008",
            "Media|||",
            " |Audio||",
            "  ||Player|0x00000001",
            "  ||Tuner|0x00000004",
            " |Video||",
            "  ||Camera|0x00000002",
            " |audio||",
            "  ||Mixer|0x00000003",
            "unknown|||",
            " |unknown||",
            "  ||unknown|0x00000005",
            "zeta|||",
            " |Time||",
            "  ||Clock|0x00000007",
        };
        QCOMPARE(treeLines(page._familyTree), expected);
        QCOMPARE(page.state(), GatewayComponentWidget::Complete);
        QCOMPARE(states.count(), 2);
        QCOMPARE(states.at(0).at(0).value<GatewayComponentWidget::ComponentState>(), GatewayComponentWidget::Processing);
        QCOMPARE(states.at(1).at(0).value<GatewayComponentWidget::ComponentState>(), GatewayComponentWidget::Complete);
        QVERIFY(page.isComplete());
        QVERIFY(page.canSearch());
        QVERIFY(page._familyTree->isSortingEnabled());
        QVERIFY(!page.pacer().isArmed());
    }

    void reachesReadyWithoutAvailableClasses_data()
    {
        QTest::addColumn<QList<IdRecord>>("classes");
        QTest::newRow("no classes") << QList<IdRecord>();
        QTest::newRow("none available") << QList<IdRecord>{makeClass("0x00000001", "A", "F", "S", false),
                                                           makeClass("0x00000002", "B", "F", "S", false)};
    }

    void reachesReadyWithoutAvailableClasses()
    {
        QFETCH(QList<IdRecord>, classes);
        DeviceCache cache = cacheOf(classes);
        FamilyTreeView page;
        page.setDeviceRecord(&cache);
        QVERIFY(waitReady(page));
        QCOMPARE(page._familyTree->topLevelItemCount(), 0);
        QCOMPARE(page.state(), GatewayComponentWidget::Complete);
    }

    void tickBacksOffWhileTheWorkerIsBusy()
    {
        // A long run of unavailable classes keeps the worker busy with nothing to show.
        QList<IdRecord> classes{makeClass("0x00000001", "First", "F", "S")};
        for (int i = 2; i < 5000; ++i)
            classes.append(makeClass(QString("0x%1").arg(i, 8, 16, QChar('0')), "Off", "F", "S", false));
        DeviceCache cache = cacheOf(classes);
        FamilyTreeView page;
        page.setDeviceRecord(&cache);
        // A second record starts no second worker and re-arms nothing.
        page.setDeviceRecord(&cache);
        QCOMPARE(page.pacer().lastArmed(), FamilyTreeView::FirstTickMs);

        QVERIFY(QTest::qWaitFor([&] {
            page.onTimeElapse();
            return page._familyTree->topLevelItemCount() == 1;
        }));
        QCOMPARE(page.pacer().lastArmed(), FamilyTreeView::BusyMs);

        QList<int> waits;
        for (int i = 0; i < 6; ++i) {
            page.onTimeElapse();
            waits.append(page.pacer().lastArmed());
        }
        QCOMPARE(waits, QList<int>({101, 201, 301, 401, 500, 500}));
        QCOMPARE(page.status(), QString("Processing Class IDs"));
        // Destroyed with the worker still walking: the teardown stops it.
    }

    void familiesStayInOrderWhileFilling()
    {
        QList<IdRecord> classes{makeClass("0x00000001", "Z", "zeta", "S"), makeClass("0x00000002", "A", "Alpha", "S"),
                                makeClass("0x00000003", "M", "media", "S"), makeClass("0x00000004", "B", "Beta", "S"),
                                makeClass("0x00000005", "M2", "Media", "T")};
        // Trailing unavailable classes keep the worker, and so the fill, going.
        for (int i = 6; i < 5000; ++i)
            classes.append(makeClass(QString("0x%1").arg(i, 8, 16, QChar('0')), "Off", "F", "S", false));
        DeviceCache cache = cacheOf(classes);
        FamilyTreeView page;
        page.setDeviceRecord(&cache);
        QVERIFY(QTest::qWaitFor([&] {
            page.onTimeElapse();
            return page._familyTree->topLevelItemCount() == 4 && page._familyTree->topLevelItem(2)->childCount() == 2;
        }));
        QStringList families;
        for (int i = 0; i < page._familyTree->topLevelItemCount(); ++i)
            families.append(page._familyTree->topLevelItem(i)->text(0));
        QCOMPARE(families, QStringList({"Alpha", "Beta", "media", "zeta"}));
        QCOMPARE(page.state(), GatewayComponentWidget::Processing);
    }

    void searchesTheTree()
    {
        DeviceCache cache = cacheOf({makeClass("0x00000001", "Player", "Media", "Audio"),
                                     makeClass("0x00000002", "Camera", "Media", "Video"),
                                     makeClass("0x00000003", "Heap", "Kernel", "Memory")});
        FamilyTreeView page;
        page.setDeviceRecord(&cache);
        QVERIFY(waitReady(page));
        QTreeWidget* tree = page._familyTree;

        QVERIFY(page.search("cam"));
        QCOMPARE(page.searchText(), QString("cam"));
        const QList<QTreeWidgetItem*> selected = tree->selectedItems();
        QCOMPARE(selected.size(), 1);
        QCOMPARE(selected.first()->text(3), QString("0x00000002"));
        QVERIFY(selected.first()->parent()->isExpanded());
        QVERIFY(selected.first()->parent()->parent()->isExpanded());
        QVERIFY(!tree->topLevelItem(0)->isExpanded()); // "Kernel" holds no hit

        QVERIFY(!page.search("ca"));
        QCOMPARE(page.searchText(), QString());
        QVERIFY(tree->selectedItems().isEmpty());
        QVERIFY(!tree->topLevelItem(1)->isExpanded());

        QSignalSpy passing(&page, &GatewayComponentWidget::timedStatusChanged);
        QVERIFY(page.search("xyz"));
        QCOMPARE(passing.count(), 1);
        QCOMPARE(passing.first().first().toString(), QString("\"xyz\" not found."));
    }

    void reportWithoutRecord()
    {
        FamilyTreeView page;
        QCOMPARE(page.xmlReport(), QString("<!DOCTYPE familyTree>\n<deviceTree device=\"\" manufacturer=\"\"/>\n"));
    }

    void reportFollowsTheTreeAndIsFrozen()
    {
        DeviceCache cache = cacheOf({makeClass("0x00000001", "beta", "Media", "Audio"),
                                     makeClass("0x00000002", "Alpha", "Media", "Audio"),
                                     makeClass("0x00000003", "Heap", "Kernel", "Memory")});
        FamilyTreeView page;
        page.setDeviceRecord(&cache);
        QVERIFY(waitReady(page));
        // The user sorts by class name, descending, before exporting.
        page._familyTree->sortByColumn(2, Qt::DescendingOrder);

        const QString expected = "<!DOCTYPE familyTree>\n"
                                 "<deviceTree device=\"0x0A110021\" manufacturer=\"Zantro &amp; Sons\">\n"
                                 " <family name=\"Kernel\">\n"
                                 "  <subfamily name=\"Memory\">\n"
                                 "   <class name=\"Heap\" classid=\"0x00000003\"/>\n"
                                 "  </subfamily>\n"
                                 " </family>\n"
                                 " <family name=\"Media\">\n"
                                 "  <subfamily name=\"Audio\">\n"
                                 "   <class name=\"beta\" classid=\"0x00000001\"/>\n"
                                 "   <class name=\"Alpha\" classid=\"0x00000002\"/>\n"
                                 "  </subfamily>\n"
                                 " </family>\n"
                                 "</deviceTree>\n";
        QCOMPARE(page.xmlReport(), expected);

        page._familyTree->sortByColumn(2, Qt::AscendingOrder);
        delete page._familyTree->topLevelItem(0);
        QCOMPARE(page.xmlReport(), expected);
    }

    void simulatorSampleExport()
    {
        SimulatorProcess simulator(m_sockets.path());
        const QSharedPointer<_ZantDevice> device = connectSample(simulator, "simulator", "aurora");
        QVERIFY(device);

        FamilyTreeView page;
        page.setDeviceRecord(&device->cache);
        QVERIFY(waitReady(page));

        int available = 0;
        for (const IdRecord& record : std::as_const(device->cache.classes))
            available += record.available ? 1 : 0;
        int shown = 0;
        for (const QString& line : treeLines(page._familyTree))
            shown += line.startsWith("  ") ? 1 : 0;
        QCOMPARE(shown, available);
        QVERIFY(available < device->cache.classes.size()); // the sample has unavailable classes

        QVERIFY(matchesExpected("familyTree-simulator.xml", page.xmlReport()));
    }

    void windowFeedsBothTreePages()
    {
        SimulatorProcess simulator(m_sockets.path());
        QVERIFY(connectSample(simulator, "handset", "kestrel"));

        QPointer<DeviceWindow> window = new DeviceWindow;
        window->setDevice("kestrel");
        auto* family = qobject_cast<FamilyTreeView*>(window->pageAt(6));
        auto* level = qobject_cast<LevelViewWidget*>(window->pageAt(9));
        QVERIFY(family);
        QVERIFY(level);
        QCOMPARE(family->objectName(), QString("_familyTreeView"));
        QCOMPARE(level->objectName(), QString("_levelViewWidget"));

        QStringList files;
        listLevelFiles(files);
        QVERIFY(!files.isEmpty());
        QCOMPARE(level->_levelDocuments->count(), files.size() + 1);

        // Fed while hidden: the family tree fills without being shown.
        QVERIFY(waitReady(*family));
        QVERIFY(family->_familyTree->topLevelItemCount() > 0);

        window->onToolbarActionTriggered(window->action_Family_Tree);
        auto* status = window->findChild<QLabel*>("_status");
        QVERIFY(status);
        QCOMPARE(status->text(), QString("Ready"));
        QVERIFY(window->actionExport_to_XML->isEnabled());
        window->onSearch("Player");
        QVERIFY(!family->_familyTree->selectedItems().isEmpty());

        window->onToolbarActionTriggered(window->_actionLevelView);
        level->_levelDocuments->setCurrentIndex(1);
        QCOMPARE(status->text(), QString("Ready"));
        QVERIFY(level->_level1Tree->topLevelItemCount() > 0);
        window->close();
        QTRY_VERIFY(window.isNull());
    }

private:
    QTemporaryDir m_sockets;
};

QTEST_MAIN(TestFamilyTreeView)
#include "tst_familytreeview.moc"
