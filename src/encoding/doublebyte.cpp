#include "encoding/doublebyte.h"

#include "encoding/mappingtable.h"

namespace doublebyte {

namespace {

// A lead byte whose trail byte lies past the end of the block: the code of a
// lead byte followed by NUL, which no table maps.
unsigned int CodeOfLoneLead(unsigned char lead)
{
    return unsigned(lead) << 8;
}

} // namespace

int DecodeEveryByte(QEncoding &encoding, const QByteArray &in, QString &out, bool (*isLead)(unsigned char))
{
    const auto *bytes = reinterpret_cast<const unsigned char *>(in.constData());
    const qsizetype size = in.size();
    // At most one unit per byte: write into out's buffer, then cut it.
    const qsizetype start = out.size();
    out.resize(start + size);
    QChar *next = out.data() + start;
    for (qsizetype i = 0; i < size;) {
        unsigned int code = bytes[i];
        if (isLead(bytes[i])) {
            code = i + 1 < size ? (code << 8) | bytes[i + 1] : CodeOfLoneLead(bytes[i]);
            i += 2;
        } else {
            i += 1;
        }
        quint16 unit = 0;
        if (!encoding.CharToUnicode(code, &unit))
            unit = '?';
        if (unit == 0)
            break;
        *next++ = QChar(char16_t(unit));
    }
    out.resize(next - out.constData());
    return int(out.size());
}

int DecodeUpToNul(QEncoding &encoding, const QByteArray &in, QString &out)
{
    const auto *bytes = reinterpret_cast<const unsigned char *>(in.constData());
    qsizetype size = in.indexOf('\0');
    if (size < 0)
        size = in.size();
    const qsizetype start = out.size();
    out.resize(start + size);
    QChar *next = out.data() + start;
    for (qsizetype i = 0; i < size;) {
        unsigned int code = bytes[i];
        if (code & 0x80) {
            code = i + 1 < size ? (code << 8) | bytes[i + 1] : CodeOfLoneLead(bytes[i]);
            i += 2;
        } else {
            i += 1;
        }
        quint16 unit = 0;
        if (!encoding.CharToUnicode(code, &unit) || unit == 0)
            unit = ' ';
        *next++ = QChar(char16_t(unit));
    }
    out.resize(next - out.constData());
    return int(out.size());
}

void WriteCode(quint16 code, char *bytes)
{
    if (code < 0x100) {
        bytes[0] = char(code);
        bytes[1] = 0;
    } else {
        bytes[0] = char(code >> 8);
        bytes[1] = char(code & 0xFF);
        bytes[2] = 0;
    }
}

bool EncodeWithTable(const MappingTable &table, unsigned int unit, char *bytes)
{
    quint16 code = 0;
    if (!bytes || unit > 0xFFFF || !table.ToCode(unit, &code))
        return false;
    WriteCode(code, bytes);
    return true;
}

} // namespace doublebyte
