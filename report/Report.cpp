#include "Report.h"

#include "SortKey.h"
#include "XmlEscape.h"
#include "XmlReport.h"

#include <QJsonArray>
#include <QJsonDocument>

#include <algorithm>

namespace {

bool startsFormula(const QString& text)
{
    static const QString starts = QStringLiteral("=+-@\t\r");
    return !text.isEmpty() && starts.contains(text.at(0));
}

QByteArray csvField(const QString& text)
{
    const bool quoted = text.contains(QLatin1Char(',')) || text.contains(QLatin1Char('"'))
        || text.contains(QLatin1Char('\n')) || text.contains(QLatin1Char('\r')) || text.startsWith(QLatin1Char(' '))
        || text.endsWith(QLatin1Char(' '));
    QByteArray field = text.toUtf8();
    if (!quoted)
        return field;
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

QJsonValue typedValue(const ReportField& field, const QString& text)
{
    switch (field.type) {
    case ReportField::Integer: {
        bool ok = false;
        const qint64 number = text.toLongLong(&ok, 10);
        return ok ? QJsonValue(number) : QJsonValue();
    }
    case ReportField::Boolean:
        return text == QLatin1String("Yes") || text == QLatin1String("Found") || text == QLatin1String("true");
    case ReportField::Flags:
        return QJsonArray::fromStringList(text.isEmpty() ? QStringList() : text.split(QStringLiteral(" | ")));
    case ReportField::Id:
    case ReportField::Text:
        break;
    }
    return text;
}

// A value as JSON text: a scalar through a one-element array, so that Qt does the escaping.
QByteArray jsonScalar(const QJsonValue& value)
{
    if (value.isObject())
        return QJsonDocument(value.toObject()).toJson(QJsonDocument::Compact);
    if (value.isArray())
        return QJsonDocument(value.toArray()).toJson(QJsonDocument::Compact);
    const QByteArray wrapped = QJsonDocument(QJsonArray {value}).toJson(QJsonDocument::Compact);
    return wrapped.mid(1, wrapped.size() - 2);
}

} // namespace

Report::Report(const QString& documentType, const QString& rootElement, const QString& recordElement)
    : m_documentType(documentType)
    , m_recordElement(recordElement)
    , m_root(rootElement)
{
}

void Report::declare(const QString& element, const QVector<ReportField>& fields)
{
    m_fields.insert(element, fields);
}

void Report::setDevice(const QString& id, const QString& name)
{
    m_deviceId = id;
    m_deviceName = name;
}

QString Report::schemaName() const
{
    QString name = m_documentType;
    if (name.startsWith(QLatin1String("zant-")))
        name.remove(0, 5);
    return QStringLiteral("delvix.") + name;
}

void Report::check(const ReportNode& node) const
{
    const auto declared = m_fields.constFind(node.element);
    if (declared == m_fields.cend())
        return;
    bool same = declared->size() == node.attributes.size();
    for (const ReportField& field : *declared) {
        same = same && std::any_of(node.attributes.cbegin(), node.attributes.cend(),
                                   [&field](const ReportAttribute& attribute) { return attribute.name == field.name; });
    }
    if (!same)
        qFatal("%s: element %s does not have its declared fields", qPrintable(m_documentType), qPrintable(node.element));
}

void Report::writeXml(QXmlStreamWriter& xml, const ReportNode& node) const
{
    check(node);
    const QVector<ReportField> fields = m_fields.value(node.element);
    xml.writeStartElement(node.element);
    for (const ReportAttribute& attribute : node.attributes) {
        const bool exported = std::none_of(fields.cbegin(), fields.cend(), [&attribute](const ReportField& field) {
            return field.name == attribute.name && !field.exported;
        });
        if (exported)
            xml.writeAttribute(attribute.name, XmlEscape::escaped(attribute.text));
    }
    for (const ReportNode& child : node.children)
        writeXml(xml, child);
    xml.writeEndElement();
}

QVector<QPair<QString, QJsonValue>> Report::jsonFields(const ReportNode& node) const
{
    check(node);
    QVector<QPair<QString, QJsonValue>> values;
    const auto declared = m_fields.constFind(node.element);
    const auto add = [&values](const ReportAttribute& attribute, const ReportField* field) {
        const QJsonValue value = !attribute.value.isUndefined() ? attribute.value
            : field                                            ? typedValue(*field, attribute.text)
                                                               : QJsonValue(attribute.text);
        values.append({attribute.name, value});
        if (field && field->type == ReportField::Id) {
            bool ok = false;
            const qint64 number = attribute.text.toLongLong(&ok, 0);
            values.append({attribute.name + QStringLiteral("-number"), ok ? QJsonValue(number) : QJsonValue()});
        }
    };
    if (declared == m_fields.cend()) {
        for (const ReportAttribute& attribute : node.attributes)
            add(attribute, nullptr);
        return values;
    }
    // The declared order, which is the page's column order.
    for (const ReportField& field : *declared) {
        const auto attribute = std::find_if(node.attributes.cbegin(), node.attributes.cend(),
                                            [&field](const ReportAttribute& known) { return known.name == field.name; });
        add(*attribute, &field);
    }
    return values;
}

QJsonObject Report::jsonObject(const ReportNode& node) const
{
    QJsonObject object;
    for (const auto& value : jsonFields(node))
        object.insert(value.first, value.second);
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

void Report::appendJson(QByteArray& out, const ReportNode& node, int depth,
                        const QVector<QPair<QString, QJsonValue>>& head) const
{
    const QByteArray pad(4 * (depth + 1), ' ');
    bool first = true;
    const auto key = [&](const QString& name) {
        out += first ? "\n" : ",\n";
        first = false;
        out += pad + jsonScalar(name) + ": ";
    };
    out += '{';
    for (const auto& value : head + jsonFields(node)) {
        key(value.first);
        out += jsonScalar(value.second);
    }
    // Children of one name form one array, in document order.
    QStringList names;
    QHash<QString, QVector<const ReportNode*>> groups;
    for (const ReportNode& child : node.children) {
        if (!groups.contains(child.element))
            names.append(child.element);
        groups[child.element].append(&child);
    }
    for (const QString& name : std::as_const(names)) {
        key(name);
        out += '[';
        const QVector<const ReportNode*>& children = groups[name];
        for (qsizetype i = 0; i < children.size(); ++i) {
            out += (i > 0 ? ",\n" : "\n") + pad + "    ";
            appendJson(out, *children.at(i), depth + 2, {});
        }
        out += '\n' + pad + ']';
    }
    out += first ? QByteArray("}") : '\n' + QByteArray(4 * depth, ' ') + '}';
}

void Report::csvColumns(const ReportNode& node, QStringList& names, QStringList& values, CsvCells cells) const
{
    check(node);
    const auto declared = m_fields.constFind(node.element);
    if (declared == m_fields.cend()) {
        // Undeclared elements: their attributes as written, named after the element above the record.
        for (const ReportAttribute& attribute : node.attributes) {
            names.append(node.element == m_recordElement ? attribute.name : node.element + QLatin1Char('.') + attribute.name);
            values.append(cells == CsvCells::Guarded && startsFormula(attribute.text) ? QLatin1Char('\'') + attribute.text
                                                                                     : attribute.text);
        }
        return;
    }
    for (const ReportField& field : *declared) {
        if (field.column.isEmpty())
            continue;
        const auto attribute = std::find_if(node.attributes.cbegin(), node.attributes.cend(),
                                            [&field](const ReportAttribute& known) { return known.name == field.name; });
        const bool guard = cells == CsvCells::Guarded && field.type != ReportField::Integer && startsFormula(attribute->text);
        names.append(field.column);
        values.append(guard ? QLatin1Char('\'') + attribute->text : attribute->text);
    }
}

void Report::writeCsv(QByteArray& csv, const ReportNode& node, QStringList& names, QStringList& values,
                      bool& headerWritten, CsvCells cells) const
{
    for (const ReportNode& child : node.children) {
        const qsizetype depth = values.size();
        csvColumns(child, names, values, cells);
        if (child.element == m_recordElement) {
            if (!headerWritten)
                appendCsvLine(csv, names);
            headerWritten = true;
            appendCsvLine(csv, values);
        } else {
            writeCsv(csv, child, names, values, headerWritten, cells);
        }
        names.resize(depth);
        values.resize(depth);
    }
}

QString Report::toXml() const
{
    XmlReport report(m_documentType);
    writeXml(report.writer(), m_root);
    return report.text();
}

QByteArray Report::toJson() const
{
    QByteArray out;
    appendJson(out, m_root, 0, header());
    return out + '\n';
}

QVector<QPair<QString, QJsonValue>> Report::header() const
{
    QVector<QPair<QString, QJsonValue>> head {{QStringLiteral("schema"), schemaName()}, {QStringLiteral("version"), SchemaVersion}};
    if (!m_deviceId.isEmpty())
        head.append({QStringLiteral("identity"), QJsonObject {{QStringLiteral("id"), m_deviceId}, {QStringLiteral("name"), m_deviceName}}});
    return head;
}

QJsonObject Report::toJsonObject() const
{
    QJsonObject object;
    for (const auto& value : header())
        object.insert(value.first, value.second);
    const QJsonObject body = jsonObject(m_root);
    for (auto it = body.constBegin(); it != body.constEnd(); ++it)
        object.insert(it.key(), it.value());
    return object;
}

QByteArray Report::toCsv(CsvCells cells) const
{
    QByteArray csv;
    QStringList names;
    QStringList values;
    bool headerWritten = false;
    writeCsv(csv, m_root, names, values, headerWritten, cells);
    if (!headerWritten && m_fields.contains(m_recordElement)) {
        for (const ReportField& field : m_fields.value(m_recordElement)) {
            if (!field.column.isEmpty())
                names.append(field.column);
        }
        appendCsvLine(csv, names);
    }
    return csv;
}

QByteArray Report::write(Format format, CsvCells cells) const
{
    switch (format) {
    case Format::Json:
        return toJson();
    case Format::Csv:
        return toCsv(cells);
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
