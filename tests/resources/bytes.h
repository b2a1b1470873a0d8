#pragma once

#include <QByteArray>

#include <initializer_list>

// Little-endian values and hex text for building resource blocks by hand.
namespace resourcebytes {

inline QByteArray Hex(const char *hex)
{
    return QByteArray::fromHex(hex);
}

// The values one after another, each `size` bytes long, little-endian.
template <typename Values> QByteArray LittleEndian(const Values &values, int size)
{
    QByteArray out;
    for (const quint32 value : values)
        for (int i = 0; i < size; ++i)
            out.append(char((value >> (8 * i)) & 0xFF));
    return out;
}

inline QByteArray U16s(std::initializer_list<quint32> values)
{
    return LittleEndian(values, 2);
}

inline QByteArray U32s(std::initializer_list<quint32> values)
{
    return LittleEndian(values, 4);
}

} // namespace resourcebytes
