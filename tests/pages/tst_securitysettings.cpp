#include "DeviceWindow.h"
#include "LockStatusWidget.h"
#include "PageFixtures.h"
#include "Portlex.h"
#include "SecuritySettingsDialog.h"
#include "SimulatorProcess.h"
#include "TestImage.h"

#include <QLocale>
#include <QSettings>
#include <QTemporaryDir>
#include <QtTest>

namespace {

const QString Led = QStringLiteral(":/LockStatusWidget/Resources/%1.png");

// An expiry text as the C library's ctime writes it: the day of month padded with a blank.
QString ctimeText(const QDate& date)
{
    return QLocale::c().toString(date, QStringLiteral("ddd MMM "))
        + QString::number(date.day()).rightJustified(2, ' ') + QStringLiteral(" 20:00:00 ")
        + QString::number(date.year());
}

} // namespace

// The developer enablement state: the status-bar indicator, the dialog and its "Lock", on
// devices that a simulator serves in each mode.
class SecuritySettingsTest : public QObject
{
    Q_OBJECT

    QTemporaryDir m_sockets;

private slots:
    void initTestCase()
    {
        Q_INIT_RESOURCE(delvix);
        QCoreApplication::setOrganizationName("Norvale");
        QCoreApplication::setApplicationName("Delvix");
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        Portlex::Initialize();
    }

    // What the indicator and the dialog show in each mode, the dialog opened by a click on
    // the indicator; "Lock" ends the mode it names (the service first), and the indicator
    // shows the outcome once the dialog is closed.
    void enablementThroughTheWindow_data()
    {
        QTest::addColumn<QString>("mode");
        QTest::addColumn<QString>("expiry");
        QTest::addColumn<QStringList>("indicator"); // text, LED, tool tip
        QTest::addColumn<QStringList>("panel"); // mode, expiry, privilege values...
        QTest::addColumn<QString>("afterLock");
        const QString soon = ctimeText(QDate::currentDate().addDays(30));
        const QString service = QStringLiteral("Developer Enabled Service"),
                      sig = QStringLiteral("Developer Enabled Signature");
        const QStringList priviledges = {"0x00000011", "0x12345678"};
        // The service's LED is green while 7 or more days are left; a day of month padded with a
        // blank (the 5th) reads too.
        const QDate today = QDate::currentDate(), later = today.addDays(40);
        const QList<std::tuple<const char*, QDate, QString>> services
            = {{"service 7 days", today.addDays(7), "GreenLED"},
                {"service 6 days", today.addDays(6), "YellowLED"},
                {"service expired", today.addDays(-1), "YellowLED"},
                {"service padded day", QDate(later.year(), later.month(), 5), "GreenLED"}};
        for (const auto& [tag, date, led] : services) {
            const QString expiry = ctimeText(date);
            QTest::newRow(tag) << "service" << expiry
                               << QStringList {"DES Enabled", led, service + " expires:\n" + expiry}
                               << QStringList {service, expiry} + priviledges << "Simulator Enabled";
        }
        QTest::newRow("signature") << "signature" << soon
                                   << QStringList {"Sig Enabled", "Globe", sig + " expires:\n" + soon}
                                   << QStringList {sig, soon} << "Simulator Enabled";
        QTest::newRow("both") << "both" << soon
                              << QStringList {"Sig Enabled", "Globe", sig + " expires:\n" + soon}
                              << QStringList {sig, soon} << "Sig Enabled";
        QTest::newRow("none") << "none" << soon << QStringList {"Simulator Enabled", "UnlitLED", ""}
                              << QStringList {"Disabled???", ""} << "Simulator Enabled";
    }
    void enablementThroughTheWindow()
    {
        QFETCH(QString, mode);
        QFETCH(QString, expiry);
        QFETCH(QStringList, indicator);
        QFETCH(QStringList, panel);
        QFETCH(QString, afterLock);
        TestImage image;
        image.fillDefault();
        QByteArray profile = TestImage::defaultProfile();
        profile.replace(R"(mode="service")", "mode=\"" + mode.toUtf8() + '"');
        profile.replace("Sun Sep 19 20:00:00 2027", expiry.toUtf8());
        image.writeProfile(profile);
        SimulatorProcess simulator(m_sockets.path());
        const QString id = QString(QStringLiteral("lock-") + QTest::currentDataTag()).replace(' ', '-');
        QVERIFY(simulator.connectDevice(image.path(), id));

        DeviceWindow window;
        window.setDevice(id);
        window.show();
        auto* status = window.findChild<LockStatusWidget*>();
        QCOMPARE(status->_modeStatus->text(), indicator.at(0));
        QCOMPARE(status->_ledStatus->pixmap().toImage(),
            QImage(Led.arg(indicator.at(1)))
                .convertToFormat(status->_ledStatus->pixmap().toImage().format()));
        QCOMPARE(status->toolTip(), indicator.at(2));

        QStringList shown;
        QTimer::singleShot(0, this, [&] {
            auto* dialog = window.findChild<SecuritySettingsDialog*>();
            const SecuritySettings* settings = dialog->_securitySettings;
            shown << settings->_unlockModeLabel->text() << settings->_expiresLabel->text()
                  << PageFixtures::columnTexts(settings->_priviledgeTable, 0);
            settings->_lockButton->click();
            dialog->okButton->click();
        });
        QTest::mouseClick(status->_modeStatus, Qt::LeftButton);
        QCOMPARE(shown, panel);
        QCOMPARE(status->_modeStatus->text(), afterLock);
    }

    // Only the first two indicators ever built show the hint cursor.
    void hintCursorOnTheFirstTwo()
    {
        QSettings().remove("lockseen");
        QList<Qt::CursorShape> shapes;
        for (int i = 0; i < 3; ++i)
            shapes << LockStatusWidget().cursor().shape();
        QCOMPARE(shapes, (QList<Qt::CursorShape> {Qt::BitmapCursor, Qt::BitmapCursor, Qt::ArrowCursor}));
    }

    void cleanupTestCase() { Portlex::Destroy(); }
};

QTEST_MAIN(SecuritySettingsTest)
#include "tst_securitysettings.moc"
