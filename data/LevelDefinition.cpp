#include "LevelDefinition.h"

#include "IdFormat.h"

#include <QDomDocument>
#include <QFile>

bool LevelDefinition::load(const QString& path)
{
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly))
        return false;
    return load(&file);
}

bool LevelDefinition::load(QIODevice* device)
{
    QDomDocument document;
    if (!document.setContent(device))
        return false;

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
