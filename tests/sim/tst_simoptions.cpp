#include "FailurePlan.h"
#include "SimOptions.h"
#include "SimRequestHandler.h"

#include <QtTest>

class TestSimOptions : public QObject
{
    Q_OBJECT

private slots:
    void failRules_data();
    void failRules();
    void failMatching();
    void serveOptions();
    void refusedOptions_data();
    void refusedOptions();
    void commands();
};

void TestSimOptions::failRules_data()
{
    QTest::addColumn<QString>("rule");
    QTest::addColumn<bool>("valid");
    QTest::addColumn<QString>("operation");
    QTest::addColumn<QString>("path");
    QTest::addColumn<qint32>("code");

    QTest::newRow("whole operation") << "GetRegistry=3" << true << "GetRegistry" << "" << 3;
    QTest::newRow("settings node") << "GetChildSettings:/appinfo=0xDEADBEEF" << true << "GetChildSettings" << "/appinfo"
                                   << qint32(0xDEADBEEF);
    QTest::newRow("directory") << "GetFileSystemLevel:/user=0xdeadbeef" << true << "GetFileSystemLevel" << "/user" << qint32(0xDEADBEEF);
    QTest::newRow("path with = and :") << "GetFileSystemLevel:/a=b:c=7" << true << "GetFileSystemLevel" << "/a=b:c" << 7;
    QTest::newRow("largest code") << "GetModules=4294967295" << true << "GetModules" << "" << qint32(-1);

    QTest::newRow("no code") << "GetRegistry" << false << "" << "" << 0;
    QTest::newRow("zero") << "GetRegistry=0" << false << "" << "" << 0;
    QTest::newRow("not a number") << "GetRegistry=three" << false << "" << "" << 0;
    QTest::newRow("above 32 bits") << "GetRegistry=0x100000000" << false << "" << "" << 0;
    QTest::newRow("no operation") << "=3" << false << "" << "" << 0;
    QTest::newRow("unknown operation") << "GetWeather=3" << false << "" << "" << 0;
    QTest::newRow("wrong case") << "getregistry=3" << false << "" << "" << 0;
    QTest::newRow("handshake cannot fail") << "Hello=3" << false << "" << "" << 0;
    QTest::newRow("empty path") << "GetChildSettings:=3" << false << "" << "" << 0;
}

void TestSimOptions::failRules()
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

void TestSimOptions::failMatching()
{
    const QStringList operations = SimRequestHandler::operationNames();
    FailurePlan plan;
    QString error;
    QVERIFY(plan.addRule(QStringLiteral("GetFileSystemLevel=5"), operations, &error));
    QVERIFY(plan.addRule(QStringLiteral("GetFileSystemLevel:/user=0xDEADBEEF"), operations, &error));
    QVERIFY(plan.addRule(QStringLiteral("GetFileSystemLevel=6"), operations, &error));

    qint32 code = 0;
    QVERIFY(plan.match(QStringLiteral("GetFileSystemLevel"), QStringLiteral("/user"), code));
    QCOMPARE(code, qint32(0xDEADBEEF)); // the rule for the path wins, whatever the order
    QVERIFY(plan.match(QStringLiteral("GetFileSystemLevel"), QStringLiteral("/shared"), code));
    QCOMPARE(code, 5); // the first rule for the whole operation
    QVERIFY(!plan.match(QStringLiteral("GetModules"), QString(), code));
}

void TestSimOptions::serveOptions()
{
    SimOptions options;
    QVERIFY2(options.parse({QStringLiteral("zantro-sim"), QStringLiteral("--image"), QStringLiteral("/img"),
                            QStringLiteral("--id"), QStringLiteral("dev-1.a_b"), QStringLiteral("--socket-dir"), QStringLiteral("/s"),
                            QStringLiteral("--reset"), QStringLiteral("--refuse-connect"), QStringLiteral("0x10:Busy: try later"),
                            QStringLiteral("--latency"), QStringLiteral("250"), QStringLiteral("--fail"), QStringLiteral("GetRegistry=3"),
                            QStringLiteral("--fail"), QStringLiteral("GetModules=4")}),
             qPrintable(options.errorString()));
    QCOMPARE(options.command, SimOptions::Command::Serve);
    QCOMPARE(options.imageDir, QStringLiteral("/img"));
    QCOMPARE(options.deviceId, QStringLiteral("dev-1.a_b"));
    QCOMPARE(options.socketDir, QStringLiteral("/s"));
    QVERIFY(options.reset);
    QCOMPARE(options.refuseCode, 16);
    QCOMPARE(options.refuseText, QStringLiteral("Busy: try later"));
    QCOMPARE(options.latencyMs, 250);
    qint32 code = 0;
    QVERIFY(options.failures.match(QStringLiteral("GetRegistry"), QString(), code));
    QCOMPARE(code, 3);
    QVERIFY(options.failures.match(QStringLiteral("GetModules"), QString(), code));
    QCOMPARE(code, 4);

    SimOptions defaults;
    QVERIFY(defaults.parse({QStringLiteral("zantro-sim"), QStringLiteral("--image=/img")}));
    QVERIFY(!defaults.reset);
    QCOMPARE(defaults.refuseCode, 0);
    QVERIFY(defaults.deviceId.isEmpty());
    QVERIFY(defaults.failures.isEmpty());
}

void TestSimOptions::refusedOptions_data()
{
    QTest::addColumn<QStringList>("arguments");
    QTest::newRow("no image") << QStringList{};
    QTest::newRow("unknown option") << QStringList{"--image", "/i", "--turbo"};
    QTest::newRow("bad id") << QStringList{"--image", "/i", "--id", "../x"};
    QTest::newRow("negative latency") << QStringList{"--image", "/i", "--latency", "-1"};
    QTest::newRow("refusal without text") << QStringList{"--image", "/i", "--refuse-connect", "5"};
    QTest::newRow("refusal with code 0") << QStringList{"--image", "/i", "--refuse-connect", "0:ok"};
    QTest::newRow("bad fail rule") << QStringList{"--image", "/i", "--fail", "GetRegistry"};
    QTest::newRow("generate without folder") << QStringList{"generate", "--modules", "5"};
    QTest::newRow("generate negative") << QStringList{"generate", "out", "--files", "-5"};
    QTest::newRow("make-sample one argument") << QStringList{"make-sample", "desc.xml"};
}

void TestSimOptions::refusedOptions()
{
    QFETCH(QStringList, arguments);
    arguments.prepend(QStringLiteral("zantro-sim"));
    SimOptions options;
    QVERIFY(!options.parse(arguments));
    QVERIFY(!options.errorString().isEmpty());
}

void TestSimOptions::commands()
{
    SimOptions help;
    QVERIFY(help.parse({QStringLiteral("zantro-sim"), QStringLiteral("--help")}));
    QCOMPARE(help.command, SimOptions::Command::Help);
    const QString text = SimOptions::helpText();
    for (const char* word : {"--image", "--id", "--socket-dir", "ZANTRO_SIM_DIR", "--reset", "--refuse-connect", "--latency",
                             "--fail", "generate", "make-sample", "GetChildSettings"})
        QVERIFY2(text.contains(QLatin1String(word)), word);

    SimOptions generate;
    QVERIFY(generate.parse({QStringLiteral("zantro-sim"), QStringLiteral("generate"), QStringLiteral("out"), QStringLiteral("--modules"),
                            QStringLiteral("10000"), QStringLiteral("--classes"), QStringLiteral("20"), QStringLiteral("--files"),
                            QStringLiteral("0"), QStringLiteral("--processes"), QStringLiteral("3")}));
    QCOMPARE(generate.command, SimOptions::Command::Generate);
    QCOMPARE(generate.outputDir, QStringLiteral("out"));
    QCOMPARE(generate.counts.modules, 10000);
    QCOMPARE(generate.counts.classes, 20);
    QCOMPARE(generate.counts.files, 0);
    QCOMPARE(generate.counts.processes, 3);

    SimOptions sample;
    QVERIFY(sample.parse({QStringLiteral("zantro-sim"), QStringLiteral("make-sample"), QStringLiteral("d.xml"), QStringLiteral("img")}));
    QCOMPARE(sample.command, SimOptions::Command::MakeSample);
    QCOMPARE(sample.descriptionPath, QStringLiteral("d.xml"));
    QCOMPARE(sample.outputDir, QStringLiteral("img"));
}

QTEST_GUILESS_MAIN(TestSimOptions)
#include "tst_simoptions.moc"
