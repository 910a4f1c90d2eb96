#include "LevelDefinition.h"
#include "LevelFiles.h"
#include "NameDatabases.h"

#include <QBuffer>
#include <QCoreApplication>
#include <QDir>
#include <QFile>
#include <QTemporaryDir>
#include <QTest>

namespace {

void writeFile(const QString& path, const QByteArray& content)
{
    QFile file(path);
    QVERIFY(file.open(QIODevice::WriteOnly | QIODevice::Truncate));
    QCOMPARE(file.write(content), qint64(content.size()));
}

IdRecord idAndName(const QString& id, const QString& name)
{
    IdRecord r;
    r.id = id;
    r.name = name;
    return r;
}

bool loadText(LevelDefinition& level, const QByteArray& text)
{
    QBuffer buffer;
    buffer.setData(text);
    return buffer.open(QIODevice::ReadOnly) && level.load(&buffer);
}

const QByteArray TwoClasses = R"(<level><Id value="0x00000001" name="One"/><Id value="0x00000002" name="Two"/></level>)";

} // namespace

class TestLevelDefinition : public QObject
{
    Q_OBJECT

private slots:
    void listsFilesContainingXml();
    void listsNothingForMissingFolder();
    void listsShippedLevels();
    void failedLoadKeepsRecords_data();
    void failedLoadKeepsRecords();
    void readsIdChildrenInOrder();
    void mergesWithIdMap();
    void copiesAndAppends();
    void shippedLevelsNameKnownClasses();
};

void TestLevelDefinition::listsFilesContainingXml()
{
    QTemporaryDir dir;
    QVERIFY(dir.isValid());
    const QStringList listed{"Level-1.0.xml", "Level-2.0.xml.bak", "a.xmlx", ".hidden.xml"};
    for (const QString& name : listed + QStringList{"LEVEL-3.0.XML", "Level.Xml", "notes.txt", "xml"})
        writeFile(dir.filePath(name), TwoClasses);
    QVERIFY(QDir(dir.path()).mkdir("folder.xml"));

    QStringList list{"left over"};
    listLevelFiles(dir.path(), list);

    QStringList expected;
    for (const QString& name : listed)
        expected << dir.path() + QDir::separator() + name;
    list.sort();
    expected.sort();
    QCOMPARE(list, expected);
}

void TestLevelDefinition::listsNothingForMissingFolder()
{
    QTemporaryDir dir;
    QVERIFY(dir.isValid());
    QStringList list{"left over"};
    listLevelFiles(dir.filePath("Levels"), list);
    QVERIFY(list.isEmpty());

    // A plain file where the folder should be lists nothing either.
    writeFile(dir.filePath("Levels"), TwoClasses);
    listLevelFiles(dir.filePath("Levels"), list);
    QVERIFY(list.isEmpty());
}

void TestLevelDefinition::listsShippedLevels()
{
    QStringList list;
    listLevelFiles(list);
    const QString levels = QCoreApplication::applicationDirPath() + QDir::separator() + "Levels" + QDir::separator();
    QVERIFY(list.contains(levels + "Level-1.0.xml"));
    QVERIFY(list.contains(levels + "Level-2.0.xml"));
}

void TestLevelDefinition::failedLoadKeepsRecords_data()
{
    QTest::addColumn<QString>("name");
    QTest::addColumn<QByteArray>("content");

    QTest::newRow("missing file") << "missing.xml" << QByteArray();
    QTest::newRow("empty file") << "empty.xml" << QByteArray("");
    QTest::newRow("unclosed") << "unclosed.xml" << QByteArray("<level><Id value=\"0x3\" name=\"Three\"/>");
    QTest::newRow("text only") << "text.xml" << QByteArray("Id value=0x3");
    QTest::newRow("undefined entity") << "entity.xml" << QByteArray("<level><Id value=\"&x;\" name=\"Three\"/></level>");
    QTest::newRow("a folder") << "folder.xml" << QByteArray();
}

void TestLevelDefinition::failedLoadKeepsRecords()
{
    QFETCH(QString, name);
    QFETCH(QByteArray, content);

    QTemporaryDir dir;
    QVERIFY(dir.isValid());
    writeFile(dir.filePath("good.xml"), TwoClasses);
    if (name == "folder.xml")
        QVERIFY(QDir(dir.path()).mkdir(name));
    else if (name != "missing.xml")
        writeFile(dir.filePath(name), content);

    LevelDefinition level;
    QVERIFY(level.load(dir.filePath("good.xml")));
    const QList<IdRecord> before = level.records();
    QCOMPARE(before.size(), 2);

    QVERIFY(!level.load(dir.filePath(name)));
    QCOMPARE(level.records(), before);
}

void TestLevelDefinition::readsIdChildrenInOrder()
{
    LevelDefinition level;
    QVERIFY(loadText(level, R"(<?xml version="1.0"?>
<whatever version="9">
 <Id value="0x00000002" name="Second"/>
 <Id value="0x00000001" name="First"/>
 <Id value="0x00000002" name="SecondAgain"/>
 <Id value="" name="EmptyValue"/>
 <Id name="NoValue"/>
 <Id value="0X0000abcd" name="Normalized"/>
 <Id value="0x00000005"/>
 <id value="0x00000006" name="LowerCaseElement"/>
 <Class value="0x00000007" name="OtherElement"/>
 <group><Id value="0x00000008" name="Nested"/></group>
 <Id value="not an id" name="Kept"/>
</whatever>)"));
    const QList<IdRecord> expected{
        idAndName("0x00000002", "Second"),
        idAndName("0x00000001", "First"),
        idAndName("0x00000002", "SecondAgain"),
        idAndName("0x0000ABCD", "Normalized"),
        idAndName("0x00000005", ""),
        idAndName("not An iD", "Kept"),
    };
    QCOMPARE(level.records(), expected);

    LevelDefinition none;
    QVERIFY(loadText(none, "<level/>"));
    QVERIFY(none.records().isEmpty());
}

void TestLevelDefinition::mergesWithIdMap()
{
    IdRecordMap device;
    device.insert("0x00000001", IdRecord{"0x00000001", "DeviceName", "Kernel", "Memory", "heap.mod", "/usermod/heap", true});
    device.insert("0x0000ABCD", IdRecord{"0x0000ABCD", "Mixed", "Media", "Audio", "", "", false});
    device.insert("0x00000002", IdRecord{"0x00000002", "", "Ignored", "Ignored", "x.mod", "/x", true});
    device.insert("0x00000004", IdRecord{"0x00000004", "Named", "Storage", "File", "", "", true});

    const QByteArray file = R"(<level>
 <Id value="0x00000001" name="FileName"/>
 <Id value="0x0000abcd" name="FromLowerCase"/>
 <Id value="0x00000002" name="MapNameEmpty"/>
 <Id value="0x00000003" name="Absent"/>
 <Id value="0x00000004"/>
</level>)";

    LevelDefinition level;
    level.setIdMap(&device);
    QVERIFY(loadText(level, file));
    const QList<IdRecord> expected{
        IdRecord{"0x00000001", "FileName", "Kernel", "Memory", "heap.mod", "/usermod/heap", true},
        IdRecord{"0x0000ABCD", "FromLowerCase", "Media", "Audio", "", "", false},
        idAndName("0x00000002", "MapNameEmpty"),
        idAndName("0x00000003", "Absent"),
        IdRecord{"0x00000004", "", "Storage", "File", "", "", true},
    };
    QCOMPARE(level.records(), expected);

    // Without a map the same file keeps ids and names only.
    LevelDefinition plain;
    plain.setIdMap(&device);
    plain.setIdMap(nullptr);
    QVERIFY(loadText(plain, file));
    QCOMPARE(plain.records().first(), idAndName("0x00000001", "FileName"));
    QVERIFY(!plain.records().first().available);
}

void TestLevelDefinition::copiesAndAppends()
{
    QTemporaryDir dir;
    QVERIFY(dir.isValid());
    writeFile(dir.filePath("level.xml"), TwoClasses);

    LevelDefinition level;
    QVERIFY(level.load(dir.filePath("level.xml")));
    QVERIFY(level.load(dir.filePath("level.xml")));

    QList<IdRecord> copy{idAndName("stale", "stale")};
    level.copyRecords(copy);
    QCOMPARE(copy.size(), 4);
    QCOMPARE(copy.at(0).id, QString("0x00000001"));
    QCOMPARE(copy.at(3).id, QString("0x00000002"));
}

void TestLevelDefinition::shippedLevelsNameKnownClasses()
{
    NameDatabases names;
    names.load(QCoreApplication::applicationDirPath());

    QStringList files;
    listLevelFiles(files);
    QVERIFY(files.size() >= 2);
    for (const QString& path : files) {
        LevelDefinition level;
        QVERIFY2(level.load(path), qPrintable(path));
        QVERIFY(level.records().size() >= 50);
        for (const IdRecord& r : level.records()) {
            QString name, family, subFamily;
            names.lookupClass(r.id, name, family, subFamily);
            QCOMPARE(name, r.name);
        }
    }
}

QTEST_GUILESS_MAIN(TestLevelDefinition)
#include "tst_leveldefinition.moc"
