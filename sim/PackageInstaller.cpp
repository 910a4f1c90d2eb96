#include "PackageInstaller.h"

#include "PackageExtractor.h"
#include "TransferTable.h"

#include <QDir>
#include <QDirIterator>
#include <QRandomGenerator>
#include <QSaveFile>

#include <cstdio>

namespace {

const QString PlanName = QStringLiteral("plan");

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

bool stopHere(int step)
{
    return PackageInstaller::faultHook && PackageInstaller::faultHook(step);
}

} // namespace

std::function<bool(int step)> PackageInstaller::faultHook;

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
    bool killed = false;
    if (!ok)
        *statusText = QStringLiteral("Package %1 refused: %2").arg(packageName, extractor.errorString());
    else if (!(ok = moveIntoPlace(staging, extractor.topLevelNames(), installFolder, &killed)) && killed)
        return false;
    else if (!ok)
        *statusText = QStringLiteral("Package %1 not installed: the install folder cannot be written").arg(packageName);
    else
        *statusText = QStringLiteral("Package %1 installed").arg(packageName);
    QDir(staging).removeRecursively();
    return ok;
}

// Each name replaces what the install folder holds under it; the old entry is parked in
// the staging folder until every name is in place, and put back if one fails.
bool PackageInstaller::moveIntoPlace(const QString& staging, const QStringList& names, const QString& installFolder,
                                     bool* killed)
{
    const QDir fresh(QDir(staging).filePath(QStringLiteral("new")));
    const QDir parked(QDir(staging).filePath(QStringLiteral("old")));
    if (!QDir().mkpath(parked.path()))
        return false;
    QSaveFile plan(QDir(staging).filePath(PlanName));
    if (!plan.open(QIODevice::WriteOnly) || plan.write(names.join(QLatin1Char('\n')).toUtf8()) < 0 || !plan.commit())
        return false;
    const QDir target(installFolder);
    int step = 0;
    bool ok = true;
    for (const QString& name : names) {
        const QFileInfo existing(target.filePath(name));
        if ((*killed = stopHere(step++)))
            return false;
        if (existing.exists() || existing.isSymLink()) {
            if (!(ok = renamePath(existing.filePath(), parked.filePath(name))))
                break;
        }
        if ((*killed = stopHere(step++)))
            return false;
        if (!(ok = renamePath(fresh.filePath(name), target.filePath(name))))
            break;
    }
    if ((*killed = stopHere(step++)))
        return false;
    if (!ok) {
        rollBack(staging, installFolder);
        return false;
    }
    // The switch is done: from here on the new set stands.
    if (QFile::remove(QDir(staging).filePath(PlanName)))
        return true;
    rollBack(staging, installFolder);
    return false;
}

// Undoes a switch as the staging folder shows it: a name no longer in new/ was moved into
// place, so it goes back there; then a parked old entry returns. Each step is one rename,
// and a repeated run finds nothing left to do for the names already done.
void PackageInstaller::rollBack(const QString& staging, const QString& installFolder)
{
    QFile plan(QDir(staging).filePath(PlanName));
    if (!plan.open(QIODevice::ReadOnly))
        return;
    const QStringList names = QString::fromUtf8(plan.readAll()).split(QLatin1Char('\n'), Qt::SkipEmptyParts);
    const QDir fresh(QDir(staging).filePath(QStringLiteral("new")));
    const QDir parked(QDir(staging).filePath(QStringLiteral("old")));
    const QDir target(installFolder);
    for (const QString& name : names) {
        const QFileInfo inPlace(target.filePath(name));
        const QFileInfo old(parked.filePath(name));
        const bool movedIn = !fresh.exists(name) && !QFileInfo(fresh.filePath(name)).isSymLink();
        if (movedIn && (inPlace.exists() || inPlace.isSymLink()))
            renamePath(inPlace.filePath(), fresh.filePath(name));
        if (old.exists() || old.isSymLink())
            renamePath(old.filePath(), target.filePath(name));
    }
    plan.close();
    plan.remove();
}

int PackageInstaller::recover(const QString& root)
{
    int recovered = 0;
    QDirIterator it(root, QDir::Dirs | QDir::Hidden | QDir::NoDotAndDotDot | QDir::NoSymLinks, QDirIterator::Subdirectories);
    QStringList stagings;
    while (it.hasNext()) {
        it.next();
        if (it.fileName().startsWith(TransferTable::StagingPrefix))
            stagings.append(it.filePath());
    }
    for (const QString& staging : std::as_const(stagings)) {
        if (!QFileInfo::exists(QDir(staging).filePath(PlanName)))
            continue;
        rollBack(staging, QFileInfo(staging).path());
        ++recovered;
    }
    return recovered;
}
