#include "DeviceProfileParser.h"

#include "IdFormat.h"
#include "XmlReadPolicy.h"

#include <QDomDocument>
#include <QRegularExpression>
#include <QSet>

#include <limits>

namespace {

bool isPlainFolderName(const QString& name)
{
    return !name.isEmpty() && name != QLatin1String(".") && name != QLatin1String("..")
        && !name.contains(QLatin1Char('/')) && !name.contains(QLatin1Char('\\')) && !name.contains(QChar(0));
}

// A relative folder below a volume: plain names joined by single slashes.
bool isRelativeFolder(const QString& path)
{
    const QStringList parts = path.split(QLatin1Char('/'));
    for (const QString& part : parts) {
        if (!isPlainFolderName(part))
            return false;
    }
    return true;
}

} // namespace

bool DeviceProfileParser::fail(const QString& message)
{
    m_error = message;
    return false;
}

bool DeviceProfileParser::isValidDeviceId(const QString& id)
{
    static const QRegularExpression pattern(QStringLiteral("^[A-Za-z0-9._-]{1,64}$"));
    return pattern.match(id).hasMatch() && id != QLatin1String(".") && id != QLatin1String("..");
}

bool DeviceProfileParser::parseFile(const QString& path, DeviceProfile& profile)
{
    m_error.clear();
    profile = DeviceProfile();
    XmlReadPolicy policy(XmlReadPolicy::ProfileFileBytes);
    QDomDocument document;
    if (!policy.readFile(path, document))
        return fail(policy.errorString());
    return readDocument(document, profile);
}

bool DeviceProfileParser::parse(const QByteArray& xml, DeviceProfile& profile)
{
    m_error.clear();
    profile = DeviceProfile();
    XmlReadPolicy policy(XmlReadPolicy::ProfileFileBytes);
    QDomDocument document;
    if (!policy.parse(xml, QStringLiteral("device.xml"), document))
        return fail(policy.errorString());
    return readDocument(document, profile);
}

bool DeviceProfileParser::readDocument(const QDomDocument& document, DeviceProfile& profile)
{
    const QDomElement root = document.documentElement();
    if (root.tagName() != QLatin1String("device"))
        return fail(QStringLiteral("the root element must be <device>"));

    profile.id = root.attribute(QStringLiteral("id"));
    profile.name = root.attribute(QStringLiteral("name"));
    if (!isValidDeviceId(profile.id))
        return fail(QStringLiteral("the device id must be 1-64 letters, digits, '.', '_' or '-'"));
    if (profile.name.isEmpty())
        return fail(QStringLiteral("the device needs a name"));
    const QString connection = root.attribute(QStringLiteral("connection"), QStringLiteral("simulator"));
    if (connection == QLatin1String("usb"))
        profile.connection = DeviceProfile::Connection::Usb;
    else if (connection != QLatin1String("simulator"))
        return fail(QStringLiteral("connection must be \"simulator\" or \"usb\""));

    QSet<quint32> volumeIds;
    QSet<QString> mountPoints;
    for (QDomElement e = root.firstChildElement(); !e.isNull(); e = e.nextSiblingElement()) {
        const QString tag = e.tagName();
        bool ok = true;
        if (tag == QLatin1String("identity")) {
            ok = readIdentity(e, profile);
        } else if (tag == QLatin1String("hardware")) {
            readFacts(e, profile.data);
        } else if (tag == QLatin1String("media")) {
            readFacts(e, profile.data);
        } else if (tag == QLatin1String("platform")) {
            ok = readPlatform(e, profile);
        } else if (tag == QLatin1String("settings")) {
            profile.settings.name = QStringLiteral("/");
            ok = readSettingsNode(e, profile.settings, 0);
        } else if (tag == QLatin1String("processes")) {
            ok = readProcesses(e, profile);
        } else if (tag == QLatin1String("enablement")) {
            ok = readEnablement(e, profile.enablement);
        } else if (tag == QLatin1String("volume")) {
            VolumeSpec volume;
            ok = readVolume(e, volume);
            if (ok && volumeIds.contains(volume.id))
                return fail(QStringLiteral("volume id %1 is used twice").arg(volume.id));
            if (ok && mountPoints.contains(volume.mountPoint))
                return fail(QStringLiteral("mount point %1 is used twice").arg(volume.mountPoint));
            volumeIds.insert(volume.id);
            mountPoints.insert(volume.mountPoint);
            profile.volumes.append(volume);
        }
        if (!ok)
            return false;
    }
    if (profile.volumes.isEmpty())
        return fail(QStringLiteral("the device needs at least one <volume>"));
    return true;
}

bool DeviceProfileParser::readIdentity(const QDomElement& e, DeviceProfile& profile)
{
    DeviceData& d = profile.data;
    d.phoneName = e.attribute(QStringLiteral("phoneName"));
    d.targetId = e.attribute(QStringLiteral("targetId"));
    d.zantVersion = e.attribute(QStringLiteral("zantVersion"));
    d.zantBuildNumber = e.attribute(QStringLiteral("zantBuildNumber"));
    d.staticBuildId = e.attribute(QStringLiteral("staticBuildId"));
    d.dynamicBuildId = e.attribute(QStringLiteral("dynamicBuildId"));
    d.componentServicesBuild = e.attribute(QStringLiteral("componentServicesBuild"));
    return true;
}

// <hardware><fact key= value=/></hardware> and <media><audio|image|video format= supported=/></media>
void DeviceProfileParser::readFacts(const QDomElement& e, DeviceData& data)
{
    for (QDomElement f = e.firstChildElement(); !f.isNull(); f = f.nextSiblingElement()) {
        const QString tag = f.tagName();
        if (tag == QLatin1String("fact"))
            data.hardware.insert(f.attribute(QStringLiteral("key")), f.attribute(QStringLiteral("value")));
        else if (tag == QLatin1String("audio"))
            data.audio.insert(f.attribute(QStringLiteral("format")), f.attribute(QStringLiteral("supported")));
        else if (tag == QLatin1String("image"))
            data.image.insert(f.attribute(QStringLiteral("format")), f.attribute(QStringLiteral("supported")));
        else if (tag == QLatin1String("video"))
            data.video.insert(f.attribute(QStringLiteral("format")), f.attribute(QStringLiteral("supported")));
    }
}

bool DeviceProfileParser::readPlatform(const QDomElement& e, DeviceProfile& profile)
{
    profile.platformName = e.attribute(QStringLiteral("name"));
    profile.platformDirectory = e.attribute(QStringLiteral("directory"));
    for (QDomElement c = e.firstChildElement(); !c.isNull(); c = c.nextSiblingElement()) {
        const QString id = c.attribute(QStringLiteral("id")).trimmed();
        if (c.tagName() != QLatin1String("class") && c.tagName() != QLatin1String("interface"))
            continue;
        if (id.isEmpty())
            return fail(QStringLiteral("a platform <%1> has no id").arg(c.tagName()));
        if (c.tagName() == QLatin1String("class"))
            profile.platformClasses.append({formatId(parseHexId(id)), c.attribute(QStringLiteral("component"))});
        else
            profile.interfaces.append(formatId(parseHexId(id)));
    }
    return true;
}

bool DeviceProfileParser::readSettingsNode(const QDomElement& e, SettingsNodeSpec& node, int depth)
{
    if (depth > MaxSettingsDepth)
        return fail(QStringLiteral("the settings tree is nested deeper than %1 levels").arg(MaxSettingsDepth));
    QSet<QString> childNames;
    for (QDomElement c = e.firstChildElement(); !c.isNull(); c = c.nextSiblingElement()) {
        if (c.tagName() == QLatin1String("value")) {
            node.values.append({c.attribute(QStringLiteral("name")), c.attribute(QStringLiteral("text"))});
        } else if (c.tagName() == QLatin1String("node")) {
            SettingsNodeSpec child;
            child.name = c.attribute(QStringLiteral("name"));
            if (!isPlainFolderName(child.name))
                return fail(QStringLiteral("settings node name \"%1\" is not a plain name").arg(child.name));
            if (childNames.contains(child.name))
                return fail(QStringLiteral("settings node \"%1\" appears twice under one parent").arg(child.name));
            childNames.insert(child.name);
            if (!readSettingsNode(c, child, depth + 1))
                return false;
            node.children.append(child);
        }
    }
    return true;
}

bool DeviceProfileParser::readProcesses(const QDomElement& e, DeviceProfile& profile)
{
    ProcessEvolutionSpec& ev = profile.evolution;
    quint64 value = 0;
    if (!readFlag(e, QStringLiteral("evolve"), false, ev.enabled))
        return false;
    if (!readNumber(e, QStringLiteral("seed"), 0xffffffffu, value))
        return false;
    ev.seed = e.hasAttribute(QStringLiteral("seed")) ? quint32(value) : 1;
    if (!readNumber(e, QStringLiteral("interval"), 3600000, value))
        return false;
    ev.intervalMs = e.hasAttribute(QStringLiteral("interval")) ? int(value) : 2000;
    if (ev.intervalMs < 50)
        return fail(QStringLiteral("the process interval must be at least 50 ms"));
    if (!readNumber(e, QStringLiteral("max"), 100000, value))
        return false;
    ev.maxProcesses = e.hasAttribute(QStringLiteral("max")) ? int(value) : 16;
    if (!readNumber(e, QStringLiteral("changes"), 100000, value))
        return false;
    ev.changesPerStep = e.hasAttribute(QStringLiteral("changes")) ? int(value) : 1;

    for (QDomElement p = e.firstChildElement(); !p.isNull(); p = p.nextSiblingElement()) {
        ProcessSpec process;
        if (p.tagName() == QLatin1String("process")) {
            if (!readProcess(p, process))
                return false;
            profile.residentProcesses.append(process);
        } else if (p.tagName() == QLatin1String("transient")) {
            if (!readProcess(p, process) || !readNumber(p, QStringLiteral("lifetime"), 100000, value))
                return false;
            process.lifetime = p.hasAttribute(QStringLiteral("lifetime")) ? int(value) : 5;
            if (process.lifetime < 1)
                return fail(QStringLiteral("a transient process must live at least one step"));
            profile.transientProcesses.append(process);
        }
    }
    return true;
}

bool DeviceProfileParser::readProcess(const QDomElement& e, ProcessSpec& process)
{
    process.name = e.attribute(QStringLiteral("name"));
    if (process.name.isEmpty())
        return fail(QStringLiteral("a process has no name"));
    quint64 value = 0;
    for (QDomElement c = e.firstChildElement(); !c.isNull(); c = c.nextSiblingElement()) {
        if (c.tagName() == QLatin1String("thread")) {
            ThreadSpec thread;
            thread.name = c.attribute(QStringLiteral("name"));
            if (!readNumber(c, QStringLiteral("priority"), 0xffffffffu, value))
                return false;
            thread.priority = quint32(value);
            if (!readNumber(c, QStringLiteral("state"), 0xffffffffu, value))
                return false;
            thread.state = quint32(value);
            process.threads.append(thread);
        } else if (c.tagName() == QLatin1String("module")) {
            LoadedModuleSpec module;
            module.name = c.attribute(QStringLiteral("name"));
            module.location = c.attribute(QStringLiteral("location"));
            if (!readNumber(c, QStringLiteral("size"), 0xffffffffu, value)
                || !readFlag(c, QStringLiteral("onDemand"), false, module.onDemand))
                return false;
            module.size = quint32(value);
            process.modules.append(module);
        }
    }
    return true;
}

bool DeviceProfileParser::readEnablement(const QDomElement& e, EnablementSpec& enablement)
{
    const QString mode = e.attribute(QStringLiteral("mode"), QStringLiteral("none"));
    if (mode == QLatin1String("service"))
        enablement.mode = EnablementSpec::Mode::Service;
    else if (mode == QLatin1String("signature"))
        enablement.mode = EnablementSpec::Mode::Signature;
    else if (mode == QLatin1String("both"))
        enablement.mode = EnablementSpec::Mode::Both;
    else if (mode == QLatin1String("none"))
        enablement.mode = EnablementSpec::Mode::None;
    else
        return fail(QStringLiteral("enablement mode must be \"service\", \"signature\", \"both\" or \"none\""));
    enablement.owner = e.attribute(QStringLiteral("owner"));
    enablement.expires = e.attribute(QStringLiteral("expires"));
    for (QDomElement p = e.firstChildElement(QStringLiteral("priviledge")); !p.isNull();
         p = p.nextSiblingElement(QStringLiteral("priviledge"))) {
        const QString id = p.attribute(QStringLiteral("id")).trimmed();
        if (id.isEmpty())
            return fail(QStringLiteral("a <priviledge> has no id"));
        enablement.priviledges.append(formatId(parseHexId(id)));
    }
    return true;
}

bool DeviceProfileParser::readVolume(const QDomElement& e, VolumeSpec& volume)
{
    quint64 value = 0;
    if (!e.hasAttribute(QStringLiteral("id")))
        return fail(QStringLiteral("a volume has no id"));
    if (!readNumber(e, QStringLiteral("id"), 0xffffffffu, value))
        return false;
    volume.id = quint32(value);
    volume.friendlyName = e.attribute(QStringLiteral("name"));
    volume.mountPoint = e.attribute(QStringLiteral("mount"));
    volume.folder = e.attribute(QStringLiteral("folder"));
    if (!volume.mountPoint.startsWith(QLatin1Char('/')) || volume.mountPoint.contains(QLatin1String("//"))
        || (volume.mountPoint.size() > 1 && volume.mountPoint.endsWith(QLatin1Char('/')))
        || (volume.mountPoint.size() > 1 && !isRelativeFolder(volume.mountPoint.mid(1))))
        return fail(QStringLiteral("volume %1: the mount point must be \"/\" or \"/name[/name...]\"").arg(volume.id));
    if (!isPlainFolderName(volume.folder))
        return fail(QStringLiteral("volume %1: the folder must be a plain folder name").arg(volume.id));
    if (!readNumber(e, QStringLiteral("size"), std::numeric_limits<quint64>::max(), volume.size)
        || !readNumber(e, QStringLiteral("reserved"), volume.size, volume.reserved)
        || !readFlag(e, QStringLiteral("removable"), false, volume.removable)
        || !readFlag(e, QStringLiteral("mounted"), true, volume.mounted))
        return false;

    volume.moduleFolders = e.attribute(QStringLiteral("modules"), QStringLiteral("usermod"))
                               .split(QLatin1Char(' '), Qt::SkipEmptyParts);
    volume.installFolder = e.attribute(QStringLiteral("install"), QStringLiteral("usermod"));
    for (const QString& folder : std::as_const(volume.moduleFolders)) {
        if (!isRelativeFolder(folder))
            return fail(QStringLiteral("volume %1: module folder \"%2\" is not a relative folder").arg(volume.id).arg(folder));
        // Nested folders would list their modules twice.
        for (const QString& other : std::as_const(volume.moduleFolders)) {
            if (&other != &folder && (other == folder || other.startsWith(folder + QLatin1Char('/'))))
                return fail(QStringLiteral("volume %1: module folders \"%2\" and \"%3\" overlap").arg(volume.id).arg(folder, other));
        }
    }
    if (!volume.moduleFolders.contains(volume.installFolder))
        return fail(QStringLiteral("volume %1: the install folder must be one of its module folders").arg(volume.id));
    return true;
}

bool DeviceProfileParser::readNumber(const QDomElement& e, const QString& attribute, quint64 max, quint64& value)
{
    value = 0;
    if (!e.hasAttribute(attribute))
        return true;
    // Decimal, or hexadecimal with "0x"; never octal, so "010" means ten.
    const QString text = e.attribute(attribute).trimmed();
    bool ok = false;
    if (text.startsWith(QLatin1String("0x"), Qt::CaseInsensitive))
        value = text.mid(2).toULongLong(&ok, 16);
    else
        value = text.toULongLong(&ok, 10);
    if (!ok || value > max)
        return fail(QStringLiteral("<%1 %2=\"%3\">: not a number in range").arg(e.tagName(), attribute, e.attribute(attribute)));
    return true;
}

bool DeviceProfileParser::readFlag(const QDomElement& e, const QString& attribute, bool defaultValue, bool& value)
{
    value = defaultValue;
    if (!e.hasAttribute(attribute))
        return true;
    const QString text = e.attribute(attribute);
    if (text == QLatin1String("yes"))
        value = true;
    else if (text == QLatin1String("no"))
        value = false;
    else
        return fail(QStringLiteral("<%1 %2=\"%3\">: expected yes or no").arg(e.tagName(), attribute, text));
    return true;
}
