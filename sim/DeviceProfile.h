#pragma once

#include "DeviceData.h"

#include <QList>
#include <QPair>
#include <QString>
#include <QStringList>

// What a device image's device.xml declares. Everything that follows from the image's
// files (modules, exported classes, registry, used space) is not here.

struct SettingsNodeSpec
{
    QString name;
    QList<QPair<QString, QString>> values;
    QList<SettingsNodeSpec> children;
};

struct ThreadSpec
{
    QString name;
    quint32 priority = 0;
    quint32 state = 0;
};

struct LoadedModuleSpec
{
    QString name;
    QString location;
    quint32 size = 0;
    bool onDemand = false; // loaded and unloaded over time while the process runs
};

struct ProcessSpec
{
    QString name;
    int lifetime = 0; // steps a transient process lives; 0 for resident processes
    QList<ThreadSpec> threads;
    QList<LoadedModuleSpec> modules;
};

struct ProcessEvolutionSpec
{
    bool enabled = false;
    quint32 seed = 1;
    int intervalMs = 2000;
    int maxProcesses = 16;
    int changesPerStep = 1; // processes whose threads or modules change in one step
};

struct PlatformClassSpec
{
    QString id;        // formatId form
    QString component; // the built-in component exporting it; empty: known but not shipped
};

struct EnablementSpec
{
    enum class Mode
    {
        None,
        Service,   // developer enablement service: expiry and privileges
        Signature, // global test signature
        Both,      // the signature and the service at once
    };
    Mode mode = Mode::None;
    QString owner; // who the enablement was granted to
    QString expires; // ctime layout, e.g. "Sun Sep 19 20:00:00 2027"
    QStringList priviledges;
};

struct VolumeSpec
{
    quint32 id = 0;
    QString friendlyName;
    QString mountPoint;
    QString folder; // the image's sub-folder holding the volume's files
    quint64 size = 0;
    quint64 reserved = 0; // space taken by the system beyond the image's files
    bool removable = false;
    bool mounted = true;
    QStringList moduleFolders; // relative to the volume; installed modules live below them
    QString installFolder;     // where packages go; one of moduleFolders
};

struct DeviceProfile
{
    enum class Connection
    {
        Simulator,
        Usb,
    };

    QString id;
    QString name;
    Connection connection = Connection::Simulator;
    DeviceData data;
    QString platformName;
    QString platformDirectory;
    QList<PlatformClassSpec> platformClasses;
    QStringList interfaces;
    SettingsNodeSpec settings;
    ProcessEvolutionSpec evolution;
    QList<ProcessSpec> residentProcesses;
    QList<ProcessSpec> transientProcesses;
    EnablementSpec enablement;
    QList<VolumeSpec> volumes;

    QString displayName() const
    {
        return connection == Connection::Usb ? QStringLiteral("Zantro USB Device: ") + name
                                             : QStringLiteral("Zantro Simulator - ") + name;
    }
    QString connectionText() const
    {
        return connection == Connection::Usb ? QStringLiteral("USB") : QStringLiteral("Simulator");
    }
};
