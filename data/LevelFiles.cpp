#include "LevelFiles.h"

#include "DataFolders.h"

#include <QDir>

void listLevelFiles(QStringList& list)
{
    list.clear();
    for (const QString& folder : DataFolders::levelFolders()) {
        QStringList files;
        listLevelFiles(folder, files);
        list += files;
    }
}

void listLevelFiles(const QString& levelsDirectory, QStringList& list)
{
    list.clear();
    const QString prefix = levelsDirectory + QDir::separator();
    // Hidden files count too: the rule is only the ".xml" in the name.
    const QStringList names = QDir(levelsDirectory).entryList(QDir::Files | QDir::Hidden, QDir::Unsorted);
    for (const QString& name : names) {
        if (name.contains(QLatin1String(".xml"), Qt::CaseSensitive))
            list.append(prefix + name);
    }
}
