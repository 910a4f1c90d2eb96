// Feeds arbitrary bytes as the request payload of every operation to the simulator's
// request handler, serving a small image written once per process.
#include "DeviceState.h"
#include "PortlexErrors.h"
#include "SampleBuilder.h"
#include "SimRequestHandler.h"

#include <QDir>
#include <QTemporaryDir>

#include <cstdint>
#include <cstdlib>

namespace {

const char* const Profile = R"(<device id="fuzz" name="Fuzz">
  <platform name="P"><class id="0x01011001" component="core"/><class id="0x01011002"/></platform>
  <settings><node name="appinfo"><value name="a" text="b"/><node name="calc"/></node><node name="CSA_NORMAL"/></settings>
  <processes evolve="yes" interval="50"><process name="K"><thread name="t"/><module name="m" onDemand="yes"/></process>
    <transient name="T" lifetime="2"><thread name="u"/></transient></processes>
  <enablement mode="service" expires="Sun Sep 19 20:00:00 2027"><priviledge id="0x11"/></enablement>
  <volume id="1" mount="/" folder="flash" size="100000" modules="sys/mod usermod" install="usermod"/>
  <volume id="2" mount="/card" folder="card" size="100" removable="yes"/>
</device>)";

struct Device
{
    QTemporaryDir dir;
    QTemporaryDir outside;
    DeviceState state;
    std::unique_ptr<SimRequestHandler> handler;
    QList<Operation> operations;

    Device()
    {
        QString error;
        SampleBuilder::ModuleSpec module;
        module.name = QStringLiteral("calc");
        module.mif.classes = {0x01011002};
        module.mif.mimeTypes = {{0x01011002, 0x01011001, QStringLiteral("text/plain")}};
        const QDir image(dir.path());
        if (!SampleBuilder::writeFile(image.filePath(QStringLiteral("device.xml")), Profile, &error)
            || !SampleBuilder::writeModule(image.filePath(QStringLiteral("flash/usermod/calc")), module, &error)
            || !SampleBuilder::writeFile(image.filePath(QStringLiteral("flash/user/a.txt")), "a", &error)
            || !SampleBuilder::writeFile(image.filePath(QStringLiteral("card/err/log.txt")), "e", &error)
            || !SampleBuilder::writeFile(QDir(outside.path()).filePath(QStringLiteral("secret")), "s", &error)
            || !QFile::link(outside.path(), image.filePath(QStringLiteral("flash/out")))
            || !state.load(dir.path(), dir.path()))
            abort();
        handler = std::make_unique<SimRequestHandler>(state);
        operations = SimRequestHandler::operations();
    }
};

bool isConfined(const QString& path)
{
    return path.startsWith(QLatin1Char('/')) && !path.split(QLatin1Char('/')).contains(QStringLiteral(".."))
        && !path.contains(QLatin1String("secret"));
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    static Device device;
    Request request;
    request.payload = QByteArray(reinterpret_cast<const char*>(data), qsizetype(size));
    for (Operation operation : std::as_const(device.operations)) {
        request.operation = operation;
        const Answer answer = device.handler->handle(request);
        if (answer.result != 0 || request.operation != Operation::GetFileSystemLevel)
            continue;
        // Whatever was asked, a level only ever shows what lies inside a volume.
        _DirectoryInfo level;
        PayloadStream in(answer.body);
        in >> level;
        if (!in.ok() || !isConfined(level.Path()))
            abort();
        for (const auto& file : level.files) {
            if (!isConfined(file->Path()))
                abort();
        }
        for (const auto& directory : level.directories) {
            if (!isConfined(directory->Path()))
                abort();
        }
    }
    return 0;
}
