// Feeds arbitrary bytes to the device.xml parser. A profile it accepts must be safe to
// serve: volumes with plain folders and mount points, settings names without slashes.
#include "DeviceProfileParser.h"

#include <cstdint>
#include <cstdlib>

namespace {

bool plainSettings(const SettingsNodeSpec& node, int depth)
{
    if (depth > DeviceProfileParser::MaxSettingsDepth + 1)
        return false;
    for (const SettingsNodeSpec& child : node.children) {
        if (child.name.isEmpty() || child.name.contains(QLatin1Char('/')) || !plainSettings(child, depth + 1))
            return false;
    }
    return true;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    DeviceProfileParser parser;
    DeviceProfile profile;
    const QByteArray xml = QByteArray::fromRawData(reinterpret_cast<const char*>(data), qsizetype(size));
    if (!parser.parse(xml, profile)) {
        if (parser.errorString().isEmpty())
            abort();
        return 0;
    }
    if (profile.volumes.isEmpty() || !DeviceProfileParser::isValidDeviceId(profile.id) || !plainSettings(profile.settings, 0))
        abort();
    for (const VolumeSpec& volume : profile.volumes) {
        if (!volume.mountPoint.startsWith(QLatin1Char('/')) || volume.folder.contains(QLatin1Char('/'))
            || volume.folder == QLatin1String("..") || volume.reserved > volume.size
            || !volume.moduleFolders.contains(volume.installFolder))
            abort();
        for (const QString& folder : volume.moduleFolders) {
            if (folder.startsWith(QLatin1Char('/')) || folder.split(QLatin1Char('/')).contains(QStringLiteral("..")))
                abort();
        }
    }
    if (profile.evolution.intervalMs < 50)
        abort();
    return 0;
}
