#include "CliRun.h"
#include "JsonSchema.h"
#include "SimulatorProcess.h"
#include "TestSupport.h"

#include <QJsonDocument>
#include <QJsonObject>
#include <QTemporaryDir>
#include <QtTest>

using namespace TestSupport;

// Snapshots and their differences against a handset served from a copy of its image, so
// that a settings change can be made between two runs of the simulator.
class TestCliSnapshot : public QObject
{
    Q_OBJECT

    QTemporaryDir m_sockets, m_work;
    std::unique_ptr<SimulatorProcess> m_device;
    QString work(const QString& name) const { return m_work.filePath(name); }
    bool serve()
    {
        m_device = std::make_unique<SimulatorProcess>(m_sockets.path());
        return m_device->start(work("image"), "kestrel-k7", {}, SimulatorProcess::Image::InPlace);
    }
    static QString violation(const QByteArray& json, const QString& schema)
    {
        const QJsonObject rules = JsonSchema::load(QCoreApplication::applicationDirPath(), schema);
        return rules.isEmpty() ? "no schema " + schema : JsonSchema::violation(QJsonDocument::fromJson(json).object(), rules);
    }

private slots:
    void initTestCase()
    {
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        QCOMPARE(QProcess::execute("cp", {"-a", SimulatorProcess::sampleImage("handset"), work("image")}), 0);
        // The card's own module, installed again onto the flash.
        QCOMPARE(QProcess::execute("cp", {"-a", work("image/card/usermod/carousel"), work("carousel")}), 0);
        QCOMPARE(QProcess::execute(SimulatorProcess::executable(), {"pack", work("carousel"), work("carousel.zantro")}), 0);
        QVERIFY(serve());
        const CliRun taken = runCli({"--hash-limit", "65536", "snapshot", "kestrel", "-o", work("before.json")});
        QVERIFY2(taken.exitCode == 0 && taken.out.isEmpty(), taken.err.constData());
        const QString invalid = violation(readFile(work("before.json")), "snapshot");
        QVERIFY2(invalid.isEmpty(), qPrintable(invalid));
    }

    void itselfIsNoDifference()
    {
        const CliRun run = runCli({"--fail-on-difference", "diff", work("before.json"), work("before.json")});
        QCOMPARE(run.exitCode, 0);
        QCOMPARE(run.out, QByteArray("No differences.\n"));
    }

    // An install, a delete and a settings change, and nothing else, read from the running device.
    void changesAreListedExactly()
    {
        QCOMPARE(runCli({"install", "kestrel", work("carousel.zantro")}).exitCode, 0);
        QCOMPARE(runCli({"rm", "kestrel", "/user/notes/shopping.txt"}).exitCode, 0);
        QVERIFY(m_device->stop());
        const QByteArray profile = readFile(work("image/device.xml"));
        QVERIFY(writeFile(work("image/device.xml"), QByteArray(profile).replace(R"(<value name="count" text="36"/>)", R"(<value name="count" text="37"/>)")));
        QVERIFY(serve());
        const CliRun text = runCli({"--fail-on-difference", "diff", work("before.json"), "kestrel"});
        QCOMPARE(text.exitCode, 1);
        // Sizes and hashes of the sample files, from sha256sum.
        QCOMPARE(QString::fromUtf8(text.out), QString(R"(6 differences: modules 1 added; classes none; registry entries none; settings 1 changed; files 3 added, 1 removed

Modules added (1):
  /usermod/carousel/carousel.mif: carousel, version 1.0.2, signature Unsigned

Settings changed (1):
  /appinfo [count]: 36 -> 37

Files added (3):
  /usermod/carousel/carousel.inf: 108 bytes, sha256 281ab69a3a2e6149d40d96c910dd9db8599782d86f5eaac49dafc604ecae5ca1
  /usermod/carousel/carousel.mif: 124 bytes, sha256 30797fb95291b0a5a3b0f7b1ffebbac3ba96a910af33f03ec24ec98ad8fa8b74
  /usermod/carousel/carousel.mod: 4096 bytes, sha256 9fe462e90adc32fa054a210fccf983c879c2a935a892b2ed88200d928a6a53ee

Files removed (1):
  /user/notes/shopping.txt: 46 bytes, sha256 b675fd547b9696fe6272454d98c5e8234828fc91b05495e859d7d86d299bc0ac
)"));
        const CliRun json = runCli({"--format", "json", "diff", work("before.json"), "kestrel"});
        QCOMPARE(json.exitCode, 0);
        const QString invalid = violation(json.out, "diff");
        QVERIFY2(invalid.isEmpty(), qPrintable(invalid));
        QCOMPARE(QJsonDocument::fromJson(json.out)["total"].toInt(), 6);
    }

    void brokenSnapshotsAreRefused_data()
    {
        QTest::addColumn<QByteArray>("content");
        QTest::addColumn<QString>("said");
        const QByteArray whole = readFile(work("before.json"));
        QTest::newRow("truncated") << whole.left(whole.size() / 2) << "truncated or corrupt";
        QTest::newRow("empty") << QByteArray() << "truncated or corrupt";
        QTest::newRow("another document") << QByteArray(R"({"schema": "delvix.modules", "version": 1})") << "no \"delvix.snapshot\" schema";
        QTest::newRow("newer") << QByteArray(whole).replace(R"("version":1)", R"("version":2)") << "snapshot version 2";
        QTest::newRow("part missing") << QByteArray(whole).replace(R"("registry":)", R"("registrz":)") << "lacks its \"registry\" document";
    }
    void brokenSnapshotsAreRefused()
    {
        QFETCH(QByteArray, content);
        QFETCH(QString, said);
        QVERIFY(writeFile(work("broken.json"), content));
        const CliRun run = runCli({"diff", work("before.json"), work("broken.json")});
        QCOMPARE(run.exitCode, 4);
        QVERIFY2(run.err.contains(said.toUtf8()) && run.err.contains("broken.json"), run.err.constData());
        QVERIFY(run.out.isEmpty());
    }
};

QTEST_GUILESS_MAIN(TestCliSnapshot)
#include "tst_clisnapshot.moc"
