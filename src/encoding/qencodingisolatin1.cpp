#include "encoding/qencodingisolatin1.h"

namespace {
constexpr char kMark = 0x03;
}

int QEncodingIsoLatin1::ToUnicode(const QByteArray &in, QString &out)
{
    qsizetype start = (!in.isEmpty() && in.at(0) == kMark) ? 1 : 0;
    qsizetype end = in.indexOf('\0', start);
    if (end < 0)
        end = in.size();
    out.append(QString::fromLatin1(in.constData() + start, end - start));
    return int(out.size());
}

bool QEncodingIsoLatin1::CharToUnicode(unsigned int code, quint16 *unit)
{
    if (unit)
        *unit = quint16(code & 0xFF);
    return true;
}

bool QEncodingIsoLatin1::UnicodeToChar(unsigned int unit, char *bytes)
{
    if (!bytes)
        return false;
    bytes[0] = char(unit & 0xFF);
    bytes[1] = 0;
    return true;
}
