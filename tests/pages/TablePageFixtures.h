#pragma once

// Device images for the tests of the module list and class id list pages.

#include "Portlex.h"
#include "SimulatorProcess.h"

#include <QDir>
#include <QFile>
#include <QProcess>

namespace TablePageFixtures {

// A small image's profile: one flash volume whose module folder is "usermod", and the
// given platform class elements.
inline QByteArray profile(const QByteArray& platformClasses)
{
    return "<device id=\"tables\" name=\"Tables\" connection=\"simulator\">\n"
           " <identity phoneName=\"Tables\" targetId=\"0x0A1100FF\" zantVersion=\"3.2.9\"/>\n"
           " <hardware>\n"
           "  <fact key=\"Manufacturer\" value=\"Norvale &amp; Sons\"/>\n"
           "  <fact key=\"Model\" value=\"T&lt;1&gt; &quot;Slim&quot;\"/>\n"
           " </hardware>\n"
           " <platform name=\"Test Platform\" directory=\"/opt/zantro/test\">\n"
        + platformClasses
        + " </platform>\n"
          " <volume id=\"1\" name=\"Flash\" mount=\"/\" folder=\"flash\" size=\"16777216\" modules=\"usermod\"/>\n"
          "</device>\n";
}

// Writes an image into folder: the profile and, unless modules is empty, the modules that
// sample description lists (<sample><module .../></sample>), built by zantro-sim.
inline bool writeImage(const QString& folder, const QByteArray& platformClasses, const QByteArray& modules = {})
{
    const QDir image(folder);
    QFile device(image.filePath(QStringLiteral("device.xml")));
    if (!image.mkpath(QStringLiteral("flash/usermod")) || !device.open(QIODevice::WriteOnly)
        || device.write(profile(platformClasses)) < 0)
        return false;
    device.close();
    if (modules.isEmpty())
        return true;
    QFile description(image.filePath(QStringLiteral("modules.xml")));
    if (!description.open(QIODevice::WriteOnly) || description.write("<sample>\n" + modules + "</sample>\n") < 0)
        return false;
    description.close();
    return QProcess::execute(SimulatorProcess::executable(),
                             {QStringLiteral("make-sample"), description.fileName(), folder})
        == 0;
}

// One module element of a sample description.
inline QByteArray module(const QByteArray& name, const QByteArray& version, const QByteArray& type,
                         const QByteArray& signature, const QByteArray& copyright)
{
    return "<module volume=\"flash\" folder=\"usermod/" + name + "\" name=\"" + name + "\" version=\"" + version
        + "\" type=\"" + type + "\" signature=\"" + signature + "\" copyright=\"" + copyright + "\" size=\"16\"/>\n";
}

// Serves image as device id and connects it; null, with a warning, on failure.
inline QSharedPointer<_ZantDevice> connectImage(SimulatorProcess& simulator, const QString& image, const QString& id,
                                                const QStringList& extraArguments = {})
{
    if (!simulator.start(image, id, extraArguments)) {
        qWarning("%s", qPrintable(simulator.errorString()));
        return {};
    }
    QList<QPair<QString, QString>> devices;
    Portlex::GetDevices(devices);
    QSharedPointer<_ZantDevice> device = Portlex::GetDevice(id);
    if (device && Portlex::ConnectDevice(device, QString(), QString()))
        return device;
    qWarning("connect failed: %s", qPrintable(Portlex::LastStatus()));
    return {};
}

} // namespace TablePageFixtures
