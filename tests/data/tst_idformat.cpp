#include "IdFormat.h"

#include <QTest>

class TestIdFormat : public QObject
{
    Q_OBJECT

private slots:
    void formatsIds_data()
    {
        QTest::addColumn<quint32>("number");
        QTest::addColumn<int>("digits");
        QTest::addColumn<QString>("text");
        QTest::newRow("zero") << 0u << 8 << "0x00000000";
        QTest::newRow("ABC") << 0xABCu << 8 << "0x00000ABC";
        QTest::newRow("largest") << 0xFFFFFFFFu << 8 << "0xFFFFFFFF";
        QTest::newRow("short zero") << 0u << 4 << "0x0000";
        QTest::newRow("short ABC") << 0xABCu << 4 << "0x0ABC";
        QTest::newRow("short largest") << 0xFFFFu << 4 << "0xFFFF";
    }
    void formatsIds()
    {
        QFETCH(quint32, number);
        QFETCH(int, digits);
        QFETCH(QString, text);
        QCOMPARE(digits == 8 ? formatId(number) : formatShortId(quint16(number)), text);
        if (digits == 8)
            QCOMPARE(parseHexId(text), number);
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

    void normalizesIdText_data()
    {
        QTest::addColumn<QString>("text");
        QTest::addColumn<QString>("normalized");
        QTest::newRow("X and a-f") << "0Xabcdef01" << "0xABCDEF01";
        QTest::newRow("letters beyond f kept") << "XxX0ghz" << "xxx0ghz";
        QTest::newRow("not padded or trimmed") << " 0xab " << " 0xAB ";
        QTest::newRow("non-ASCII kept") << QString::fromUtf8("0x\u00E4b") << QString::fromUtf8("0x\u00E4B");
    }
    void normalizesIdText()
    {
        QFETCH(QString, text);
        QFETCH(QString, normalized);
        QCOMPARE(normalizeIdText(text), normalized);
    }
};

QTEST_APPLESS_MAIN(TestIdFormat)
#include "tst_idformat.moc"
