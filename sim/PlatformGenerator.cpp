#include "PlatformGenerator.h"

#include "DataFolders.h"
#include "IdFormat.h"
#include "MifEntry.h"
#include "MifWriter.h"
#include "NameDatabases.h"
#include "SampleBuilder.h"

#include <QCommandLineParser>
#include <QDir>
#include <QFile>
#include <QTextStream>

#include <algorithm>

namespace {

constexpr int FilesPerFolder = 40;
constexpr int BrokenEvery = 100;
constexpr int BrokenAt = 42;
constexpr quint32 PrivateClassBase = 0x7F000001;
// Module classes of a sub-family start at +0x801; the database names only the first few.
constexpr quint32 UnnamedClassOffset = 0xC00;
constexpr int MaxMifs = 1000000;

const char* const Suffixes[] = { ".mif", ".MIF", ".Mif", ".miF" };

QString fileBase(int index)
{
    return QStringLiteral("module%1").arg(index, 5, 10, QLatin1Char('0'));
}

QString folderOf(int index)
{
    // Four depths in turn, one to four folders below the output folder.
    const int group = index / FilesPerFolder;
    const QString name = QStringLiteral("group%1").arg(group, 4, 10, QLatin1Char('0'));
    switch (group % 4) {
    case 0:
        return QStringLiteral("release/") + name;
    case 1:
        return QStringLiteral("release/%1/variant").arg(name);
    case 2:
        return QStringLiteral("release/%1/variant/lib").arg(name);
    default:
        return name;
    }
}

QVector<quint32> classesOf(int index, const QVector<quint32>& known)
{
    QVector<quint32> classes;
    if (index % 7 == 6)
        return classes; // some modules export nothing
    const int count = 1 + index % 4;
    if (known.isEmpty()) {
        for (int c = 0; c < count; ++c)
            classes.append(PrivateClassBase + quint32(index) * 4 + quint32(c));
        return classes;
    }
    for (int c = 0; c < count; ++c)
        classes.append(known.at((index * 3 + c) % known.size()));
    classes.append((classes.first() & 0xFFFFF000u) | (UnnamedClassOffset + quint32(index) % 0x400));
    return classes;
}

} // namespace

bool PlatformGenerator::isBroken(int index)
{
    return index % BrokenEvery == BrokenAt;
}

int PlatformGenerator::brokenCount(int mifCount)
{
    return mifCount / BrokenEvery + (mifCount % BrokenEvery > BrokenAt ? 1 : 0);
}

QString PlatformGenerator::relativePath(int index)
{
    return folderOf(index) + QLatin1Char('/') + fileBase(index) + QLatin1String(Suffixes[index % 4]);
}

QVector<quint32> PlatformGenerator::classDatabaseIds(const QString& folder)
{
    QFile file(QDir(folder).filePath(QStringLiteral("ClassDB.xml")));
    QList<IdRecord> records;
    if (!file.open(QIODevice::ReadOnly) || !NameDatabases::readEntries(&file, QStringLiteral("class"), records))
        return {};
    QVector<quint32> ids;
    for (const IdRecord& record : records) {
        const quint32 id = parseHexId(record.id);
        if (id != 0)
            ids.append(id);
    }
    std::sort(ids.begin(), ids.end());
    ids.erase(std::unique(ids.begin(), ids.end()), ids.end());
    return ids;
}

QByteArray PlatformGenerator::moduleData(int index, const QVector<quint32>& knownClasses)
{
    MifEntry mif;
    mif.classes = classesOf(index, knownClasses);
    if (index % 3 == 0 && !knownClasses.isEmpty())
        mif.externalClasses.append(knownClasses.at((index + 7) % knownClasses.size()));
    if (index % 5 == 0 && !mif.classes.isEmpty())
        mif.mimeTypes.append({ mif.classes.first(), 0, QStringLiteral("application/x-platform-%1").arg(index) });
    mif.classCount = quint16(mif.classes.size());
    mif.externalClassCount = quint16(mif.externalClasses.size());
    mif.mimeTypeCount = quint16(mif.mimeTypes.size());
    return MifWriter::moduleData(mif);
}

QByteArray PlatformGenerator::brokenData(int index, const QByteArray& sound)
{
    switch ((index / BrokenEvery) % 4) {
    case 0:
        return QByteArray();
    case 1:
        return sound.left(sound.size() / 2);
    case 2:
        return SampleBuilder::fillerBytes(fileBase(index), 200);
    default: {
        MifWriter writer;
        writer.addResource(0x1234, 0, QByteArrayLiteral("not a module"));
        return writer.data();
    }
    }
}

bool PlatformGenerator::write(const QString& path, const QByteArray& data)
{
    return SampleBuilder::writeFile(path, data, &m_error);
}

bool PlatformGenerator::writeDecoys(const QString& outputDir)
{
    const QDir out(outputDir);
    return write(out.filePath(QStringLiteral("resources.mif/readme.txt")), "a folder, not a MIF\n")
        && write(out.filePath(QStringLiteral("mif")), "no suffix\n")
        && write(out.filePath(QStringLiteral("layout.mifx")), "another suffix\n");
}

bool PlatformGenerator::generate(const QString& outputDir, int mifCount, const QVector<quint32>& knownClasses)
{
    m_error.clear();
    if (mifCount < 0 || mifCount > MaxMifs) {
        m_error = QStringLiteral("the MIF count must lie between 0 and %1").arg(MaxMifs);
        return false;
    }
    const QDir out(outputDir);
    if (out.exists() && !out.isEmpty(QDir::AllEntries | QDir::Hidden | QDir::System | QDir::NoDotAndDotDot)) {
        m_error = QStringLiteral("%1 is not empty").arg(outputDir);
        return false;
    }
    if (!out.mkpath(QStringLiteral("."))) {
        m_error = QStringLiteral("cannot create %1").arg(outputDir);
        return false;
    }
    if (!writeDecoys(outputDir))
        return false;

    for (int i = 0; i < mifCount; ++i) {
        const QString base = out.filePath(folderOf(i) + QLatin1Char('/') + fileBase(i));
        const QByteArray sound = moduleData(i, knownClasses);
        if (!write(out.filePath(relativePath(i)), isBroken(i) ? brokenData(i, sound) : sound))
            return false;
        if (i % FilesPerFolder == 0 && !write(QDir(out.filePath(folderOf(i))).filePath(QStringLiteral("build.log")), "built\n"))
            return false;
        if (i % 10 == 0 && !write(base + QStringLiteral(".mod"), SampleBuilder::fillerBytes(fileBase(i), 256)))
            return false;
        if (i % 25 == 0 && !write(base + QStringLiteral(".mif.bak"), sound))
            return false;
    }
    return true;
}

int PlatformGenerator::run(const QStringList& arguments, QTextStream& out, QTextStream& err)
{
    QCommandLineParser parser;
    const QCommandLineOption mifs(QStringLiteral("mifs"), QString(), QStringLiteral("N"), QStringLiteral("100"));
    const QCommandLineOption names(QStringLiteral("names"), QString(), QStringLiteral("DIR"));
    parser.addOptions({ mifs, names });
    QStringList rest = arguments;
    rest.removeAt(1);
    if (!parser.parse(rest)) {
        err << "zantro-sim platform: " << parser.errorText() << "\n";
        return 2;
    }
    bool ok = false;
    const int count = parser.value(mifs).toInt(&ok);
    if (!ok || parser.positionalArguments().size() != 1) {
        err << "zantro-sim platform: expects OUT --mifs N [--names DIR]\n";
        return 2;
    }
    const QString outputDir = parser.positionalArguments().first();
    const QString namesDir = parser.isSet(names) ? parser.value(names) : DataFolders::nameDatabaseFolder();

    PlatformGenerator generator;
    if (!generator.generate(outputDir, count, classDatabaseIds(namesDir))) {
        err << "zantro-sim platform: " << generator.errorString() << "\n";
        return 1;
    }
    out << "zantro-sim platform: wrote " << count << " MIF files (" << brokenCount(count) << " broken) to "
        << outputDir << "\n";
    return 0;
}
