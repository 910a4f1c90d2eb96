#include "LevelDefinition.h"

#include "IdFormat.h"
#include "XmlReadPolicy.h"

#include "XmlEscape.h"

#include <QFile>
#include <QXmlStreamReader>

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
    QByteArray bytes;
    if (!policy.readBytes(device, bytes)) {
        m_error = policy.errorString();
        return false;
    }
    const QString source = XmlReadPolicy::sourceName(device);
    // Streamed: a DOM of a file at the policy's size limit would cost gigabytes.
    QList<IdRecord> read;
    QXmlStreamReader xml(bytes);
    xml.setNamespaceProcessing(false);
    int depth = 0;
    while (!xml.atEnd()) {
        const QXmlStreamReader::TokenType token = xml.readNext();
        if (!policy.checkToken(xml, source)) {
            m_error = policy.errorString();
            return false;
        }
        if (token == QXmlStreamReader::EndElement)
            --depth;
        if (token != QXmlStreamReader::StartElement || ++depth != 2 || xml.name() != u"Id")
            continue;
        IdRecord record;
        record.id = normalizeIdText(XmlEscape::unescaped(xml.attributes().value(QLatin1String("value"))));
        record.name = XmlEscape::unescaped(xml.attributes().value(QLatin1String("name")));
        if (!record.id.isEmpty())
            read.append(record);
    }
    if (xml.hasError()) {
        m_error = QStringLiteral("%1 line %2: %3")
                      .arg(source)
                      .arg(xml.lineNumber())
                      .arg(xml.errorString());
        return false;
    }
    m_error.clear();

    for (IdRecord record : std::as_const(read)) {
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
