#pragma once

// Helpers shared by the tests of the family tree and level pages.

#include "DeviceCache.h"
#include "GatewayComponentWidget.h"
#include "Portlex.h"
#include "SimulatorProcess.h"

#include <QDir>
#include <QFile>
#include <QTest>
#include <QTreeWidget>

namespace TreePageFixtures {

constexpr int ReadyTimeoutMs = 30000;

inline IdRecord makeClass(const QString& id, const QString& name, const QString& family, const QString& subFamily,
                          bool available = true)
{
    IdRecord record;
    record.id = id;
    record.name = name;
    record.family = family;
    record.subFamily = subFamily;
    record.available = available;
    return record;
}

inline DeviceCache cacheOf(const QList<IdRecord>& classes)
{
    DeviceCache cache;
    for (const IdRecord& record : classes)
        cache.classes.insert(record.id, record);
    cache.deviceData.targetId = QStringLiteral("0x0A110021");
    cache.deviceData.hardware.insert(QStringLiteral("Manufacturer"), QStringLiteral("Zantro & Sons"));
    return cache;
}

inline void appendLines(const QTreeWidgetItem* item, int depth, QStringList& lines)
{
    QStringList texts;
    for (int column = 0; column < item->treeWidget()->columnCount(); ++column)
        texts.append(item->text(column));
    lines.append(QString(depth, QLatin1Char(' ')) + texts.join(QLatin1Char('|')));
    for (int i = 0; i < item->childCount(); ++i)
        appendLines(item->child(i), depth + 1, lines);
}

// The tree as lines: one per item, depth-first, indented by depth, columns joined by "|".
inline QStringList treeLines(const QTreeWidget* tree)
{
    QStringList lines;
    for (int i = 0; i < tree->topLevelItemCount(); ++i)
        appendLines(tree->topLevelItem(i), 0, lines);
    return lines;
}

inline bool waitReady(GatewayComponentWidget& page)
{
    return QTest::qWaitFor([&] { return page.status() == QLatin1String("Ready"); }, ReadyTimeoutMs);
}

// Starts image on a simulator and connects it; null (with a warning) on failure.
inline QSharedPointer<_ZantDevice> connectSample(SimulatorProcess& simulator, const QString& image, const QString& id)
{
    if (!simulator.start(SimulatorProcess::sampleImage(image), id)) {
        qWarning("%s", qPrintable(simulator.errorString()));
        return {};
    }
    QList<QPair<QString, QString>> devices;
    Portlex::GetDevices(devices);
    for (const auto& entry : std::as_const(devices)) {
        if (entry.second != id)
            continue;
        QSharedPointer<_ZantDevice> device = Portlex::GetDevice(id);
        if (device && Portlex::ConnectDevice(device, QString(), QString()))
            return device;
        qWarning("connect failed: %s", qPrintable(Portlex::LastStatus()));
    }
    return {};
}

// An export compared with its expected document beside the test source; on a difference
// the actual text is written to the temporary folder for inspection.
inline bool matchesExpected(const QString& name, const QString& actual)
{
    QFile file(QFINDTESTDATA(QStringLiteral("expected/") + name));
    if (file.open(QIODevice::ReadOnly) && QString::fromUtf8(file.readAll()) == actual)
        return true;
    QFile out(QDir::temp().filePath(QStringLiteral("actual-") + name));
    if (out.open(QIODevice::WriteOnly))
        out.write(actual.toUtf8());
    qWarning("%s differs; the actual document is in %s", qPrintable(name), qPrintable(out.fileName()));
    return false;
}

} // namespace TreePageFixtures

Q_DECLARE_METATYPE(IdRecord)
