#include "PackageInstaller.h"

#include "PackageExtractor.h"
#include "TransferTable.h"

#include <QDir>
#include <QRandomGenerator>

#include <cstdio>

namespace {

bool renamePath(const QString& from, const QString& to)
{
    return std::rename(QFile::encodeName(from).constData(), QFile::encodeName(to).constData()) == 0;
}

QString makeStaging(const QString& installFolder)
{
    const QDir folder(installFolder);
    for (int attempt = 0; attempt < 16; ++attempt) {
        const QString name = TransferTable::StagingPrefix + QString::number(QRandomGenerator::global()->generate64(), 36);
        if (folder.mkdir(name))
            return folder.filePath(name);
    }
    return QString();
}

} // namespace

bool PackageInstaller::install(const QString& packagePath, const QString& packageName, const QString& installFolder,
                               const Rules& rules, QString* statusText)
{
    const QString staging = makeStaging(installFolder);
    if (staging.isEmpty()) {
        *statusText = QStringLiteral("Package %1 refused: the install folder cannot be written").arg(packageName);
        return false;
    }
    PackageExtractor extractor;
    extractor.setKeepAlive(rules.keepAlive);
    extractor.setEntryCheck([&rules](const QString& relativePath) {
        if (TransferTable::hasReservedName(relativePath))
            return QStringLiteral("the entry \"%1\" has a name the device keeps for its own temporary files").arg(relativePath);
        return rules.refuse ? rules.refuse(relativePath) : QString();
    });
    bool ok = QDir(staging).mkdir(QStringLiteral("new"))
        && extractor.extract(packagePath, QDir(staging).filePath(QStringLiteral("new")), rules.spaceLimit);
    if (!ok)
        *statusText = QStringLiteral("Package %1 refused: %2").arg(packageName, extractor.errorString());
    else if (!(ok = moveIntoPlace(staging, extractor.topLevelNames(), installFolder)))
        *statusText = QStringLiteral("Package %1 not installed: the install folder cannot be written").arg(packageName);
    else
        *statusText = QStringLiteral("Package %1 installed").arg(packageName);
    QDir(staging).removeRecursively();
    return ok;
}

// Each name replaces what the install folder holds under it; the old entry is parked in
// the staging folder until every name is in place, and put back if one fails.
bool PackageInstaller::moveIntoPlace(const QString& staging, const QStringList& names, const QString& installFolder)
{
    const QDir fresh(QDir(staging).filePath(QStringLiteral("new")));
    const QDir parked(QDir(staging).filePath(QStringLiteral("old")));
    if (!QDir().mkpath(parked.path()))
        return false;
    const QDir target(installFolder);
    QStringList moved;
    QStringList replaced;
    bool ok = true;
    for (const QString& name : names) {
        const QFileInfo existing(target.filePath(name));
        if (existing.exists() || existing.isSymLink()) {
            if (!(ok = renamePath(existing.filePath(), parked.filePath(name))))
                break;
            replaced.append(name);
        }
        if (!(ok = renamePath(fresh.filePath(name), target.filePath(name))))
            break;
        moved.append(name);
    }
    if (ok)
        return true;
    for (const QString& name : std::as_const(moved))
        renamePath(target.filePath(name), fresh.filePath(name));
    for (const QString& name : std::as_const(replaced))
        renamePath(parked.filePath(name), target.filePath(name));
    return false;
}
