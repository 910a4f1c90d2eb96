#pragma once

#include "DeviceActions.h"
#include "FailurePlan.h"
#include "ImageGenerator.h"

#include <QString>
#include <QStringList>

// The command line of zantro-sim: serving an image (the default) or one of its commands.
class SimOptions
{
public:
    enum class Command
    {
        Serve,
        Generate,
        MakeSample,
        Pack,
        Help,
        Version,
    };

    // arguments includes the program name first. False, with errorString(), on a mistake.
    bool parse(const QStringList& arguments);
    QString errorString() const { return m_error; }
    static QString helpText();

    Command command = Command::Serve;

    // Serve
    QString imageDir;
    QString deviceId;  // empty: the image's own id
    QString socketDir; // empty: ZANTRO_SIM_DIR, else the per-user runtime folder
    QString namesDir;  // empty: the program's folder
    bool reset = false;
    qint32 refuseCode = 0;
    QString refuseText;
    int latencyMs = 0;
    int runLifetimeMs = DeviceActions::DefaultRunLifetimeMs;
    FailurePlan failures;

    // Generate (into outputDir), MakeSample (descriptionPath into outputDir) and Pack
    // (the module folder descriptionPath into the package outputDir)
    QString outputDir;
    QString descriptionPath;
    ImageGenerator::Counts counts;

private:
    bool fail(const QString& message);
    bool parseServe(const QStringList& arguments);
    bool parseGenerate(const QStringList& arguments);
    bool parseMakeSample(const QStringList& arguments);

    QString m_error;
};
