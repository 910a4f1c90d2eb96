#include "FolderReport.h"

namespace {

void addEntry(ReportNode& folder, const QString& type, const QString& name, const QString& path, const QString& size,
              const QString& attributes)
{
    folder.add(QStringLiteral("entry"))
        .set(QStringLiteral("type"), type)
        .set(QStringLiteral("name"), name)
        .set(QStringLiteral("path"), path)
        .set(QStringLiteral("size"), size)
        .set(QStringLiteral("attributes"), attributes);
}

} // namespace

Report FolderReport::build(const _DirectoryInfo& level)
{
    Report report(QStringLiteral("zant-folder"), QStringLiteral("folder"), QStringLiteral("entry"));
    report.declare(QStringLiteral("folder"),
                   {{QStringLiteral("name"), ReportField::Text, QString()},
                    {QStringLiteral("path"), ReportField::Text, QString()}});
    report.declare(QStringLiteral("entry"),
                   {{QStringLiteral("type"), ReportField::Text, QStringLiteral("Type")},
                    {QStringLiteral("name"), ReportField::Text, QStringLiteral("Name")},
                    {QStringLiteral("path"), ReportField::Text, QStringLiteral("Path")},
                    {QStringLiteral("size"), ReportField::Integer, QStringLiteral("Size")},
                    {QStringLiteral("attributes"), ReportField::Text, QStringLiteral("File Attributes")}});
    ReportNode& folder = report.root();
    folder.set(QStringLiteral("name"), level.Name()).set(QStringLiteral("path"), level.Path());
    folder.children.reserve(level.directories.size() + level.files.size());
    for (const QSharedPointer<_DirectoryInfo>& directory : level.directories)
        addEntry(folder, QStringLiteral("folder"), directory->Name(), directory->Path(), QString(), QString());
    for (const QSharedPointer<_FileInfo>& file : level.files)
        addEntry(folder, QStringLiteral("file"), file->Name(), file->Path(), QString::number(file->size), file->Attributes());
    return report;
}
