#include "ClassListView.h"
#include "IdFormat.h"
#include "PageFixtures.h"
#include "Portlex.h"
#include "SimulatorProcess.h"

#include <QSignalSpy>
#include <QTemporaryDir>

using namespace PageFixtures;

namespace {

enum Column { NameColumn, IdColumn, FamilyColumn, SubFamilyColumn, AvailableColumn, PathColumn };

DeviceCache numberedClasses(int count)
{
    QList<IdRecord> classes;
    for (int k = 0; k < count; ++k)
        classes.append(makeClass(formatId(0x7E000001 + quint32(k)), QString("Class %1").arg(k), "F", "S"));
    return cacheOf(classes);
}

} // namespace

// The class id list page on records built here, and its export of the classes a real
// simulator reports.
class TestClassListView : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase()
    {
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        QVERIFY(Portlex::Initialize());
    }

    void cleanupTestCase() { Portlex::Destroy(); }

    // Each page counts its own rows: a second page says the same as the first.
    void reportsProgressEveryHundredRows_data()
    {
        QTest::addColumn<int>("classes");
        QTest::addColumn<QStringList>("statuses");
        QTest::newRow("none") << 0 << QStringList{"Processing Class IDs", "Ready"};
        QTest::newRow("201") << 201 << QStringList{"Processing Class IDs", "Processed 100 classes", "Processed 200 classes", "Ready"};
    }

    void reportsProgressEveryHundredRows()
    {
        QFETCH(int, classes);
        QFETCH(QStringList, statuses);
        DeviceCache cache = numberedClasses(classes);
        for (int page = 0; page < 2; ++page) {
            ClassListView view;
            QSignalSpy spy(&view, &GatewayComponentWidget::statusChanged);
            view.setDeviceRecord(&cache);
            QVERIFY(fillByHand(view));
            QCOMPARE(signalTexts(spy), statuses);
            QCOMPARE(view._classIDTable->rowCount(), classes);
            QVERIFY(view._classIDTable->updatesEnabled() && !view._classIDTable->signalsBlocked());
            QCOMPARE(view.state(), GatewayComponentWidget::Complete);
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
        QTableWidget* table = page._classIDTable;
        QSignalSpy singles(&page, &ClassListView::singleClick);
        QSignalSpy doubles(&page, &ClassListView::doubleClick);
        QTest::mouseClick(table->viewport(), Qt::LeftButton, {}, table->visualItemRect(table->item(1, IdColumn)).center());
        const QPoint first = table->visualItemRect(table->item(0, NameColumn)).center();
        QTest::mouseClick(table->viewport(), Qt::LeftButton, {}, first);
        QTest::mouseDClick(table->viewport(), Qt::LeftButton, {}, first);
        QCOMPARE(signalTexts(singles), QStringList({"0x00000002", "First"}));
        QCOMPARE(signalTexts(doubles), QStringList("First"));
    }

    // The export of the sample device's classes: names from the name databases, sorted by
    // the table, escaped by the writer.
    void exportOfTheSimulator()
    {
        SimulatorProcess simulator(m_sockets.path());
        const QSharedPointer<_ZantDevice> device = simulator.connectDevice(SimulatorProcess::sampleImage("simulator"), "export");
        QVERIFY(device);
        ClassListView page;
        page.setDeviceRecord(&device->cache);
        // Left to its own timer.
        QTRY_VERIFY_WITH_TIMEOUT(page.isComplete(), 30000);
        QVERIFY(isExpectedExport(page.xmlReport(), "zant-class-ids-simulator.xml"));
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
        QCOMPARE(columnTexts(page._classIDTable, AvailableColumn), QStringList({"No", "Yes", "Yes"}));
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
        QVERIFY(tickUntil(page, [&] { return page._classIDTable->rowCount() > 0; }));
        cache.reset();
        QVERIFY(fillByHand(page));
        QCOMPARE(page._classIDTable->rowCount(), 400);
        QCOMPARE(page.xmlReport(), expected);
    }

    void destroyedWhileFillingEndsItsWorker()
    {
        // Far more than teardown waits for: only a worker that stops ends in time.
        DeviceCache cache = numberedClasses(20000);
        const int threads = TestSupport::threadCount();
        auto page = std::make_unique<ClassListView>();
        page->setDeviceRecord(&cache);
        QVERIFY(tickUntil(*page, [&] { return page->_classIDTable->rowCount() > 0; }));
        QVERIFY(TestSupport::threadCount() > threads);
        page.reset();
        QTRY_COMPARE(TestSupport::threadCount(), threads);
    }

private:
    QTemporaryDir m_sockets;
};

QTEST_MAIN(TestClassListView)
#include "tst_classlistview.moc"
