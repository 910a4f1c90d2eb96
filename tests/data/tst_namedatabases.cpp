#include "IdFormat.h"
#include "NameDatabases.h"
#include "NameLibrary.h"

#include <QBuffer>
#include <QCoreApplication>
#include <QDir>
#include <QDomDocument>
#include <QFile>
#include <QSet>
#include <QTemporaryDir>
#include <QTest>

namespace {

void writeFile(const QString& directory, const QString& name, const QByteArray& content)
{
    QFile file(directory + QLatin1Char('/') + name);
    QVERIFY(file.open(QIODevice::WriteOnly | QIODevice::Truncate));
    QCOMPARE(file.write(content), qint64(content.size()));
}

bool readText(const QByteArray& text, QList<IdRecord>& entries)
{
    QBuffer buffer;
    buffer.setData(text);
    return buffer.open(QIODevice::ReadOnly) && NameDatabases::readEntries(&buffer, "class", entries);
}

struct Names
{
    QString name;
    QString family;
    QString subFamily;
};

Names classNames(const NameDatabases& db, const QString& idText)
{
    Names n;
    db.lookupClass(idText, n.name, n.family, n.subFamily);
    return n;
}

Names interfaceNames(const NameDatabases& db, const QString& idText)
{
    Names n;
    db.lookupInterface(idText, n.name, n.family, n.subFamily);
    return n;
}

QStringList ids(const QList<PriviledgeRecord>& records)
{
    QStringList result;
    for (const PriviledgeRecord& r : records)
        result << r.id;
    return result;
}

// The id attributes of the direct children named element of a shipped database.
QStringList shippedIds(const QString& fileName, const QString& element)
{
    QFile file(QCoreApplication::applicationDirPath() + QLatin1Char('/') + fileName);
    QDomDocument document;
    if (!file.open(QIODevice::ReadOnly) || !document.setContent(&file))
        return {};
    QStringList result;
    for (QDomElement e = document.documentElement().firstChildElement(element); !e.isNull(); e = e.nextSiblingElement(element))
        result << e.attribute(QStringLiteral("id"));
    return result;
}

const QByteArray ValidClasses = R"(<classes>
 <class id="0x00000001" name="Heap" family="Kernel" subFamily="Memory"/>
</classes>)";

const QByteArray ValidInterfaces = R"(<interfaces>
 <interface id="0x02010001" name="IBase" family="Kernel" subFamily="Objects"/>
</interfaces>)";

} // namespace

class TestNameDatabases : public QObject
{
    Q_OBJECT

private slots:
    void unreadableFilesLeaveOnlyThatDatabaseEmpty_data();
    void unreadableFilesLeaveOnlyThatDatabaseEmpty();
    void readsOnlyCompleteDirectEntries();
    void lastDuplicateWinsAndKeysAreCaseSensitive();
    void looksUpPriviledges();
    void priviledgesInRange_data();
    void priviledgesInRange();
    void initializesOnlyOnce();
    void failedReloadKeepsEarlierEntries();
    void processWideLibraryUsesShippedData();
};

void TestNameDatabases::unreadableFilesLeaveOnlyThatDatabaseEmpty_data()
{
    QTest::addColumn<QByteArray>("classFile");
    QTest::addColumn<bool>("writeClassFile");

    QTest::newRow("missing") << QByteArray() << false;
    QTest::newRow("empty") << QByteArray() << true;
    QTest::newRow("unclosed root") << QByteArray("<classes><class id=\"0x00000001\" name=\"Heap\"/>") << true;
    QTest::newRow("mismatched tags") << QByteArray("<classes><class id=\"0x00000001\" name=\"Heap\"></klass></classes>") << true;
    QTest::newRow("binary") << QByteArray("\x00\xff\xfe<\x01", 5) << true;
    QTest::newRow("two roots") << QByteArray("<a/><class id=\"0x00000001\" name=\"Heap\"/>") << true;
}

void TestNameDatabases::unreadableFilesLeaveOnlyThatDatabaseEmpty()
{
    QFETCH(QByteArray, classFile);
    QFETCH(bool, writeClassFile);

    QTemporaryDir dir;
    QVERIFY(dir.isValid());
    if (writeClassFile)
        writeFile(dir.path(), "ClassDB.xml", classFile);
    writeFile(dir.path(), "InterfaceDB.xml", ValidInterfaces);

    NameDatabases db;
    db.load(dir.path());

    QString idText;
    Names n;
    db.lookupClass(1u, idText, n.name, n.family, n.subFamily);
    QCOMPARE(idText, QString("0x00000001"));
    QCOMPARE(n.name, QString("not found"));
    QCOMPARE(n.family, QString("unknown"));
    QCOMPARE(n.subFamily, QString("unknown"));
    QCOMPARE(interfaceNames(db, "0x02010001").name, QString("IBase"));

    PriviledgeRecord p;
    db.lookupPriviledge(5u, p);
    QCOMPARE(p, (PriviledgeRecord{"0x00000005", "not found", "unknown", "unknown"}));
}

void TestNameDatabases::readsOnlyCompleteDirectEntries()
{
    QTemporaryDir dir;
    QVERIFY(dir.isValid());
    writeFile(dir.path(), "ClassDB.xml", R"(<?xml version="1.0"?>
<!-- the root name is not checked -->
<anything>
 <class id="0x00000001" name="NoFamily"/>
 <class name="NoId" family="F" subFamily="S"/>
 <class id="0x00000003" family="F" subFamily="S"/>
 <class id="0x00000004" name="" family="F" subFamily="S"/>
 <klass id="0x00000005" name="OtherElement" family="F" subFamily="S"/>
 <group>
  <class id="0x00000006" name="Nested" family="F" subFamily="S"/>
 </group>
 <class id="0x00000007" name="WithChild" family="F" subFamily="S"><class id="0x00000008" name="Inner"/></class>
 <class id="0x00000009" name="LowerF" family="F" subfamily="S"/>
 <class id="0x0000000A" name="A &amp; B" family="F" subFamily="S"/>
 <Class id="0x0000000B" name="CapitalC" family="F" subFamily="S"/>
</anything>)");
    writeFile(dir.path(), "InterfaceDB.xml", "<interfaces><class id=\"0x00000001\" name=\"WrongElement\"/></interfaces>");

    NameDatabases db;
    db.load(dir.path());

    const Names noFamily = classNames(db, "0x00000001");
    QCOMPARE(noFamily.name, QString("NoFamily"));
    QCOMPARE(noFamily.family, QString());
    QCOMPARE(noFamily.subFamily, QString());
    QCOMPARE(classNames(db, "").name, QString("not found"));
    for (const char* skipped : {"0x00000003", "0x00000004", "0x00000005", "0x00000006", "0x00000008", "0x0000000B"})
        QCOMPARE(classNames(db, skipped).name, QString("not found"));
    QCOMPARE(classNames(db, "0x00000007").name, QString("WithChild"));
    QCOMPARE(classNames(db, "0x00000009").subFamily, QString());
    QCOMPARE(classNames(db, "0x0000000A").name, QString("A & B"));
    QCOMPARE(interfaceNames(db, "0x00000001").name, QString("not found"));

    // The reader itself keeps document order and the first four fields only.
    QList<IdRecord> entries;
    QVERIFY(readText(R"(<r><class id="b" name="2" family="f" subFamily="s"/><class id="a" name="1"/></r>)", entries));
    QCOMPARE(entries.size(), 2);
    QCOMPARE(entries.at(0), (IdRecord{"b", "2", "f", "s", QString(), QString(), false}));
    QCOMPARE(entries.at(1).id, QString("a"));

    QVERIFY(!readText("<r><class id=\"c\" name=\"3\"/>", entries));
    QCOMPARE(entries.size(), 2);
}

void TestNameDatabases::lastDuplicateWinsAndKeysAreCaseSensitive()
{
    QTemporaryDir dir;
    QVERIFY(dir.isValid());
    writeFile(dir.path(), "ClassDB.xml", R"(<classes>
 <class id="0x00000010" name="First" family="F1" subFamily="S1"/>
 <class id="0x00000010" name="Second" family="F2" subFamily="S2"/>
 <class id="0x00000010" name="" family="F3" subFamily="S3"/>
 <class id="0x0000abcd" name="LowerCase" family="F" subFamily="S"/>
 <class id=" 0x00000011" name="Padded" family="F" subFamily="S"/>
</classes>)");

    NameDatabases db;
    db.load(dir.path());

    const Names dup = classNames(db, "0x00000010");
    QCOMPARE(dup.name, QString("Second"));
    QCOMPARE(dup.family, QString("F2"));
    QCOMPARE(dup.subFamily, QString("S2"));

    QString idText;
    Names byNumber;
    db.lookupClass(0xABCDu, idText, byNumber.name, byNumber.family, byNumber.subFamily);
    QCOMPARE(idText, QString("0x0000ABCD"));
    QCOMPARE(byNumber.name, QString("not found"));
    QCOMPARE(classNames(db, "0x0000abcd").name, QString("LowerCase"));
    QCOMPARE(classNames(db, "0x0000ABCD").name, QString("not found"));

    // Keys are exact texts: no trimming either way.
    QCOMPARE(classNames(db, " 0x00000011").name, QString("Padded"));
    QCOMPARE(classNames(db, "0x00000011").name, QString("not found"));
}

void TestNameDatabases::looksUpPriviledges()
{
    QTemporaryDir dir;
    QVERIFY(dir.isValid());
    writeFile(dir.path(), "PriviledgeDB.xml", R"(<p>
 <priviledge id="0x00000101" name="NetOpenSocket" family="Network" subFamily="Sockets"/>
 <privilege id="0x00000102" name="CorrectSpelling" family="Network" subFamily="Sockets"/>
</p>)");

    NameDatabases db;
    db.load(dir.path());

    PriviledgeRecord record{"stale", "stale", "stale", "stale"};
    db.lookupPriviledge(0x101u, record);
    QCOMPARE(record, (PriviledgeRecord{"0x00000101", "NetOpenSocket", "Network", "Sockets"}));
    db.lookupPriviledge(QStringLiteral("0x00000102"), record);
    QCOMPARE(record, (PriviledgeRecord{"0x00000102", "not found", "unknown", "unknown"}));
    db.lookupPriviledge(QStringLiteral("junk"), record);
    QCOMPARE(record, (PriviledgeRecord{"junk", "not found", "unknown", "unknown"}));
}

void TestNameDatabases::priviledgesInRange_data()
{
    QTest::addColumn<quint32>("low");
    QTest::addColumn<quint32>("high");
    QTest::addColumn<QStringList>("expected");

    const QStringList all{"0x00000004", "0x00000005", "0x0000000B", "0x0000000a", "0x7FFFFFFF", "0x80000000", "0xFFFFFFFF"};
    QTest::newRow("single id") << 5u << 5u << QStringList{"0x00000005"};
    QTest::newRow("low above high") << 6u << 4u << QStringList();
    QTest::newRow("both ends included") << 4u << 5u << QStringList{"0x00000004", "0x00000005"};
    QTest::newRow("full range in key order") << 0u << 0xFFFFFFFFu << all;
    QTest::newRow("lower-case key read as a number") << 10u << 10u << QStringList{"0x0000000a"};
    QTest::newRow("upper half is unsigned") << 0x80000000u << 0xFFFFFFFFu << QStringList{"0x80000000", "0xFFFFFFFF"};
    QTest::newRow("lower half") << 0u << 0x7FFFFFFFu << all.mid(0, 5);
    QTest::newRow("largest only") << 0xFFFFFFFFu << 0xFFFFFFFFu << QStringList{"0xFFFFFFFF"};
    QTest::newRow("gap") << 0x0Cu << 0x7FFFFFFEu << QStringList();
}

void TestNameDatabases::priviledgesInRange()
{
    QFETCH(quint32, low);
    QFETCH(quint32, high);
    QFETCH(QStringList, expected);

    QTemporaryDir dir;
    QVERIFY(dir.isValid());
    writeFile(dir.path(), "PriviledgeDB.xml", R"(<p>
 <priviledge id="0xFFFFFFFF" name="Top" family="F" subFamily="S"/>
 <priviledge id="0x80000000" name="HighBit" family="F" subFamily="S"/>
 <priviledge id="0x7FFFFFFF" name="BelowHighBit" family="F" subFamily="S"/>
 <priviledge id="0x0000000a" name="Ten" family="F" subFamily="S"/>
 <priviledge id="0x0000000B" name="Eleven" family="F" subFamily="S"/>
 <priviledge id="0x00000005" name="Five" family="F" subFamily="S"/>
 <priviledge id="0x00000004" name="Four" family="F" subFamily="S"/>
</p>)");

    NameDatabases db;
    db.load(dir.path());

    QList<PriviledgeRecord> list{PriviledgeRecord{"left", "over", "", ""}};
    db.priviledgesInRange(low, high, list);
    QCOMPARE(ids(list), expected);
}

void TestNameDatabases::initializesOnlyOnce()
{
    QTemporaryDir dir;
    QVERIFY(dir.isValid());
    QTemporaryDir other;
    QVERIFY(other.isValid());
    writeFile(dir.path(), "ClassDB.xml", ValidClasses);
    writeFile(other.path(), "ClassDB.xml", "<c><class id=\"0x00000002\" name=\"Elsewhere\"/></c>");

    NameDatabases db;
    QVERIFY(!db.isInitialized());
    db.initialize(dir.path());
    QVERIFY(db.isInitialized());
    QCOMPARE(classNames(db, "0x00000001").name, QString("Heap"));

    writeFile(dir.path(), "ClassDB.xml", "<c><class id=\"0x00000001\" name=\"Changed\"/></c>");
    db.initialize(dir.path());
    db.initialize(other.path());
    QCOMPARE(classNames(db, "0x00000001").name, QString("Heap"));
    QCOMPARE(classNames(db, "0x00000002").name, QString("not found"));
}

void TestNameDatabases::failedReloadKeepsEarlierEntries()
{
    QTemporaryDir dir;
    QVERIFY(dir.isValid());
    writeFile(dir.path(), "ClassDB.xml", ValidClasses);

    NameDatabases db;
    db.load(dir.path());
    writeFile(dir.path(), "ClassDB.xml", "<classes><class id=\"0x00000001\" name=\"Half");
    db.load(dir.path());
    QCOMPARE(classNames(db, "0x00000001").name, QString("Heap"));

    writeFile(dir.path(), "ClassDB.xml", "<c><class id=\"0x00000002\" name=\"Added\"/></c>");
    db.load(dir.path());
    QCOMPARE(classNames(db, "0x00000001").name, QString("Heap"));
    QCOMPARE(classNames(db, "0x00000002").name, QString("Added"));
}

void TestNameDatabases::processWideLibraryUsesShippedData()
{
    const QStringList classIds = shippedIds("ClassDB.xml", "class");
    const QStringList interfaceIds = shippedIds("InterfaceDB.xml", "interface");
    const QStringList priviledgeIds = shippedIds("PriviledgeDB.xml", "priviledge");
    QVERIFY2(classIds.size() >= 300, "ClassDB.xml is not beside the test");
    QVERIFY(interfaceIds.size() >= 50);
    QVERIFY(priviledgeIds.size() >= 30);

    initializeLibrary();
    initializeLibrary();

    // Every shipped id is in the form the lookups by number ask for, and unique.
    for (const QStringList& list : {classIds, interfaceIds, priviledgeIds}) {
        QCOMPARE(QSet<QString>(list.cbegin(), list.cend()).size(), list.size());
        for (const QString& id : list)
            QCOMPARE(formatId(parseHexId(id)), id);
    }
    for (const QString& id : classIds) {
        QString idText;
        Names n;
        lookupClass(parseHexId(id), idText, n.name, n.family, n.subFamily);
        QVERIFY2(n.name != "not found" && !n.family.isEmpty() && !n.subFamily.isEmpty(), qPrintable(id));
    }
    Names i;
    lookupInterface(interfaceIds.first(), i.name, i.family, i.subFamily);
    QVERIFY(i.name != "not found");

    QList<PriviledgeRecord> all;
    ::priviledgesInRange(0u, 0xFFFFFFFFu, all);
    QCOMPARE(all.size(), priviledgeIds.size());
    PriviledgeRecord p;
    lookupPriviledge(parseHexId(priviledgeIds.last()), p);
    QVERIFY(p.name != "not found");
}

QTEST_GUILESS_MAIN(TestNameDatabases)
#include "tst_namedatabases.moc"
