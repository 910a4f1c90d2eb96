#include "DataFolders.h"
#include "IdFormat.h"
#include "LevelDefinition.h"
#include "LevelFiles.h"
#include "NameDatabases.h"
#include "TestSupport.h"

#include <QBuffer>
#include <QCoreApplication>
#include <QTemporaryDir>
#include <QTest>

namespace {

// Name, family and sub-family of a class.
QStringList classNames(const NameDatabases& db, const QString& idText)
{
    QString name, family, subFamily;
    db.lookupClass(idText, name, family, subFamily);
    return {name, family, subFamily};
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

// The name databases, the id texts they are keyed by (parsed, formatted and normalized), and
// the level definitions checked against them.
class TestReferenceData : public QObject
{
    Q_OBJECT

    QTemporaryDir m_dir;

    bool write(const QString& file, const QByteArray& content) { return TestSupport::writeFile(m_dir.filePath(file), content); }
    NameDatabases loaded()
    {
        NameDatabases db;
        db.load(m_dir.path());
        return db;
    }

private slots:
    void init() { QVERIFY(m_dir.isValid() && QDir(m_dir.path()).removeRecursively() && QDir().mkpath(m_dir.path())); }

    // Lookups never fail; a bad file empties only its own database.
    void unreadableFileLeavesOnlyItsDatabaseEmpty_data()
    {
        QTest::addColumn<QString>("classFile");
        QTest::newRow("missing") << "Other.xml";
        QTest::newRow("unclosed root") << "ClassDB.xml";
    }
    void unreadableFileLeavesOnlyItsDatabaseEmpty()
    {
        QFETCH(QString, classFile);
        QVERIFY(write(classFile, R"(<classes><class id="0x00000001" name="Heap"/>)"));
        QVERIFY(write("InterfaceDB.xml", R"(<i><interface id="0x02010001" name="IBase" family="K" subFamily="O"/></i>)"));
        QVERIFY(write("PriviledgeDB.xml", R"(<p><priviledge id="0x00000101" name="Net" family="N" subFamily="S"/>
 <privilege id="0x00000102" name="CorrectSpelling"/></p>)"));
        const NameDatabases db = loaded();
        QString idText, name, family, subFamily;
        db.lookupClass(1u, idText, name, family, subFamily);
        QCOMPARE(QStringList({idText, name, family, subFamily}), QStringList({"0x00000001", "not found", "unknown", "unknown"}));
        db.lookupInterface("0x02010001", name, family, subFamily);
        QCOMPARE(name, QString("IBase"));
        PriviledgeRecord record{"stale", "stale", "stale", "stale"};
        db.lookupPriviledge(0x101u, record);
        QCOMPARE(record, (PriviledgeRecord{"0x00000101", "Net", "N", "S"}));
        db.lookupPriviledge(QStringLiteral("0x00000102"), record);
        QCOMPARE(record, (PriviledgeRecord{"0x00000102", "not found", "unknown", "unknown"}));
    }

    void readsOnlyCompleteDirectEntries()
    {
        QVERIFY(write("InterfaceDB.xml", R"(<interfaces><class id="0x00000001" name="WrongElement"/></interfaces>)"));
        QVERIFY(write("ClassDB.xml", R"(<anything>
 <class id="0x00000001" name="NoFamily"/> <class name="NoId" family="F" subFamily="S"/>
 <class id="0x00000003" family="F" subFamily="S"/> <class id="0x00000004" name="" family="F" subFamily="S"/>
 <klass id="0x00000005" name="OtherElement"/> <group><class id="0x00000006" name="Nested"/></group>
 <class id="0x00000007" name="WithChild" family="F" subFamily="S"><class id="0x00000008" name="Inner"/></class>
 <class id="0x00000009" name="LowerF" family="F" subfamily="S"/> <Class id="0x0000000B" name="CapitalC"/>
</anything>)"));
        const NameDatabases db = loaded();
        QCOMPARE(classNames(db, "0x00000001"), QStringList({"NoFamily", "", ""}));
        for (const char* skipped : {"", "0x00000003", "0x00000004", "0x00000005", "0x00000006", "0x00000008", "0x0000000B"})
            QCOMPARE(classNames(db, skipped).first(), QString("not found"));
        QCOMPARE(classNames(db, "0x00000007").first(), QString("WithChild"));
        QCOMPARE(classNames(db, "0x00000009"), QStringList({"LowerF", "F", ""}));
        QString name, family, subFamily;
        db.lookupInterface("0x00000001", name, family, subFamily);
        QCOMPARE(name, QString("not found"));

        // The reader keeps document order and the first four fields; a failed parse adds nothing.
        QList<IdRecord> entries;
        QBuffer good, bad;
        good.setData(R"(<r><class id="b" name="2" family="f" subFamily="s"/><class id="a" name="1"/></r>)");
        bad.setData(R"(<r><class id="c" name="3"/>)");
        QVERIFY(good.open(QIODevice::ReadOnly) && bad.open(QIODevice::ReadOnly));
        QVERIFY(NameDatabases::readEntries(&good, "class", entries));
        QVERIFY(!NameDatabases::readEntries(&bad, "class", entries));
        QCOMPARE(entries, (QList<IdRecord>{{"b", "2", "f", "s", "", "", false}, {"a", "1", "", "", "", "", false}}));
    }

    void lastDuplicateWinsAndKeysAreExactText()
    {
        QVERIFY(write("ClassDB.xml", R"(<classes>
 <class id="0x00000010" name="First" family="F1" subFamily="S1"/> <class id="0x00000010" name="Second" family="F2" subFamily="S2"/>
 <class id="0x00000010" name="" family="F3" subFamily="S3"/> <class id="0x0000abcd" name="LowerCase"/>
 <class id=" 0x00000011" name="Padded"/></classes>)"));
        const NameDatabases db = loaded();
        QCOMPARE(classNames(db, "0x00000010"), QStringList({"Second", "F2", "S2"}));
        QString idText, name, family, subFamily;
        db.lookupClass(0xABCDu, idText, name, family, subFamily);
        QCOMPARE(QStringList({idText, name}), QStringList({"0x0000ABCD", "not found"}));
        QCOMPARE(classNames(db, "0x0000abcd").first(), QString("LowerCase"));
        QCOMPARE(classNames(db, " 0x00000011").first(), QString("Padded"));
        QCOMPARE(classNames(db, "0x00000011").first(), QString("not found"));
    }

    void priviledgesInRange_data()
    {
        QTest::addColumn<quint32>("low");
        QTest::addColumn<quint32>("high");
        QTest::addColumn<QStringList>("expected");
        QTest::newRow("single id") << 5u << 5u << QStringList{"0x00000005"};
        QTest::newRow("low above high") << 6u << 4u << QStringList();
        QTest::newRow("both ends, in key text order")
            << 4u << 11u << QStringList{"0x00000004", "0x00000005", "0x0000000B", "0x0000000a"};
        QTest::newRow("upper half is unsigned") << 0x80000000u << 0xFFFFFFFFu << QStringList{"0x80000000", "0xFFFFFFFF"};
        QTest::newRow("gap") << 0x0Cu << 0x7FFFFFFEu << QStringList();
    }
    void priviledgesInRange()
    {
        QFETCH(quint32, low);
        QFETCH(quint32, high);
        QFETCH(QStringList, expected);
        QByteArray file = "<p>";
        for (const char* id : {"0xFFFFFFFF", "0x80000000", "0x7FFFFFFF", "0x0000000a", "0x0000000B", "0x00000005", "0x00000004"})
            file += QByteArray("<priviledge id=\"") + id + "\" name=\"N\" family=\"F\" subFamily=\"S\"/>";
        QVERIFY(write("PriviledgeDB.xml", file + "</p>"));
        QList<PriviledgeRecord> list{PriviledgeRecord{"left", "over", "", ""}};
        loaded().priviledgesInRange(low, high, list);
        QStringList ids;
        for (const PriviledgeRecord& r : list)
            ids << r.id;
        QCOMPARE(ids, expected);
    }

    void reloadsAndInitializesOnce()
    {
        QVERIFY(write("ClassDB.xml", R"(<classes><class id="0x00000001" name="Heap"/></classes>)"));
        NameDatabases db = loaded();
        QVERIFY(write("ClassDB.xml", "<classes><class id=\"0x00000001\" name=\"Half"));
        db.load(m_dir.path());
        QCOMPARE(classNames(db, "0x00000001").first(), QString("Heap"));
        QVERIFY(write("ClassDB.xml", R"(<c><class id="0x00000002" name="Added"/></c>)"));
        db.load(m_dir.path());
        QCOMPARE(classNames(db, "0x00000001").first(), QString("Heap"));
        QCOMPARE(classNames(db, "0x00000002").first(), QString("Added"));

        NameDatabases once;
        once.initialize(m_dir.path());
        QVERIFY(write("ClassDB.xml", R"(<classes><class id="0x00000001" name="Heap"/></classes>)"));
        once.initialize(m_dir.path());
        QCOMPARE(classNames(once, "0x00000002").first(), QString("Added"));
        QCOMPARE(classNames(once, "0x00000001").first(), QString("not found"));
    }

    void formatsIds()
    {
        QCOMPARE(formatId(0), "0x00000000");
        QCOMPARE(formatId(0xABCu), "0x00000ABC");
        QCOMPARE(formatShortId(0xABC), "0x0ABC");
        QCOMPARE(formatShortId(0xFFFF), "0xFFFF");
        for (const quint32 number : {0u, 0xABCu, 0xFFFFFFFFu})
            QCOMPARE(parseHexId(formatId(number)), number);
    }

    void parsesHexIds_data()
    {
        QTest::addColumn<QString>("text");
        QTest::addColumn<quint32>("number");
        QTest::newRow("blanks, upper X, lower digits") << " \t0Xabc" << 0xABCu;
        QTest::newRow("no prefix, mixed case") << "aBcDeF" << 0xABCDEFu;
        QTest::newRow("prefix characters in any mix") << "x0X0x 7" << 0x7u;
        QTest::newRow("stops at letter beyond F") << "0x12G4" << 0x12u;
        QTest::newRow("stops at blank after digits") << "0x1 2" << 0x1u;
        QTest::newRow("starts with other character") << "-1" << 0u;
        QTest::newRow("prefix only") << "0x" << 0u;
        QTest::newRow("wraps past 32 bits") << "0x123456789" << 0x23456789u;
        QTest::newRow("non-ASCII digits are not hex") << QString::fromUtf8("\u0661\u0662") << 0u;
        QTest::newRow("fullwidth letters are not hex") << QString::fromUtf8("0x1\uFF21") << 0x1u;
    }
    void parsesHexIds()
    {
        QFETCH(QString, text);
        QFETCH(quint32, number);
        QCOMPARE(parseHexId(text), number);
    }

    // Only a-f and X change: no trim, no pad.
    void normalizesIdText()
    {
        const QPair<QString, QString> texts[] = {{"0Xabcdef01", "0xABCDEF01"}, {"XxX0ghz", "xxx0ghz"}, {" 0xab ", " 0xAB "},
                                                 {QString::fromUtf8("0x\u00E4b"), QString::fromUtf8("0x\u00E4B")}};
        for (const auto& [text, normalized] : texts)
            QCOMPARE(normalizeIdText(text), normalized);
    }

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

    // The program's own folder wins over the data folders; the user's levels come after the
    // shipped ones, and only its level files.
    void dataFoldersInOrder()
    {
        QTemporaryDir home;
        qputenv("XDG_DATA_HOME", QFile::encodeName(home.path()));
        const QString own = home.filePath("delvix"), program = QCoreApplication::applicationDirPath();
        for (const char* file : {"/ClassDB.xml", "/Only-here.mss", "/Levels/Mine.xml", "/Levels/notes.txt"})
            QVERIFY(TestSupport::writeFile(own + file, TwoClasses));

        QCOMPARE(DataFolders::searchPath().mid(0, 3), QStringList({program, QDir::cleanPath(program + "/../share/delvix"), own}));
        QCOMPARE(DataFolders::locate("ClassDB.xml"), program + "/ClassDB.xml");
        QCOMPARE(DataFolders::locate("Only-here.mss"), own + "/Only-here.mss");
        QVERIFY(DataFolders::locate("Nowhere.mss").isEmpty());
        QStringList files;
        listLevelFiles(files);
        QCOMPARE(files.mid(2), QStringList({own + "/Levels/Mine.xml"}));
    }
};

QTEST_GUILESS_MAIN(TestReferenceData)
#include "tst_referencedata.moc"
