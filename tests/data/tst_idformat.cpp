#include "IdFormat.h"

#include <QTest>

class TestIdFormat : public QObject
{
    Q_OBJECT

private slots:
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
};

QTEST_APPLESS_MAIN(TestIdFormat)
#include "tst_idformat.moc"
