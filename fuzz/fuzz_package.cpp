// Feeds arbitrary bytes as a .zantro package to the simulator's extraction, in a fresh
// folder per input; aborts if anything lands beside the target folder or a link appears.
#include "PackageExtractor.h"

#include <QDir>
#include <QDirIterator>
#include <QFile>
#include <QTemporaryDir>

#include <cstdint>
#include <cstdlib>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    QTemporaryDir dir;
    const QDir root(dir.path());
    QFile package(root.filePath(QStringLiteral("p.zantro")));
    if (!dir.isValid() || !root.mkdir(QStringLiteral("into")) || !package.open(QIODevice::WriteOnly)
        || package.write(reinterpret_cast<const char*>(data), qint64(size)) != qint64(size))
        abort();
    package.close();

    PackageExtractor extractor;
    extractor.extract(package.fileName(), root.filePath(QStringLiteral("into")), 64 * 1024 * 1024);

    const QStringList beside = root.entryList(QDir::AllEntries | QDir::Hidden | QDir::System | QDir::NoDotAndDotDot);
    if (beside != QStringList({QStringLiteral("into"), QStringLiteral("p.zantro")}))
        abort();
    QDirIterator it(root.filePath(QStringLiteral("into")), QDir::AllEntries | QDir::Hidden | QDir::System | QDir::NoDotAndDotDot,
                    QDirIterator::Subdirectories);
    while (it.hasNext()) {
        const QFileInfo entry(it.next());
        if (entry.isSymLink() || !(entry.isFile() || entry.isDir()))
            abort();
    }
    return 0;
}
