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
    if (QEncodingKSC5601::KsToUnicode(code, unit) || encodingtables::kCp949.ToUnit(code, unit))
        return true;
    *unit = ' ';
    return false;
}

bool QEncodingCP949::UnicodeToChar(unsigned int unit, char *bytes)
{
    if (doublebyte::EncodeWithTable(encodingtables::kCp949, unit, bytes))
        return true;
    bytes[0] = ' ';
    bytes[1] = 0;
    return false;
}
