#pragma once

#include "qencoding.h"

class MappingTable;

// GB 2312 in its EUC-CN byte form (lead bytes A1-F7), with ASCII.
class HARNESS_EXPORT QEncodingGB2312 : public QEncoding
{
public:
    QEncodingGB2312();

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
