#include "DelvixVersion.h"
#include "ImageGenerator.h"
#include "PackageWriter.h"
#include "PlatformGenerator.h"
#include "SampleBuilder.h"
#include "SimOptions.h"
#include "SimulatorDaemon.h"

#include <QCoreApplication>
#include <QTextStream>

int main(int argc, char* argv[])
{
    QCoreApplication app(argc, argv);
    QCoreApplication::setApplicationName(QStringLiteral("zantro-sim"));
    QTextStream out(stdout);
    QTextStream err(stderr);

    if (app.arguments().value(1) == QLatin1String("platform"))
        return PlatformGenerator::run(app.arguments(), out, err);

    SimOptions options;
    if (!options.parse(app.arguments())) {
        err << "zantro-sim: " << options.errorString() << "\n" << "Try zantro-sim --help\n";
        return 2;
    }

    switch (options.command) {
    case SimOptions::Command::Help:
        out << SimOptions::helpText();
        return 0;
    case SimOptions::Command::Version:
        out << "zantro-sim " DELVIX_VERSION "\n";
        return 0;
    case SimOptions::Command::Generate: {
        ImageGenerator generator;
        if (!generator.generate(options.outputDir, options.counts)) {
            err << "zantro-sim generate: " << generator.errorString() << "\n";
            return 1;
        }
        return 0;
    }
    case SimOptions::Command::MakeSample: {
        SampleBuilder builder;
        if (!builder.build(options.descriptionPath, options.outputDir)) {
            err << "zantro-sim make-sample: " << builder.errorString() << "\n";
            return 1;
        }
        return 0;
    }
    case SimOptions::Command::Pack: {
        QString error;
        if (!PackageWriter::pack(options.descriptionPath, options.outputDir, &error)) {
            err << "zantro-sim pack: " << error << "\n";
            return 1;
        }
        return 0;
    }
    case SimOptions::Command::Serve:
        break;
    }

    SimulatorDaemon daemon;
    if (!daemon.start(options)) {
        err << "zantro-sim: " << daemon.errorString() << "\n";
        return 1;
    }
    QObject::connect(&daemon, &SimulatorDaemon::stopped, &app, &QCoreApplication::quit, Qt::QueuedConnection);
    out << "zantro-sim: serving " << daemon.servedImage() << " on " << daemon.socketPath() << Qt::endl;
    return app.exec();
}
