#include "FrameDecoder.h"
#include "PayloadStream.h"
#include "RecordStreams.h"

#include <QSet>
#include <QtEndian>
#include <QtTest>

namespace {

Frame makeFrame(quint32 requestId, const QByteArray& payload)
{
    return Frame { Protocol::ProtocolVersion, 0x3, requestId, quint32(Operation::GetModules), payload };
}

QByteArray header(quint32 magic, quint32 size)
{
    QByteArray bytes(Protocol::HeaderSize, '\0');
    qToBigEndian<quint32>(magic, bytes.data());
    qToBigEndian<quint32>(size, bytes.data() + 4);
    return bytes;
}

template <typename T>
QByteArray encode(const T& value)
{
    QByteArray bytes;
    PayloadStream out(&bytes);
    out << value;
    return bytes;
}

template <typename T>
QDataStream::Status decode(const QByteArray& bytes, T& value)
{
    PayloadStream in(bytes);
    in >> value;
    return in.status();
}

// Writes value, reads it back as the same record, and refuses every shorter prefix of its bytes.
template <typename T>
void checkRoundTrip(const T& value)
{
    const QByteArray bytes = encode(value);
    T back;
    QCOMPARE(decode(bytes, back), QDataStream::Ok);
    QCOMPARE(encode(back), bytes);
    QVERIFY(back == value);
    for (int cut = 0; cut < bytes.size(); ++cut) {
        T partial;
        PayloadStream truncated(bytes.left(cut));
        truncated >> partial;
        QVERIFY2(!truncated.ok(), qPrintable(QStringLiteral("accepted %1 of %2 bytes").arg(cut).arg(bytes.size())));
    }
}

QSharedPointer<_SettingsInfo> settingsChain(int depth)
{
    auto root = QSharedPointer<_SettingsInfo>::create(QStringLiteral("n0"), QStringLiteral("/n0"));
    for (auto node = root; depth > 1; --depth) {
        node->children << QSharedPointer<_SettingsInfo>::create(QStringLiteral("n"), node->Path() + QStringLiteral("/n"));
        node = node->children.last();
    }
    return root;
}

} // namespace

class WireFormatTest : public QObject
{
    Q_OBJECT

private slots:
    void framesSurviveAnyChunking()
    {
        const QByteArrayList sent = { makeFrame(1, "first").encode(), makeFrame(2, QByteArray()).encode(),
                                      makeFrame(3, QByteArray(5000, 'x')).encode() };
        const QByteArray stream = sent.join();
        // The whole stream at once, byte by byte, in odd chunks, in header-sized ones.
        for (const int chunk : { 0, 1, 7, Protocol::HeaderSize }) {
            FrameDecoder decoder;
            QByteArrayList received;
            bool partialSeen = false;  // drives the server's half-open timer
            const int step = chunk == 0 ? int(stream.size()) : chunk;
            for (int offset = 0; offset < stream.size(); offset += step) {
                decoder.feed(stream.mid(offset, step));
                Frame frame;
                FrameDecoder::Status status;
                while ((status = decoder.next(&frame)) == FrameDecoder::Status::Ready)
                    received << frame.encode();
                QCOMPARE(status, FrameDecoder::Status::NeedMore);
                partialSeen |= decoder.hasPartialFrame();
            }
            QCOMPARE(received, sent);
            QCOMPARE(partialSeen, chunk != 0);
            QVERIFY(!decoder.hasPartialFrame());
        }
    }

    void malformedStreams_data()
    {
        QTest::addColumn<QByteArray>("bytes");
        QTest::addColumn<QString>("reason");  // empty: not malformed
        QTest::newRow("text instead of a frame") << QByteArray("GET / HTTP/1.1\r\nHost: x\r\n\r\n") << "magic";
        QTest::newRow("one byte over the limit") << header(Protocol::FrameMagic, Protocol::MaxPayloadSize + 1) << "limit";
        QTest::newRow("largest size claimed") << header(Protocol::FrameMagic, 0xFFFFFFFF) << "limit";
        QTest::newRow("exactly the limit waits for the payload") << header(Protocol::FrameMagic, Protocol::MaxPayloadSize) << "";
        QTest::newRow("bad magic after a good frame") << makeFrame(9, "ok").encode() + header(0x12345678, 0) << "magic";
    }

    void malformedStreams()
    {
        QFETCH(QByteArray, bytes);
        QFETCH(QString, reason);
        FrameDecoder decoder;
        decoder.feed(bytes);
        Frame frame;
        FrameDecoder::Status status;
        while ((status = decoder.next(&frame)) == FrameDecoder::Status::Ready) {
        }
        QCOMPARE(status == FrameDecoder::Status::Malformed, !reason.isEmpty());
        QVERIFY(decoder.errorString().contains(reason));
        if (!reason.isEmpty()) {
            // Once out of step, the stream stays refused even if good bytes follow.
            decoder.feed(makeFrame(1, "late").encode());
            QCOMPARE(decoder.next(&frame), FrameDecoder::Status::Malformed);
        }
    }

    // Every field is set apart from its default, so that a field left out on either side shows.
    void recordsRoundTrip()
    {
        checkRoundTrip(ModuleInfo { QStringLiteral("player"), ModuleInfo::Application | ModuleInfo::Preinstalled,
                                    ModuleInfo::MakerSigned, QStringLiteral("/usermod/player/player.mif"), QStringLiteral("3.1.0"),
                                    QString::fromUtf8("© Norvale"), 123456, 77 });
        checkRoundTrip(RegistryInfo { QStringLiteral("audio/x-zmf"), 0x01001000, 0x01002000, 2, 77, true, true });
        checkRoundTrip(ProcessInfo { QStringLiteral("shell"), 12,
                                     { ThreadEntry { QStringLiteral("ui"), 13, 250, 3, 12, 0x100000000ULL }, ThreadEntry() } });
        checkRoundTrip(LoadedModuleInfo { QStringLiteral("shell"), 12,
                                          { LoadedModuleEntry { QStringLiteral("core.mod"), QStringLiteral("/sys/core.mod"), 4096, 5, 0x80000000, 2 } } });
        checkRoundTrip(VolumeInfo { QStringLiteral("Internal"), QStringLiteral("fs:/"), 0x200000000ULL, 1, true, true, 0xFFFFFFFF });
        checkRoundTrip(PriviledgeRecord { QStringLiteral("0x0100"), QStringLiteral("PL_FILE"), QStringLiteral("File"), QStringLiteral("x") });
        checkRoundTrip(MifEntry { 0x5000, QStringLiteral("player.mif"), QStringLiteral("/usermod/player/player.mif"),
                                  9, 1, 1, 1, 1,  // counts as stored, not recomputed
                                  { 0x01001000, 0x01001001 },
                                  { MifApplet { 0x01001000, QStringLiteral("Player"), 0x10, 2, 0xABCDEF01, 7, 0x8000 } },
                                  { 0x0100F000 }, { MifNotifier { 1, 2, 0xFFFFFFFF } },
                                  { MifMimeType { 0x01001000, 0x01000001, QStringLiteral("audio/x-zmf") } }, QByteArray(40, '\x5A') });

        _SettingsInfo settings(QStringLiteral("appinfo"), QStringLiteral("/appinfo"));
        settings.values << qMakePair(QStringLiteral("vendor"), QStringLiteral("Norvale")) << qMakePair(QString(), QString());
        settings.children << QSharedPointer<_SettingsInfo>::create(QStringLiteral("cache"), QStringLiteral("/appinfo/cache"));
        checkRoundTrip(settings);
        checkRoundTrip(*settingsChain(MaxRecordNesting));

        _DirectoryInfo level(QStringLiteral("user"), QStringLiteral("fs:/user"));
        level.files << QSharedPointer<_FileInfo>::create(QStringLiteral("a.txt"), QStringLiteral("fs:/user/a.txt"), QStringLiteral("rw-"), 0x1FFFFFFFFULL);
        level.directories << QSharedPointer<_DirectoryInfo>::create(QStringLiteral("usermod"), QStringLiteral("fs:/user/usermod"));
        checkRoundTrip(level);

        // A null child cannot travel; it arrives as an empty record, never as null.
        _DirectoryInfo withNull, back;
        withNull.files << QSharedPointer<_FileInfo>();
        QCOMPARE(decode(encode(withNull), back), QDataStream::Ok);
        QCOMPARE(back.files.size(), 1);
        QVERIFY(back.files.first());
        QCOMPARE(*back.files.first(), _FileInfo());
    }

    void hostileInputIsRefused()
    {
        // A count of four billion modules backed by a few bytes: refused, nothing kept.
        QVector<ModuleInfo> modules { ModuleInfo() };
        PayloadStream in(encode(quint32(0xFFFFFFFF)) + encode(QStringLiteral("only one name")));
        readList(in, modules);
        QVERIFY(!in.ok());
        QVERIFY(modules.isEmpty());

        // The same for a list of plain numbers inside a MIF entry.
        QByteArray mifBytes = encode(MifEntry());
        const int classesOffset = 4 + 4 + 4 + 5 * 2;  // kind, two null texts, five counts
        mifBytes.replace(classesOffset, 4, QByteArray("\xFF\xFF\xFF\xF0", 4));
        MifEntry mif;
        QVERIFY(decode(mifBytes, mif) != QDataStream::Ok);
        QVERIFY(mif.classes.isEmpty());

        // Trees one level deeper than allowed are corrupt, not a stack overflow.
        _SettingsInfo tooDeep;
        QCOMPARE(decode(encode(*settingsChain(MaxRecordNesting + 1)), tooDeep), QDataStream::ReadCorruptData);
        QByteArray nested = encode(_DirectoryInfo());
        for (int i = 0; i < 1000; ++i)  // name, path, no file, one folder
            nested = encode(QString()) + encode(QString()) + encode(quint32(0)) + encode(quint32(1)) + nested;
        _DirectoryInfo deepDirectory;
        QCOMPARE(decode(nested, deepDirectory), QDataStream::ReadCorruptData);

        // A text with an odd byte count cannot be UTF-16.
        VolumeInfo volume;
        QVERIFY(decode(QByteArray("\3\0\0\0abc", 7), volume) != QDataStream::Ok);  // byte count 3
    }

    // GetVolumes answers a QSet: records equal by value must hash alike.
    void volumesWorkInSets()
    {
        const VolumeInfo a { QStringLiteral("Internal"), QStringLiteral("fs:/"), 0, 1, true, true, 1 };
        VolumeInfo fuller = a, other = a;
        fuller.freeSpace = 10;
        other.volumeId = 2;
        const QSet<VolumeInfo> set { a, VolumeInfo(a), fuller, other };
        QCOMPARE(set.size(), 3);
        QVERIFY(set.contains(fuller));
    }

    void moduleDisplayTexts()
    {
        const struct { quint32 type; quint32 signature; const char* texts; } modules[] = {
            { ModuleInfo::Library | ModuleInfo::System, ModuleInfo::MakerSigned, "Library | System, Maker Signed" },
            { 0, ModuleInfo::TestSigned, "None, Test Signed" },
            { ModuleInfo::Extension | 0x100, 42, "Extension | 0x100, Unknown (42)" }, // unknown bits and signature
        };
        for (const auto& [type, signature, texts] : modules) {
            ModuleInfo module;
            module.type = type;
            module.signature = signature;
            QCOMPARE(module.GetModuleProperty() + QStringLiteral(", ") + module.GetModuleSig(), QLatin1String(texts));
        }
    }
};

QTEST_GUILESS_MAIN(WireFormatTest)
#include "tst_wireformat.moc"
