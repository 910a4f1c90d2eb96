// Writes the package seeds: package-seed-generator fuzz/corpus/package
// Valid module packages and the hostile kinds the extraction must refuse, byte for byte
// the same on every run.
#include "PackageWriter.h"

#include <QDir>

#include <cstdio>
#include <functional>

int main(int argc, char** argv)
{
    if (argc != 2) {
        std::fprintf(stderr, "usage: package-seed-generator OUTDIR\n");
        return 2;
    }
    const QDir out(QString::fromLocal8Bit(argv[1]));
    const QList<QPair<QString, std::function<void(PackageWriter&)>>> seeds {
        {QStringLiteral("module"), [](PackageWriter& w) {
             w.addDirectory(QStringLiteral("calc"));
             w.addFile(QStringLiteral("calc/calc.mif"), QByteArray(600, 'M'));
             w.addFile(QStringLiteral("calc/calc.mod"), QByteArray("code").repeated(100));
             w.addFile(QStringLiteral("calc/calc.inf"), "version=1.0\nsignature=developer\n");
         }},
        {QStringLiteral("nested"), [](PackageWriter& w) {
             w.addFile(QStringLiteral("a/b/c/d.txt"), "deep");
             w.addFile(QStringLiteral("./a/./e.txt"), "dots");
         }},
        {QStringLiteral("dotdot"), [](PackageWriter& w) { w.addFile(QStringLiteral("../escape"), "x"); }},
        {QStringLiteral("dotdot_inner"), [](PackageWriter& w) { w.addFile(QStringLiteral("m/../../escape"), "x"); }},
        {QStringLiteral("absolute"), [](PackageWriter& w) { w.addFile(QStringLiteral("/tmp/zantro-escape"), "x"); }},
        {QStringLiteral("symlink"), [](PackageWriter& w) {
             w.addSymlink(QStringLiteral("m/link"), QStringLiteral("../../.."));
             w.addFile(QStringLiteral("m/link/escape"), "x");
         }},
        {QStringLiteral("duplicate"), [](PackageWriter& w) {
             w.addFile(QStringLiteral("m/a"), "1");
             w.addFile(QStringLiteral("m/a"), "2");
         }},
        {QStringLiteral("bomb"), [](PackageWriter& w) { w.addFile(QStringLiteral("m/zeros"), QByteArray(4 << 20, 0)); }},
        {QStringLiteral("empty"), [](PackageWriter&) {}},
    };
    for (const auto& seed : seeds) {
        PackageWriter writer;
        if (!writer.open(out.filePath(seed.first + QStringLiteral(".zantro"))))
            return 1;
        seed.second(writer);
        if (!writer.close()) {
            std::fprintf(stderr, "%s: %s\n", qPrintable(seed.first), qPrintable(writer.errorString()));
            return 1;
        }
    }
    return 0;
}
