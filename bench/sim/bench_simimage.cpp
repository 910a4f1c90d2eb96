// Prints how long the simulator takes to generate and load a large image and to build its
// largest answers (the request handler only, no socket). Not a test: figures only.
#include "DeviceState.h"
#include "ImageGenerator.h"
#include "SimRequestHandler.h"

#include <QCoreApplication>
#include <QElapsedTimer>
#include <QTemporaryDir>
#include <QTextStream>

#include <algorithm>

namespace {

double medianMs(QVector<qint64> nanoseconds)
{
    std::sort(nanoseconds.begin(), nanoseconds.end());
    return nanoseconds.at(nanoseconds.size() / 2) / 1e6;
}

// The answer's size, or -1 with its result when the device refused.
double timeRequest(SimRequestHandler& handler, Operation operation, const QByteArray& payload, int runs, int& bytes,
                   qint32& result)
{
    Request request;
    request.operation = operation;
    request.payload = payload;
    QVector<qint64> times;
    for (int i = 0; i < runs; ++i) {
        QElapsedTimer timer;
        timer.start();
        const Answer answer = handler.handle(request);
        times.append(timer.nsecsElapsed());
        result = answer.result;
        bytes = answer.result == 0 ? int(answer.body.size()) : -1;
    }
    return medianMs(times);
}

} // namespace

int main(int argc, char* argv[])
{
    QCoreApplication app(argc, argv);
    QTextStream out(stdout);
    const int modules = argc > 1 ? QString::fromLocal8Bit(argv[1]).toInt() : 10000;

    QTemporaryDir dir;
    ImageGenerator::Counts counts;
    counts.modules = modules;
    counts.classes = modules * 2;
    counts.files = modules;
    counts.processes = 50;
    QElapsedTimer timer;
    timer.start();
    ImageGenerator generator;
    if (!generator.generate(dir.path(), counts)) {
        out << "generate failed: " << generator.errorString() << "\n";
        return 1;
    }
    out << "generate " << modules << " modules, " << counts.classes << " classes, " << counts.files
        << " files: " << timer.elapsed() << " ms\n";

    timer.restart();
    DeviceState state;
    if (!state.load(dir.path(), QCoreApplication::applicationDirPath())) {
        out << "load failed: " << state.errorString() << "\n";
        return 1;
    }
    out << "load the image: " << timer.elapsed() << " ms\n";

    SimRequestHandler handler(state);
    // The device serves a connection only after it accepted a Connect on it.
    Request connect;
    connect.operation = Operation::Connect;
    PayloadStream credentials(&connect.payload);
    credentials << QString() << QString();
    if (const Answer accepted = handler.handle(connect); accepted.result != 0) {
        out << "Connect refused: " << accepted.result << "\n";
        return 1;
    }
    int bytes = 0;
    qint32 result = 0;
    QByteArray bulk;
    PayloadStream path(&bulk);
    path << QStringLiteral("/shared/bulk");
    const struct
    {
        const char* name;
        Operation operation;
        QByteArray payload;
    } requests[] = {
        {"GetModules", Operation::GetModules, QByteArray()},
        {"GetCache", Operation::GetCache, QByteArray()},
        {"GetRegistry", Operation::GetRegistry, QByteArray()},
        {"GetFileSystemLevel /shared/bulk", Operation::GetFileSystemLevel, bulk},
    };
    for (const auto& r : requests) {
        const double ms = timeRequest(handler, r.operation, r.payload, 9, bytes, result);
        if (bytes < 0)
            out << r.name << ": refused with " << result << "\n";
        else
            out << r.name << ": median " << QString::number(ms, 'f', 2) << " ms, " << bytes << " bytes\n";
    }
    return 0;
}
