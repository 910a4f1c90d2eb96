#include "ModuleReport.h"

QStringList ModuleReport::cells(const ModuleInfo& module)
{
    return {module.name, module.version, module.GetModuleProperty(), module.GetModuleSig(), module.path,
            module.copyright};
}

Report ModuleReport::build(const QVector<QStringList>& rows)
{
    Report report(QStringLiteral("zant-modules"), QStringLiteral("modules"), QStringLiteral("module"));
    report.declare(QStringLiteral("module"),
                   {{QStringLiteral("name"), ReportField::Text, QStringLiteral("Module Name")},
                    {QStringLiteral("version"), ReportField::Text, QStringLiteral("Component Services Version")},
                    {QStringLiteral("type"), ReportField::Flags, QStringLiteral("Module Type")},
                    {QStringLiteral("signature"), ReportField::Text, QStringLiteral("Signature")},
                    {QStringLiteral("path"), ReportField::Text, QStringLiteral("Path")},
                    {QStringLiteral("copyright"), ReportField::Text, QStringLiteral("Copyright")}});
    ReportNode& modules = report.root();
    modules.children.reserve(rows.size());
    for (const QStringList& cell : rows) {
        modules.add(QStringLiteral("module"))
            .set(QStringLiteral("copyright"), cell.at(CopyrightColumn))
            .set(QStringLiteral("path"), cell.at(PathColumn))
            .set(QStringLiteral("signature"), cell.at(SignatureColumn))
            .set(QStringLiteral("type"), cell.at(TypeColumn))
            .set(QStringLiteral("version"), cell.at(VersionColumn))
            .set(QStringLiteral("name"), cell.at(NameColumn));
    }
    return report;
}
