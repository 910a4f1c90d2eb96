#include "CITreeWidgetItem.h"
#include "ISettingsTreeView.h"
#include "ISettingsTreeViewThread.h"
#include "PageFixtures.h"
#include "Portlex.h"
#include "SimulatorProcess.h"

#include <QTemporaryDir>

using namespace PageFixtures;

namespace {

// A node of the test store with one value, so that a node that was read shows it.
QByteArray node(const QByteArray& name, const QByteArray& children = QByteArray())
{
    return "<node name=\"" + name + "\"><value name=\"of\" text=\"" + name + "\"/>" + children + "</node>\n";
}

// prefix + first, ..., prefix + last, numbered in two digits.
QStringList numbered(const QString& prefix, int first, int last)
{
    QStringList names;
    for (int n = first; n <= last; ++n)
        names << prefix + QString::number(n).rightJustified(2, '0');
    return names;
}

QByteArray leaves(const QStringList& names)
{
    QByteArray nodes;
    for (const QString& name : names)
        nodes += node(name.toUtf8());
    return nodes;
}

const QByteArray Settings = "<settings><value name=\"root\" text=\"yes\"/>\n"
        + node("appinfo", "<value name=\"count\" text=\"34\"/><value name=\"Build\" text=\"b7\"/>" + node("a1") + node("a2") + node("a3"))
        + node("ztoversion", node("c")) + node("OATtest", node("t1") + node("t2"))
        + node("CSA_NORMAL", node("hidden1")) + node("csa_removal", node("hidden2"))
        + node("Zeta", leaves(numbered("z", 1, 11))) + node("alpha", node("a01", node("sub")) + leaves(numbered("a", 2, 10)))
        + "</settings>\n";

// The order the crawl reads the test store in: "appinfo" and "ztoversion" branches first,
// the other children of the root at 10 in plain string order, then the children of nodes
// with at most 10 children (11) before those of nodes with 11 (12), "oattest" last and
// the CSA branches never.
QStringList crawlOrder()
{
    return QStringList{"/", "/appinfo", "/appinfo/a1", "/appinfo/a2", "/appinfo/a3", "/ztoversion", "/ztoversion/c",
                       "/Zeta", "/alpha", "/alpha/a01", "/alpha/a01/sub"}
        + numbered("/alpha/a", 2, 10) + numbered("/Zeta/z", 1, 11)
        + QStringList{"/OATtest", "/OATtest/t1", "/OATtest/t2"};
}

int kindOf(const QTreeWidgetItem* item)
{
    return static_cast<const CITreeWidgetItem*>(item)->kind();
}

QString pathOf(const QTreeWidgetItem* item)
{
    QStringList names;
    for (; item; item = item->parent())
        names.prepend(item->text(0));
    return "/" + names.join('/');
}

QTreeWidgetItem* itemAt(const QTreeWidget* tree, const QString& path)
{
    for (QTreeWidgetItemIterator it(const_cast<QTreeWidget*>(tree)); *it; ++it) {
        if (kindOf(*it) != ISettingsTreeView::ValueKind && pathOf(*it) == path)
            return *it;
    }
    return nullptr;
}

// The nodes whose answer is in the tree (their values are hidden children), in order; a
// value that shows is listed as such.
QStringList readNodes(const QTreeWidget* tree)
{
    QStringList read;
    for (QTreeWidgetItemIterator it(const_cast<QTreeWidget*>(tree)); *it; ++it) {
        if (kindOf(*it) == ISettingsTreeView::ValueKind) {
            const QString parent = (*it)->parent() ? pathOf((*it)->parent()) : QString("/");
            if (!read.contains(parent))
                read << parent;
            if (!(*it)->isHidden())
                read << "shown value " + pathOf(*it);
        }
    }
    read.sort();
    return read;
}

} // namespace

// The settings tree page against real simulators: the crawl's priorities, order and end, and
// the name/value table.
class TestISettingsTreeView : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase()
    {
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        QVERIFY(Portlex::Initialize());
        QVERIFY(writeImage(m_image.path(), "settings", {}, Settings));
        QVERIFY(m_simulator.connectDevice(m_image.path(), "settings"));
    }

    void cleanupTestCase() { Portlex::Destroy(); }

    void childPriority_data()
    {
        QTest::addColumn<QString>("path");
        QTest::addColumn<bool>("childOfRoot");
        QTest::addColumn<int>("siblings");
        QTest::addColumn<int>("priority"); // -1: never read
        QTest::newRow("oattest in capitals") << "/x/OATTEST/y" << false << 3 << 20;
        QTest::newRow("oattest before appinfo") << "/appinfo/oatTest" << true << 3 << 20;
        QTest::newRow("appinfo") << "/AppInfo" << true << 3 << 1;
        QTest::newRow("below appinfo") << "/x/appinfo2/y" << false << 500 << 1;
        QTest::newRow("ztoversion") << "/ZTOversion/c" << false << 1 << 2;
        QTest::newRow("CSA_NORMAL") << "/CSA_NORMAL" << true << 3 << -1;
        QTest::newRow("csa_removal below") << "/x/csa_removal/y" << false << 3 << -1;
        QTest::newRow("child of the root") << "/x" << true << 500 << 10;
        QTest::newRow("zant marks nothing") << "/zant" << false << 3 << 11;
        QTest::newRow("10 siblings") << "/x/y" << false << 10 << 11;
        QTest::newRow("11 siblings") << "/x/y" << false << 11 << 12;
        QTest::newRow("50 siblings") << "/x/y" << false << 50 << 12;
        QTest::newRow("51 siblings") << "/x/y" << false << 51 << 13;
        QTest::newRow("100 siblings") << "/x/y" << false << 100 << 13;
        QTest::newRow("101 siblings") << "/x/y" << false << 101 << 14;
    }

    void childPriority()
    {
        QFETCH(QString, path);
        QFETCH(bool, childOfRoot);
        QFETCH(int, siblings);
        QFETCH(int, priority);
        const std::optional<quint16> found = ISettingsTreeViewThread::childPriority(path, childOfRoot, siblings);
        QCOMPARE(found ? int(*found) : -1, priority);
    }

    // The crawl reads the store in its order and ends at the first node the device refuses:
    // silently for 0xDEADBEEF (the page completes), with the code for any other (the page
    // fails). Either way the nodes read before stay in the tree.
    void crawlEndsAtAFailingNode_data()
    {
        QTest::addColumn<QString>("failing");
        QTest::addColumn<QString>("code");
        QTest::addColumn<QString>("status");
        QTest::newRow("none") << QString() << QString() << "Ready";
        QTest::newRow("0xDEADBEEF at the root") << "/" << "0xDEADBEEF" << "Ready";
        QTest::newRow("error among the 11s") << "/alpha/a02" << "5" << "Error: 5";
        QTest::newRow("error at oattest") << "/OATtest" << "0x10" << "Error: 16";
    }

    void crawlEndsAtAFailingNode()
    {
        QFETCH(QString, failing);
        QFETCH(QString, code);
        QFETCH(QString, status);
        SimulatorProcess simulator(m_sockets.path());
        const QStringList rule = failing.isEmpty() ? QStringList() : QStringList{"--fail", "GetChildSettings:" + failing + "=" + code};
        QVERIFY(simulator.connectDevice(m_image.path(), "crawl", rule));
        ISettingsTreeView page;
        page.startComponent("crawl");
        const bool fails = status != "Ready";
        QVERIFY(tickUntil(page, [&page] { return page.state() == GatewayComponentWidget::Complete || !page.pacer().isArmed(); }));
        QCOMPARE(page.status(), status);
        QCOMPARE(page.state(), fails ? GatewayComponentWidget::Failed : GatewayComponentWidget::Complete);
        QVERIFY(page._settingsTree->isSortingEnabled());

        QStringList expected = crawlOrder();
        if (!failing.isEmpty())
            expected = expected.mid(0, int(expected.indexOf(failing)));
        expected.sort();
        QCOMPARE(readNodes(page._settingsTree), expected);
        if (failing.isEmpty()) {
            // Shown as the children of a node that was read, never read themselves.
            QCOMPARE(itemAt(page._settingsTree, "/CSA_NORMAL")->childCount(), 0);
            QCOMPARE(itemAt(page._settingsTree, "/csa_removal")->childCount(), 0);
        }
    }

    // An id the gateway does not know starts nothing; showing the page again tries again.
    // Then choosing a node with values lists them by name, the names not selectable; a node
    // without values empties the table.
    void selectedNodeShowsItsValues()
    {
        ISettingsTreeView page;
        page.startComponent("missing");
        QCOMPARE(page.status(), QString("Device not found"));
        QCOMPARE(page.state(), GatewayComponentWidget::Starting);
        QVERIFY(!page.pacer().isArmed());
        page.startComponent("settings");
        QVERIFY(tickUntil(page, [&page] { return page.state() == GatewayComponentWidget::Complete; }));
        QTableWidget* table = page._nameValueTable;
        page._settingsTree->setCurrentItem(itemAt(page._settingsTree, "/appinfo"));
        QCOMPARE(columnTexts(table, 0), QStringList({"Build", "count", "of"}));
        QCOMPARE(columnTexts(table, 1), QStringList({"b7", "34", "appinfo"}));
        QCOMPARE(table->item(0, 0)->flags(), Qt::NoItemFlags);
        page._settingsTree->setCurrentItem(itemAt(page._settingsTree, "/CSA_NORMAL"));
        QCOMPARE(table->rowCount(), 0);
        page._settingsTree->setCurrentItem(itemAt(page._settingsTree, "/alpha/a01/sub"));
        QCOMPARE(columnTexts(table, 1), QStringList("sub"));
    }

private:
    QTemporaryDir m_sockets;
    QTemporaryDir m_image;
    SimulatorProcess m_simulator{m_sockets.path()};
};

QTEST_MAIN(TestISettingsTreeView)
#include "tst_isettingstreeview.moc"
