#include "TestImage.h"

#include <QCoreApplication>
#include <QDir>
#include <QtTest>

TestImage::TestImage()
{
    QDir(m_dir.path()).mkpath(QStringLiteral("flash"));
    QDir(m_dir.path()).mkpath(QStringLiteral("card"));
}

QByteArray TestImage::defaultProfile()
{
    return R"(<device id="test-dev" name="Test" connection="simulator">
  <identity phoneName="Test Phone" targetId="0x01020304" zantVersion="3.2.0" zantBuildNumber="3.2.0.1"
            staticBuildId="S1" dynamicBuildId="D1" componentServicesBuild="CS1"/>
  <hardware><fact key="Manufacturer" value="Test Maker"/><fact key="HeapMemory" value="1024"/></hardware>
  <media><audio format="MP3" supported="Yes"/><image format="PNG" supported="Yes"/><video format="H.263" supported="No"/></media>
  <platform name="Test Platform" directory="/opt/test">
    <class id="0x01011001" component="core"/><class id="0x01011002"/><class id="0x01012001"/><interface id="0x02011001"/>
  </platform>
  <settings><value name="rootValue" text="r"/>
    <node name="appinfo"><value name="count" text="2"/><value name="owner" text="test"/>
      <node name="calc"><value name="version" text="1.0"/></node><node name="notes"/></node>
    <node name="CSA_REMOVAL"><node name="hidden"/></node>
  </settings>
  <processes evolve="no">
    <process name="Kernel"><thread name="idle" priority="0" state="1"/>
      <module name="k.bin" location="/sys/k.bin" size="10"/></process>
  </processes>
  <enablement mode="service" owner="Tester" expires="Sun Sep 19 20:00:00 2027">
    <priviledge id="0x00000011"/><priviledge id="0x12345678"/>
  </enablement>
  <volume id="1" name="Flash" mount="/" folder="flash" size="1000000" reserved="1000" modules="sys/mod usermod" install="usermod"/>
  <volume id="2" name="Card" mount="/card" folder="card" size="500" removable="yes"/>
</device>
)";
}

void TestImage::writeFile(const QString& relativePath, const QByteArray& bytes)
{
    QString error;
    QVERIFY2(SampleBuilder::writeFile(QDir(m_dir.path()).filePath(relativePath), bytes, &error), qPrintable(error));
}

void TestImage::addModule(const QString& relativeFolder, const SampleBuilder::ModuleSpec& module)
{
    QString error;
    QVERIFY2(SampleBuilder::writeModule(QDir(m_dir.path()).filePath(relativeFolder), module, &error), qPrintable(error));
}

SampleBuilder::ModuleSpec TestImage::module(const QString& name, const QVector<quint32>& classes,
                                            const QVector<MifMimeType>& mimeTypes)
{
    SampleBuilder::ModuleSpec spec;
    spec.name = name;
    spec.version = QStringLiteral("1.2.3");
    spec.type = QStringLiteral("Application | Preinstalled");
    spec.signature = QStringLiteral("developer");
    spec.copyright = QStringLiteral("(c) Test");
    spec.codeSize = 100;
    spec.mif.classes = classes;
    spec.mif.mimeTypes = mimeTypes;
    return spec;
}

void TestImage::fillDefault()
{
    writeProfile(defaultProfile());
    addModule(QStringLiteral("flash/sys/mod/sysm"),
              module(QStringLiteral("sysm"), {0x01012001}, {{0x01012001, 0x01011001, QStringLiteral("text/plain")}}));
    addModule(QStringLiteral("flash/usermod/userm"),
              module(QStringLiteral("userm"), {0x01013001, 0x7F000001},
                     {{0x01013001, 0x01011001, QStringLiteral("TEXT/plain")}, {0x7F000001, 0x01011001, QStringLiteral("image/png")}}));
    writeFile(QStringLiteral("flash/user/notes.txt"), "hello");
    writeFile(QStringLiteral("flash/user/.hidden"), "h");
    writeFile(QStringLiteral("flash/shared/tone.mid"), QByteArray(9999, 't'));
    writeFile(QStringLiteral("card/user/photo.jpg"), QByteArray(200, 'p'));
}

bool TestImage::load()
{
    m_handler.reset();
    m_state = std::make_unique<DeviceState>();
    if (!m_state->load(path(), QCoreApplication::applicationDirPath())) {
        qWarning("%s", qPrintable(m_state->errorString()));
        return false;
    }
    m_handler = std::make_unique<SimRequestHandler>(*m_state);
    return true;
}
