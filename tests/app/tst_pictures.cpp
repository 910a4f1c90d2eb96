#include "AboutDialog.h"
#include "SplashDialog.h"

#include <QAbstractEventDispatcher>
#include <QGuiApplication>
#include <QImage>
#include <QPainter>
#include <QPointer>
#include <QScreen>
#include <QTest>

// The compiled-in pictures, the splash's close timer and the About picture's component table.
class PicturesTest : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase();
    void resourceSizes_data();
    void resourceSizes();
    void cursorPointsAtItsHotSpot_data();
    void cursorPointsAtItsHotSpot();
    void splashTimerIsCapped_data();
    void splashTimerIsCapped();
    void splashClosesItselfOnItsTimer();
    void picturesAreCentredOnTheScreen();
    void componentCells();
    void aboutDrawsRowsInTheirCells();
    void aboutAppendsRows();
    void aboutClosesOnMouseRelease();

private:
    static QImage render(QWidget& widget);
};

void PicturesTest::initTestCase()
{
    Q_INIT_RESOURCE(delvix);
}

void PicturesTest::resourceSizes_data()
{
    QTest::addColumn<QString>("path");
    QTest::addColumn<QSize>("size");
    QTest::newRow("splash") << ":/Resources/splash.png" << QSize(500, 250);
    QTest::newRow("about") << ":/Resources/about.png" << QSize(500, 300);
    QTest::newRow("application icon") << "://Resources/Delvix.png" << QSize(256, 256);
    QTest::newRow("tray icon") << ":/Resources/TrayIcon.png" << QSize(16, 16);
    for (const char* icon : {"InfoIcon", "ModulesIcon", "ISettingsIcon", "RegistryIcon", "FamilyListIcon",
                             "ClassesIcon", "Lock", "FileSystemIcon", "saveIcon", "threading", "processing",
                             "levels", "InfoCursor"})
        QTest::newRow(icon) << QString(":/Resources/%1.png").arg(icon) << QSize(32, 32);
    QTest::newRow("plugin icon") << ":/Resources/Resources/PluginIcon.png" << QSize(32, 32);
    for (const char* small : {"UnlitLED", "CheckBoxIcon", "FileIcon", "FolderIcon"})
        QTest::newRow(small) << QString(":/Resources/%1.png").arg(small) << QSize(16, 16);
    for (const char* led : {"GreenLED", "YellowLED", "UnlitLED", "Globe"})
        QTest::newRow(led) << QString(":/LockStatusWidget/Resources/%1.png").arg(led) << QSize(16, 16);
    QTest::newRow("indicator cursor") << ":/LockStatusWidget/Resources/InfoCursor.png" << QSize(32, 32);
}

void PicturesTest::resourceSizes()
{
    QFETCH(QString, path);
    QFETCH(QSize, size);
    const QImage image(path);
    QVERIFY2(!image.isNull(), qPrintable(path));
    QCOMPARE(image.size(), size);
}

void PicturesTest::cursorPointsAtItsHotSpot_data()
{
    QTest::addColumn<QString>("path");
    QTest::addColumn<QPoint>("hotSpot");
    QTest::newRow("module page") << ":/Resources/InfoCursor.png" << QPoint(5, 0);
    QTest::newRow("indicator") << ":/LockStatusWidget/Resources/InfoCursor.png" << QPoint(5, 10);
}

void PicturesTest::cursorPointsAtItsHotSpot()
{
    QFETCH(QString, path);
    QFETCH(QPoint, hotSpot);
    const QImage cursor(path);
    QVERIFY(qAlpha(cursor.pixel(hotSpot)) > 128);
    QCOMPARE(qAlpha(cursor.pixel(hotSpot - QPoint(3, 0))), 0);
}

void PicturesTest::splashTimerIsCapped_data()
{
    QTest::addColumn<int>("requested");
    QTest::addColumn<int>("armed");
    QTest::newRow("start-up") << 3500 << 3500;
    QTest::newRow("longest") << 7000 << 7000;
    QTest::newRow("too long") << 10000 << 7000;
}

void PicturesTest::splashTimerIsCapped()
{
    QFETCH(int, requested);
    QFETCH(int, armed);
    SplashDialog splash(":/Resources/splash.png", "notice", "0.5.1.0");
    splash.startCloseTimer(requested);
    const auto timers = QAbstractEventDispatcher::instance()->registeredTimers(&splash);
    QCOMPARE(timers.size(), 1);
    QCOMPARE(timers.first().interval, armed);
}

void PicturesTest::splashClosesItselfOnItsTimer()
{
    QPointer<SplashDialog> splash = new SplashDialog(":/Resources/splash.png", "notice", "0.5.1.0");
    QCOMPARE(splash->size(), QSize(500, 250));
    splash->show();
    splash->startCloseTimer(3500);
    const int timerId = QAbstractEventDispatcher::instance()->registeredTimers(splash).first().timerId;

    QTimerEvent foreign(timerId + 1000);
    QCoreApplication::sendEvent(splash, &foreign);
    QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
    QVERIFY(splash && splash->isVisible());

    QTimerEvent own(timerId);
    QCoreApplication::sendEvent(splash, &own);
    QVERIFY(splash && !splash->isVisible());
    QVERIFY(QAbstractEventDispatcher::instance()->registeredTimers(splash).isEmpty());
    QCoreApplication::sendPostedEvents(nullptr, QEvent::DeferredDelete);
    QVERIFY(!splash);
}

void PicturesTest::picturesAreCentredOnTheScreen()
{
    const QPoint centre = QGuiApplication::primaryScreen()->geometry().center();
    SplashDialog splash(":/Resources/splash.png", "notice", "0.5.1.0");
    AboutDialog about(":/Resources/about.png", "notice", "0.5.1.0");
    for (QWidget* picture : {static_cast<QWidget*>(&splash), static_cast<QWidget*>(&about)}) {
        const QPoint offset = picture->geometry().center() - centre;
        QVERIFY2(offset.manhattanLength() <= 2, picture->metaObject()->className());
        QVERIFY(picture->windowFlags().testFlag(Qt::WindowStaysOnTopHint));
    }
    QCOMPARE(about.size(), QSize(500, 300));
}

void PicturesTest::componentCells()
{
    const QStringList rows = {"Portlex.dll\t0.9.0.3", "Skinwell.dll\t1.0.0.1", "", "\ta\t\tb\tc"};
    const QVector<AboutDialog::Cell> expected = {
        {QPoint(30, 200), "Portlex.dll"}, {QPoint(170, 200), "0.9.0.3"},
        {QPoint(30, 220), "Skinwell.dll"}, {QPoint(170, 220), "1.0.0.1"},
        {QPoint(30, 260), "a"}, {QPoint(170, 260), "b"}, {QPoint(310, 260), "c"}};
    QCOMPARE(AboutDialog::componentCells(rows), expected);
}

QImage PicturesTest::render(QWidget& widget)
{
    QImage image(widget.size(), QImage::Format_ARGB32);
    image.fill(Qt::black);
    widget.render(&image);
    return image;
}

void PicturesTest::aboutDrawsRowsInTheirCells()
{
    AboutDialog plain(":/Resources/about.png", "notice", "0.5.1.0");
    AboutDialog listed(":/Resources/about.png", "notice", "0.5.1.0");
    const QStringList rows = {"Portlex.dll\t0.9.0.3", "Skinwell.dll\t1.0.0.1"};
    listed.setComponents(rows);
    const QImage before = render(plain);
    const QImage after = render(listed);

    // Every changed pixel lies in the box of one of the cells, and every box has some.
    const QFontMetrics metrics(QFont("Helvetica", 10, QFont::Bold));
    QVector<QRect> boxes;
    for (const AboutDialog::Cell& cell : AboutDialog::componentCells(rows))
        boxes.append(metrics.boundingRect(cell.second).translated(cell.first).adjusted(-2, -2, 2, 2));
    QVector<int> hits(boxes.size(), 0);
    for (int y = 0; y < after.height(); ++y) {
        for (int x = 0; x < after.width(); ++x) {
            if (before.pixel(x, y) == after.pixel(x, y))
                continue;
            const auto box = std::find_if(boxes.begin(), boxes.end(), [&](const QRect& r) { return r.contains(x, y); });
            QVERIFY2(box != boxes.end(), qPrintable(QString("drawn at %1,%2").arg(x).arg(y)));
            ++hits[int(box - boxes.begin())];
        }
    }
    QVERIFY(!hits.contains(0));
}

void PicturesTest::aboutAppendsRows()
{
    AboutDialog once(":/Resources/about.png", "notice", "0.5.1.0");
    once.setComponents({"Portlex.dll\t0.9.0.3", "Skinwell.dll\t1.0.0.1"});
    AboutDialog twice(":/Resources/about.png", "notice", "0.5.1.0");
    twice.setComponents({"Portlex.dll\t0.9.0.3"});
    twice.setComponents({"Skinwell.dll\t1.0.0.1"});
    QCOMPARE(render(twice), render(once));
}

void PicturesTest::aboutClosesOnMouseRelease()
{
    AboutDialog about(":/Resources/about.png", "notice", "0.5.1.0");
    about.show();
    QVERIFY(QTest::qWaitForWindowExposed(&about));
    QTest::mouseRelease(&about, Qt::RightButton, Qt::NoModifier, QPoint(420, 40));
    QVERIFY(!about.isVisible());
    QCOMPARE(about.result(), int(QDialog::Accepted));
}

QTEST_MAIN(PicturesTest)
#include "tst_pictures.moc"
