#pragma once

#include "qencoding.h"

class MappingTable;

// Decoding and encoding steps shared by the converters of the double-byte
// encodings. None of them reads past the block it is given.
namespace doublebyte {

// Decodes every byte of `in`: a byte for which isLead holds forms a code
// with the next byte (a lead byte at the very end forms an unknown code),
// any other byte is a one-byte code. Codes that do not decode give "?".
// Appends the units before the first NUL unit to `out`; returns its length.
int DecodeEveryByte(QEncoding &encoding, const QByteArray &in, QString &out, bool (*isLead)(unsigned char));

// Decodes the bytes before the first NUL byte: a byte with the high bit set
// forms a code with the next byte, any other byte is a one-byte code. Codes
// that do not decode, or decode to U+0000, give U+0020. Appends to `out`;
// returns its length.
int DecodeUpToNul(QEncoding &encoding, const QByteArray &in, QString &out);

// Writes `code` as one byte (below 0x100) or lead and trail byte, then a NUL.
void WriteCode(quint16 code, char *bytes);

// Looks `unit` up in `table` and writes its code; false when there is none.
bool EncodeWithTable(const MappingTable &table, unsigned int unit, char *bytes);

} // namespace doublebyte
