#pragma once

#include <QtGlobal>

// Typed little reads and writes over some byte store. 16- and 32-bit values are
// byte-swapped when the data's byte order differs from the machine's.
// The operations are declared in their fixed slot order; the destructor comes last.
class QStream
{
public:
    enum ByteOrder { BigEndian = 1, LittleEndian = 2 };

    explicit QStream(int byteOrder = LittleEndian);
    QStream(const QStream&) = delete;
    QStream& operator=(const QStream&) = delete;

    virtual bool atEnd() const = 0;
    virtual bool hasError() const = 0;
    // Every typed read yields 0 when the bytes could not be read.
    virtual quint8 readUInt8();
    virtual quint8 readUInt8(quint8& value);
    virtual quint16 readUInt16();
    virtual quint16 readUInt16(quint16& value);
    virtual quint32 readUInt32();
    virtual quint32 readUInt32(quint32& value);
    // True only when all count bytes were copied.
    virtual bool readBytes(char* buffer, qint64 count) = 0;
    virtual void writeUInt32(quint32 value);
    virtual void writeUInt32(qint32 value);
    virtual void writeUInt16(quint16 value);
    virtual void writeUInt16(qint16 value);
    virtual void writeUInt8(quint8 value);
    virtual void writeUInt8(qint8 value);
    virtual bool writeBytes(const char* buffer, qint64 count) = 0;
    virtual ~QStream();

    int byteOrder() const { return m_byteOrder; }
    int hostByteOrder() const { return m_hostByteOrder; }

    // The machine's byte order, fixed for the process on first use (2 on little-endian machines).
    static int machineByteOrder();

private:
    bool swaps() const { return m_byteOrder != m_hostByteOrder; }

    int m_byteOrder;
    int m_hostByteOrder;
};
