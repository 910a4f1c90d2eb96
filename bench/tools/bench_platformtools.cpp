// The two platform tools on large inputs, printing figures only:
// - the comparison of two scans of 50,000 class ids each (40,000 shared): the time to load
//   both into the comparison view, next to a row-by-row search for each id (every row from
//   the top, as a plain table search does) and the view, both on a smaller size in the same run;
// - the platform scan of 5,000 MIF files exporting 50,000 class ids in all, from the chosen
//   folder to a filled dialog (progress window shown), with the gateway's and the
//   dialog's shares apart.
//
// bench_platformtools [--ids N] [--small N] [--mifs N] [--classes N] [--rounds N]

#include "FreeFormProgressDialog.h"
#include "IdFormat.h"
#include "MifEntry.h"
#include "MifWriter.h"
#include "NameLibrary.h"
#include "PlatformClassIDDialog.h"
#include "PlatformComparisonDialog.h"
#include "PlatformTools.h"
#include "Portlex.h"

#include <algorithm>
#include <cstdio>
#include <functional>
#include <QApplication>
#include <QCommandLineParser>
#include <QDir>
#include <QElapsedTimer>
#include <QFile>
#include <QTableWidget>
#include <QTemporaryDir>
#include <QTextStream>

namespace {

// Ids of the class database come first, so some rows are named and most are not.
const quint32 Known[] = {0x01011001, 0x01011002, 0x01012001, 0x01013001};

quint32 classId(int index)
{
    return index < 4 ? Known[index] : 0x0A000000u + quint32(index);
}

// A scan of ids first .. first+count-1, as the scan dialog writes one.
bool writeScan(const QString& path, int first, int count)
{
    QFile file(path);
    if (!file.open(QIODevice::WriteOnly))
        return false;
    QTextStream out(&file);
    out << "<!DOCTYPE platform-scan>\n<ZTOINFO>\n <ZTOVERSION version=\"\"/>\n <ZantHeaderDataList>\n";
    for (int i = first; i < first + count; ++i) {
        QString idText, name, family, subFamily;
        lookupClass(classId(i), idText, name, family, subFamily);
        out << "  <ZTOId name=\"" << name << "\" value=\"" << idText << "\" family=\"" << family
            << "\" subfamily=\"" << subFamily << "\"/>\n";
    }
    out << " </ZantHeaderDataList>\n</ZTOINFO>\n";
    return out.status() == QTextStream::Ok;
}

double msOf(const std::function<void()>& work)
{
    QElapsedTimer timer;
    timer.start();
    work();
    return timer.nsecsElapsed() / 1e6;
}

// Both scans loaded into a fresh comparison dialog, as the tool opens them; rows through *rows.
double viewLoad(const QString& a, const QString& b, int* rows)
{
    auto* dialog = new PlatformComparisonDialog;
    bool loaded = false;
    const double ms = msOf([&] { loaded = dialog->loadFiles({a, b}); });
    *rows = loaded ? dialog->_platformView->_comparisonTable->model()->rowCount() : -1;
    delete dialog;
    return ms;
}

// The same two loads with each id looked up by a search of the rows from the top.
double rowSearchLoad(const QVector<QStringList>& scans, int* rows)
{
    QTableWidget table(0, 4);
    const QIcon check(QStringLiteral(":/Resources/CheckBoxIcon.png"));
    const double ms = msOf([&] {
        for (const QStringList& ids : scans) {
            const int column = table.columnCount();
            table.setColumnCount(column + 1);
            for (const QString& id : ids) {
                int row = 0;
                while (row < table.rowCount() && table.item(row, 1)->text() != id)
                    ++row;
                if (row == table.rowCount()) {
                    table.insertRow(row);
                    table.setItem(row, 1, new QTableWidgetItem(id));
                }
                table.setItem(row, column, new QTableWidgetItem(check, QString()));
            }
        }
    });
    *rows = table.rowCount();
    return ms;
}

QStringList idTexts(int first, int count)
{
    QStringList ids;
    for (int i = first; i < first + count; ++i)
        ids << formatId(classId(i));
    return ids;
}

bool writePlatform(const QString& folder, int mifs, int classesPerMif)
{
    for (int m = 0; m < mifs; ++m) {
        MifEntry entry;
        for (int c = 0; c < classesPerMif; ++c)
            entry.classes.append(classId((m * classesPerMif + c) % (mifs * classesPerMif / 2 + 1)));
        entry.classCount = quint16(entry.classes.size());
        const QString path = QStringLiteral("%1/group%2/module%3.mif").arg(folder).arg(m / 50).arg(m);
        QDir().mkpath(QFileInfo(path).absolutePath());
        QString error;
        if (!MifWriter::writeModuleFile(path, entry, &error))
            return false;
    }
    return true;
}

} // namespace

int main(int argc, char** argv)
{
    if (qEnvironmentVariableIsEmpty("QT_QPA_PLATFORM"))
        qputenv("QT_QPA_PLATFORM", "offscreen");
    QTemporaryDir work;
    qputenv("XDG_CONFIG_HOME", QFile::encodeName(work.filePath(QStringLiteral("config"))));
    QApplication app(argc, argv);
    QCommandLineParser options;
    options.addHelpOption();
    options.addOption({QStringLiteral("ids"), QStringLiteral("ids per scan"), QStringLiteral("N"),
        QStringLiteral("50000")});
    options.addOption({QStringLiteral("small"), QStringLiteral("ids per scan, row search"),
        QStringLiteral("N"), QStringLiteral("5000")});
    options.addOption(
        {QStringLiteral("mifs"), QStringLiteral("MIF files"), QStringLiteral("N"), QStringLiteral("5000")});
    options.addOption({QStringLiteral("classes"), QStringLiteral("class ids in all"), QStringLiteral("N"),
        QStringLiteral("50000")});
    options.addOption(
        {QStringLiteral("rounds"), QStringLiteral("rounds"), QStringLiteral("N"), QStringLiteral("3")});
    options.process(app);
    const int ids = std::max(10, options.value(QStringLiteral("ids")).toInt());
    const int small = std::max(10, options.value(QStringLiteral("small")).toInt());
    const int mifs = std::max(1, options.value(QStringLiteral("mifs")).toInt());
    const int perMif = std::max(1, options.value(QStringLiteral("classes")).toInt() / mifs);
    const int rounds = std::max(1, options.value(QStringLiteral("rounds")).toInt());
    initializeLibrary();

    // Four fifths of each scan are shared, as 40,000 of 50,000.
    const QString a = work.filePath(QStringLiteral("a.xml")), b = work.filePath(QStringLiteral("b.xml"));
    const QString sa = work.filePath(QStringLiteral("sa.xml")), sb = work.filePath(QStringLiteral("sb.xml"));
    if (!writeScan(a, 0, ids) || !writeScan(b, ids / 5, ids) || !writeScan(sa, 0, small)
        || !writeScan(sb, small / 5, small)) {
        std::fprintf(stderr, "cannot write the scans\n");
        return 1;
    }
    double large = 1e300, smallView = 1e300, smallSearch = 1e300;
    int largeRows = 0, smallRows = 0, searchRows = 0;
    for (int round = 0; round < rounds; ++round) {
        large = std::min(large, viewLoad(a, b, &largeRows));
        smallView = std::min(smallView, viewLoad(sa, sb, &smallRows));
        smallSearch = std::min(
            smallSearch, rowSearchLoad({idTexts(0, small), idTexts(small / 5, small)}, &searchRows));
    }
    std::printf(
        "comparison, best of %d (%s):\n", rounds, qPrintable(qEnvironmentVariable("QT_QPA_PLATFORM")));
    std::printf("  view, 2 x %6d ids    %9.1f ms, %d rows (target under 200 ms) %s\n", ids, large, largeRows,
        large < 200 ? "met" : "MISSED");
    std::printf("  view, 2 x %6d ids    %9.1f ms, %d rows\n", small, smallView, smallRows);
    std::printf(
        "  row search, 2 x %6d  %9.1f ms, %d rows (ids only, no names)\n", small, smallSearch, searchRows);

    const QString platform = work.filePath(QStringLiteral("platform"));
    if (!writePlatform(platform, mifs, perMif)) {
        std::fprintf(stderr, "cannot write the platform\n");
        return 1;
    }
    double total = 1e300, gateway = 1e300, fill = 1e300, quietFill = 1e300;
    int rows = 0;
    for (int round = 0; round < rounds; ++round) {
        std::vector<MifEntry> entries;
        gateway = std::min(
            gateway, msOf([&] { Portlex::GetPlatformClassIds(platform, entries, nullptr, nullptr); }));
        // The dialog's own part, reporting to a progress window and to none.
        for (const bool reporting : {true, false}) {
            FreeFormProgressDialog progress;
            progress.show();
            PlatformClassIDDialog dialog;
            dialog.setProgressDialog(reporting ? &progress : nullptr);
            // As after the gateway's scan, the bar has its range.
            FreeFormProgressDialog::progressCallback(&progress, -1, int(entries.size()), QString());
            double& best = reporting ? fill : quietFill;
            best = std::min(best, msOf([&] { dialog.populate(entries); }));
        }
        FreeFormProgressDialog progress;
        std::unique_ptr<PlatformClassIDDialog> dialog;
        total = std::min(total, msOf([&] {
            progress.show();
            dialog = scanPlatformFolder(platform, &progress);
        }));
        rows = dialog ? dialog->_platformClassTable->rowCount() : -1;
    }
    std::printf("platform scan, best of %d: %d MIF files, %d class ids\n", rounds, mifs, rows);
    std::printf("  folder to filled dialog %9.1f ms (target under 2000 ms) %s\n", total,
        total < 2000 ? "met" : "MISSED");
    std::printf("  the gateway alone       %9.1f ms (without progress window)\n", gateway);
    std::printf("  populate alone          %9.1f ms (%.1f ms without progress window)\n", fill, quietFill);
    return 0;
}
