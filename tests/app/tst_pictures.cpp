#include "AboutDialog.h"
#include "SplashDialog.h"

#include <QAbstractEventDispatcher>
#include <QDirIterator>
#include <QImage>
#include <QPointer>
#include <QTest>

class PicturesTest : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase() { Q_INIT_RESOURCE(delvix); }

    // A picture that does not load shows as a blank icon.
    void everyResourceLoads()
    {
        QStringList loaded;
        for (const char* folder : {":/Resources", ":/LockStatusWidget"}) {
            for (QDirIterator it(folder, QDir::Files, QDirIterator::Subdirectories); it.hasNext();) {
                loaded << it.next();
                QVERIFY2(!QImage(loaded.last()).isNull(), qPrintable(loaded.last()));
            }
        }
        for (const char* named : {":/Resources/splash.png", ":/Resources/about.png", ":/Resources/InfoCursor.png"})
            QVERIFY2(loaded.contains(named), named);
        QVERIFY(!QImage("://Resources/Delvix.png").isNull());  // as the forms name it
        QCOMPARE(QImage(":/Resources/TrayIcon.png").size(), QSize(16, 16));
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

    void aboutClosesOnMouseRelease()
    {
        AboutDialog about(":/Resources/about.png", "notice", "0.5.1.0");
        about.show();
        QVERIFY(QTest::qWaitForWindowExposed(&about));
        QTest::mouseRelease(&about, Qt::RightButton, Qt::NoModifier, QPoint(420, 40));
        QVERIFY(!about.isVisible());
        QCOMPARE(about.result(), int(QDialog::Accepted));
    }
};

QTEST_MAIN(PicturesTest)
#include "tst_pictures.moc"
