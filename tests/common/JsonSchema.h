#pragma once

// The part of JSON Schema our schemas use (type, enum, properties, required,
// additionalProperties false, items), enough to check a document in a test.

#include <QFile>
#include <QJsonArray>
#include <QJsonDocument>
#include <QJsonObject>
#include <QString>

#include <algorithm>

namespace JsonSchema {

inline bool hasType(const QJsonValue& value, const QString& type)
{
    if (type == QLatin1String("integer"))
        return value.isDouble() && value.toDouble() == double(value.toInteger());
    return (type == QLatin1String("null") && value.isNull()) || (type == QLatin1String("boolean") && value.isBool())
        || (type == QLatin1String("number") && value.isDouble()) || (type == QLatin1String("string") && value.isString())
        || (type == QLatin1String("array") && value.isArray()) || (type == QLatin1String("object") && value.isObject());
}

// The first place where value breaks schema, as "where: what"; empty when it conforms.
inline QString violation(const QJsonValue& value, const QJsonObject& schema, const QString& where = QStringLiteral("$"))
{
    if (schema.contains("type")) {
        const QJsonValue type = schema["type"];
        const QJsonArray types = type.isArray() ? type.toArray() : QJsonArray {type};
        if (std::none_of(types.begin(), types.end(), [&](const QJsonValue& t) { return hasType(value, t.toString()); }))
            return where + ": not of type " + QJsonDocument(types).toJson(QJsonDocument::Compact);
    }
    if (schema.contains("enum") && !schema["enum"].toArray().contains(value))
        return where + ": not one of " + QJsonDocument(schema["enum"].toArray()).toJson(QJsonDocument::Compact);
    const QJsonObject object = value.toObject();
    const QJsonObject properties = schema["properties"].toObject();
    for (const QJsonValue& required : schema["required"].toArray()) {
        if (value.isObject() && !object.contains(required.toString()))
            return where + ": lacks " + required.toString();
    }
    for (auto it = object.begin(); value.isObject() && it != object.end(); ++it) {
        if (properties.contains(it.key())) {
            const QString inner = violation(it.value(), properties[it.key()].toObject(), where + '.' + it.key());
            if (!inner.isEmpty())
                return inner;
        } else if (schema["additionalProperties"] == QJsonValue(false)) {
            return where + ": unexpected " + it.key();
        }
    }
    const QJsonArray items = value.toArray();
    for (int i = 0; value.isArray() && schema.contains("items") && i < items.size(); ++i) {
        const QString inner = violation(items.at(i), schema["items"].toObject(), where + QStringLiteral("[%1]").arg(i));
        if (!inner.isEmpty())
            return inner;
    }
    return QString();
}

// The schema file beside the test executables (schema/NAME.json).
inline QJsonObject load(const QString& directory, const QString& name)
{
    QFile file(directory + "/schema/" + name + ".json");
    return file.open(QIODevice::ReadOnly) ? QJsonDocument::fromJson(file.readAll()).object() : QJsonObject();
}

} // namespace JsonSchema
