#include "Report.h"

#include "SortKey.h"
#include "XmlEscape.h"
#include "XmlReport.h"

#include <QJsonArray>
#include <QJsonDocument>
#include <QJsonObject>

#include <algorithm>

namespace {

void writeXml(QXmlStreamWriter& xml, const ReportNode& node)
{
    xml.writeStartElement(node.element);
    for (const auto& attribute : node.attributes)
        xml.writeAttribute(attribute.first, XmlEscape::escaped(attribute.second));
    for (const ReportNode& child : node.children)
        writeXml(xml, child);
    xml.writeEndElement();
}

QJsonObject jsonObject(const ReportNode& node)
{
    QJsonObject object;
    for (const auto& attribute : node.attributes)
        object.insert(attribute.first, attribute.second);
    // Children of one name form one array, in document order.
    QStringList names;
    QHash<QString, QJsonArray> groups;
    for (const ReportNode& child : node.children) {
        if (!groups.contains(child.element))
            names.append(child.element);
        groups[child.element].append(jsonObject(child));
    }
    for (const QString& name : std::as_const(names))
        object.insert(name, groups.value(name));
    return object;
}

QByteArray csvField(const QString& text)
{
    const QByteArray bytes = text.toUtf8();
    const bool quoted = text.contains(QLatin1Char(',')) || text.contains(QLatin1Char('"'))
        || text.contains(QLatin1Char('\n')) || text.contains(QLatin1Char('\r')) || text.startsWith(QLatin1Char(' '))
        || text.endsWith(QLatin1Char(' '));
    if (!quoted)
        return bytes;
    QByteArray field = bytes;
    field.replace('"', "\"\"");
    return '"' + field + '"';
}

void appendCsvLine(QByteArray& csv, const QStringList& fields)
{
    for (int i = 0; i < fields.size(); ++i) {
        if (i > 0)
            csv += ',';
        csv += csvField(fields.at(i));
    }
    csv += '\n';
}

// Walks down to the record elements, carrying the attributes of the elements passed on the way.
void writeCsv(QByteArray& csv, const ReportNode& node, const QString& recordElement, QStringList& names,
              QStringList& values, bool& headerWritten)
{
    for (const ReportNode& child : node.children) {
        const qsizetype depth = values.size();
        for (const auto& attribute : child.attributes) {
            names.append(child.element == recordElement ? attribute.first : child.element + QLatin1Char('.') + attribute.first);
            values.append(attribute.second);
        }
        if (child.element == recordElement) {
            if (!headerWritten)
                appendCsvLine(csv, names);
            headerWritten = true;
            appendCsvLine(csv, values);
        } else {
            writeCsv(csv, child, recordElement, names, values, headerWritten);
        }
        names.resize(depth);
        values.resize(depth);
    }
}

} // namespace

Report::Report(const QString& documentType, const QString& rootElement, const QString& recordElement)
    : m_documentType(documentType)
    , m_recordElement(recordElement)
    , m_root(rootElement)
{
}

QString Report::toXml() const
{
    XmlReport report(m_documentType);
    writeXml(report.writer(), m_root);
    return report.text();
}

QByteArray Report::toJson() const
{
    return QJsonDocument(jsonObject(m_root)).toJson(QJsonDocument::Indented);
}

QByteArray Report::toCsv() const
{
    QByteArray csv;
    QStringList names;
    QStringList values;
    bool headerWritten = false;
    writeCsv(csv, m_root, m_recordElement, names, values, headerWritten);
    return csv;
}

QByteArray Report::write(Format format) const
{
    switch (format) {
    case Format::Json:
        return toJson();
    case Format::Csv:
        return toCsv();
    case Format::Xml:
        break;
    }
    return toXml().toUtf8();
}

bool Report::parseFormat(const QString& name, Format* format)
{
    static const QVector<QPair<QString, Format>> formats = {
        {QStringLiteral("xml"), Format::Xml}, {QStringLiteral("json"), Format::Json}, {QStringLiteral("csv"), Format::Csv}};
    for (const auto& known : formats) {
        if (known.first == name) {
            *format = known.second;
            return true;
        }
    }
    return false;
}

void Report::sortRows(QVector<QStringList>& rows, int column)
{
    // The folded texts are worked out once, not at every comparison.
    QVector<QPair<QString, qsizetype>> keys;
    keys.reserve(rows.size());
    for (qsizetype i = 0; i < rows.size(); ++i)
        keys.append(qMakePair(sortKey(rows.at(i).value(column)), i));
    std::stable_sort(keys.begin(), keys.end(), [](const auto& a, const auto& b) { return a.first < b.first; });
    QVector<QStringList> sorted;
    sorted.reserve(rows.size());
    for (const auto& key : std::as_const(keys))
        sorted.append(std::move(rows[key.second]));
    rows = std::move(sorted);
}
