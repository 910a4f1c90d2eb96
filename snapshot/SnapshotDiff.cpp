#include "SnapshotDiff.h"

#include "Report.h"

#include <QJsonArray>
#include <QMap>

#include <algorithm>

namespace {

QJsonObject document(const QJsonObject& snapshot, const char* name)
{
    return snapshot.value(QStringLiteral("documents")).toObject().value(QLatin1String(name)).toObject();
}

QJsonArray records(const QJsonObject& object, const char* name)
{
    return object.value(QLatin1String(name)).toArray();
}

QString text(const QJsonObject& record, const char* name)
{
    return record.value(QLatin1String(name)).toString();
}

QMap<QString, QString> modules(const QJsonObject& snapshot)
{
    QMap<QString, QString> found;
    for (const QJsonValue& value : records(document(snapshot, "modules"), "module")) {
        const QJsonObject module = value.toObject();
        found.insert(text(module, "path"), QStringLiteral("%1, version %2, signature %3")
                                               .arg(text(module, "name"), text(module, "version"), text(module, "signature")));
    }
    return found;
}

QMap<QString, QString> classes(const QJsonObject& snapshot)
{
    QMap<QString, QString> found;
    const QJsonObject list = records(document(snapshot, "class-ids"), "ZantHeaderDataList").at(0).toObject();
    for (const QJsonValue& value : records(list, "ZTOId")) {
        const QJsonObject record = value.toObject();
        found.insert(text(record, "value"), QStringLiteral("%1, %2").arg(
            text(record, "name"), record.value(QLatin1String("available")).toBool() ? QStringLiteral("available")
                                                                                      : QStringLiteral("not available")));
    }
    return found;
}

QMap<QString, QString> registry(const QJsonObject& snapshot)
{
    QMap<QString, QString> found;
    for (const QJsonValue& value : records(document(snapshot, "registry"), "entry")) {
        const QJsonObject entry = value.toObject();
        QStringList flags;
        for (const QJsonValue& flag : records(entry, "flags"))
            flags.append(flag.toString());
        found.insert(QStringLiteral("class type %1, %2")
                         .arg(entry.value(QLatin1String("class-type")).toInteger())
                         .arg(text(entry, "mime-type")),
                     QStringLiteral("handler %1, flags %2")
                         .arg(entry.value(QLatin1String("class-handler")).toInteger())
                         .arg(flags.isEmpty() ? QStringLiteral("none") : flags.join(QStringLiteral(" | "))));
    }
    return found;
}

// A node by its path, a value as "path [name]".
QMap<QString, QString> settings(const QJsonObject& snapshot)
{
    QMap<QString, QString> found;
    for (const QJsonValue& value : records(document(snapshot, "settings"), "node")) {
        const QJsonObject node = value.toObject();
        const QString path = text(node, "path");
        found.insert(path, QStringLiteral("node"));
        for (const QJsonValue& setting : records(node, "value"))
            found.insert(QStringLiteral("%1 [%2]").arg(path, text(setting.toObject(), "name")), text(setting.toObject(), "value"));
    }
    return found;
}

QMap<QString, QString> files(const QJsonObject& snapshot)
{
    QMap<QString, QString> found;
    for (const QJsonValue& volume : records(document(snapshot, "files"), "volumes")) {
        for (const QJsonValue& value : records(volume.toObject(), "files")) {
            const QJsonObject file = value.toObject();
            QString description = QStringLiteral("%1 bytes").arg(file.value(QLatin1String("size")).toInteger());
            if (file.contains(QLatin1String("sha256")))
                description += QStringLiteral(", sha256 ") + text(file, "sha256");
            found.insert(text(file, "path"), description);
        }
    }
    return found;
}

} // namespace

const QVector<QPair<QString, QString>>& SnapshotDiff::kinds()
{
    static const QVector<QPair<QString, QString>> all {{QStringLiteral("module"), QStringLiteral("Modules")},
                                                       {QStringLiteral("class"), QStringLiteral("Classes")},
                                                       {QStringLiteral("registry"), QStringLiteral("Registry entries")},
                                                       {QStringLiteral("setting"), QStringLiteral("Settings")},
                                                       {QStringLiteral("file"), QStringLiteral("Files")}};
    return all;
}

SnapshotDiff::SnapshotDiff(const QJsonObject& a, const QJsonObject& b)
    : m_manifestA(a.value(QStringLiteral("manifest")).toObject())
    , m_manifestB(b.value(QStringLiteral("manifest")).toObject())
{
    compare(QStringLiteral("module"), modules(a), modules(b));
    compare(QStringLiteral("class"), classes(a), classes(b));
    compare(QStringLiteral("registry"), registry(a), registry(b));
    compare(QStringLiteral("setting"), settings(a), settings(b));
    compare(QStringLiteral("file"), files(a), files(b));
}

void SnapshotDiff::compare(const QString& kind, const QMap<QString, QString>& a, const QMap<QString, QString>& b)
{
    // Both maps are in key order: one merge pass finds every difference.
    auto left = a.cbegin();
    auto right = b.cbegin();
    while (left != a.cend() || right != b.cend()) {
        if (right == b.cend() || (left != a.cend() && left.key() < right.key())) {
            m_differences.append({kind, Removed, left.key(), left.value(), QString()});
            ++left;
        } else if (left == a.cend() || right.key() < left.key()) {
            m_differences.append({kind, Added, right.key(), QString(), right.value()});
            ++right;
        } else {
            if (left.value() != right.value())
                m_differences.append({kind, Changed, left.key(), left.value(), right.value()});
            ++left;
            ++right;
        }
    }
}

int SnapshotDiff::count(const QString& kind, Change change) const
{
    return int(std::count_if(m_differences.cbegin(), m_differences.cend(), [&](const Difference& difference) {
        return difference.kind == kind && difference.change == change;
    }));
}

QString SnapshotDiff::changeName(Change change)
{
    switch (change) {
    case Added:
        return QStringLiteral("added");
    case Removed:
        return QStringLiteral("removed");
    case Changed:
        break;
    }
    return QStringLiteral("changed");
}

QString SnapshotDiff::text() const
{
    if (isEmpty())
        return QStringLiteral("No differences.\n");
    QStringList counts;
    for (const auto& kind : kinds()) {
        QStringList parts;
        for (const Change change : {Added, Removed, Changed}) {
            if (const int n = count(kind.first, change))
                parts.append(QStringLiteral("%1 %2").arg(n).arg(changeName(change)));
        }
        counts.append(QStringLiteral("%1 %2").arg(kind.second.toLower(), parts.isEmpty() ? QStringLiteral("none") : parts.join(QStringLiteral(", "))));
    }
    QString out = QStringLiteral("%1 difference%2: %3\n")
                      .arg(m_differences.size())
                      .arg(m_differences.size() == 1 ? QString() : QStringLiteral("s"))
                      .arg(counts.join(QStringLiteral("; ")));
    for (const auto& kind : kinds()) {
        for (const Change change : {Added, Removed, Changed}) {
            const int n = count(kind.first, change);
            if (n == 0)
                continue;
            out += QStringLiteral("\n%1 %2 (%3):\n").arg(kind.second, changeName(change)).arg(n);
            for (const Difference& difference : m_differences) {
                if (difference.kind != kind.first || difference.change != change)
                    continue;
                const QString detail = change == Added ? difference.after
                    : change == Removed                ? difference.before
                                                       : difference.before + QStringLiteral(" -> ") + difference.after;
                out += QStringLiteral("  %1: %2\n").arg(difference.key, detail);
            }
        }
    }
    return out;
}

QJsonObject SnapshotDiff::json() const
{
    QJsonObject counts;
    for (const auto& kind : kinds()) {
        QJsonObject byChange;
        for (const Change change : {Added, Removed, Changed})
            byChange.insert(changeName(change), count(kind.first, change));
        counts.insert(kind.first, byChange);
    }
    QJsonArray list;
    for (const Difference& difference : m_differences) {
        QJsonObject entry {{QStringLiteral("kind"), difference.kind},
                           {QStringLiteral("change"), changeName(difference.change)},
                           {QStringLiteral("key"), difference.key}};
        if (difference.change != Added)
            entry.insert(QStringLiteral("before"), difference.before);
        if (difference.change != Removed)
            entry.insert(QStringLiteral("after"), difference.after);
        list.append(entry);
    }
    return {{QStringLiteral("schema"), QStringLiteral("delvix.diff")},
            {QStringLiteral("version"), Report::SchemaVersion},
            {QStringLiteral("a"), m_manifestA},
            {QStringLiteral("b"), m_manifestB},
            {QStringLiteral("total"), int(m_differences.size())},
            {QStringLiteral("counts"), counts},
            {QStringLiteral("differences"), list}};
}
