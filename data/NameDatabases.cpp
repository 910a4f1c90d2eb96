#include "NameDatabases.h"

#include "IdFormat.h"
#include "XmlReadPolicy.h"

#include <QDir>
#include <QDomDocument>
#include <QFile>

namespace {

const QString NotFound = QStringLiteral("not found");
const QString Unknown = QStringLiteral("unknown");

} // namespace

void NameDatabases::load(const QString& directory)
{
    for (const IdRecord& e : readFile(directory, QStringLiteral("ClassDB.xml"), QStringLiteral("class")))
        m_classNames.insert(e.id, e);
    for (const IdRecord& e : readFile(directory, QStringLiteral("InterfaceDB.xml"), QStringLiteral("interface")))
        m_interfaceNames.insert(e.id, e);
    for (const IdRecord& e : readFile(directory, QStringLiteral("PriviledgeDB.xml"), QStringLiteral("priviledge")))
        m_priviledgeNames.insert(e.id, PriviledgeRecord{e.id, e.name, e.family, e.subFamily});
}

void NameDatabases::initialize(const QString& directory)
{
    if (m_initialized)
        return;
    load(directory);
    m_initialized = true;
}

void NameDatabases::lookupClass(const QString& idText, QString& name, QString& family, QString& subFamily) const
{
    lookupIn(m_classNames, idText, name, family, subFamily);
}

void NameDatabases::lookupClass(quint32 idNumber, QString& idText, QString& name, QString& family, QString& subFamily) const
{
    idText = formatId(idNumber);
    lookupClass(idText, name, family, subFamily);
}

void NameDatabases::lookupInterface(const QString& idText, QString& name, QString& family, QString& subFamily) const
{
    lookupIn(m_interfaceNames, idText, name, family, subFamily);
}

void NameDatabases::lookupPriviledge(const QString& idText, PriviledgeRecord& record) const
{
    record = m_priviledgeNames.value(idText, PriviledgeRecord{idText, NotFound, Unknown, Unknown});
}

void NameDatabases::lookupPriviledge(quint32 idNumber, PriviledgeRecord& record) const
{
    lookupPriviledge(formatId(idNumber), record);
}

void NameDatabases::priviledgesInRange(quint32 low, quint32 high, QList<PriviledgeRecord>& list) const
{
    list.clear();
    for (auto it = m_priviledgeNames.cbegin(); it != m_priviledgeNames.cend(); ++it) {
        const quint32 id = parseHexId(it.key());
        if (id >= low && id <= high)
            list.append(it.value());
    }
}

bool NameDatabases::readEntries(QIODevice* device, const QString& elementName, QList<IdRecord>& entries,
                                QString* error)
{
    XmlReadPolicy policy(XmlReadPolicy::DatabaseFileBytes);
    QDomDocument document;
    if (!policy.read(device, document)) {
        if (error)
            *error = policy.errorString();
        return false;
    }

    const QDomElement root = document.documentElement();
    for (QDomElement e = root.firstChildElement(elementName); !e.isNull(); e = e.nextSiblingElement(elementName)) {
        IdRecord record;
        record.id = e.attribute(QStringLiteral("id"));
        record.name = e.attribute(QStringLiteral("name"));
        record.family = e.attribute(QStringLiteral("family"));
        record.subFamily = e.attribute(QStringLiteral("subFamily"));
        if (!record.id.isEmpty() && !record.name.isEmpty())
            entries.append(record);
    }
    return true;
}

void NameDatabases::lookupIn(const IdRecordMap& map, const QString& idText, QString& name, QString& family, QString& subFamily)
{
    const auto it = map.constFind(idText);
    if (it == map.cend()) {
        name = NotFound;
        family = Unknown;
        subFamily = Unknown;
        return;
    }
    name = it->name;
    family = it->family;
    subFamily = it->subFamily;
}

QList<IdRecord> NameDatabases::readFile(const QString& directory, const QString& fileName, const QString& elementName)
{
    QList<IdRecord> entries;
    QFile file(directory + QDir::separator() + fileName);
    if (file.open(QIODevice::ReadOnly))
        readEntries(&file, elementName, entries);
    return entries;
}
