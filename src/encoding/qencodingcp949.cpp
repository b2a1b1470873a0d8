#include "encoding/qencodingcp949.h"

#include "encoding/doublebyte.h"
#include "encoding/mappingtable.h"
#include "encoding/qencodingksc5601.h"

int QEncodingCP949::ToUnicode(const QByteArray &in, QString &out)
{
    return doublebyte::DecodeUpToNul(*this, in, out);
}

bool QEncodingCP949::CharToUnicode(unsigned int code, quint16 *unit)
{
    quint16 decoded = ' ';
    const bool mapped = QEncodingKSC5601::KsToUnicode(code, &decoded) || encodingtables::kCp949.ToUnit(code, &decoded);
    if (unit)
        *unit = mapped ? decoded : quint16(' ');
    return mapped;
}

bool QEncodingCP949::UnicodeToChar(unsigned int unit, char *bytes)
{
    if (!bytes)
        return false;
    if (doublebyte::EncodeWithTable(encodingtables::kCp949, unit, bytes))
        return true;
    bytes[0] = ' ';
    bytes[1] = 0;
    return false;
}
