#include "IdFormat.h"

#include <QTest>

class TestIdFormat : public QObject
{
    Q_OBJECT

private slots:
    void formatsIds_data();
    void formatsIds();
    void formatsShortIds_data();
    void formatsShortIds();
    void parsesHexIds_data();
    void parsesHexIds();
    void parsesWhatItFormats();
    void normalizesIdText_data();
    void normalizesIdText();
};

void TestIdFormat::formatsIds_data()
{
    QTest::addColumn<quint32>("number");
    QTest::addColumn<QString>("text");

    QTest::newRow("zero") << 0u << "0x00000000";
    QTest::newRow("255") << 255u << "0x000000FF";
    QTest::newRow("ABC") << 0xABCu << "0x00000ABC";
    QTest::newRow("high bit") << 0x80000000u << "0x80000000";
    QTest::newRow("largest") << 0xFFFFFFFFu << "0xFFFFFFFF";
}

void TestIdFormat::formatsIds()
{
    QFETCH(quint32, number);
    QFETCH(QString, text);
    QCOMPARE(formatId(number), text);
}

void TestIdFormat::formatsShortIds_data()
{
    QTest::addColumn<quint16>("number");
    QTest::addColumn<QString>("text");

    QTest::newRow("zero") << quint16(0) << "0x0000";
    QTest::newRow("255") << quint16(255) << "0x00FF";
    QTest::newRow("ABC") << quint16(0xABC) << "0x0ABC";
    QTest::newRow("largest") << quint16(0xFFFF) << "0xFFFF";
}

void TestIdFormat::formatsShortIds()
{
    QFETCH(quint16, number);
    QFETCH(QString, text);
    QCOMPARE(formatShortId(number), text);
}

void TestIdFormat::parsesHexIds_data()
{
    QTest::addColumn<QString>("text");
    QTest::addColumn<quint32>("number");

    QTest::newRow("formatted") << "0x00000ABC" << 0xABCu;
    QTest::newRow("blanks, upper X, lower digits") << "  0Xabc" << 0xABCu;
    QTest::newRow("tab before") << "\t0x1F" << 0x1Fu;
    QTest::newRow("no prefix") << "ABC" << 0xABCu;
    QTest::newRow("mixed case digits") << "0xaBcDeF" << 0xABCDEFu;
    QTest::newRow("stops at letter beyond F") << "0x12G4" << 0x12u;
    QTest::newRow("stops at blank after digits") << "0x1 2" << 0x1u;
    QTest::newRow("blank after prefix skipped") << "0x 12" << 0x12u;
    QTest::newRow("prefix characters in any mix") << "x0X0x 7" << 0x7u;
    QTest::newRow("starts with other letter") << "G12" << 0u;
    QTest::newRow("minus sign") << "-1" << 0u;
    QTest::newRow("empty") << "" << 0u;
    QTest::newRow("prefix only") << "0x" << 0u;
    QTest::newRow("all zeros") << "0x00000000" << 0u;
    QTest::newRow("largest") << "0xFFFFFFFF" << 0xFFFFFFFFu;
    QTest::newRow("wraps past 32 bits") << "0x123456789" << 0x23456789u;
    QTest::newRow("non-ASCII digits are not hex") << QString::fromUtf8("\u0661\u0662") << 0u;
    QTest::newRow("fullwidth letters are not hex") << QString::fromUtf8("0x1\uFF21") << 0x1u;
}

void TestIdFormat::parsesHexIds()
{
    QFETCH(QString, text);
    QFETCH(quint32, number);
    QCOMPARE(parseHexId(text), number);
}

void TestIdFormat::parsesWhatItFormats()
{
    const quint32 samples[] = {0u, 1u, 0x10u, 0xABCu, 0x01011001u, 0x7FFFFFFFu, 0x80000000u, 0xFFFFFFFEu, 0xFFFFFFFFu};
    for (quint32 n : samples)
        QCOMPARE(parseHexId(formatId(n)), n);
}

void TestIdFormat::normalizesIdText_data()
{
    QTest::addColumn<QString>("text");
    QTest::addColumn<QString>("normalized");

    QTest::newRow("already normal") << "0x0101A001" << "0x0101A001";
    QTest::newRow("upper X") << "0X0101A001" << "0x0101A001";
    QTest::newRow("lower digits") << "0xabcdef01" << "0xABCDEF01";
    QTest::newRow("letters beyond f kept") << "0x00ghxyz" << "0x00ghxyz";
    QTest::newRow("every X") << "XxX" << "xxx";
    QTest::newRow("not padded or trimmed") << " 0xab " << " 0xAB ";
    QTest::newRow("empty") << "" << "";
    QTest::newRow("non-ASCII kept") << QString::fromUtf8("0x\u00E4b") << QString::fromUtf8("0x\u00E4B");
}

void TestIdFormat::normalizesIdText()
{
    QFETCH(QString, text);
    QFETCH(QString, normalized);
    QCOMPARE(normalizeIdText(text), normalized);
}

QTEST_APPLESS_MAIN(TestIdFormat)
#include "tst_idformat.moc"
