#include "SaveXmlReport.h"

#include <QCoreApplication>
#include <QDir>
#include <QFile>
#include <QSettings>
#include <QTemporaryDir>
#include <QTest>

// The one routine that writes XML exports: what it asks, where it starts, what it writes,
// and what it says when it cannot write.
class SaveXmlReportTest : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase();
    void init();
    void cleanup();
    void asksWithCaptionFilterAndLastFolder();
    void writesTheReportUnchanged();
    void cancelledDialogStaysSilent();
    void unwritableFileIsReported_data();
    void unwritableFileIsReported();

private:
    struct Question
    {
        QString caption;
        QString folder;
        QString filter;
    };
    // Answers the file dialog with answer and records what was asked.
    void answerWith(const QString& answer);
    static QByteArray contents(const QString& path);

    QTemporaryDir m_dir;
    QList<Question> m_questions;
    QStringList m_warnings;
};

void SaveXmlReportTest::initTestCase()
{
    QCoreApplication::setOrganizationName("Norvale");
    QCoreApplication::setApplicationName("Delvix");
    QVERIFY(m_dir.isValid());
}

void SaveXmlReportTest::init()
{
    QSettings().clear();
    m_questions.clear();
    m_warnings.clear();
    saveXmlReportDialogs().warn = [this](QWidget*, const QString& title, const QString& text) {
        m_warnings << title + "|" + text;
    };
}

void SaveXmlReportTest::cleanup()
{
    saveXmlReportDialogs() = SaveXmlReportDialogs();
}

void SaveXmlReportTest::answerWith(const QString& answer)
{
    saveXmlReportDialogs().askFileName = [this, answer](QWidget*, const QString& caption, const QString& folder,
                                                        const QString& filter) {
        m_questions.append({caption, folder, filter});
        return answer;
    };
}

QByteArray SaveXmlReportTest::contents(const QString& path)
{
    QFile file(path);
    return file.open(QIODevice::ReadOnly) ? file.readAll() : QByteArray("<unreadable>");
}

void SaveXmlReportTest::asksWithCaptionFilterAndLastFolder()
{
    QVERIFY(QDir().mkpath(m_dir.filePath("first")));
    answerWith(m_dir.filePath("first/modules.xml"));
    saveXmlReport(nullptr, "ModuleList", "<zant-modules/>\n");

    QCOMPARE(m_questions.size(), 1);
    QCOMPARE(m_questions[0].caption, QString("Save fileModuleList"));
    QCOMPARE(m_questions[0].filter, QString("XML Files (*.xml)"));
    QCOMPARE(m_questions[0].folder, QCoreApplication::applicationDirPath());

    // Every export starts where the last one, of any page or tool, was saved.
    answerWith(m_dir.filePath("classes.xml"));
    saveXmlReport(nullptr, "ClassList", "<zant-class-ids/>\n");
    QCOMPARE(m_questions[1].caption, QString("Save fileClassList"));
    QCOMPARE(m_questions[1].folder, m_dir.filePath("first"));
    QCOMPARE(QSettings().value("lastPath").toString(), m_dir.path());
    QVERIFY(m_warnings.isEmpty());
}

void SaveXmlReportTest::writesTheReportUnchanged()
{
    const QString target = m_dir.filePath("report.xml");
    {
        QFile old(target);
        QVERIFY(old.open(QIODevice::WriteOnly));
        old.write(QByteArray(4096, 'x'));
    }
    const QString report = QString::fromUtf8("<!DOCTYPE zant-modules>\n<zant-modules>\n <module name=\"Größe\"/>\n</zant-modules>\n");
    answerWith(target);
    saveXmlReport(nullptr, "ModuleList", report);
    QCOMPARE(contents(target), report.toUtf8());
}

void SaveXmlReportTest::cancelledDialogStaysSilent()
{
    QSettings().setValue("lastPath", m_dir.path());
    answerWith(QString());
    saveXmlReport(nullptr, "ModuleList", "<zant-modules/>");
    QCOMPARE(m_questions.size(), 1);
    QVERIFY(m_warnings.isEmpty());
    QCOMPARE(QSettings().value("lastPath").toString(), m_dir.path());
}

void SaveXmlReportTest::unwritableFileIsReported_data()
{
    QTest::addColumn<QString>("target");
    QTest::newRow("folder is a file") << "plain.txt/report.xml";
    QTest::newRow("target is a folder") << "folder";
    QTest::newRow("missing folder") << "missing/report.xml";
}

void SaveXmlReportTest::unwritableFileIsReported()
{
    QFETCH(QString, target);
    {
        QFile plain(m_dir.filePath("plain.txt"));
        QVERIFY(plain.open(QIODevice::WriteOnly));
        plain.write("kept");
    }
    QVERIFY(QDir().mkpath(m_dir.filePath("folder")));
    const QString path = m_dir.filePath(target);
    answerWith(path);
    saveXmlReport(nullptr, "ModuleList", "<zant-modules/>");

    QCOMPARE(m_warnings.size(), 1);
    QVERIFY2(m_warnings[0].startsWith("Export to XML|"), qPrintable(m_warnings[0]));
    QVERIFY2(m_warnings[0].contains(QDir::toNativeSeparators(path)), qPrintable(m_warnings[0]));
    QCOMPARE(contents(m_dir.filePath("plain.txt")), QByteArray("kept"));
    QVERIFY(QSettings().value("lastPath").toString().isEmpty());
}

QTEST_MAIN(SaveXmlReportTest)
#include "tst_savexmlreport.moc"
