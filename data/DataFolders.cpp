#include "DataFolders.h"

#include <QCoreApplication>
#include <QDir>
#include <QFileInfo>
#include <QStandardPaths>

namespace {

const QString SubFolder = QStringLiteral("delvix");
const QString LevelsFolder = QStringLiteral("Levels");

} // namespace

QStringList DataFolders::searchPath()
{
    const QString programFolder = QCoreApplication::applicationDirPath();
    QStringList folders { programFolder, QDir::cleanPath(programFolder + QStringLiteral("/../share/") + SubFolder) };
    for (const QString& data : QStandardPaths::standardLocations(QStandardPaths::GenericDataLocation)) {
        const QString folder = QDir::cleanPath(data + QLatin1Char('/') + SubFolder);
        if (!folders.contains(folder))
            folders.append(folder);
    }
    return folders;
}

QString DataFolders::locate(const QString& name)
{
    for (const QString& folder : searchPath()) {
        const QString path = folder + QLatin1Char('/') + name;
        if (QFileInfo::exists(path))
            return path;
    }
    return QString();
}

QString DataFolders::nameDatabaseFolder()
{
    const QString database = locate(QStringLiteral("ClassDB.xml"));
    return database.isEmpty() ? QCoreApplication::applicationDirPath() : QFileInfo(database).path();
}

QStringList DataFolders::levelFolders()
{
    QStringList folders;
    const QString shipped = locate(LevelsFolder);
    if (!shipped.isEmpty())
        folders.append(shipped);
    const QString own = QDir::cleanPath(QStandardPaths::writableLocation(QStandardPaths::GenericDataLocation) + QLatin1Char('/')
                                        + SubFolder + QLatin1Char('/') + LevelsFolder);
    if (!folders.contains(own))
        folders.append(own);
    return folders;
}
