#include "ImageGenerator.h"

#include "SampleBuilder.h"

#include <QDir>
#include <QHash>
#include <QXmlStreamWriter>

#include <algorithm>

namespace {

// One node of a generated settings store.
struct SettingsNode
{
    QString name;
    QVector<QPair<QString, QString>> values;
    QVector<int> children;
};

// The child counts that the generated parents take in turn: one in each of the crawl's
// bands (up to 10, 50, 100 and more than 100 siblings).
constexpr int SettingsFanouts[] = {5, 40, 90, 200};

SettingsNode generatedNode(int index)
{
    SettingsNode node;
    node.name = QStringLiteral("n%1").arg(index, 6, 10, QLatin1Char('0'));
    // Most nodes hold nothing, a third hold a pair of values, a few hold many.
    const int values = index % 50 == 0 ? 20 : index % 3 == 0 ? 2 : 0;
    for (int v = 0; v < values; ++v)
        node.values.append({QStringLiteral("key%1").arg(v, 2, 10, QLatin1Char('0')), QStringLiteral("value %1.%2").arg(index).arg(v)});
    return node;
}

// Hangs count new nodes below parents, breadth first, each parent in turn taking the next
// child count of the cycle.
void growSettings(QVector<SettingsNode>& nodes, QVector<int> parents, int count)
{
    int turn = 0;
    for (int next = 0; count > 0 && next < parents.size(); ++next) {
        const int parent = parents.at(next);
        const int take = std::min(SettingsFanouts[turn++ % std::size(SettingsFanouts)], count);
        for (int c = 0; c < take; ++c) {
            const int index = int(nodes.size());
            nodes.append(generatedNode(index));
            nodes[parent].children.append(index);
            parents.append(index);
        }
        count -= take;
    }
}

// The store below the root (node 0): the named branches, then generated nodes up to total:
// a twentieth below "oattest", a hundredth below "CSA_REMOVAL", the rest in eight branches.
QVector<SettingsNode> settingsStore(int total)
{
    QVector<SettingsNode> nodes(1);
    QHash<QString, int> named;
    for (const char* branch : {"appinfo", "ztoversion", "oattest", "CSA_NORMAL", "CSA_REMOVAL"}) {
        named.insert(QLatin1String(branch), int(nodes.size()));
        nodes[0].children.append(int(nodes.size()));
        nodes.append({QLatin1String(branch), {{QStringLiteral("generated"), QStringLiteral("yes")}}, {}});
    }
    const int rest = std::max(0, total - ImageGenerator::NamedSettingsBranches);
    const int lastRead = rest / 20;
    const int neverRead = rest / 100;
    growSettings(nodes, {named.value(QStringLiteral("oattest"))}, lastRead);
    growSettings(nodes, {named.value(QStringLiteral("CSA_REMOVAL"))}, neverRead);
    const int bulk = rest - lastRead - neverRead;
    QVector<int> branches;
    for (int b = 0; b < std::min(8, bulk); ++b) {
        branches.append(int(nodes.size()));
        nodes[0].children.append(int(nodes.size()));
        nodes.append(generatedNode(int(nodes.size())));
    }
    growSettings(nodes, branches, bulk - int(branches.size()));
    return nodes;
}

void writeSettingsNode(QXmlStreamWriter& w, const QVector<SettingsNode>& nodes, int index)
{
    const SettingsNode& node = nodes.at(index);
    w.writeStartElement(QStringLiteral("node"));
    w.writeAttribute(QStringLiteral("name"), node.name);
    for (const auto& value : node.values) {
        w.writeEmptyElement(QStringLiteral("value"));
        w.writeAttribute(QStringLiteral("name"), value.first);
        w.writeAttribute(QStringLiteral("text"), value.second);
    }
    for (int child : node.children)
        writeSettingsNode(w, nodes, child);
    w.writeEndElement();
}

// MIME record j lives in module j % modules. The first round claims a type of its own per
// module; later rounds claim the first round's types again, as inactive entries.
MifMimeType mimeRecord(int j, const ImageGenerator::Counts& counts)
{
    const auto classId = [&counts](int k) {
        return ImageGenerator::FirstClassId + quint32(counts.classes > 0 ? k % counts.classes : 0);
    };
    return {classId(j), classId(j / counts.modules), QStringLiteral("application/x-gen-%1").arg(j % counts.modules)};
}

} // namespace

bool ImageGenerator::generate(const QString& imageDir, const Counts& counts)
{
    if (counts.modules < 0 || counts.classes < 0 || counts.files < 0 || counts.folders < 0 || counts.processes < 0
        || counts.mimeTypes < -1 || counts.settings < 0 || counts.threads < 0 || counts.loadedModules < 0
        || counts.churn < -1 || counts.churn > 100) {
        m_error = QStringLiteral("counts must not be negative");
        return false;
    }
    const int mimeTypes = counts.mimeTypes >= 0 ? counts.mimeTypes : std::min(counts.modules, counts.classes);
    if (mimeTypes > 0 && (counts.modules == 0 || (mimeTypes - 1) / counts.modules >= MaxMimeTypesPerModule)) {
        m_error = QStringLiteral("%1 MIME types need at least %2 modules")
                      .arg(mimeTypes)
                      .arg((mimeTypes - 1) / MaxMimeTypesPerModule + 1);
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
        for (int j = m; j < mimeTypes; j += counts.modules)
            module.mif.mimeTypes.append(mimeRecord(j, counts));
        const QString folder = image.filePath(QStringLiteral("flash/usermod/g%1").arg(m / ModulesPerFolder, 3, 10, QLatin1Char('0')));
        if (!SampleBuilder::writeModule(folder, module, &m_error))
            return false;
    }

    const QByteArray line("generated file\n");
    for (int f = 0; f < counts.files; ++f) {
        const QString folder = counts.folders > 0
            ? QStringLiteral("flash/shared/bulk/d%1/").arg(f % counts.folders, 5, 10, QLatin1Char('0'))
            : QStringLiteral("flash/shared/bulk/");
        const QString path = image.filePath(folder + QStringLiteral("file%1.txt").arg(f, 6, 10, QLatin1Char('0')));
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
    const QVector<SettingsNode> store = settingsStore(counts.settings);
    for (int branch : store.first().children)
        writeSettingsNode(w, store, branch);
    w.writeEndElement();

    w.writeStartElement(QStringLiteral("processes"));
    w.writeAttribute(QStringLiteral("evolve"), counts.churn == 0 ? QStringLiteral("no") : QStringLiteral("yes"));
    w.writeAttribute(QStringLiteral("seed"), QStringLiteral("7"));
    w.writeAttribute(QStringLiteral("max"), QString::number(counts.processes + 8));
    if (counts.churn >= 0) {
        w.writeAttribute(QStringLiteral("interval"), QStringLiteral("1000"));
        w.writeAttribute(QStringLiteral("changes"), QString::number(std::max(1, counts.processes * counts.churn / 100)));
    }
    const auto writeModule = [&w](const QString& name, bool onDemand) {
        w.writeEmptyElement(QStringLiteral("module"));
        w.writeAttribute(QStringLiteral("name"), name);
        w.writeAttribute(QStringLiteral("location"), QStringLiteral("/usermod"));
        w.writeAttribute(QStringLiteral("size"), QStringLiteral("256"));
        if (onDemand)
            w.writeAttribute(QStringLiteral("onDemand"), QStringLiteral("yes"));
    };
    for (int p = 0; p < counts.processes; ++p) {
        w.writeStartElement(QStringLiteral("process"));
        w.writeAttribute(QStringLiteral("name"), QStringLiteral("proc%1").arg(p));
        for (int t = 0; t < counts.threads; ++t) {
            w.writeEmptyElement(QStringLiteral("thread"));
            w.writeAttribute(QStringLiteral("name"), QStringLiteral("thread%1").arg(t));
            w.writeAttribute(QStringLiteral("priority"), QString::number(100 + t));
            w.writeAttribute(QStringLiteral("state"), QString::number(t % 4));
        }
        for (int m = 0; m < counts.loadedModules; ++m)
            writeModule(m == 0 ? QStringLiteral("proc%1.mod").arg(p) : QStringLiteral("proc%1-%2.lib").arg(p).arg(m), false);
        // Modules that a changing process loads and unloads.
        for (int m = 0; counts.churn > 0 && m < 2; ++m)
            writeModule(QStringLiteral("proc%1-plugin%2.lib").arg(p).arg(m), true);
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
