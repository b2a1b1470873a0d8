#pragma once

#include "qencoding.h"

// Windows code page 949: KS X 1001 in its EUC-KR form plus the Unified
// Hangul Code extension (lead bytes 81-FE, trail bytes 41-FE), with ASCII.
class HARNESS_EXPORT QEncodingCP949 : public QEncoding
{
public:
    // As QEncodingKSC5601::ToUnicode, with the extension's codes decoded too.
    int ToUnicode(const QByteArray &in, QString &out) override;
    bool CharToUnicode(unsigned int code, quint16 *unit) override;
    // A unit with no code writes a single blank and returns false.
    bool UnicodeToChar(unsigned int unit, char *bytes) override;
    unsigned int MaxCharSize() override { return 4; }
    unsigned int MinCharSize() override { return 1; }
};
