#include "FreeFormProgressDialog.h"
#include "NameLibrary.h"
#include "PlatformClassIDDialog.h"
#include "PlatformComparisonDialog.h"
#include "PlatformComparisonView.h"
#include "PlatformTools.h"
#include "Portlex.h"
#include "SaveXmlReport.h"
#include "SimulatorProcess.h"
#include "TestSupport.h"

#include <QApplication>
#include <QRegularExpression>
#include <QSettings>
#include <QTemporaryDir>
#include <QtTest>

namespace {

// A scan file of "value=name" entries (family "F", sub-family "S").
QByteArray scanFile(const QString& version, const QString& container, const QStringList& ids)
{
    QString xml = QStringLiteral("<!DOCTYPE platform-scan>\n<ZTOINFO><ZTOVERSION version=\"%1\"/><%2>")
                      .arg(version, container);
    for (const QString& id : ids)
        xml += QStringLiteral("<ZTOId name=\"%2\" value=\"%1\" family=\"F\" subfamily=\"S\"/>")
                   .arg(id.section('=', 0, 0), id.section('=', 1));
    return (xml + QStringLiteral("</%1></ZTOINFO>").arg(container)).toUtf8();
}

// The rows shown, cells joined by "|", a check shown as "x" (centred), "?" for a mark not centred;
// then the headers.
QStringList tableLines(const QTableView* table)
{
    const QAbstractItemModel* model = table->model();
    QStringList lines, headers;
    for (int row = 0; row < model->rowCount(); ++row) {
        QStringList cells;
        for (int column = 0; column < model->columnCount(); ++column) {
            const QModelIndex cell = model->index(row, column);
            const bool centred = cell.data(Qt::TextAlignmentRole).toInt() == Qt::AlignCenter;
            cells << (cell.data(Qt::DecorationRole).value<QIcon>().isNull() ? cell.data().toString()
                          : centred                                       ? QStringLiteral("x")
                                                                          : QStringLiteral("?"));
        }
        lines << cells.join('|');
    }
    for (int column = 0; column < model->columnCount(); ++column)
        headers << model->headerData(column, Qt::Horizontal).toString();
    return lines << headers.join('|');
}

template<typename Dialog> QList<Dialog*> shown()
{
    QList<Dialog*> found;
    for (QWidget* widget : QApplication::topLevelWidgets()) {
        if (auto* dialog = qobject_cast<Dialog*>(widget); dialog && dialog->isVisible())
            found << dialog;
    }
    return found;
}

} // namespace

// The platform class-id scan over a platform that `zantro-sim platform` writes, and the
// comparison of scan files, from their tray handlers to their exports.
class PlatformToolsTest : public QObject
{
    Q_OBJECT

    QTemporaryDir m_work;
    std::vector<MifEntry> m_entries; // the platform as the gateway scans it

    // The rows of the first count entries in scan order: name, id, family, sub-family, path.
    QStringList rowsOf(size_t count) const
    {
        QStringList rows;
        for (size_t e = 0; e < count; ++e) {
            for (const quint32 id : m_entries[e].classes) {
                QString idText, name, family, subFamily;
                lookupClass(id, idText, name, family, subFamily);
                rows << QStringList {name, idText, family, subFamily, m_entries[e].filePath}.join('|');
            }
        }
        return rows;
    }

private slots:
    void initTestCase()
    {
        Q_INIT_RESOURCE(delvix);
        QCoreApplication::setOrganizationName("Norvale");
        QCoreApplication::setApplicationName("Delvix");
        QProcess generator;
        generator.start(
            SimulatorProcess::executable(), {"platform", m_work.filePath("platform"), "--mifs", "40"});
        QVERIFY(generator.waitForFinished(60000) && generator.exitCode() == 0);
        Portlex::GetPlatformClassIds(m_work.filePath("platform"), m_entries, nullptr, nullptr);
        QVERIFY(m_entries.size() > 3);
        QVERIFY(QDir(m_work.path()).mkpath("empty"));
        initializeLibrary();
    }
    void cleanup()
    {
        platformToolPrompts() = PlatformToolPrompts();
        saveXmlReportDialogs() = SaveXmlReportDialogs();
        qDeleteAll(shown<PlatformComparisonDialog>());
    }

    // Every exported class of every file fills a row, sorted by name once complete, and the
    // saved document lists them in scan order, once per file; a cancel keeps the rows so far,
    // unsorted, and leaves nothing to save. The whole platform goes through the tray handler,
    // which asks for the folder from the last one and remembers the choice.
    void populate_data()
    {
        QTest::addColumn<int>("cancelAt"); // the file whose step cancels; 0: none
        QTest::newRow("whole platform") << 0;
        QTest::newRow("cancelled at the fourth file") << 4;
    }
    void populate()
    {
        QFETCH(int, cancelAt);
        QTemporaryDir saved;
        saveXmlReportDialogs().askFileName
            = [&](QWidget*, const QString& caption, const QString&, const QString&) {
                  return caption == "Save filePlatformClassID.xml" ? saved.filePath("scan.xml") : QString();
              };
        QStringList rows;
        const auto inspect = [&](PlatformClassIDDialog* dialog) {
            dialog->_saveClassIDsButton->click();
            rows = tableLines(dialog->_platformClassTable).mid(0, dialog->_platformClassTable->rowCount());
        };
        if (cancelAt == 0) {
            QSettings().setValue("lastClassIDPath", "/before");
            platformToolPrompts().askDirectory = [&](QWidget*, const QString& caption, const QString& from) {
                return caption + from == "Browse for Platform Directory/before" ? m_work.filePath("platform")
                                                                                : "";
            };
            QTimer closer;
            connect(&closer, &QTimer::timeout, this, [&] {
                for (PlatformClassIDDialog* dialog : shown<PlatformClassIDDialog>()) {
                    inspect(dialog);
                    dialog->reject();
                }
            });
            closer.start(10);
            scanPlatformClassIds();
            QCOMPARE(QSettings().value("lastClassIDPath").toString(), m_work.filePath("platform"));
        } else {
            FreeFormProgressDialog progress;
            connect(progress._progressBar, &QProgressBar::valueChanged, this, [&](int value) {
                if (value == cancelAt)
                    progress._cancelButton->click();
            });
            PlatformClassIDDialog dialog;
            dialog.setProgressDialog(&progress);
            dialog.populate(m_entries);
            inspect(&dialog);
            QCOMPARE(rows, rowsOf(size_t(cancelAt - 1)));
            QVERIFY(!QFile::exists(saved.filePath("scan.xml")));
            return;
        }
        QVERIFY(std::is_sorted(rows.begin(), rows.end(), [](const QString& a, const QString& b) {
            return a.section('|', 0, 0).compare(b.section('|', 0, 0), Qt::CaseInsensitive) < 0;
        }));
        QVERIFY(rows.contains(QRegularExpression("^not found\\|0x[0-9A-F]{8}\\|unknown\\|unknown\\|/.*")));
        QStringList expected = rowsOf(m_entries.size()), written, inOrder;
        for (const QString& row : expected)
            inOrder << "name=\"" + row.section('|', 0, 0) + "\" value=\"" + row.section('|', 1, 1) + "\"";
        auto matches = QRegularExpression("name=\"[^\"]*\" value=\"[^\"]*\"")
                           .globalMatch(QString::fromUtf8(TestSupport::readFile(saved.filePath("scan.xml"))));
        while (matches.hasNext())
            written << matches.next().captured();
        QCOMPARE(written, inOrder);
        QVERIFY(TestSupport::readFile(saved.filePath("scan.xml"))
                    .startsWith("<!DOCTYPE platform-scan>\n<ZTOINFO>\n <ZTOVERSION version=\"\"/>\n "
                                "<ZantHeaderDataList>\n"));
        QVERIFY(
            QSet<QString>(written.begin(), written.end()).size() < written.size()); // modules share classes
        rows.sort();
        expected.sort();
        QCOMPARE(rows, expected);
    }

    // Two chosen scans side by side: a row per id (ids compared in one form), a column per scan
    // headed by its version or file name, the summary; and files that cannot be compared.
    void comparison_data()
    {
        QTest::addColumn<QByteArray>("first");
        QTest::addColumn<QByteArray>("second"); // empty: the first file again
        QTest::addColumn<QStringList>("lines"); // rows, headers, summary; empty: nothing opens
        QTest::addColumn<QString>("message");
        const QString list = QStringLiteral("ZantHeaderDataList"),
                      fixed = QStringLiteral("Class Name|Class ID|Family|Sub-Family|");
        const QByteArray a = scanFile("", list, {"0x01011001=Heap", "0x7E000001=Alpha"});
        QTest::newRow("both, first only, second only")
            << a << scanFile("", list, {"0x7E000002=Beta", "0x01011001=Heap"})
            << QStringList {"Alpha|0x7E000001|F|S|x|", "Beta|0x7E000002|F|S||x", "Heap|0x01011001|F|S|x|x",
                   fixed + "first|second", "1 class in both, 1 only in first, 1 only in second"}
            << "";
        QTest::newRow("ids in other forms, a version")
            << scanFile("", list, {"0x7e000001=Alpha", "0xfe000001=High", "0x1=One", "n/a=Odd"})
            << scanFile("3.2.1", list, {"0x7E000001=A", "0xFE000001=H", "1=O", "n/a=O"})
            << QStringList {"Alpha|0x7E000001|F|S|x|x", "High|0xFE000001|F|S|x|x", "Odd|n/a|F|S|x|x",
                   "One|0x00000001|F|S|x|x", fixed + "first|3.2.1",
                   "4 classes in both, 0 only in first, 0 only in 3.2.1"}
            << "";
        QTest::newRow("no class list") << a << scanFile("", "other", {"0x7E000001=Alpha"}) << QStringList()
                                       << "File Format Error|SECOND is not the right format.";
        QTest::newRow("not XML") << a << QByteArray("<ZTOINFO><ZTOVERSION") << QStringList() << "";
        QTest::newRow("first not XML") << QByteArray("<ZTOINFO><ZTOVERSION") << a << QStringList() << "";
        QTest::newRow("same file") << a << QByteArray() << QStringList()
                                   << "User Error|The files are the same";
    }
    void comparison()
    {
        QFETCH(QByteArray, first);
        QFETCH(QByteArray, second);
        QFETCH(QStringList, lines);
        QFETCH(QString, message);
        QTemporaryDir one, two;
        QStringList answers = {one.filePath("first.xml"),
            second.isEmpty() ? one.filePath("first.xml") : two.filePath("second.xml")};
        QVERIFY(TestSupport::writeFile(answers[0], first) && TestSupport::writeFile(answers[1], second));
        QSettings().remove("lastComparePath2");
        QStringList asked, messages;
        platformToolPrompts().askOpenFile
            = [&](QWidget*, const QString& caption, const QString& from, const QString& filter) {
                  asked << caption + "|" + from + "|" + filter;
                  return answers.takeFirst();
              };
        platformToolPrompts().inform
            = [&](QWidget*, const QString& title, const QString& text) { messages << title + "|" + text; };
        QSettings().setValue("lastComparePath1", "/before");
        comparePlatformScans();
        QCOMPARE(asked,
            (QStringList {"Browse for Platform Scan|/before|*.xml",
                "Browse for Comparison Platform Scan File|" + QCoreApplication::applicationDirPath()
                    + "|*.xml"}));
        QCOMPARE(
            QSettings().value("lastComparePath2").toString(), second.isEmpty() ? one.path() : two.path());
        QCOMPARE(messages,
            message.isEmpty() ? QStringList()
                              : QStringList {message.replace("SECOND", two.filePath("second.xml"))});
        const QList<PlatformComparisonDialog*> dialogs = shown<PlatformComparisonDialog>();
        QCOMPARE(dialogs.size(), lines.isEmpty() ? 0 : 1);
        if (!lines.isEmpty())
            QCOMPARE(tableLines(dialogs[0]->_platformView->_comparisonTable)
                    << dialogs[0]->_platformView->_summaryLabel->text(),
                lines);
    }

    // "Differences only" hides the classes every scan has, also as a further scan loads; header
    // clicks sort; "Save to File..." writes every class with its presence in each scan.
    void differencesAndExport()
    {
        QTemporaryDir folder;
        QVERIFY(TestSupport::writeFile(
            folder.filePath("a.xml"), scanFile("1.0", "classes", {"0x01011001=Heap", "0x7E000001=Alpha"})));
        QVERIFY(TestSupport::writeFile(
            folder.filePath("b.xml"), scanFile("", "classes", {"0x7E000002=Beta", "0x01011001=Heap"})));
        auto* dialog = new PlatformComparisonDialog;
        PlatformComparisonView* view = dialog->_platformView;
        view->_differencesOnly->setChecked(true);
        QVERIFY(dialog->loadFiles({folder.filePath("a.xml")}));
        QCOMPARE(tableLines(view->_comparisonTable).size(), 1);
        QVERIFY(dialog->loadFiles({folder.filePath("b.xml")}));
        QCOMPARE(tableLines(view->_comparisonTable).mid(0, 2),
            (QStringList {"Alpha|0x7E000001|F|S|x|", "Beta|0x7E000002|F|S||x"}));
        view->_differencesOnly->setChecked(false);
        QCOMPARE(tableLines(view->_comparisonTable).size(), 4);
        // By a scan's column its classes come first either way, the rest keeping their order.
        view->_comparisonTable->sortByColumn(5, Qt::DescendingOrder);
        QCOMPARE(tableLines(view->_comparisonTable).mid(0, 3),
            (QStringList {"Beta|0x7E000002|F|S||x", "Heap|0x01011001|F|S|x|x", "Alpha|0x7E000001|F|S|x|"}));
        view->_comparisonTable->sortByColumn(0, Qt::DescendingOrder);
        QCOMPARE(tableLines(view->_comparisonTable).first(), "Heap|0x01011001|F|S|x|x");

        saveXmlReportDialogs().askFileName
            = [&](QWidget*, const QString& caption, const QString&, const QString&) {
                  return caption == "Save filePlatformComparison" ? folder.filePath("saved.xml") : QString();
              };
        dialog->_saveFileButton->click();
        QCOMPARE(TestSupport::readFile(folder.filePath("saved.xml")),
            QByteArray("<!DOCTYPE platform-comparison>\n<PlatformComparison>\n"
                       " <scan id=\"scan1\" name=\"1.0\"/>\n <scan id=\"scan2\" name=\"b\"/>\n"
                       " <class name=\"Heap\" value=\"0x01011001\" family=\"F\" subfamily=\"S\" "
                       "scan1=\"yes\" scan2=\"yes\"/>\n"
                       " <class name=\"Alpha\" value=\"0x7E000001\" family=\"F\" subfamily=\"S\" "
                       "scan1=\"yes\" scan2=\"no\"/>\n"
                       " <class name=\"Beta\" value=\"0x7E000002\" family=\"F\" subfamily=\"S\" scan1=\"no\" "
                       "scan2=\"yes\"/>\n"
                       "</PlatformComparison>\n"));
        const QPointer<PlatformComparisonDialog> closing = dialog;
        dialog->_closeButton->click();
        QTRY_VERIFY(!closing);
    }
};

QTEST_MAIN(PlatformToolsTest)
#include "tst_platformtools.moc"
