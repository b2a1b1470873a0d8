#pragma once

#include <QByteArray>

#include <algorithm>

// Little-endian values read one after another from a block. Reads never go
// past the block: a value past its end reads as 0 and Bytes returns only the
// bytes that are there.
class BlockReader
{
public:
    explicit BlockReader(const QByteArray &block) : m_block(block) { }

    qint64 Remaining() const { return m_block.size() - m_pos; }
    qint64 Position() const { return m_pos; }
    bool AtEnd() const { return m_pos >= m_block.size(); }

    quint8 U8() { return Value<quint8>(); }
    quint16 U16() { return Value<quint16>(); }
    quint32 U32() { return Value<quint32>(); }

    // The next `count` bytes, or as many as remain.
    QByteArray Bytes(qint64 count)
    {
        const qint64 take = std::clamp<qint64>(count, 0, Remaining());
        const QByteArray bytes = m_block.mid(m_pos, take);
        m_pos += take;
        return bytes;
    }

    void Skip(qint64 count) { m_pos += std::clamp<qint64>(count, 0, Remaining()); }

private:
    template <typename T> T Value()
    {
        if (Remaining() < qint64(sizeof(T))) {
            m_pos = m_block.size();
            return 0;
        }
        T value = 0;
        for (qint64 i = qint64(sizeof(T)) - 1; i >= 0; --i)
            value = T((value << 8) | T(uchar(m_block.at(m_pos + i))));
        m_pos += qint64(sizeof(T));
        return value;
    }

    const QByteArray &m_block;
    qint64 m_pos = 0;
};
