#pragma once

#include "qencoding.h"

class MappingTable;

// Shift_JIS: JIS X 0208 with ASCII (5C and 7E included) and the half-width
// katakana A1-DF, plus the user-defined area: lead bytes F0 and above with
// trail bytes 40-FC (except 7F) decode to U+E000 onwards; U+E000-U+E757
// encode back to F040-F9FC.
class HARNESS_EXPORT QEncodingSJIS : public QEncoding
{
public:
    QEncodingSJIS();

    // Appends the units of every byte of `in` up to the first NUL unit; a
    // code with no mapping (a lone lead byte at the end included) gives "?".
    int ToUnicode(const QByteArray &in, QString &out) override;
    bool CharToUnicode(unsigned int code, quint16 *unit) override;
    bool UnicodeToChar(unsigned int unit, char *bytes) override;
    unsigned int MaxCharSize() override { return 2; }
    unsigned int MinCharSize() override { return 1; }

private:
    const MappingTable *m_table;
};
