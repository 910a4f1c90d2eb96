#include "DesktopDriver.h"
#include "SimulatorProcess.h"

#include <QProcess>
#include <QSettings>
#include <QTemporaryDir>
#include <QTest>

#include <memory>

// The program itself in a desktop session with a tray: a person opens device windows from the
// tray menu and leaves with Exit.
class TrayExitTest : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase();
    void exitClosesEveryWindowAndEnds();
    void exitWithNoWindowOpenEnds();

private:
    void startDelvix(QProcess& delvix);
    void chooseExit(QProcess& delvix);

    QTemporaryDir m_sockets;
    QTemporaryDir m_config;
    std::unique_ptr<SimulatorProcess> m_simulator;
};

void TrayExitTest::initTestCase()
{
    QVERIFY(m_sockets.isValid() && m_config.isValid());
    m_simulator = std::make_unique<SimulatorProcess>(m_sockets.path());
    QVERIFY2(m_simulator->start(SimulatorProcess::sampleImage("simulator"), "aurora"),
             qPrintable(m_simulator->errorString()));
}

void TrayExitTest::startDelvix(QProcess& delvix)
{
    QProcessEnvironment environment = QProcessEnvironment::systemEnvironment();
    environment.insert("ZANTRO_SIM_DIR", m_sockets.path());
    environment.insert("XDG_CONFIG_HOME", m_config.path());
    delvix.setProcessEnvironment(environment);
    delvix.start(QCoreApplication::applicationDirPath() + "/delvix");
    QVERIFY(delvix.waitForStarted());
}

void TrayExitTest::chooseExit(QProcess& delvix)
{
    QVERIFY(DesktopDriver::openTrayMenu());
    QVERIFY(DesktopDriver::pressKeys({"Up", "Return"}));
    QVERIFY(delvix.waitForFinished(15000));
    QCOMPARE(delvix.exitStatus(), QProcess::NormalExit);
    QCOMPARE(delvix.exitCode(), 0);
}

void TrayExitTest::exitClosesEveryWindowAndEnds()
{
    QProcess delvix;
    startDelvix(delvix);
    // About, the two tools, then the only device.
    for (int window = 1; window <= 2; ++window) {
        QVERIFY(DesktopDriver::openTrayMenu());
        QVERIFY(DesktopDriver::pressKeys({"Down", "Down", "Down", "Down", "Return"}));
        QVERIFY(DesktopDriver::waitForWindows("^Delvix - Simulator Aurora$", window));
    }
    chooseExit(delvix);

    QSettings settings(m_config.filePath("Norvale/Delvix.conf"), QSettings::IniFormat);
    settings.beginGroup("Zantro Simulator - Aurora");
    QCOMPARE(settings.value("size").toSize(), QSize(900, 600));
}

void TrayExitTest::exitWithNoWindowOpenEnds()
{
    QProcess delvix;
    startDelvix(delvix);
    chooseExit(delvix);
}

QTEST_GUILESS_MAIN(TrayExitTest)
#include "tst_trayexit.moc"
