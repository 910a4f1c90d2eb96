#include "SaveXmlReport.h"
#include "TestSupport.h"

#include <QCoreApplication>
#include <QSettings>
#include <QTemporaryDir>
#include <QTest>

// The one routine that writes XML exports: what it asks, where it starts, what it writes,
// and what it says when it cannot write.
class SaveXmlReportTest : public QObject
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

    void asksWithCaptionFilterAndLastFolder()
    {
        QVERIFY(QDir().mkpath(m_dir.filePath("first")));
        answerWith(m_dir.filePath("first/modules.xml"));
        saveXmlReport(nullptr, "ModuleList", "<zant-modules/>\n");
        QCOMPARE(m_questions, QList<QStringList>({{"Save fileModuleList", QCoreApplication::applicationDirPath(), "XML Files (*.xml)"}}));

        // Every export starts where the last one, of any page or tool, was saved.
        answerWith(m_dir.filePath("classes.xml"));
        saveXmlReport(nullptr, "ClassList", "<zant-class-ids/>\n");
        QCOMPARE(m_questions.last().mid(0, 2), QStringList({"Save fileClassList", m_dir.filePath("first")}));
        QCOMPARE(QSettings().value("lastPath").toString(), m_dir.path());
        QVERIFY(m_warnings.isEmpty());
    }

    void writesTheReportUnchanged()
    {
        const QString target = m_dir.filePath("report.xml");
        QVERIFY(TestSupport::writeFile(target, QByteArray(4096, 'x')));
        const QString report = QString::fromUtf8("<!DOCTYPE zant-modules>\n<zant-modules>\n <module name=\"Größe\"/>\n</zant-modules>\n");
        answerWith(target);
        saveXmlReport(nullptr, "ModuleList", report);
        QCOMPARE(TestSupport::readFile(target), report.toUtf8());
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

QTEST_MAIN(SaveXmlReportTest)
#include "tst_savexmlreport.moc"
