#include "FailurePlan.h"
#include "SimOptions.h"
#include "SimRequestHandler.h"

#include <QtTest>

class TestSimOptions : public QObject
{
    Q_OBJECT

private slots:
    void failRules_data()
    {
        QTest::addColumn<QString>("rule");
        QTest::addColumn<bool>("valid");
        QTest::addColumn<QString>("operation");
        QTest::addColumn<QString>("path");
        QTest::addColumn<qint32>("code");
        QTest::newRow("whole operation") << "GetRegistry=3" << true << "GetRegistry" << "" << 3;
        QTest::newRow("path") << "GetChildSettings:/appinfo=0xdeadbeef" << true << "GetChildSettings" << "/appinfo" << qint32(0xDEADBEEF);
        QTest::newRow("path with = and :") << "GetFileSystemLevel:/a=b:c=7" << true << "GetFileSystemLevel" << "/a=b:c" << 7;
        QTest::newRow("largest code") << "GetModules=4294967295" << true << "GetModules" << "" << qint32(-1);
        QTest::newRow("zero") << "GetRegistry=0" << false << "" << "" << 0;
        QTest::newRow("above 32 bits") << "GetRegistry=0x100000000" << false << "" << "" << 0;
        QTest::newRow("unknown operation") << "GetWeather=3" << false << "" << "" << 0;
        QTest::newRow("wrong case") << "getregistry=3" << false << "" << "" << 0;
        QTest::newRow("handshake cannot fail") << "Hello=3" << false << "" << "" << 0;
        QTest::newRow("empty path") << "GetChildSettings:=3" << false << "" << "" << 0;
    }

    void failRules()
    {
        QFETCH(QString, rule);
        QFETCH(bool, valid);
        QFETCH(QString, operation);
        QFETCH(QString, path);
        QFETCH(qint32, code);
        FailurePlan plan;
        QString error;
        QCOMPARE(plan.addRule(rule, SimRequestHandler::operationNames(), &error), valid);
        QCOMPARE(error.isEmpty(), valid);
        QCOMPARE(plan.isEmpty(), !valid);
        if (!valid)
            return;
        qint32 matched = 0;
        QVERIFY(plan.match(operation, path, matched));
        QCOMPARE(matched, code);
        if (!path.isEmpty())
            QVERIFY(!plan.match(operation, path + QStringLiteral("/x"), matched));
    }

    void failPrecedence()
    {
        FailurePlan plan;
        QString error;
        for (const char* rule : {"GetFileSystemLevel=5", "GetFileSystemLevel:/user=0xDEADBEEF", "GetFileSystemLevel=6"})
            QVERIFY(plan.addRule(QLatin1String(rule), SimRequestHandler::operationNames(), &error));
        qint32 code = 0;
        QVERIFY(plan.match(QStringLiteral("GetFileSystemLevel"), QStringLiteral("/user"), code));
        QCOMPARE(code, qint32(0xDEADBEEF)); // the rule for the path wins, whatever the order
        QVERIFY(plan.match(QStringLiteral("GetFileSystemLevel"), QStringLiteral("/shared"), code));
        QCOMPARE(code, 5); // the first rule for the whole operation
        QVERIFY(!plan.match(QStringLiteral("GetModules"), QString(), code));
    }

    void serveOptions()
    {
        SimOptions options;
        QVERIFY2(options.parse({"zantro-sim", "--image", "/img", "--id", "dev-1.a_b", "--socket-dir", "/s", "--reset",
                                "--refuse-connect", "0x10:Busy: try later", "--latency", "250", "--fail", "GetRegistry=3",
                                "--fail", "GetModules=4"}),
                 qPrintable(options.errorString()));
        QCOMPARE(options.command, SimOptions::Command::Serve);
        QCOMPARE((QStringList {options.imageDir, options.deviceId, options.socketDir, options.refuseText}),
                 (QStringList {"/img", "dev-1.a_b", "/s", "Busy: try later"}));
        QVERIFY(options.reset);
        QCOMPARE(options.refuseCode, 16);
        QCOMPARE(options.latencyMs, 250);
        qint32 code = 0;
        QVERIFY(options.failures.match(QStringLiteral("GetRegistry"), QString(), code));
        QCOMPARE(code, 3);
        QVERIFY(options.failures.match(QStringLiteral("GetModules"), QString(), code));
        QCOMPARE(code, 4);

        SimOptions defaults;
        QVERIFY(defaults.parse({"zantro-sim", "--image=/img"}));
        QCOMPARE(defaults.imageDir, "/img");
        QVERIFY(!defaults.reset && defaults.refuseCode == 0 && defaults.deviceId.isEmpty() && defaults.failures.isEmpty());
    }

    void commands()
    {
        SimOptions help;
        QVERIFY(help.parse({"zantro-sim", "--help"}));
        QCOMPARE(help.command, SimOptions::Command::Help);
        SimOptions generate;
        QVERIFY(generate.parse({"zantro-sim", "generate", "out", "--modules", "10000", "--classes", "20", "--files", "0",
                                "--processes", "3"}));
        QCOMPARE(generate.command, SimOptions::Command::Generate);
        QCOMPARE(generate.outputDir, "out");
        const ImageGenerator::Counts& counts = generate.counts;
        QCOMPARE((QList<int> {counts.modules, counts.classes, counts.files, counts.processes}), (QList<int> {10000, 20, 0, 3}));
        SimOptions sample;
        QVERIFY(sample.parse({"zantro-sim", "make-sample", "d.xml", "img"}));
        QCOMPARE(sample.command, SimOptions::Command::MakeSample);
        QCOMPARE(sample.descriptionPath + ' ' + sample.outputDir, "d.xml img");
    }

    void refusedOptions_data()
    {
        QTest::addColumn<QStringList>("arguments");
        QTest::newRow("no image") << QStringList {};
        QTest::newRow("unknown option") << QStringList {"--image", "/i", "--turbo"};
        QTest::newRow("bad id") << QStringList {"--image", "/i", "--id", "../x"};
        QTest::newRow("negative latency") << QStringList {"--image", "/i", "--latency", "-1"};
        QTest::newRow("refusal without text") << QStringList {"--image", "/i", "--refuse-connect", "5"};
        QTest::newRow("refusal with code 0") << QStringList {"--image", "/i", "--refuse-connect", "0:ok"};
        QTest::newRow("bad fail rule") << QStringList {"--image", "/i", "--fail", "GetRegistry"};
        QTest::newRow("generate without folder") << QStringList {"generate", "--modules", "5"};
        QTest::newRow("generate negative") << QStringList {"generate", "out", "--files", "-5"};
        QTest::newRow("make-sample one argument") << QStringList {"make-sample", "desc.xml"};
    }

    void refusedOptions()
    {
        QFETCH(QStringList, arguments);
        SimOptions options;
        QVERIFY(!options.parse(QStringList {"zantro-sim"} + arguments));
        QVERIFY(!options.errorString().isEmpty());
    }
};

QTEST_GUILESS_MAIN(TestSimOptions)
#include "tst_simoptions.moc"
