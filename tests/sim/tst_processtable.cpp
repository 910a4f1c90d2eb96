#include "ProcessTable.h"

#include <QSet>
#include <QtTest>

#include <algorithm>

static const QList<ProcessSpec> Residents = {
    {"Kernel", 0, {{"idle", 0, 1}, {"timer", 240, 0}},
     {{"k.bin", "/sys/k.bin", 100, false}, {"codec", "/sys/codec.mod", 50, true}, {"net", "/sys/net.mod", 60, true}}},
    {"Shell", 0, {{"ui", 160, 1}}, {}}};
static const QList<ProcessSpec> Transients = {
    {"Browser", 3, {{"main", 150, 1}, {"fetch", 120, 2}}, {{"browser.mod", "/sys/mod/browser/browser.mod", 2000, false}}}};

static ProcessEvolutionSpec evolution(bool enabled, quint32 seed = 42) { return {enabled, seed, 2000, 6}; }

// Every id in the table, as one comparable value.
static QString snapshot(const ProcessTable& table)
{
    QStringList parts;
    for (const ProcessTable::Process& p : table.processes()) {
        QStringList ids {QString::number(p.id)};
        for (const ProcessTable::Thread& t : p.threads)
            ids << QString::number(t.id);
        for (const ProcessTable::Module& m : p.modules)
            ids << 'm' + QString::number(m.id);
        parts << ids.join(',');
    }
    return parts.join(' ');
}

class TestProcessTable : public QObject
{
    Q_OBJECT

private slots:
    // Residents stay, short-lived processes, threads and on-demand modules come and go, and
    // ids always ascend: whatever appears has an id above every id seen before.
    void lifeGoesOnWithAscendingIds()
    {
        ProcessTable table(Residents, Transients, evolution(true));
        const ProcessTable::Process kernel = table.processes().first();
        QCOMPARE(kernel.modules.size(), 1); // on-demand modules start unloaded
        QSet<quint32> live[2], processIds, kernelThreads; // [0] processes and threads (one id space), [1] modules
        quint32 highest[2] = {};
        bool moduleLoaded = false, threadEnded = false;
        for (quint64 step = 0; step <= 400; table.advanceTo(++step)) {
            QSet<quint32> now[2];
            quint32 previousProcess = 0;
            for (const ProcessTable::Process& p : table.processes()) {
                QList<quint32> ids[2] = {{p.id}, {}};
                for (const ProcessTable::Thread& t : p.threads)
                    ids[0] << t.id;
                for (const ProcessTable::Module& m : p.modules)
                    ids[1] << m.id;
                for (int kind : {0, 1}) {
                    for (int i = 0; i < ids[kind].size(); ++i) {
                        const quint32 id = ids[kind][i];
                        QVERIFY2((i == 0 || id > ids[kind][i - 1]) && (live[kind].contains(id) || id > highest[kind]),
                                 qPrintable(snapshot(table)));
                        now[kind].insert(id);
                    }
                }
                QVERIFY(p.id > previousProcess && p.threads.size() <= 2 + ProcessTable::MaxDynamicThreads);
                previousProcess = p.id;
                processIds.insert(p.id);
                moduleLoaded = moduleLoaded || p.modules.size() > 1;
            }
            for (int kind : {0, 1})
                highest[kind] = std::max(highest[kind], *std::max_element(now[kind].cbegin(), now[kind].cend()));
            QVERIFY(table.processes().size() <= 6);
            const ProcessTable::Process& resident = table.processes().first();
            QCOMPARE(qMakePair(resident.id, resident.threads.first().id), qMakePair(kernel.id, kernel.threads.first().id));
            QCOMPARE(table.processes().at(1).name, "Shell");
            QSet<quint32> threads;
            for (const ProcessTable::Thread& t : resident.threads)
                threads.insert(t.id);
            threadEnded = threadEnded || !(kernelThreads - threads).isEmpty();
            kernelThreads = threads;
            std::swap(live, now);
        }
        QVERIFY(processIds.size() > 10 && moduleLoaded && threadEnded);
    }

    void sameSeedSameHistory()
    {
        ProcessTable tables[] = {{Residents, Transients, evolution(true, 7)}, {Residents, Transients, evolution(true, 7)},
                                 {Residents, Transients, evolution(true, 8)}};
        QStringList history[3];
        for (quint64 step = 1; step <= 60; ++step) {
            for (int i = 0; i < 3; ++i) {
                tables[i].advanceTo(step);
                history[i] << snapshot(tables[i]);
            }
        }
        QCOMPARE(history[0], history[1]);
        QVERIFY(history[0] != history[2]);
        // Steps already run are never run again.
        tables[0].advanceTo(10);
        tables[0].advanceTo(60);
        QCOMPARE(tables[0].currentStep(), 60u);
        QCOMPARE(snapshot(tables[0]), history[0].last());
    }

    void withoutEvolutionOnlyShortLivedProcessesEnd()
    {
        ProcessTable table(Residents, Transients, evolution(false));
        const QString atStart = snapshot(table);
        const quint32 id = table.start(Transients.first(), 3);
        QCOMPARE(table.processes().last().id, id);
        QCOMPARE(table.processes().last().threads.first().id, id + 1);
        table.advanceTo(2);
        QCOMPARE(table.processes().size(), 3);
        table.advanceTo(3);
        QCOMPARE(table.processes().size(), 2);
        table.advanceTo(100);
        QCOMPARE(snapshot(table), atStart);
        table.start(Transients.first(), 0); // lives at least one step
        QCOMPARE(table.processes().size(), 3);
        table.advanceTo(101);
        QCOMPARE(table.processes().size(), 2);
    }
};

QTEST_GUILESS_MAIN(TestProcessTable)
#include "tst_processtable.moc"
