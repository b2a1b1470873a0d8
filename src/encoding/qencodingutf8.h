#pragma once

#include "qencoding.h"

// UTF-8. Each UTF-16 unit is encoded on its own, so a surrogate pair becomes
// two three-byte sequences; the decoder turns such sequences back into the
// same units and four-byte sequences into surrogate pairs.
class HARNESS_EXPORT QEncodingUTF8 : public QEncoding
{
public:
    // Replaces `out` with the units decoded from every byte of `in`, up to
    // a NUL byte or a sequence cut short. A byte that starts no sequence, or
    // a lead byte whose sequence is malformed, gives one U+FFFD.
    int ToUnicode(const QByteArray &in, QString &out) override;
    bool CharToUnicode(unsigned int code, quint16 *unit) override;
    bool UnicodeToChar(unsigned int unit, char *bytes) override;
    unsigned int MaxCharSize() override { return 4; }
    unsigned int MinCharSize() override { return 1; }
};
