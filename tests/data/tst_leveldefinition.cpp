#include "LevelDefinition.h"
#include "LevelFiles.h"
#include "NameDatabases.h"
#include "TestSupport.h"

#include <QBuffer>
#include <QCoreApplication>
#include <QTemporaryDir>
#include <QTest>

namespace {

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
    void listsFilesContainingXml()
    {
        QTemporaryDir dir;
        const QStringList listed{"Level-1.0.xml", "Level-2.0.xml.bak", "a.xmlx", ".hidden.xml"};
        for (const QString& name : listed + QStringList{"LEVEL-3.0.XML", "Level.Xml", "notes.txt", "xml"})
            QVERIFY(TestSupport::writeFile(dir.filePath(name), TwoClasses));
        QVERIFY(QDir(dir.path()).mkdir("folder.xml"));
        QStringList list{"left over"}, expected;
        listLevelFiles(dir.path(), list);
        for (const QString& name : listed)
            expected << dir.path() + QDir::separator() + name;
        list.sort();
        expected.sort();
        QCOMPARE(list, expected);
        list = QStringList{"left over"};
        listLevelFiles(dir.filePath("Levels"), list);
        QVERIFY(list.isEmpty());
    }

    // A failed load leaves the records as they were; a load appends.
    void failedLoadKeepsRecords()
    {
        QTemporaryDir dir;
        QVERIFY(TestSupport::writeFile(dir.filePath("good.xml"), TwoClasses));
        QVERIFY(TestSupport::writeFile(dir.filePath("unclosed.xml"), R"(<level><Id value="0x3" name="Three"/>)"));
        QVERIFY(QDir(dir.path()).mkdir("folder.xml"));
        LevelDefinition level;
        QVERIFY(level.load(dir.filePath("good.xml")));
        const QList<IdRecord> once = level.records();
        QCOMPARE(once.size(), 2);
        for (const char* name : {"missing.xml", "unclosed.xml", "folder.xml"}) {
            QVERIFY(!level.load(dir.filePath(name)));
            QCOMPARE(level.records(), once);
        }
        QVERIFY(level.load(dir.filePath("good.xml")));
        QCOMPARE(level.records(), once + once);
    }

    void readsIdChildrenInOrder()
    {
        LevelDefinition level;
        QVERIFY(loadText(level, R"(<whatever version="9">
 <Id value="0x00000002" name="Second"/> <Id value="0x00000001" name="First"/>
 <Id value="0x00000002" name="SecondAgain"/> <Id value="" name="EmptyValue"/> <Id name="NoValue"/>
 <Id value="0X0000abcd" name="Normalized"/> <Id value="0x00000005"/>
 <id value="0x00000006" name="LowerCaseElement"/> <Class value="0x00000007" name="OtherElement"/>
 <group><Id value="0x00000008" name="Nested"/></group> <Id value="not an id" name="Kept"/>
</whatever>)"));
        const QList<IdRecord> expected{
            idAndName("0x00000002", "Second"),    idAndName("0x00000001", "First"),
            idAndName("0x00000002", "SecondAgain"), idAndName("0x0000ABCD", "Normalized"),
            idAndName("0x00000005", ""),          idAndName("not An iD", "Kept"),
        };
        QCOMPARE(level.records(), expected);
    }

    // The map gives the other fields only when it names the class; the file's name stays.
    void mergesWithIdMap()
    {
        IdRecordMap device;
        device.insert("0x00000001", IdRecord{"0x00000001", "DeviceName", "Kernel", "Memory", "heap.mod", "/usermod/heap", true});
        device.insert("0x0000ABCD", IdRecord{"0x0000ABCD", "Mixed", "Media", "Audio", "", "", false});
        device.insert("0x00000002", IdRecord{"0x00000002", "", "Ignored", "Ignored", "x.mod", "/x", true});

        LevelDefinition level;
        level.setIdMap(&device);
        QVERIFY(loadText(level, R"(<level><Id value="0x00000001" name="FileName"/>
 <Id value="0x0000abcd" name="FromLowerCase"/> <Id value="0x00000002" name="MapNameEmpty"/>
 <Id value="0x00000003" name="Absent"/></level>)"));
        const QList<IdRecord> expected{
            IdRecord{"0x00000001", "FileName", "Kernel", "Memory", "heap.mod", "/usermod/heap", true},
            IdRecord{"0x0000ABCD", "FromLowerCase", "Media", "Audio", "", "", false},
            idAndName("0x00000002", "MapNameEmpty"),
            idAndName("0x00000003", "Absent"),
        };
        QCOMPARE(level.records(), expected);
    }

    // Reference-data drift: the shipped levels and the class database must agree.
    void shippedLevelsNameKnownClasses()
    {
        NameDatabases names;
        names.load(QCoreApplication::applicationDirPath());
        QStringList files;
        listLevelFiles(files);
        const QString levels = QCoreApplication::applicationDirPath() + "/Levels/";
        QVERIFY(files.contains(levels + "Level-1.0.xml") && files.contains(levels + "Level-2.0.xml"));
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
};

QTEST_GUILESS_MAIN(TestLevelDefinition)
#include "tst_leveldefinition.moc"
