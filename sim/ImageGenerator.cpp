#include "ImageGenerator.h"

#include "SampleBuilder.h"

#include <QDir>
#include <QXmlStreamWriter>

bool ImageGenerator::generate(const QString& imageDir, const Counts& counts)
{
    if (counts.modules < 0 || counts.classes < 0 || counts.files < 0 || counts.processes < 0) {
        m_error = QStringLiteral("counts must not be negative");
        return false;
    }
    const QDir image(imageDir);
    if (!image.mkpath(QStringLiteral("flash/usermod")) || !image.mkpath(QStringLiteral("flash/shared/bulk"))
        || !image.mkpath(QStringLiteral("flash/user")) || !image.mkpath(QStringLiteral("flash/err"))) {
        m_error = QStringLiteral("cannot create the volume folders in %1").arg(imageDir);
        return false;
    }

    for (int m = 0; m < counts.modules; ++m) {
        SampleBuilder::ModuleSpec module;
        module.name = QStringLiteral("gen%1").arg(m, 5, 10, QLatin1Char('0'));
        module.version = QStringLiteral("1.0.%1").arg(m);
        module.type = QStringLiteral("Application");
        module.signature = QStringLiteral("test");
        module.copyright = QStringLiteral("Generated module %1").arg(m);
        module.codeSize = 256;
        // Module m exports every class k with k % modules == m.
        for (int k = m; k < counts.classes; k += counts.modules)
            module.mif.classes.append(FirstClassId + quint32(k));
        if (!module.mif.classes.isEmpty())
            module.mif.mimeTypes.append({module.mif.classes.first(), FirstClassId,
                                         QStringLiteral("application/x-gen-%1").arg(m)});
        const QString folder = image.filePath(QStringLiteral("flash/usermod/g%1").arg(m / ModulesPerFolder, 3, 10, QLatin1Char('0')));
        if (!SampleBuilder::writeModule(folder, module, &m_error))
            return false;
    }

    const QByteArray line("generated file\n");
    for (int f = 0; f < counts.files; ++f) {
        const QString path = image.filePath(QStringLiteral("flash/shared/bulk/file%1.txt").arg(f, 6, 10, QLatin1Char('0')));
        if (!SampleBuilder::writeFile(path, line, &m_error))
            return false;
    }
    return writeProfile(imageDir, counts);
}

bool ImageGenerator::writeProfile(const QString& imageDir, const Counts& counts)
{
    QByteArray xml;
    QXmlStreamWriter w(&xml);
    w.setAutoFormatting(true);
    w.writeStartDocument();
    w.writeStartElement(QStringLiteral("device"));
    w.writeAttribute(QStringLiteral("id"), QStringLiteral("generated-%1").arg(counts.modules));
    w.writeAttribute(QStringLiteral("name"), QStringLiteral("Generated %1").arg(counts.modules));
    w.writeAttribute(QStringLiteral("connection"), QStringLiteral("simulator"));

    w.writeEmptyElement(QStringLiteral("identity"));
    w.writeAttribute(QStringLiteral("phoneName"), QStringLiteral("Generated"));
    w.writeAttribute(QStringLiteral("targetId"), QStringLiteral("0x7E000000"));
    w.writeAttribute(QStringLiteral("zantVersion"), QStringLiteral("3.2.0"));

    w.writeStartElement(QStringLiteral("settings"));
    for (const char* branch : {"appinfo", "ztoversion", "oattest", "CSA_NORMAL", "CSA_REMOVAL"}) {
        w.writeStartElement(QStringLiteral("node"));
        w.writeAttribute(QStringLiteral("name"), QLatin1String(branch));
        w.writeEmptyElement(QStringLiteral("value"));
        w.writeAttribute(QStringLiteral("name"), QStringLiteral("generated"));
        w.writeAttribute(QStringLiteral("text"), QStringLiteral("yes"));
        w.writeEndElement();
    }
    w.writeEndElement();

    w.writeStartElement(QStringLiteral("processes"));
    w.writeAttribute(QStringLiteral("evolve"), QStringLiteral("yes"));
    w.writeAttribute(QStringLiteral("seed"), QStringLiteral("7"));
    w.writeAttribute(QStringLiteral("max"), QString::number(counts.processes + 8));
    for (int p = 0; p < counts.processes; ++p) {
        w.writeStartElement(QStringLiteral("process"));
        w.writeAttribute(QStringLiteral("name"), QStringLiteral("proc%1").arg(p));
        for (int t = 0; t < 2; ++t) {
            w.writeEmptyElement(QStringLiteral("thread"));
            w.writeAttribute(QStringLiteral("name"), QStringLiteral("thread%1").arg(t));
            w.writeAttribute(QStringLiteral("priority"), QString::number(100 + t));
            w.writeAttribute(QStringLiteral("state"), QString::number(t));
        }
        w.writeEmptyElement(QStringLiteral("module"));
        w.writeAttribute(QStringLiteral("name"), QStringLiteral("proc%1.mod").arg(p));
        w.writeAttribute(QStringLiteral("location"), QStringLiteral("/usermod"));
        w.writeAttribute(QStringLiteral("size"), QStringLiteral("256"));
        w.writeEndElement();
    }
    w.writeEndElement();

    w.writeEmptyElement(QStringLiteral("volume"));
    w.writeAttribute(QStringLiteral("id"), QStringLiteral("1"));
    w.writeAttribute(QStringLiteral("name"), QStringLiteral("Generated Flash"));
    w.writeAttribute(QStringLiteral("mount"), QStringLiteral("/"));
    w.writeAttribute(QStringLiteral("folder"), QStringLiteral("flash"));
    w.writeAttribute(QStringLiteral("size"), QString::number(Q_UINT64_C(8) * 1024 * 1024 * 1024));
    w.writeEndElement();
    w.writeEndDocument();

    return SampleBuilder::writeFile(QDir(imageDir).filePath(QStringLiteral("device.xml")), xml, &m_error);
}
