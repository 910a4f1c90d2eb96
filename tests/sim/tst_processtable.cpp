#include "ProcessTable.h"

#include <QSet>
#include <QtTest>

class TestProcessTable : public QObject
{
    Q_OBJECT

private slots:
    void idsAscendAndAreNeverReused();
    void sameSeedSameHistory();
    void lifeGoesOn();
    void withoutEvolutionOnlyShortLivedProcessesEnd();
    void stepsRunOnce();

private:
    static QList<ProcessSpec> residents();
    static QList<ProcessSpec> transients();
    static ProcessEvolutionSpec evolution(bool enabled, quint32 seed = 42)
    {
        ProcessEvolutionSpec spec;
        spec.enabled = enabled;
        spec.seed = seed;
        spec.maxProcesses = 6;
        return spec;
    }
    // Every id in the table, as one comparable value.
    static QString snapshot(const ProcessTable& table);
};

QList<ProcessSpec> TestProcessTable::residents()
{
    ProcessSpec kernel;
    kernel.name = QStringLiteral("Kernel");
    kernel.threads = {{QStringLiteral("idle"), 0, 1}, {QStringLiteral("timer"), 240, 0}};
    kernel.modules = {{QStringLiteral("k.bin"), QStringLiteral("/sys/k.bin"), 100, false},
                      {QStringLiteral("codec"), QStringLiteral("/sys/codec.mod"), 50, true},
                      {QStringLiteral("net"), QStringLiteral("/sys/net.mod"), 60, true}};
    ProcessSpec shell;
    shell.name = QStringLiteral("Shell");
    shell.threads = {{QStringLiteral("ui"), 160, 1}};
    return {kernel, shell};
}

QList<ProcessSpec> TestProcessTable::transients()
{
    ProcessSpec browser;
    browser.name = QStringLiteral("Browser");
    browser.lifetime = 3;
    browser.threads = {{QStringLiteral("main"), 150, 1}, {QStringLiteral("fetch"), 120, 2}};
    browser.modules = {{QStringLiteral("browser.mod"), QStringLiteral("/sys/mod/browser/browser.mod"), 2000, false}};
    return {browser};
}

QString TestProcessTable::snapshot(const ProcessTable& table)
{
    QStringList parts;
    for (const ProcessTable::Process& p : table.processes()) {
        QStringList threads;
        for (const ProcessTable::Thread& t : p.threads)
            threads << QString::number(t.id);
        QStringList modules;
        for (const ProcessTable::Module& m : p.modules)
            modules << QString::number(m.id);
        parts << QStringLiteral("%1(%2|%3)").arg(p.id).arg(threads.join(',')).arg(modules.join(','));
    }
    return parts.join(' ');
}

void TestProcessTable::idsAscendAndAreNeverReused()
{
    ProcessTable table(residents(), transients(), evolution(true));
    QSet<quint32> seenTasks;
    QSet<quint32> seenModules;
    quint32 highestTask = 0;
    quint32 highestModule = 0;
    for (quint64 step = 0; step <= 400; ++step) {
        table.advanceTo(step);
        QList<quint32> newTasks;
        QList<quint32> newModules;
        quint32 previousProcess = 0;
        for (const ProcessTable::Process& p : table.processes()) {
            QVERIFY(p.id > previousProcess);
            previousProcess = p.id;
            if (!seenTasks.contains(p.id))
                newTasks << p.id;
            quint32 previous = 0;
            for (const ProcessTable::Thread& t : p.threads) {
                QVERIFY2(t.id > previous, qPrintable(snapshot(table)));
                previous = t.id;
                if (!seenTasks.contains(t.id))
                    newTasks << t.id;
            }
            QVERIFY(p.threads.size() <= 2 + ProcessTable::MaxDynamicThreads);
            previous = 0;
            for (const ProcessTable::Module& m : p.modules) {
                QVERIFY(m.id > previous);
                previous = m.id;
                if (!seenModules.contains(m.id))
                    newModules << m.id;
            }
        }
        // Whatever appeared in this step has an id above every id seen before it.
        for (quint32 id : std::as_const(newTasks))
            QVERIFY(id > highestTask || step == 0);
        for (quint32 id : std::as_const(newModules))
            QVERIFY(id > highestModule || step == 0);
        for (quint32 id : std::as_const(newTasks)) {
            seenTasks.insert(id);
            highestTask = qMax(highestTask, id);
        }
        for (quint32 id : std::as_const(newModules)) {
            seenModules.insert(id);
            highestModule = qMax(highestModule, id);
        }
    }
    QVERIFY(seenTasks.size() > 50);
}

void TestProcessTable::sameSeedSameHistory()
{
    ProcessTable a(residents(), transients(), evolution(true, 7));
    ProcessTable b(residents(), transients(), evolution(true, 7));
    ProcessTable other(residents(), transients(), evolution(true, 8));
    QStringList historyA;
    QStringList historyB;
    QStringList historyOther;
    for (quint64 step = 1; step <= 60; ++step) {
        a.advanceTo(step);
        b.advanceTo(step);
        other.advanceTo(step);
        historyA << snapshot(a);
        historyB << snapshot(b);
        historyOther << snapshot(other);
    }
    QCOMPARE(historyA, historyB);
    QVERIFY(historyA != historyOther);
}

void TestProcessTable::lifeGoesOn()
{
    ProcessTable table(residents(), transients(), evolution(true));
    const ProcessTable::Process kernelAtStart = table.processes().first();
    QCOMPARE(kernelAtStart.modules.size(), 1); // on-demand modules start unloaded

    QSet<quint32> processIds;
    int changes = 0;
    bool moduleLoaded = false;
    bool threadEnded = false;
    QString last = snapshot(table);
    for (quint64 step = 1; step <= 300; ++step) {
        table.advanceTo(step);
        const QString now = snapshot(table);
        changes += now != last ? 1 : 0;
        last = now;
        for (const ProcessTable::Process& p : table.processes()) {
            processIds.insert(p.id);
            moduleLoaded = moduleLoaded || p.modules.size() > 1;
        }
        // Residents stay, with their own threads.
        QCOMPARE(table.processes().at(0).id, kernelAtStart.id);
        QCOMPARE(table.processes().at(0).threads.at(0).id, kernelAtStart.threads.at(0).id);
        QCOMPARE(table.processes().at(1).name, QStringLiteral("Shell"));
        threadEnded = threadEnded || table.processes().at(0).threads.size() < 2 + ProcessTable::MaxDynamicThreads;
    }
    QVERIFY(changes > 100);
    QVERIFY(processIds.size() > 10); // short-lived processes came and went
    QVERIFY(table.processes().size() <= 6);
    QVERIFY(moduleLoaded);
    QVERIFY(threadEnded);
}

void TestProcessTable::withoutEvolutionOnlyShortLivedProcessesEnd()
{
    ProcessTable table(residents(), transients(), evolution(false));
    const QString atStart = snapshot(table);
    const quint32 id = table.start(transients().first(), 3);
    QCOMPARE(table.processes().last().id, id);
    QCOMPARE(table.processes().last().threads.first().id, id + 1);

    table.advanceTo(2);
    QCOMPARE(table.processes().size(), 3);
    table.advanceTo(3);
    QCOMPARE(table.processes().size(), 2);
    table.advanceTo(100);
    QCOMPARE(snapshot(table), atStart);

    table.start(transients().first(), 0); // lives at least one step
    QCOMPARE(table.processes().size(), 3);
    table.advanceTo(101);
    QCOMPARE(table.processes().size(), 2);
}

void TestProcessTable::stepsRunOnce()
{
    ProcessTable table(residents(), transients(), evolution(true));
    table.advanceTo(20);
    const QString at20 = snapshot(table);
    table.advanceTo(10);
    table.advanceTo(20);
    QCOMPARE(table.currentStep(), 20u);
    QCOMPARE(snapshot(table), at20);
}

QTEST_GUILESS_MAIN(TestProcessTable)
#include "tst_processtable.moc"
