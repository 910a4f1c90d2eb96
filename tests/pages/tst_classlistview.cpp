#include "CITableWidgetItem.h"
#include "ClassListView.h"
#include "DeviceWindow.h"
#include "IdFormat.h"
#include "TablePageFixtures.h"
#include "TreePageFixtures.h"

#include <QLabel>
#include <QLineEdit>
#include <QSignalSpy>
#include <QTemporaryDir>
#include <QTest>

#include <algorithm>
#include <memory>

using namespace TablePageFixtures;
using namespace TreePageFixtures;

namespace {

enum Column
{
    NameColumn,
    IdColumn,
    FamilyColumn,
    SubFamilyColumn,
    AvailableColumn,
    PathColumn
};

QStringList columnTexts(const QTableWidget* table, int column)
{
    QStringList texts;
    for (int row = 0; row < table->rowCount(); ++row)
        texts.append(table->item(row, column)->text());
    return texts;
}

QStringList rowTexts(const QTableWidget* table, int row)
{
    QStringList texts;
    for (int column = 0; column < table->columnCount(); ++column)
        texts.append(table->item(row, column)->text());
    return texts;
}

QStringList texts(const QList<QList<QVariant>>& signalArguments)
{
    QStringList list;
    for (const QList<QVariant>& arguments : signalArguments)
        list.append(arguments.at(0).toString());
    return list;
}

IdRecord sourced(IdRecord record, const QString& source)
{
    record.source = source;
    return record;
}

// count classes with ids from 0x7E000001, named so that sorting by name reverses them.
DeviceCache numberedClasses(int count)
{
    QList<IdRecord> classes;
    for (int k = 0; k < count; ++k)
        classes.append(makeClass(formatId(0x7E000001 + quint32(k)), QStringLiteral("Class %1").arg(count - k, 4, 10, QLatin1Char('0')),
                                 "Family", "Sub"));
    return cacheOf(classes);
}

} // namespace

// The class id list page and its table item, on records built here and on the classes a
// real simulator reports.
class TestClassListView : public QObject
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

    void itemOrdersByTypeThenTextWithoutCase_data()
    {
        QTest::addColumn<QString>("left");
        QTest::addColumn<QString>("right");
        QTest::addColumn<int>("leftType");
        QTest::addColumn<int>("rightType");
        QTest::addColumn<bool>("less");
        const int plain = QTableWidgetItem::Type;
        QTest::newRow("a before B") << "alpha" << "Beta" << plain << plain << true;
        QTest::newRow("B after a") << "Beta" << "alpha" << plain << plain << false;
        QTest::newRow("same but case") << "ABC" << "abc" << plain << plain << false;
        QTest::newRow("same but case, turned") << "abc" << "ABC" << plain << plain << false;
        QTest::newRow("0X0101 before 0x0102") << "0X0101" << "0x0102" << plain << plain << true;
        QTest::newRow("0x10 before 0x9: text, not numbers") << "0x10" << "0x9" << plain << plain << true;
        QTest::newRow("10.0 before 9.0") << "10.0" << "9.0" << plain << plain << true;
        QTest::newRow("empty first") << "" << "a" << plain << plain << true;
        QTest::newRow("type decides first") << "zzz" << "aaa" << plain << plain + 1 << true;
        QTest::newRow("type decides first, turned") << "aaa" << "zzz" << plain + 1 << plain << false;
        QTest::newRow("umlaut without case") << "Ärger" << "ärmel" << plain << plain << true;
    }

    void itemOrdersByTypeThenTextWithoutCase()
    {
        QFETCH(QString, left);
        QFETCH(QString, right);
        QFETCH(int, leftType);
        QFETCH(int, rightType);
        QFETCH(bool, less);
        const CITableWidgetItem a(left, leftType);
        const CITableWidgetItem b(right, rightType);
        QCOMPARE(a < b, less);
        // A plain item on the other side is compared by its text all the same.
        if (leftType == rightType) {
            const QTableWidgetItem plainRight(right, rightType);
            QCOMPARE(a < plainRight, less);
        }
    }

    void itemOrderFollowsItsText()
    {
        const QStringList words = {"Zebra", "éclair", "Eclair", "apple", "Äpfel", "ÉCLAIR", "zulu", "Apple", "0x0A", "0x09", "ß"};
        std::vector<std::unique_ptr<CITableWidgetItem>> items;
        for (const QString& word : words)
            items.push_back(std::make_unique<CITableWidgetItem>(word));
        std::vector<CITableWidgetItem*> sorted;
        for (const auto& item : items)
            sorted.push_back(item.get());
        std::stable_sort(sorted.begin(), sorted.end(), [](const CITableWidgetItem* a, const CITableWidgetItem* b) { return *a < *b; });
        QStringList byItems;
        for (const CITableWidgetItem* item : sorted)
            byItems.append(item->text());
        QStringList byText = words;
        std::stable_sort(byText.begin(), byText.end(),
                         [](const QString& a, const QString& b) { return QString::compare(a, b, Qt::CaseInsensitive) < 0; });
        QCOMPARE(byItems, byText);

        // A changed text sorts by its new value.
        CITableWidgetItem early("aaa");
        const CITableWidgetItem middle("mmm");
        QVERIFY(early < middle);
        early.setText("ZZZ");
        QVERIFY(middle < early);
        QVERIFY(!(early < middle));
        early.setData(Qt::EditRole, "Aab");
        QVERIFY(early < middle);
    }

    void startsWaitingForItsRecord()
    {
        ClassListView page;
        QCOMPARE(page.status(), QString("Starting"));
        QCOMPARE(page.state(), GatewayComponentWidget::Starting);
        QCOMPARE(page.componentName(), QString("ClassList"));
        QCOMPARE(page.pacer().lastArmed(), 500);
        QCOMPARE(page._classIDTable->rowCount(), 0);
        QStringList headers;
        for (int column = 0; column < page._classIDTable->columnCount(); ++column)
            headers.append(page._classIDTable->horizontalHeaderItem(column)->text());
        QCOMPARE(headers, QStringList({"Class Name", "Class ID", "Family", "Sub-family", "Available", "Path"}));
        QCOMPARE(page._classIDTable->selectionMode(), QAbstractItemView::NoSelection);

        // No record, no worker; the page is fed by its record, never started by id.
        page.setDeviceRecord(nullptr);
        page.startComponent("anything");
        QSignalSpy armed(&page.pacer(), &TickPacer::armed);
        QVERIFY(armed.wait(1000));
        QCOMPARE(page.status(), QString("Starting"));
        QVERIFY(!page.canSearch());
        QVERIFY(!page.isComplete());
    }

    void reportsProgressEveryHundredRows()
    {
        DeviceCache cache = numberedClasses(250);
        // Each page counts its own rows: a second page says the same as the first.
        for (int page = 0; page < 2; ++page) {
            ClassListView view;
            QSignalSpy statuses(&view, &GatewayComponentWidget::statusChanged);
            view.setDeviceRecord(&cache);
            QVERIFY(waitReady(view));
            QCOMPARE(texts(statuses),
                     QStringList({"Processing Class IDs", "Processed 100 classes", "Processed 200 classes", "Ready"}));
            QCOMPARE(view._classIDTable->rowCount(), 250);
            QCOMPARE(view._classIDTable->item(0, NameColumn)->text(), QString("Class 0001"));
            QCOMPARE(view._classIDTable->item(0, IdColumn)->text(), QString("0x7E0000FA"));
            QCOMPARE(view._classIDTable->item(249, NameColumn)->text(), QString("Class 0250"));
            QVERIFY(view._classIDTable->updatesEnabled());
            QVERIFY(!view._classIDTable->signalsBlocked());
            QCOMPARE(view.state(), GatewayComponentWidget::Complete);
            QVERIFY(view.canSearch());
            QVERIFY(!view.pacer().isArmed());
        }
    }

    void rowsShowTheSimulatorsClasses()
    {
        SimulatorProcess simulator(m_sockets.path());
        const QSharedPointer<_ZantDevice> device = connectImage(simulator, SimulatorProcess::sampleImage("simulator"), "rows");
        QVERIFY(device);
        ClassListView page;
        page.setDeviceRecord(&device->cache);
        QVERIFY(waitReady(page));
        const QTableWidget* table = page._classIDTable;
        QCOMPARE(table->rowCount(), device->cache.classes.size());

        QCOMPARE(table->rowHeight(0), 20);

        // A known class that nothing installed exports: not available, no source. (The
        // other columns are in the export below.)
        int unavailable = 0;
        for (const IdRecord& record : std::as_const(device->cache.classes)) {
            if (record.available)
                continue;
            ++unavailable;
            const int row = columnTexts(table, IdColumn).indexOf(record.id);
            QCOMPARE(table->item(row, AvailableColumn)->text(), QString("No"));
            QCOMPARE(table->item(row, PathColumn)->text(), QString());
        }
        QVERIFY(unavailable > 0);
    }

    void emptyNamesShowUnknown()
    {
        DeviceCache cache = cacheOf({sourced(makeClass("0x00000001", "", "", "", false), ""),
                                     sourced(makeClass("0x00000002", "Named", "", "Sub"), "/usermod/a/a.mif")});
        ClassListView page;
        page.setDeviceRecord(&cache);
        QVERIFY(waitReady(page));
        QCOMPARE(rowTexts(page._classIDTable, 0), QStringList({"Named", "0x00000002", "unknown", "Sub", "Yes", "/usermod/a/a.mif"}));
        QCOMPARE(rowTexts(page._classIDTable, 1), QStringList({"unknown", "0x00000001", "unknown", "unknown", "No", ""}));
    }

    void sortsNamesAndIdsAsText()
    {
        DeviceCache cache = cacheOf({makeClass("0x9", "beta", "F", "S"), makeClass("0x10", "Alpha", "F", "S"),
                                     makeClass("0X0101", "Gamma", "F", "S"), makeClass("0x0102", "alpha2", "F", "S"),
                                     makeClass("0x0A", "delta", "F", "S")});
        ClassListView page;
        page.setDeviceRecord(&cache);
        QVERIFY(waitReady(page));
        QTableWidget* table = page._classIDTable;
        QCOMPARE(columnTexts(table, NameColumn), QStringList({"Alpha", "alpha2", "beta", "delta", "Gamma"}));
        table->sortByColumn(IdColumn, Qt::AscendingOrder);
        QCOMPARE(columnTexts(table, IdColumn), QStringList({"0X0101", "0x0102", "0x0A", "0x10", "0x9"}));
    }

    void emptyDeviceCompletes()
    {
        QTemporaryDir image;
        QVERIFY(writeImage(image.path(), QByteArray()));
        SimulatorProcess simulator(m_sockets.path());
        const QSharedPointer<_ZantDevice> device = connectImage(simulator, image.path(), "empty");
        QVERIFY(device);
        QVERIFY(device->cache.classes.isEmpty());

        ClassListView page;
        QSignalSpy statuses(&page, &GatewayComponentWidget::statusChanged);
        page.setDeviceRecord(&device->cache);
        QVERIFY(waitReady(page));
        QCOMPARE(texts(statuses), QStringList({"Processing Class IDs", "Ready"}));
        QCOMPARE(page.state(), GatewayComponentWidget::Complete);
        QCOMPARE(page._classIDTable->rowCount(), 0);
        QVERIFY(page.isComplete());
    }

    void clicksEmitTheCellText()
    {
        DeviceCache cache = cacheOf({makeClass("0x00000001", "First", "F", "S"), makeClass("0x00000002", "Second", "F", "S")});
        ClassListView page;
        page.resize(800, 400);
        page.show();
        page.setDeviceRecord(&cache);
        QVERIFY(waitReady(page));
        QVERIFY(QTest::qWaitForWindowExposed(&page));
        QTableWidget* table = page._classIDTable;
        QSignalSpy singles(&page, &ClassListView::singleClick);
        QSignalSpy doubles(&page, &ClassListView::doubleClick);

        QTest::mouseClick(table->viewport(), Qt::LeftButton, {}, table->visualItemRect(table->item(1, IdColumn)).center());
        QCOMPARE(texts(singles), QStringList("0x00000002"));
        QCOMPARE(doubles.count(), 0);

        // A double-click: the first click, then the second that makes it double.
        const QPoint first = table->visualItemRect(table->item(0, NameColumn)).center();
        QTest::mouseClick(table->viewport(), Qt::LeftButton, {}, first);
        QTest::mouseDClick(table->viewport(), Qt::LeftButton, {}, first);
        QCOMPARE(texts(doubles), QStringList("First"));
        QCOMPARE(texts(singles).at(1), QString("First"));

        page.onTableClick(nullptr);
        page.onTableDoubleClick(nullptr);
        QCOMPARE(doubles.count(), 1);
    }

    void exportOfTheSimulator()
    {
        SimulatorProcess simulator(m_sockets.path());
        const QSharedPointer<_ZantDevice> device = connectImage(simulator, SimulatorProcess::sampleImage("simulator"), "export");
        QVERIFY(device);
        ClassListView page;
        page.setDeviceRecord(&device->cache);
        QVERIFY(waitReady(page));
        QVERIFY(matchesExpected("zant-class-ids-simulator.xml", page.xmlReport()));
    }

    void exportFollowsTheSortAndIsFrozen()
    {
        DeviceCache cache = cacheOf({sourced(makeClass("0x00000002", "Beta", "F", ""), "/usermod/b/b.mif"),
                                     sourced(makeClass("0x00000001", "alpha <1>", "F & G", "S"), "zkernel"),
                                     makeClass("0x00000003", "", "", "", false)});
        cache.deviceData.zantVersion = "3.2.9";
        cache.deviceData.hardware.insert("Model", "\"Slim\"");
        ClassListView page;
        page.setDeviceRecord(&cache);
        QVERIFY(waitReady(page));
        page._classIDTable->sortByColumn(IdColumn, Qt::DescendingOrder);
        const QString report = page.xmlReport();
        QCOMPARE(report, QString("<!DOCTYPE zant-class-ids>\n"
                                 "<ZTOINFO>\n"
                                 " <ZTOVERSION version=\"3.2.9\" target=\"0x0A110021\" manufacturer=\"Zantro &amp; Sons\" "
                                 "model=\"&quot;Slim&quot;\"/>\n"
                                 " <ZantHeaderDataList>\n"
                                 "  <ZTOId path=\"\" subfamily=\"unknown\" family=\"unknown\" value=\"0x00000003\" name=\"unknown\"/>\n"
                                 "  <ZTOId path=\"/usermod/b/b.mif\" subfamily=\"unknown\" family=\"F\" value=\"0x00000002\" name=\"Beta\"/>\n"
                                 "  <ZTOId path=\"zkernel\" subfamily=\"S\" family=\"F &amp; G\" value=\"0x00000001\" "
                                 "name=\"alpha &lt;1&gt;\"/>\n"
                                 " </ZantHeaderDataList>\n"
                                 "</ZTOINFO>\n"));
        page._classIDTable->sortByColumn(NameColumn, Qt::AscendingOrder);
        QCOMPARE(page.xmlReport(), report);
    }

    void exportWithoutRecord()
    {
        ClassListView page;
        const QString expected("<!DOCTYPE zant-class-ids>\n"
                               "<ZTOINFO>\n"
                               " <ZTOVERSION version=\"\" target=\"\" manufacturer=\"\" model=\"\"/>\n"
                               " <ZantHeaderDataList/>\n"
                               "</ZTOINFO>\n");
        QCOMPARE(page.xmlReport(), expected);
        // Frozen from the first call, even when a record comes later.
        DeviceCache cache = numberedClasses(3);
        page.setDeviceRecord(&cache);
        QVERIFY(waitReady(page));
        QCOMPARE(page.xmlReport(), expected);
    }

    void workerOutlivesItsRecord()
    {
        auto cache = std::make_unique<DeviceCache>(numberedClasses(400));
        ClassListView page;
        page.setDeviceRecord(cache.get());
        QVERIFY(QTest::qWaitFor([&] { return page._classIDTable->rowCount() > 0; }, ReadyTimeoutMs));
        // The device, and with it the record, may go while the worker is still walking it.
        cache.reset();
        QVERIFY(waitReady(page));
        QCOMPARE(page._classIDTable->rowCount(), 400);
    }

    void destroyedWhileFilling()
    {
        DeviceCache cache = numberedClasses(5000);
        auto page = std::make_unique<ClassListView>();
        page->setDeviceRecord(&cache);
        QVERIFY(QTest::qWaitFor([&] { return page->_classIDTable->rowCount() > 0; }, ReadyTimeoutMs));
        QVERIFY(!page->isComplete());
        page.reset();
        // The released worker is deleted from the event loop once it has returned.
        QTest::qWait(50);
    }

    void windowFeedsThePage()
    {
        SimulatorProcess simulator(m_sockets.path());
        QVERIFY(connectImage(simulator, SimulatorProcess::sampleImage("handset"), "window"));
        DeviceWindow window;
        window.setAttribute(Qt::WA_DeleteOnClose, false);
        window.setDevice("window");
        QCOMPARE(window.pageAt(2), static_cast<GatewayComponentWidget*>(window._classListView));
        // Fed by the window whether shown or not.
        QVERIFY(waitReady(*window._classListView));
        QVERIFY(window._classListView->_classIDTable->rowCount() > 0);

        window.action_Class_IDs->trigger();
        QCOMPARE(window._statusBar->findChild<QLabel*>("_status")->text(), QString("Ready"));
        QVERIFY(window.actionExport_to_XML->isEnabled());
        auto* box = window._toolbar->findChild<QLineEdit*>();
        QVERIFY(box->isEnabled());
        QTest::keyClicks(box, "Heap");
        QCOMPARE(window._classListView->searchText(), QString("Heap"));
    }

private:
    QTemporaryDir m_sockets;
};

QTEST_MAIN(TestClassListView)
#include "tst_classlistview.moc"
