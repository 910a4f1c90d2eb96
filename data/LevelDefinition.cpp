#include "LevelDefinition.h"

#include "IdFormat.h"
#include "XmlReadPolicy.h"

#include <QDomDocument>
#include <QFile>

bool LevelDefinition::load(const QString& path)
{
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly)) {
        m_error = QStringLiteral("cannot open %1: %2").arg(path, file.errorString());
        return false;
    }
    return load(&file);
}

bool LevelDefinition::load(QIODevice* device)
{
    XmlReadPolicy policy(XmlReadPolicy::DatabaseFileBytes);
    QDomDocument document;
    if (!policy.read(device, document)) {
        m_error = policy.errorString();
        return false;
    }
    m_error.clear();

    const QString idElement = QStringLiteral("Id");
    const QDomElement root = document.documentElement();
    for (QDomElement e = root.firstChildElement(idElement); !e.isNull(); e = e.nextSiblingElement(idElement)) {
        IdRecord record;
        record.id = normalizeIdText(e.attribute(QStringLiteral("value")));
        record.name = e.attribute(QStringLiteral("name"));
        if (record.id.isEmpty())
            continue;

        if (m_idMap) {
            const IdRecord found = m_idMap->value(record.id);
            if (!found.name.isEmpty()) {
                const QString fileName = record.name;
                record = found;
                record.name = fileName;
            }
        }
        m_records.append(record);
    }
    return true;
}
