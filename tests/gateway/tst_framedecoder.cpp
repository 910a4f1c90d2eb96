#include "FrameDecoder.h"

#include <QtEndian>
#include <QtTest>

namespace {

Frame makeFrame(quint32 requestId, const QByteArray& payload)
{
    Frame frame;
    frame.flags = 0x3;
    frame.requestId = requestId;
    frame.operation = quint32(Operation::GetModules);
    frame.payload = payload;
    return frame;
}

QByteArray header(quint32 magic, quint32 size)
{
    QByteArray bytes(Protocol::HeaderSize, '\0');
    qToBigEndian<quint32>(magic, bytes.data());
    qToBigEndian<quint32>(size, bytes.data() + 4);
    return bytes;
}

} // namespace

class FrameDecoderTest : public QObject
{
    Q_OBJECT

private slots:
    void framesSurviveAnyChunking_data();
    void framesSurviveAnyChunking();
    void malformedStreams_data();
    void malformedStreams();
    void partialFrameIsReported();
};

void FrameDecoderTest::framesSurviveAnyChunking_data()
{
    QTest::addColumn<int>("chunk");
    QTest::newRow("whole stream") << 0;
    QTest::newRow("byte by byte") << 1;
    QTest::newRow("odd chunks") << 7;
    QTest::newRow("header sized") << Protocol::HeaderSize;
}

void FrameDecoderTest::framesSurviveAnyChunking()
{
    QFETCH(int, chunk);
    const QList<Frame> sent = { makeFrame(1, QByteArray("first")), makeFrame(2, QByteArray()),
                                makeFrame(3, QByteArray(5000, 'x')) };
    QByteArray stream;
    for (const Frame& frame : sent)
        stream += frame.encode();

    FrameDecoder decoder;
    QList<Frame> received;
    const int step = chunk == 0 ? int(stream.size()) : chunk;
    for (int offset = 0; offset < stream.size(); offset += step) {
        decoder.feed(stream.mid(offset, step));
        Frame frame;
        FrameDecoder::Status status;
        while ((status = decoder.next(&frame)) == FrameDecoder::Status::Ready)
            received << frame;
        QCOMPARE(status, FrameDecoder::Status::NeedMore);
    }
    QCOMPARE(received.size(), sent.size());
    for (int i = 0; i < sent.size(); ++i) {
        QCOMPARE(received[i].requestId, sent[i].requestId);
        QCOMPARE(received[i].flags, sent[i].flags);
        QCOMPARE(received[i].version, Protocol::ProtocolVersion);
        QCOMPARE(received[i].operation, sent[i].operation);
        QCOMPARE(received[i].payload, sent[i].payload);
    }
    QVERIFY(!decoder.hasPartialFrame());
}

void FrameDecoderTest::malformedStreams_data()
{
    QTest::addColumn<QByteArray>("bytes");
    QTest::addColumn<bool>("malformed");
    QTest::addColumn<QString>("reason");

    QTest::newRow("text instead of a frame") << QByteArray("GET / HTTP/1.1\r\nHost: x\r\n\r\n") << true << "magic";
    QTest::newRow("one byte over the limit") << header(Protocol::FrameMagic, Protocol::MaxPayloadSize + 1) << true << "limit";
    QTest::newRow("largest size claimed") << header(Protocol::FrameMagic, 0xFFFFFFFF) << true << "limit";
    QTest::newRow("exactly the limit waits for the payload") << header(Protocol::FrameMagic, Protocol::MaxPayloadSize) << false << "";
    QTest::newRow("bad magic after a good frame") << makeFrame(9, "ok").encode() + header(0x12345678, 0) << true << "magic";
}

void FrameDecoderTest::malformedStreams()
{
    QFETCH(QByteArray, bytes);
    QFETCH(bool, malformed);
    QFETCH(QString, reason);

    FrameDecoder decoder;
    decoder.feed(bytes);
    Frame frame;
    FrameDecoder::Status status;
    while ((status = decoder.next(&frame)) == FrameDecoder::Status::Ready) {
    }
    QCOMPARE(status == FrameDecoder::Status::Malformed, malformed);
    QVERIFY(decoder.errorString().contains(reason));
    if (malformed) {
        // Once out of step, the stream stays refused even if good bytes follow.
        decoder.feed(makeFrame(1, "late").encode());
        QCOMPARE(decoder.next(&frame), FrameDecoder::Status::Malformed);
    }
}

void FrameDecoderTest::partialFrameIsReported()
{
    const QByteArray encoded = makeFrame(4, "payload").encode();
    FrameDecoder decoder;
    QVERIFY(!decoder.hasPartialFrame());
    decoder.feed(encoded.left(encoded.size() - 1));
    Frame frame;
    QCOMPARE(decoder.next(&frame), FrameDecoder::Status::NeedMore);
    QVERIFY(decoder.hasPartialFrame());
    decoder.feed(encoded.right(1));
    QCOMPARE(decoder.next(&frame), FrameDecoder::Status::Ready);
    QVERIFY(!decoder.hasPartialFrame());
    QCOMPARE(frame.payload, QByteArray("payload"));
}

QTEST_GUILESS_MAIN(FrameDecoderTest)
#include "tst_framedecoder.moc"
