#include "EnsureWindowPlacementOnDesktop.h"
#include "FreeFormProgressDialog.h"
#include "SaveXmlReport.h"
#include "SplashDialog.h"
#include "TestSupport.h"

#include <QAbstractEventDispatcher>
#include <QApplication>
#include <QPointer>
#include <QSettings>
#include <QTemporaryDir>
#include <QTest>

// The application's helpers: window placement, the progress callback, the pictures, the
// splash and About dialogs, and the one routine that writes XML exports (what it asks,
// where it starts, what it writes, and what it says when it cannot write).
class TestWindowHelpers : public QObject
{
    Q_OBJECT

    QTemporaryDir m_dir;
    QList<QStringList> m_questions;  // caption, folder, filter
    QStringList m_warnings;

    // Answers the file dialog with answer and records what was asked.
    void answerWith(const QString& answer)
    {
        saveXmlReportDialogs().askFileName = [this, answer](QWidget*, const QString& caption, const QString& folder,
                                                            const QString& filter) {
            m_questions.append({caption, folder, filter});
            return answer;
        };
    }

private slots:
    void initTestCase()
    {
        Q_INIT_RESOURCE(delvix);
        QCoreApplication::setOrganizationName("Norvale");
        QCoreApplication::setApplicationName("Delvix");
        QVERIFY(m_dir.isValid());
    }
    void init()
    {
        QSettings().clear();
        m_questions.clear();
        m_warnings.clear();
        saveXmlReportDialogs().warn = [this](QWidget*, const QString& title, const QString& text) {
            m_warnings << title + "|" + text;
        };
    }
    void cleanup() { saveXmlReportDialogs() = SaveXmlReportDialogs(); }

    void progressCallbackSequence()
    {
        FreeFormProgressDialog dialog;
        const auto report = [&dialog](int value, int maximum, const QString& text) {
            return FreeFormProgressDialog::progressCallback(&dialog, value, maximum, text);
        };
        QVERIFY(!report(-1, 50, "Processing MIF Entries"));
        QCOMPARE(dialog._progressBar->maximum(), 50);
        QVERIFY(!report(10, -1, ""));
        QCOMPARE(dialog._progressBar->value(), 10);
        QCOMPARE(dialog._progressText->text(), QString("Processing MIF Entries"));

        // The request is answered on the next value report; a text-only report neither answers nor clears it.
        QTest::mouseClick(dialog._cancelButton, Qt::LeftButton);
        QVERIFY(report(11, -1, ""));
        QVERIFY(!report(-1, -1, "Saving"));
        QCOMPARE(dialog._progressText->text(), QString("Saving"));
        QVERIFY(report(12, -1, ""));
        QCOMPARE(dialog._progressBar->value(), 12);

        // A new range clears the request.
        QVERIFY(!report(-1, 20, ""));
        QCOMPARE(dialog._progressBar->maximum(), 20);
        QCOMPARE(dialog._progressBar->value(), 0);
        QVERIFY(!report(1, -1, ""));
        QVERIFY(!FreeFormProgressDialog::progressCallback(nullptr, 5, 10, "ignored"));
    }

    // Two screens side by side: 1920 x 1080 at the origin and 1280 x 1024 to its right.
    void windowPlacement_data()
    {
        QTest::addColumn<QRect>("stored");
        QTest::addColumn<QPoint>("expected");
        QTest::newRow("near the right edge of the first") << QRect(1900, 100, 900, 600) << QPoint(1900, 100);
        QTest::newRow("on the second screen") << QRect(2500, 300, 400, 300) << QPoint(2500, 300);
        QTest::newRow("below the second screen") << QRect(2000, 1100, 400, 300) << QPoint(40, 40);
        QTest::newRow("left of every screen") << QRect(-1000, 100, 400, 300) << QPoint(40, 40);
        QTest::newRow("partly above the first") << QRect(100, -200, 400, 300) << QPoint(100, -200);
    }
    void windowPlacement()
    {
        QFETCH(QRect, stored);
        QFETCH(QPoint, expected);
        QCOMPARE(QGuiApplication::screens().size(), 2);
        QWidget window;
        window.setGeometry(stored);
        EnsureWindowPlacementOnDesktop(&window);
        QCOMPARE(window.pos(), expected);
    }

    void splashClosesOnlyOnItsOwnCappedTimer()
    {
        QPointer<SplashDialog> splash = new SplashDialog(":/Resources/splash.png", "notice", "0.5.1.0");
        splash->show();
        splash->startCloseTimer(10 * SplashDialog::LongestShowing);
        const auto timers = QAbstractEventDispatcher::instance()->registeredTimers(splash);
        QCOMPARE(timers.size(), 1);
        QCOMPARE(timers.first().interval, SplashDialog::LongestShowing);

        QTimerEvent foreign(timers.first().timerId + 1000);
        QCoreApplication::sendEvent(splash, &foreign);
        QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
        QVERIFY(splash && splash->isVisible());
        QTimerEvent own(timers.first().timerId);
        QCoreApplication::sendEvent(splash, &own);
        QVERIFY(splash && !splash->isVisible());
        QVERIFY(QAbstractEventDispatcher::instance()->registeredTimers(splash).isEmpty());
        QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
        QVERIFY(!splash);
    }

    void asksAndWritesTheReportUnchanged()
    {
        QVERIFY(QDir().mkpath(m_dir.filePath("first")));
        answerWith(m_dir.filePath("first/modules.xml"));
        saveXmlReport(nullptr, "ModuleList", "<zant-modules/>\n");
        QCOMPARE(m_questions, QList<QStringList>({{"Save fileModuleList", QCoreApplication::applicationDirPath(), "XML Files (*.xml)"}}));

        // Every export starts where the last one, of any page or tool, was saved; its text
        // replaces a longer file as it is.
        const QString target = m_dir.filePath("classes.xml");
        QVERIFY(TestSupport::writeFile(target, QByteArray(4096, 'x')));
        const QString report = QString::fromUtf8("<!DOCTYPE zant-class-ids>\n<ZTOINFO>\n <ZTOId name=\"Größe\"/>\n</ZTOINFO>\n");
        answerWith(target);
        saveXmlReport(nullptr, "ClassList", report);
        QCOMPARE(m_questions.last().mid(0, 2), QStringList({"Save fileClassList", m_dir.filePath("first")}));
        QCOMPARE(TestSupport::readFile(target), report.toUtf8());
        QCOMPARE(QSettings().value("lastPath").toString(), m_dir.path());
        QVERIFY(m_warnings.isEmpty());
    }

    // Neither a cancelled dialog nor a failed write moves the start folder; only the failure warns.
    void cancelAndFailureKeepTheLastFolder()
    {
        QVERIFY(TestSupport::writeFile(m_dir.filePath("plain.txt"), "kept"));
        QSettings().setValue("lastPath", m_dir.filePath("first"));
        answerWith(QString());
        saveXmlReport(nullptr, "ModuleList", "<zant-modules/>");
        QCOMPARE(m_questions.size(), 1);
        QVERIFY(m_warnings.isEmpty());

        const QString path = m_dir.filePath("plain.txt/report.xml");
        answerWith(path);
        saveXmlReport(nullptr, "ModuleList", "<zant-modules/>");
        QCOMPARE(m_warnings.size(), 1);
        QVERIFY2(m_warnings[0].startsWith("Export to XML|") && m_warnings[0].contains(QDir::toNativeSeparators(path)),
                 qPrintable(m_warnings[0]));
        QCOMPARE(TestSupport::readFile(m_dir.filePath("plain.txt")), QByteArray("kept"));
        QCOMPARE(QSettings().value("lastPath").toString(), m_dir.filePath("first"));
    }
};

int main(int argc, char** argv)
{
    // The offscreen platform reads its screens from a configuration file.
    const QString config = QDir::temp().filePath(QStringLiteral("tst_windowhelpers-screens-%1.json").arg(QCoreApplication::applicationPid()));
    QFile file(config);
    if (!file.open(QIODevice::WriteOnly))
        return 1;
    file.write(R"({"screens": [
        {"name": "left", "x": 0, "y": 0, "width": 1920, "height": 1080, "logicalDpi": 96, "logicalBaseDpi": 96, "dpr": 1},
        {"name": "right", "x": 1920, "y": 0, "width": 1280, "height": 1024, "logicalDpi": 96, "logicalBaseDpi": 96, "dpr": 1}
    ]})");
    file.close();
    qputenv("QT_QPA_PLATFORM", QByteArray("offscreen:configfile=") + QFile::encodeName(config));
    QApplication app(argc, argv);
    TestWindowHelpers test;
    const int result = QTest::qExec(&test, argc, argv);
    QFile::remove(config);
    return result;
}

#include "tst_windowhelpers.moc"
