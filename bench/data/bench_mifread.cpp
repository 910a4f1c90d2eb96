// How much reading and decoding MIF files costs over reading their bytes, for the
// platform scan's 5,000-file case. Prints figures only.
#include "MifEntry.h"
#include "MifReader.h"
#include "MifWriter.h"

#include <QElapsedTimer>
#include <QFile>
#include <QStringList>
#include <QTemporaryDir>
#include <QTextStream>

#include <algorithm>
#include <functional>

namespace {

constexpr int FileCount = 5000;
constexpr int Rounds = 3;

MifEntry sampleEntry(int index)
{
    MifEntry entry;
    for (int i = 0; i < 5 + index % 40; ++i)
        entry.classes.append(0x01000000u + quint32(index * 64 + i));
    for (int i = 0; i < index % 4; ++i) {
        MifApplet applet;
        applet.classId = entry.classes.first();
        applet.baseId = quint16(i);
        entry.applets.append(applet);
        MifMimeType mimeType;
        mimeType.handlerClassId = applet.classId;
        mimeType.mimeType = QStringLiteral("application/x-sample-%1").arg(i);
        entry.mimeTypes.append(mimeType);
    }
    entry.externalClasses = { 0x02000001, 0x02000002 };
    entry.classCount = quint16(entry.classes.size());
    entry.appletCount = quint16(entry.applets.size());
    entry.externalClassCount = quint16(entry.externalClasses.size());
    entry.mimeTypeCount = quint16(entry.mimeTypes.size());
    return entry;
}

// Best of a few rounds, in milliseconds; the check value keeps the work from being optimised away.
double bestOf(const std::function<qint64()>& pass, qint64& check)
{
    double best = 1e300;
    for (int round = 0; round < Rounds; ++round) {
        QElapsedTimer timer;
        timer.start();
        check = pass();
        best = std::min(best, timer.nsecsElapsed() / 1e6);
    }
    return best;
}

} // namespace

int main()
{
    QTextStream out(stdout);
    QTemporaryDir dir;
    if (!dir.isValid()) {
        out << "cannot create a temporary folder\n";
        return 1;
    }

    QStringList paths;
    qint64 totalBytes = 0;
    for (int i = 0; i < FileCount; ++i) {
        const QString path = dir.filePath(QStringLiteral("module%1.mif").arg(i));
        QString error;
        if (!MifWriter::writeModuleFile(path, sampleEntry(i), &error)) {
            out << error << "\n";
            return 1;
        }
        totalBytes += QFile(path).size();
        paths.append(path);
    }

    qint64 rawCheck = 0;
    const double raw = bestOf([&] {
        qint64 bytes = 0;
        for (const QString& path : paths) {
            QFile file(path);
            if (file.open(QIODevice::ReadOnly))
                bytes += file.readAll().size();
        }
        return bytes;
    }, rawCheck);

    qint64 fileCheck = 0;
    const double fromFile = bestOf([&] {
        qint64 classes = 0;
        MifReader reader;
        MifEntry entry;
        for (const QString& path : paths)
            if (reader.readFile(path) && reader.decodeModule(entry))
                classes += entry.classes.size();
        return classes;
    }, fileCheck);

    qint64 memoryCheck = 0;
    const double fromMemory = bestOf([&] {
        qint64 classes = 0;
        MifReader reader;
        MifEntry entry;
        for (const QString& path : paths) {
            QFile file(path);
            if (file.open(QIODevice::ReadOnly) && reader.readData(file.readAll()) && reader.decodeModule(entry))
                classes += entry.classes.size();
        }
        return classes;
    }, memoryCheck);

    out << "files: " << FileCount << ", bytes: " << totalBytes << ", best of " << Rounds << " rounds (warm cache)\n";
    const auto line = [&](const char* what, double ms, qint64 check) {
        out << qSetFieldWidth(48) << Qt::left << what << qSetFieldWidth(0) << QString::number(ms, 'f', 1) << " ms  "
            << QString::number(ms * 1000.0 / FileCount, 'f', 2) << " us/file  x" << QString::number(ms / raw, 'f', 2)
            << "  (" << check << ")\n";
    };
    line("raw bytes (QFile::readAll)", raw, rawCheck);
    line("MifReader::readFile + decodeModule", fromFile, fileCheck);
    line("readAll + MifReader::readData + decodeModule", fromMemory, memoryCheck);
    return 0;
}
