#pragma once

#include "encoding/qencoding.h"

#include <QByteArray>
#include <QString>

#include <initializer_list>
#include <memory>

namespace encodingtest {

struct EncoderDeleter
{
    void operator()(QEncoding *encoder) const { FreeEncoder(encoder); }
};
using EncoderPtr = std::unique_ptr<QEncoding, EncoderDeleter>;

// The converter for `format`, or null where there is none.
inline EncoderPtr Make(KestoEncodingFormat format)
{
    QEncoding *encoder = nullptr;
    CreateEncoder(format, &encoder);
    return EncoderPtr(encoder);
}

inline QByteArray Bytes(std::initializer_list<int> values)
{
    QByteArray bytes;
    for (int v : values)
        bytes.append(char(v));
    return bytes;
}

inline QString Units(std::initializer_list<char16_t> values)
{
    QString text;
    for (char16_t v : values)
        text.append(QChar(v));
    return text;
}

} // namespace encodingtest
