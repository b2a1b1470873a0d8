#pragma once

#include "encoding/qencoding.h"

#include <QByteArray>
#include <QString>

#include <initializer_list>
#include <memory>

namespace encodingtest {

using EncoderPtr = std::unique_ptr<QEncoding, decltype(&FreeEncoder)>;

// The converter for `format`, or null where there is none.
inline EncoderPtr Make(KestoEncodingFormat format)
{
    QEncoding *encoder = nullptr;
    CreateEncoder(format, &encoder);
    return EncoderPtr(encoder, &FreeEncoder);
}

inline QByteArray Bytes(std::initializer_list<quint8> values)
{
    return QByteArray(reinterpret_cast<const char *>(values.begin()), qsizetype(values.size()));
}

inline QString Units(std::initializer_list<char16_t> values)
{
    return QString(reinterpret_cast<const QChar *>(values.begin()), qsizetype(values.size()));
}

} // namespace encodingtest
