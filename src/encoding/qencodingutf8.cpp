#include "encoding/qencodingutf8.h"

namespace {

constexpr char16_t kReplacement = 0xFFFD;

bool IsContinuation(unsigned char byte)
{
    return (byte & 0xC0) == 0x80;
}

} // namespace

int QEncodingUTF8::ToUnicode(const QByteArray &in, QString &out)
{
    const auto *bytes = reinterpret_cast<const unsigned char *>(in.constData());
    const qsizetype size = in.size();
    // Every byte yields at most one unit (a four-byte sequence yields two).
    QString decoded;
    decoded.reserve(size);

    qsizetype i = 0;
    while (i < size) {
        const unsigned char lead = bytes[i];
        if (lead == 0)
            break;
        int length = 1;
        char32_t value = lead;
        if (lead >= 0xC0 && lead <= 0xDF) {
            length = 2;
            value = lead & 0x1F;
        } else if (lead >= 0xE0 && lead <= 0xEF) {
            length = 3;
            value = lead & 0x0F;
        } else if (lead >= 0xF0 && lead <= 0xF4) {
            length = 4;
            value = lead & 0x07;
        } else if (lead >= 0x80) {
            decoded.append(QChar(kReplacement));
            ++i;
            continue;
        }

        bool cutShort = false;
        bool malformed = false;
        for (int k = 1; k < length; ++k) {
            if (i + k >= size || bytes[i + k] == 0) {
                cutShort = true;
                break;
            }
            if (!IsContinuation(bytes[i + k])) {
                malformed = true;
                break;
            }
            value = (value << 6) | (bytes[i + k] & 0x3F);
        }
        if (cutShort)
            break;
        if (malformed || (length == 4 && (value < 0x10000 || value > 0x10FFFF))) {
            decoded.append(QChar(kReplacement));
            ++i;
            continue;
        }
        if (value >= 0x10000) {
            decoded.append(QChar(char16_t(0xD800 + ((value - 0x10000) >> 10))));
            decoded.append(QChar(char16_t(0xDC00 + ((value - 0x10000) & 0x3FF))));
        } else {
            if (value == 0)
                break;
            decoded.append(QChar(char16_t(value)));
        }
        i += length;
    }
    out = decoded;
    return int(out.size());
}

bool QEncodingUTF8::CharToUnicode(unsigned int code, quint16 *unit)
{
    if (unit)
        *unit = quint16(code);
    return true;
}

bool QEncodingUTF8::UnicodeToChar(unsigned int unit, char *bytes)
{
    if (!bytes)
        return false;
    if (unit < 0x80) {
        bytes[0] = char(unit);
        bytes[1] = 0;
    } else if (unit < 0x800) {
        bytes[0] = char(0xC0 | (unit >> 6));
        bytes[1] = char(0x80 | (unit & 0x3F));
        bytes[2] = 0;
    } else if (unit < 0x10000) {
        bytes[0] = char(0xE0 | (unit >> 12));
        bytes[1] = char(0x80 | ((unit >> 6) & 0x3F));
        bytes[2] = char(0x80 | (unit & 0x3F));
        bytes[3] = 0;
    } else if (unit < 0x110000) {
        bytes[0] = char(0xF0 | (unit >> 18));
        bytes[1] = char(0x80 | ((unit >> 12) & 0x3F));
        bytes[2] = char(0x80 | ((unit >> 6) & 0x3F));
        bytes[3] = char(0x80 | (unit & 0x3F));
        bytes[4] = 0;
    } else {
        return false;
    }
    return true;
}
