#include <QProcess>
#include <QTest>

// The program on a display without a system tray: it says so and ends with code 1.
class TrayCheckTest : public QObject
{
    Q_OBJECT

private slots:
    void withoutTrayEndsWithCodeOne()
    {
        QProcess delvix;
        delvix.start(QCoreApplication::applicationDirPath() + "/delvix");
        QVERIFY(delvix.waitForStarted());
        // Answers the message as a person would, once it shows.
        QCOMPARE(QProcess::execute("xdotool", {"search", "--sync", "--onlyvisible", "--name", "^Systray$", "windowfocus", "--sync"}), 0);
        QCOMPARE(QProcess::execute("xdotool", {"key", "Return"}), 0);
        QVERIFY(delvix.waitForFinished(15000));
        QCOMPARE(delvix.exitStatus(), QProcess::NormalExit);
        QCOMPARE(delvix.exitCode(), 1);
    }
};

QTEST_GUILESS_MAIN(TrayCheckTest)
#include "tst_traycheck.moc"
