#include "SimOptions.h"

#include "DeviceProfileParser.h"
#include "SimRequestHandler.h"

#include <QCommandLineParser>

bool SimOptions::fail(const QString& message)
{
    m_error = message;
    return false;
}

QString SimOptions::helpText()
{
    return QStringLiteral(
        "Usage:\n"
        "  zantro-sim --image DIR [options]      serve one device until SIGINT or SIGTERM\n"
        "  zantro-sim generate OUT --modules N --classes N --files N --processes N\n"
        "                      [--mime-types N] [--settings N] [--folders N] [--threads N]\n"
        "                      [--loaded-modules N] [--churn PERCENT]\n"
        "                                        write a large synthetic image to OUT: N MIME\n"
        "                                        records in the modules (default one per module\n"
        "                                        that exports a class), a settings store of N\n"
        "                                        nodes (default the five named branches), the\n"
        "                                        files spread over N folders of /shared/bulk, N\n"
        "                                        threads (default 2) and N loaded modules\n"
        "                                        (default 1) per process, PERCENT of the\n"
        "                                        processes changing every second (0: none)\n"
        "  zantro-sim make-sample DESCRIPTION IMAGE\n"
        "                                        write the modules and files a sample\n"
        "                                        description lists into IMAGE\n"
        "  zantro-sim pack DIR OUT.zantro        build a package from the module folder DIR\n"
        "  zantro-sim platform OUT [--mifs N] [--names DIR]\n"
        "                                        write a synthetic platform build folder of N\n"
        "                                        MIF files (default 100), a few of them broken\n"
        "\n"
        "Serving options:\n"
        "  --image DIR            the device image: DIR/device.xml and one folder per volume\n"
        "  --id ID                device id (default: the image's id); the socket is named ID\n"
        "  --socket-dir DIR       folder of the socket (default: $ZANTRO_SIM_DIR, else the\n"
        "                         per-user runtime folder + /zantro-sim); created with mode 0700\n"
        "  --reset                serve a fresh copy of the image in a temporary folder; the\n"
        "                         image itself stays untouched, and copies left by killed\n"
        "                         simulators are removed\n"
        "  --refuse-connect CODE:TEXT\n"
        "                         answer every Connect with result CODE and status TEXT (and\n"
        "                         so serve nothing else)\n"
        "  --latency MS           delay every answer (and take every frame of an upload)\n"
        "                         MS milliseconds late\n"
        "  --run-lifetime MS      how long a process started by RunApplication lives\n"
        "                         (default 10000)\n"
        "  --fail OP[:PATH]=CODE  make operation OP answer CODE (decimal or 0x...), for every\n"
        "                         request or only for those naming exactly PATH; repeatable.\n"
        "                         e.g. GetRegistry=3, GetChildSettings:/appinfo=0xDEADBEEF,\n"
        "                         GetFileSystemLevel:/user=0xDEADBEEF\n"
        "  --names DIR            folder of ClassDB.xml, InterfaceDB.xml, PriviledgeDB.xml used\n"
        "                         to name classes and privileges (default: the installed\n"
        "                         reference data)\n"
        "  --help                 show this text\n"
        "  --version              show the version\n"
        "\n"
        "Operations for --fail: ")
        + SimRequestHandler::operationNames().join(QStringLiteral(", ")) + QLatin1Char('\n');
}

bool SimOptions::parse(const QStringList& arguments)
{
    m_error.clear();
    const QString first = arguments.value(1);
    if (first == QLatin1String("generate"))
        return parseGenerate(arguments);
    if (first == QLatin1String("make-sample"))
        return parseMakeSample(arguments);
    if (first == QLatin1String("pack")) {
        if (arguments.size() != 4)
            return fail(QStringLiteral("pack expects DIR OUT.zantro"));
        command = Command::Pack;
        descriptionPath = arguments.at(2);
        outputDir = arguments.at(3);
        return true;
    }
    return parseServe(arguments);
}

bool SimOptions::parseServe(const QStringList& arguments)
{
    QCommandLineParser parser;
    const QCommandLineOption image(QStringLiteral("image"), QString(), QStringLiteral("DIR"));
    const QCommandLineOption id(QStringLiteral("id"), QString(), QStringLiteral("ID"));
    const QCommandLineOption socketDirOption(QStringLiteral("socket-dir"), QString(), QStringLiteral("DIR"));
    const QCommandLineOption names(QStringLiteral("names"), QString(), QStringLiteral("DIR"));
    const QCommandLineOption resetOption(QStringLiteral("reset"));
    const QCommandLineOption refuse(QStringLiteral("refuse-connect"), QString(), QStringLiteral("CODE:TEXT"));
    const QCommandLineOption latency(QStringLiteral("latency"), QString(), QStringLiteral("MS"));
    const QCommandLineOption failOption(QStringLiteral("fail"), QString(), QStringLiteral("RULE"));
    const QCommandLineOption lifetime(QStringLiteral("run-lifetime"), QString(), QStringLiteral("MS"));
    const QCommandLineOption help(QStringList{QStringLiteral("help"), QStringLiteral("h")});
    const QCommandLineOption version(QStringLiteral("version"));
    parser.addOptions({image, id, socketDirOption, names, resetOption, refuse, latency, failOption, lifetime, help, version});
    if (!parser.parse(arguments))
        return fail(parser.errorText());
    if (parser.isSet(help)) {
        command = Command::Help;
        return true;
    }
    if (parser.isSet(version)) {
        command = Command::Version;
        return true;
    }
    if (!parser.positionalArguments().isEmpty())
        return fail(QStringLiteral("unexpected argument \"%1\"").arg(parser.positionalArguments().first()));

    command = Command::Serve;
    imageDir = parser.value(image);
    if (imageDir.isEmpty())
        return fail(QStringLiteral("--image DIR is required"));
    deviceId = parser.value(id);
    if (parser.isSet(id) && !DeviceProfileParser::isValidDeviceId(deviceId))
        return fail(QStringLiteral("--id must be 1-64 letters, digits, '.', '_' or '-'"));
    socketDir = parser.value(socketDirOption);
    namesDir = parser.value(names);
    reset = parser.isSet(resetOption);

    if (parser.isSet(refuse)) {
        const QString value = parser.value(refuse);
        const qsizetype colon = value.indexOf(QLatin1Char(':'));
        if (colon <= 0 || !FailurePlan::parseCode(value.left(colon), refuseCode))
            return fail(QStringLiteral("--refuse-connect expects CODE:TEXT with a non-zero CODE"));
        refuseText = value.mid(colon + 1);
    }
    if (parser.isSet(latency)) {
        bool ok = false;
        latencyMs = parser.value(latency).toInt(&ok);
        if (!ok || latencyMs < 0 || latencyMs > 600000)
            return fail(QStringLiteral("--latency expects milliseconds between 0 and 600000"));
    }
    if (parser.isSet(lifetime)) {
        bool ok = false;
        runLifetimeMs = parser.value(lifetime).toInt(&ok);
        if (!ok || runLifetimeMs < 1 || runLifetimeMs > 3600000)
            return fail(QStringLiteral("--run-lifetime expects milliseconds between 1 and 3600000"));
    }
    const QStringList operations = SimRequestHandler::operationNames();
    for (const QString& rule : parser.values(failOption)) {
        QString error;
        if (!failures.addRule(rule, operations, &error))
            return fail(error);
    }
    return true;
}

bool SimOptions::parseGenerate(const QStringList& arguments)
{
    QCommandLineParser parser;
    const QCommandLineOption modules(QStringLiteral("modules"), QString(), QStringLiteral("N"), QStringLiteral("100"));
    const QCommandLineOption classes(QStringLiteral("classes"), QString(), QStringLiteral("N"), QStringLiteral("200"));
    const QCommandLineOption files(QStringLiteral("files"), QString(), QStringLiteral("N"), QStringLiteral("100"));
    const QCommandLineOption processes(QStringLiteral("processes"), QString(), QStringLiteral("N"), QStringLiteral("10"));
    const QCommandLineOption mimeTypes(QStringLiteral("mime-types"), QString(), QStringLiteral("N"));
    const QCommandLineOption settings(QStringLiteral("settings"), QString(), QStringLiteral("N"), QStringLiteral("0"));
    const QCommandLineOption folders(QStringLiteral("folders"), QString(), QStringLiteral("N"), QStringLiteral("0"));
    const QCommandLineOption threads(QStringLiteral("threads"), QString(), QStringLiteral("N"), QStringLiteral("2"));
    const QCommandLineOption loaded(QStringLiteral("loaded-modules"), QString(), QStringLiteral("N"), QStringLiteral("1"));
    const QCommandLineOption churn(QStringLiteral("churn"), QString(), QStringLiteral("PERCENT"));
    parser.addOptions({modules, classes, files, processes, mimeTypes, settings, folders, threads, loaded, churn});
    QStringList rest = arguments;
    rest.removeAt(1);
    if (!parser.parse(rest))
        return fail(parser.errorText());
    if (parser.positionalArguments().size() != 1)
        return fail(QStringLiteral("generate expects one output folder"));
    command = Command::Generate;
    outputDir = parser.positionalArguments().first();

    const auto count = [&parser, this](const QCommandLineOption& option, int& value, int most = 1000000) {
        bool ok = false;
        value = parser.value(option).toInt(&ok);
        if (!ok || value < 0 || value > most)
            return fail(QStringLiteral("--%1 expects a count between 0 and %2").arg(option.names().first()).arg(most));
        return true;
    };
    // A node takes about a hundred bytes of device.xml, which has a size limit.
    constexpr int MostSettings = 100000;
    return count(modules, counts.modules) && count(classes, counts.classes) && count(files, counts.files)
        && count(processes, counts.processes) && (!parser.isSet(mimeTypes) || count(mimeTypes, counts.mimeTypes))
        && count(settings, counts.settings, MostSettings) && count(folders, counts.folders)
        && count(threads, counts.threads, 1000) && count(loaded, counts.loadedModules, 1000)
        && (!parser.isSet(churn) || count(churn, counts.churn, 100));
}

bool SimOptions::parseMakeSample(const QStringList& arguments)
{
    if (arguments.size() != 4)
        return fail(QStringLiteral("make-sample expects DESCRIPTION IMAGE"));
    command = Command::MakeSample;
    descriptionPath = arguments.at(2);
    outputDir = arguments.at(3);
    return true;
}
