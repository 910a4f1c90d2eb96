#include "FamilyTreeView.h"
#include "PageFixtures.h"

#include <QSignalSpy>

using namespace PageFixtures;

namespace {

// classes, then enough unavailable ones to keep the worker, and so the fill, going.
DeviceCache busyDevice(QList<IdRecord> classes)
{
    for (int i = 0x100; i < 0x1500; ++i)
        classes.append(makeClass(QString("0x%1").arg(i, 8, 16, QChar('0')), "Off", "F", "S", false));
    return cacheOf(classes);
}

} // namespace

// The family tree page: grouping of the available classes, the order of the families while
// the tree fills, and the export.
class TestFamilyTreeView : public QObject
{
    Q_OBJECT

private slots:
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
        page.setDeviceRecord(&cache);
        // Left to its own timer.
        QTRY_VERIFY_WITH_TIMEOUT(page.isComplete(), 30000);
        QCOMPARE(treeLines(page._familyTree),
                 QStringList({"alpha|||", " |Memory||", "  ||Heap|0x00000008", "Media|||", " |Audio||", "  ||Player|0x00000001",
                              "  ||Tuner|0x00000004", " |Video||", "  ||Camera|0x00000002", " |audio||", "  ||Mixer|0x00000003",
                              "unknown|||", " |unknown||", "  ||unknown|0x00000005", "zeta|||", " |Time||", "  ||Clock|0x00000007"}));
        QCOMPARE(signalTexts(states), QStringList({"Processing", "Complete"}));
        QVERIFY(page._familyTree->isSortingEnabled());
    }

    void readyWithoutAvailableClasses()
    {
        for (DeviceCache cache : {cacheOf({}), cacheOf({makeClass("0x00000001", "A", "F", "S", false)})}) {
            FamilyTreeView page;
            page.setDeviceRecord(&cache);
            QVERIFY(fillByHand(page));
            QCOMPARE(page._familyTree->topLevelItemCount(), 0);
        }
    }

    // The fill puts each new family in its place: the tree is in order at every moment.
    void familiesStayInOrderWhileFilling()
    {
        DeviceCache cache = busyDevice({makeClass("0x00000001", "Z", "zeta", "S"), makeClass("0x00000002", "A", "Alpha", "S"),
                                        makeClass("0x00000003", "M", "media", "S"), makeClass("0x00000004", "B", "Beta", "S"),
                                        makeClass("0x00000005", "M2", "Media", "T")});
        FamilyTreeView page;
        page.setDeviceRecord(&cache);
        QStringList families;
        QVERIFY(tickUntil(page, [&] {
            families.clear();
            for (int i = 0; i < page._familyTree->topLevelItemCount(); ++i)
                families.append(page._familyTree->topLevelItem(i)->text(0));
            return families.size() == 4 && page._familyTree->topLevelItem(2)->childCount() == 2;
        }));
        QCOMPARE(families, QStringList({"Alpha", "Beta", "media", "zeta"}));
        QCOMPARE(page.state(), GatewayComponentWidget::Processing);
    }

    // The export follows the tree as the user sorted it, frozen at the first call; without
    // a record it keeps its shape.
    void exportFollowsTheTreeAndIsFrozen()
    {
        FamilyTreeView empty;
        QCOMPARE(empty.xmlReport(), QString("<!DOCTYPE familyTree>\n<deviceTree device=\"\" manufacturer=\"\"/>\n"));
        DeviceCache cache = cacheOf({makeClass("0x00000001", "beta", "Media", "Audio"),
                                     makeClass("0x00000002", "Alpha", "Media", "Audio"),
                                     makeClass("0x00000003", "Heap", "Kernel", "Memory")});
        FamilyTreeView page;
        page.setDeviceRecord(&cache);
        QVERIFY(fillByHand(page));
        page._familyTree->sortByColumn(2, Qt::DescendingOrder);
        const QString expected = "<!DOCTYPE familyTree>\n"
                                 "<deviceTree device=\"0x0A110021\" manufacturer=\"Zantro &amp; Sons\">\n"
                                 " <family name=\"Kernel\">\n  <subfamily name=\"Memory\">\n"
                                 "   <class name=\"Heap\" classid=\"0x00000003\"/>\n"
                                 "  </subfamily>\n </family>\n <family name=\"Media\">\n  <subfamily name=\"Audio\">\n"
                                 "   <class name=\"beta\" classid=\"0x00000001\"/>\n"
                                 "   <class name=\"Alpha\" classid=\"0x00000002\"/>\n"
                                 "  </subfamily>\n </family>\n</deviceTree>\n";
        QCOMPARE(page.xmlReport(), expected);
        page._familyTree->sortByColumn(2, Qt::AscendingOrder);
        delete page._familyTree->topLevelItem(0);
        QCOMPARE(page.xmlReport(), expected);
    }
};

QTEST_MAIN(TestFamilyTreeView)
#include "tst_familytreeview.moc"
