#pragma once

// Records, waits and readers shared by the page tests.

#include "DeviceCache.h"
#include "SimulatorProcess.h"
#include "TestSupport.h"

#include <QDir>
#include <QProcess>
#include <QTableWidget>
#include <QTest>
#include <QTreeWidget>

namespace PageFixtures {

inline IdRecord makeClass(const QString& id, const QString& name, const QString& family, const QString& subFamily,
                          bool available = true, const QString& source = QString())
{
    return IdRecord{id, name, family, subFamily, source, QString(), available};
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

// A simulator image of device id: body inside <device>, one 16 MiB flash volume with the further
// attributes volume, and the modules (make-sample entries) that zantro-sim builds on it.
inline bool writeImage(const QString& folder, const QByteArray& id, const QByteArray& volume,
                       const QByteArray& body = QByteArray(), const QByteArray& modules = QByteArray())
{
    const QDir image(folder);
    return image.mkpath("flash/usermod")
        && TestSupport::writeFile(image.filePath("device.xml"),
                                  "<device id=\"" + id + "\" name=\"" + id + "\" connection=\"simulator\">\n <identity phoneName=\""
                                      + id + "\" targetId=\"0x0A1100FD\" zantVersion=\"3.2.9\"/>\n" + body
                                      + " <volume id=\"1\" name=\"Flash\" mount=\"/\" folder=\"flash\" size=\"16777216\"" + volume
                                      + "/>\n</device>\n")
        && TestSupport::writeFile(image.filePath("modules.xml"), "<sample>\n" + modules + "</sample>\n")
        && QProcess::execute(SimulatorProcess::executable(), {"make-sample", image.filePath("modules.xml"), folder}) == 0;
}

// The tree as lines: one per item, depth-first, indented by depth, columns joined by "|".
inline QStringList treeLines(const QTreeWidget* tree)
{
    QStringList lines;
    QTreeWidgetItemIterator it(const_cast<QTreeWidget*>(tree));
    for (; *it; ++it) {
        QStringList texts;
        int depth = 0;
        for (const QTreeWidgetItem* up = (*it)->parent(); up; up = up->parent())
            ++depth;
        for (int column = 0; column < tree->columnCount(); ++column)
            texts.append((*it)->text(column));
        lines.append(QString(depth, QLatin1Char(' ')) + texts.join(QLatin1Char('|')));
    }
    return lines;
}

inline QStringList columnTexts(const QAbstractItemModel* model, int column)
{
    QStringList texts;
    for (int row = 0; row < model->rowCount(); ++row)
        texts.append(model->index(row, column).data().toString());
    return texts;
}

inline QStringList columnTexts(const QTableWidget* table, int column)
{
    QStringList texts;
    for (int row = 0; row < table->rowCount(); ++row)
        texts.append(table->item(row, column) ? table->item(row, column)->text() : QStringLiteral("<none>"));
    return texts;
}

// The first argument of every emission a QSignalSpy recorded, as text.
inline QStringList signalTexts(const QList<QList<QVariant>>& emissions)
{
    QStringList texts;
    for (const QList<QVariant>& arguments : emissions)
        texts.append(arguments.at(0).toString());
    return texts;
}

// Ticks page by hand until done() holds: its own first tick would come only after 500 ms.
template <typename Page, typename Done>
bool tickUntil(Page& page, Done done)
{
    return QTest::qWaitFor([&] {
        if (!done())
            page.onTimeElapse();
        return done();
    }, 30000);
}

template <typename Page>
bool fillByHand(Page& page)
{
    return tickUntil(page, [&page] { return page.isComplete(); });
}

} // namespace PageFixtures
