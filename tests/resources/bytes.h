#pragma once

#include <QByteArray>

// Little-endian values and hex text for building resource blocks by hand.
namespace resourcebytes {

inline QByteArray Hex(const char *hex)
{
    return QByteArray::fromHex(hex);
}

inline void U16(QByteArray &out, quint16 value)
{
    out.append(char(value & 0xFF)).append(char(value >> 8));
}

inline void U32(QByteArray &out, quint32 value)
{
    for (int i = 0; i < 4; ++i)
        out.append(char((value >> (8 * i)) & 0xFF));
}

} // namespace resourcebytes
