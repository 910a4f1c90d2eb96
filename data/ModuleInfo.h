#pragma once

#include <QString>

// One module installed on the device.
struct ModuleInfo
{
    // Bits of `type`.
    enum TypeFlag : quint32
    {
        Application = 0x1,
        Library = 0x2,
        Extension = 0x4,
        System = 0x8,
        Preinstalled = 0x10,
    };

    // Values of `signature`.
    enum SignatureState : quint32
    {
        Unsigned = 0,
        TestSigned = 1,
        DeveloperSigned = 2,
        MakerSigned = 3,
        SignatureInvalid = 4,
    };

    QString name;
    quint32 type = 0;
    quint32 signature = Unsigned;
    QString path;       // device path of the module's MIF file
    QString version;    // component services version
    QString copyright;
    quint32 size = 0;   // bytes the module occupies
    quint32 moduleId = 0;

    // Display texts of `type` and `signature`.
    QString GetModuleProperty() const;
    QString GetModuleSig() const;

    bool operator==(const ModuleInfo& o) const
    {
        return name == o.name && type == o.type && signature == o.signature && path == o.path && version == o.version && copyright == o.copyright && size == o.size && moduleId == o.moduleId;
    }
};
