#include "EnsureWindowPlacementOnDesktop.h"
#include "FreeFormProgressDialog.h"

#include <QApplication>
#include <QDir>
#include <QTest>

class TestWindowHelpers : public QObject
{
    Q_OBJECT

private slots:
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
        QTest::newRow("far off every screen") << QRect(5000, 5000, 900, 600) << QPoint(40, 40);
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
