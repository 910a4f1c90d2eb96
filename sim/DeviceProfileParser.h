#pragma once

#include "DeviceProfile.h"

#include <QByteArray>
#include <QString>

class QDomDocument;
class QDomElement;

// Reads device.xml. The file comes with an image that may have been written by anyone, so
// it is read under XmlReadPolicy's limits and every value is checked: a profile that
// parses is safe to serve.
class DeviceProfileParser
{
public:
    bool parse(const QByteArray& xml, DeviceProfile& profile);
    // Messages about the file as a whole (opening it, a limit, malformed XML) name the path.
    bool parseFile(const QString& path, DeviceProfile& profile);
    QString errorString() const { return m_error; }

    static bool isValidDeviceId(const QString& id);

    static constexpr int MaxSettingsDepth = 32;

private:
    bool fail(const QString& message);
    bool readDocument(const QDomDocument& document, DeviceProfile& profile);
    bool readIdentity(const QDomElement& e, DeviceProfile& profile);
    void readFacts(const QDomElement& e, DeviceData& data);
    bool readPlatform(const QDomElement& e, DeviceProfile& profile);
    bool readSettingsNode(const QDomElement& e, SettingsNodeSpec& node, int depth);
    bool readProcesses(const QDomElement& e, DeviceProfile& profile);
    bool readProcess(const QDomElement& e, ProcessSpec& process);
    bool readEnablement(const QDomElement& e, EnablementSpec& enablement);
    bool readVolume(const QDomElement& e, VolumeSpec& volume);
    bool readNumber(const QDomElement& e, const QString& attribute, quint64 max, quint64& value);
    bool readFlag(const QDomElement& e, const QString& attribute, bool defaultValue, bool& value);

    QString m_error;
};
