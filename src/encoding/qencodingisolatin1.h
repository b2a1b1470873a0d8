#pragma once

#include "qencoding.h"

// ISO 8859-1: one byte per unit. Encoding keeps the low 8 bits of the unit.
class HARNESS_EXPORT QEncodingIsoLatin1 : public QEncoding
{
public:
    // Skips a leading 03 mark and appends one unit per following byte, up
    // to the first NUL byte.
    int ToUnicode(const QByteArray &in, QString &out) override;
    bool CharToUnicode(unsigned int code, quint16 *unit) override;
    bool UnicodeToChar(unsigned int unit, char *bytes) override;
    unsigned int MaxCharSize() override { return 1; }
    unsigned int MinCharSize() override { return 1; }
};
