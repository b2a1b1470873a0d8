#pragma once

#include "qencoding.h"

// KS X 1001 (KS C 5601) in its EUC-KR byte form, with ASCII.
class HARNESS_EXPORT QEncodingKSC5601 : public QEncoding
{
public:
    // Appends the units of the bytes of `in` before its first NUL byte; a
    // byte with the high bit set takes the next byte as its trail byte. A
    // code with no mapping gives U+0020.
    int ToUnicode(const QByteArray &in, QString &out) override;
    // One-byte codes map to themselves, two-byte codes by KS X 1001.
    bool CharToUnicode(unsigned int code, quint16 *unit) override;
    bool UnicodeToChar(unsigned int unit, char *bytes) override;
    unsigned int MaxCharSize() override { return 4; }
    unsigned int MinCharSize() override { return 1; }

    // The KS X 1001 mapping on its own, shared with the CP949 converter.
    static bool KsToUnicode(unsigned int code, quint16 *unit);
    static bool UnicodeToKs(unsigned int unit, char *bytes);
};
