#include "MifEntryReport.h"

#include "IdFormat.h"
#include "NameLibrary.h"

namespace {

struct NamedClass
{
    QString id;
    QString name;
    QString family;
    QString subFamily;
};

// An id the class database does not know is named "not found", "unknown", "unknown".
NamedClass namedClass(quint32 id)
{
    NamedClass named;
    lookupClass(id, named.id, named.name, named.family, named.subFamily);
    return named;
}

using Section = MifEntryReport::Section;

const QStringList ClassAttributes = {"name", "id", "family", "subfamily"};

Section classSection(const QString& element, const QString& item, const QVector<quint32>& ids)
{
    Section section {element, item, ClassAttributes, -1, {}};
    section.rows.reserve(ids.size());
    for (const quint32 id : ids) {
        const NamedClass named = namedClass(id);
        section.rows.append({named.name, named.id, named.family, named.subFamily});
    }
    return section;
}

Section appletSection(const QVector<MifApplet>& applets)
{
    Section section {"applets", "applet",
        ClassAttributes + QStringList {"baseid", "apptype", "host", "privset", "flags"}, 4, {}};
    for (const MifApplet& applet : applets) {
        const NamedClass named = namedClass(applet.classId);
        section.rows.append({named.name, named.id, named.family, named.subFamily,
            QString::number(applet.baseId), formatShortId(applet.appType), formatId(applet.host),
            formatShortId(applet.privSet), formatShortId(applet.flags)});
    }
    return section;
}

Section notifierSection(const QVector<MifNotifier>& notifiers)
{
    Section section {"notifiers", "notifier",
        {"typename", "typeid", "typefamily", "typesubfamily", "notifiername", "notifierid", "notifierfamily",
            "notifiersubfamily", "mask"},
        -1, {}};
    for (const MifNotifier& notifier : notifiers) {
        const NamedClass type = namedClass(notifier.typeId);
        const NamedClass named = namedClass(notifier.notifierId);
        section.rows.append({type.name, type.id, type.family, type.subFamily, named.name, named.id,
            named.family, named.subFamily, formatId(notifier.mask)});
    }
    return section;
}

Section mimeTypeSection(const QVector<MifMimeType>& mimeTypes)
{
    Section section {"mimetypes", "mimetype",
        {"value", "handlerid", "handlername", "handlerfamily", "handlersubfamily", "baseid", "basename",
            "basefamily", "basesubfamily"},
        -1, {}};
    for (const MifMimeType& mimeType : mimeTypes) {
        const NamedClass handler = namedClass(mimeType.handlerClassId);
        const NamedClass base = namedClass(mimeType.baseClassId);
        section.rows.append({mimeType.mimeType, handler.id, handler.name, handler.family, handler.subFamily,
            base.id, base.name, base.family, base.subFamily});
    }
    return section;
}

} // namespace

QVector<Section> MifEntryReport::sections(const MifEntry& entry)
{
    return {classSection("classes", "class", entry.classes), appletSection(entry.applets),
        classSection("externalClasses", "externalClass", entry.externalClasses),
        notifierSection(entry.notifiers), mimeTypeSection(entry.mimeTypes)};
}

Report MifEntryReport::build(const MifEntry& entry)
{
    Report report(QStringLiteral("zant-mif-entry"), QStringLiteral("mifEntry"), QStringLiteral("class"));
    ReportNode& root = report.root();
    root.set(QStringLiteral("classCount"), QString::number(entry.classCount))
        .set(QStringLiteral("appletCount"), QString::number(entry.appletCount))
        .set(QStringLiteral("extClassCount"), QString::number(entry.externalClassCount))
        .set(QStringLiteral("notificationCount"), QString::number(entry.notificationCount))
        .set(QStringLiteral("mimeTypeCount"), QString::number(entry.mimeTypeCount));
    const QVector<Section> all = sections(entry);
    for (const Section& section : all) {
        // The counts above still say what the module states.
        if (section.rows.isEmpty())
            continue;
        ReportNode& list = root.add(section.element);
        list.children.reserve(section.rows.size());
        for (const QStringList& cells : section.rows) {
            ReportNode& row = list.add(section.item);
            for (int i = 0; i < cells.size(); ++i)
                row.set(section.attributes.at(i), cells.at(i));
        }
    }
    return report;
}
