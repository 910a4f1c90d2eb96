#include "SampleBuilder.h"

#include "IdFormat.h"
#include "MifWriter.h"

#include <QDir>
#include <QDomDocument>
#include <QFile>
#include <QFileInfo>
#include <QRandomGenerator>
#include <QtEndian>

namespace {

constexpr quint32 MaxFillerSize = 64 * 1024 * 1024;

quint32 fnv1a(const QByteArray& bytes)
{
    quint32 hash = 2166136261u;
    for (const char c : bytes) {
        hash ^= quint8(c);
        hash *= 16777619u;
    }
    return hash;
}

QByteArray moduleHeader(const SampleBuilder::ModuleSpec& module)
{
    QByteArray header(40, '\0');
    const quint32 formatVersion = 1;
    const quint32 primaryClass = module.mif.classes.isEmpty() ? 0 : module.mif.classes.first();
    qToLittleEndian(formatVersion, header.data());
    qToLittleEndian(primaryClass, header.data() + 4);
    const QByteArray name = module.name.toLatin1().left(15);
    header.replace(8, name.size(), name);
    return header;
}

} // namespace

bool SampleBuilder::fail(const QString& message)
{
    m_error = message;
    return false;
}

QByteArray SampleBuilder::fillerBytes(const QString& seedText, quint32 size)
{
    QRandomGenerator random(fnv1a(seedText.toUtf8()));
    QByteArray bytes(qsizetype(size), Qt::Uninitialized);
    for (qsizetype i = 0; i < bytes.size(); ++i)
        bytes[i] = char(random.bounded(256));
    return bytes;
}

bool SampleBuilder::writeFile(const QString& path, const QByteArray& data, QString* error)
{
    if (!QDir().mkpath(QFileInfo(path).absolutePath())) {
        *error = QStringLiteral("cannot create the folder of %1").arg(path);
        return false;
    }
    // A plain write: images are written fresh, and syncing every one of thousands of small
    // files to disk would make large images take minutes.
    QFile file(path);
    if (!file.open(QIODevice::WriteOnly | QIODevice::Truncate) || file.write(data) != data.size()) {
        *error = QStringLiteral("cannot write %1: %2").arg(path, file.errorString());
        return false;
    }
    return true;
}

bool SampleBuilder::writeModule(const QString& folder, const ModuleSpec& module, QString* error)
{
    MifEntry mif = module.mif;
    mif.header = moduleHeader(module);
    mif.classCount = quint16(mif.classes.size());
    mif.appletCount = quint16(mif.applets.size());
    mif.externalClassCount = quint16(mif.externalClasses.size());
    mif.notificationCount = quint16(mif.notifiers.size());
    mif.mimeTypeCount = quint16(mif.mimeTypes.size());

    const QString base = QDir(folder).filePath(module.name);
    if (!QDir().mkpath(folder)) {
        *error = QStringLiteral("cannot create %1").arg(folder);
        return false;
    }
    if (!writeFile(base + QStringLiteral(".mif"), MifWriter::moduleData(mif), error))
        return false;

    QByteArray code("ZMOD");
    code += fillerBytes(module.name, module.codeSize > 4 ? module.codeSize - 4 : 0);
    QString sidecar = QStringLiteral("# %1 module properties\n").arg(module.name);
    sidecar += QStringLiteral("version=%1\ntype=%2\nsignature=%3\ncopyright=%4\n")
                   .arg(module.version, module.type, module.signature, module.copyright);
    return writeFile(base + QStringLiteral(".mod"), code.left(qsizetype(module.codeSize)), error)
        && writeFile(base + QStringLiteral(".inf"), sidecar.toUtf8(), error);
}

bool SampleBuilder::imagePath(const QString& imageDir, const QString& relative, QString& path)
{
    const QStringList parts = relative.split(QLatin1Char('/'));
    for (const QString& part : parts) {
        if (part.isEmpty() || part == QLatin1String(".") || part == QLatin1String("..") || part.contains(QLatin1Char('\\')))
            return fail(QStringLiteral("\"%1\" is not a plain relative path").arg(relative));
    }
    path = QDir(imageDir).filePath(relative);
    return true;
}

bool SampleBuilder::number(const QDomElement& e, const QString& attribute, quint64 max, quint64& value)
{
    const QString text = e.attribute(attribute, QStringLiteral("0")).trimmed();
    bool ok = false;
    value = text.startsWith(QLatin1String("0x"), Qt::CaseInsensitive) ? text.mid(2).toULongLong(&ok, 16)
                                                                       : text.toULongLong(&ok, 10);
    if (!ok || value > max)
        return fail(QStringLiteral("<%1 %2=\"%3\">: not a number in range").arg(e.tagName(), attribute, text));
    return true;
}

bool SampleBuilder::readModule(const QDomElement& e, ModuleSpec& module)
{
    module.name = e.attribute(QStringLiteral("name"));
    module.version = e.attribute(QStringLiteral("version"));
    module.type = e.attribute(QStringLiteral("type"));
    module.signature = e.attribute(QStringLiteral("signature"), QStringLiteral("unsigned"));
    module.copyright = e.attribute(QStringLiteral("copyright"));
    quint64 size = 0;
    if (!number(e, QStringLiteral("size"), MaxFillerSize, size))
        return false;
    module.codeSize = e.hasAttribute(QStringLiteral("size")) ? quint32(size) : 8192;
    if (module.name.isEmpty() || module.name.contains(QLatin1Char('/')))
        return fail(QStringLiteral("a module needs a plain name"));

    MifEntry& mif = module.mif;
    for (QDomElement c = e.firstChildElement(); !c.isNull(); c = c.nextSiblingElement()) {
        const QString tag = c.tagName();
        const auto id = [&c](const char* name) { return parseHexId(c.attribute(QLatin1String(name))); };
        if (tag == QLatin1String("class")) {
            mif.classes.append(id("id"));
        } else if (tag == QLatin1String("external")) {
            mif.externalClasses.append(id("id"));
        } else if (tag == QLatin1String("applet")) {
            MifApplet applet;
            applet.classId = id("id");
            quint64 baseId = 0;
            if (!number(c, QStringLiteral("baseId"), 0xffff, baseId))
                return false;
            applet.baseId = quint16(baseId);
            applet.appType = quint16(id("appType"));
            applet.host = id("host");
            applet.privSet = quint16(id("privSet"));
            applet.flags = quint16(id("flags"));
            mif.applets.append(applet);
        } else if (tag == QLatin1String("notifier")) {
            mif.notifiers.append({id("type"), id("notifier"), id("mask")});
        } else if (tag == QLatin1String("mime")) {
            mif.mimeTypes.append({id("handler"), id("base"), c.attribute(QStringLiteral("type"))});
        }
    }
    return true;
}

bool SampleBuilder::build(const QString& descriptionPath, const QString& imageDir)
{
    QFile file(descriptionPath);
    if (!file.open(QIODevice::ReadOnly))
        return fail(QStringLiteral("cannot open %1").arg(descriptionPath));
    QDomDocument document;
    QString message;
    int line = 0;
    if (!document.setContent(&file, &message, &line))
        return fail(QStringLiteral("%1 line %2: %3").arg(descriptionPath).arg(line).arg(message));

    for (QDomElement e = document.documentElement().firstChildElement(); !e.isNull(); e = e.nextSiblingElement()) {
        QString path;
        QString error;
        if (e.tagName() == QLatin1String("module")) {
            ModuleSpec module;
            const QString folder = e.attribute(QStringLiteral("volume")) + QLatin1Char('/') + e.attribute(QStringLiteral("folder"));
            if (!readModule(e, module) || !imagePath(imageDir, folder, path))
                return false;
            if (!writeModule(path, module, &error))
                return fail(error);
        } else if (e.tagName() == QLatin1String("file")) {
            quint64 size = 0;
            if (!imagePath(imageDir, e.attribute(QStringLiteral("path")), path)
                || !number(e, QStringLiteral("size"), MaxFillerSize, size))
                return false;
            if (!writeFile(path, fillerBytes(e.attribute(QStringLiteral("path")), quint32(size)), &error))
                return fail(error);
        } else if (e.tagName() == QLatin1String("text")) {
            if (!imagePath(imageDir, e.attribute(QStringLiteral("path")), path))
                return false;
            if (!writeFile(path, e.text().trimmed().toUtf8() + '\n', &error))
                return fail(error);
        }
    }
    return true;
}
