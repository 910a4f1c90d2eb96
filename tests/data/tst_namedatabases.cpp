#include "NameDatabases.h"
#include "TestSupport.h"

#include <QBuffer>
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

} // namespace

class TestNameDatabases : public QObject
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
};

QTEST_GUILESS_MAIN(TestNameDatabases)
#include "tst_namedatabases.moc"
