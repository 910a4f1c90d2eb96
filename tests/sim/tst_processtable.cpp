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
    // Residents stay while short-lived processes, threads and on-demand modules come and go;
    // whatever appears has an id above every id seen before (processes and threads share one space).
    void lifeGoesOnWithAscendingIds()
    {
        ProcessTable table(Residents, Transients, evolution(true));
        const quint32 kernel = table.processes().first().id;
        QSet<quint32> live[2], seen[2];
        quint32 highest[2] = {};
        for (quint64 step = 0; step <= 400; table.advanceTo(++step)) {
            QSet<quint32> now[2];
            for (const ProcessTable::Process& p : table.processes()) {
                now[0] << p.id;
                for (const ProcessTable::Thread& t : p.threads)
                    now[0] << t.id;
                for (const ProcessTable::Module& m : p.modules)
                    now[1] << m.id;
            }
            for (int kind : {0, 1}) {
                for (const quint32 id : std::as_const(now[kind]))
                    QVERIFY2(live[kind].contains(id) || id > highest[kind], qPrintable(snapshot(table)));
                highest[kind] = std::max(highest[kind], *std::max_element(now[kind].cbegin(), now[kind].cend()));
                seen[kind] += now[kind];
            }
            QCOMPARE(table.processes().first().id, kernel);
            QCOMPARE(table.processes().at(1).name, "Shell");
            std::swap(live, now);
        }
        QVERIFY2(seen[0].size() > 40 && seen[1].size() > 4, qPrintable(QStringLiteral("%1 %2").arg(seen[0].size()).arg(seen[1].size())));

        // The same seed gives the same history in one jump, another seed another; steps
        // already run are never run again.
        ProcessTable twin(Residents, Transients, evolution(true)), other(Residents, Transients, evolution(true, 8));
        twin.advanceTo(401);
        other.advanceTo(401);
        QCOMPARE(snapshot(twin), snapshot(table));
        QVERIFY(snapshot(other) != snapshot(table));
        table.advanceTo(10);
        QCOMPARE(table.currentStep(), 401u);
        QCOMPARE(snapshot(table), snapshot(twin));
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
