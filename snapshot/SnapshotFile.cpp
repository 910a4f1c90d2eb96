#include "SnapshotFile.h"

#include <QFile>
#include <QJsonDocument>
#include <QSaveFile>
#include <QStringList>

namespace {

// Far above a large device's snapshot (about 10 MB for 50,000 files).
constexpr qint64 MaximumSize = qint64(1) << 30;

} // namespace

const QStringList& SnapshotFile::documentNames()
{
    static const QStringList names {QStringLiteral("phone-info"), QStringLiteral("modules"),   QStringLiteral("class-ids"),
                                    QStringLiteral("registry"),   QStringLiteral("settings"),  QStringLiteral("processes"),
                                    QStringLiteral("loaded-modules"), QStringLiteral("files")};
    return names;
}

bool SnapshotFile::write(const QString& path, const QJsonObject& snapshot, QString* error)
{
    QSaveFile file(path);
    const QByteArray bytes = QJsonDocument(snapshot).toJson(QJsonDocument::Compact);
    if (file.open(QIODevice::WriteOnly) && file.write(bytes) == bytes.size() && file.commit())
        return true;
    *error = file.errorString();
    return false;
}

bool SnapshotFile::read(const QString& path, QJsonObject* snapshot, QString* error)
{
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly)) {
        *error = file.errorString();
        return false;
    }
    if (file.size() > MaximumSize) {
        *error = QStringLiteral("it is larger than any snapshot (%1 bytes)").arg(file.size());
        return false;
    }
    QJsonParseError parse;
    const QJsonDocument document = QJsonDocument::fromJson(file.readAll(), &parse);
    if (parse.error != QJsonParseError::NoError) {
        *error = QStringLiteral("not a snapshot: %1 at byte %2 (a truncated or corrupt file)")
                     .arg(parse.errorString())
                     .arg(parse.offset);
        return false;
    }
    const QJsonObject object = document.object();
    if (object.value(QStringLiteral("schema")).toString() != QLatin1String(SchemaName)) {
        *error = QStringLiteral("not a snapshot: it names no \"%1\" schema").arg(QLatin1String(SchemaName));
        return false;
    }
    const int version = object.value(QStringLiteral("version")).toInt();
    if (version != Version) {
        *error = QStringLiteral("snapshot version %1; this program reads version %2").arg(version).arg(Version);
        return false;
    }
    const QJsonObject documents = object.value(QStringLiteral("documents")).toObject();
    if (!object.value(QStringLiteral("manifest")).isObject()) {
        *error = QStringLiteral("the snapshot has no manifest");
        return false;
    }
    for (const QString& name : documentNames()) {
        if (!documents.value(name).isObject()) {
            *error = QStringLiteral("the snapshot lacks its \"%1\" document").arg(name);
            return false;
        }
    }
    *snapshot = object;
    return true;
}
