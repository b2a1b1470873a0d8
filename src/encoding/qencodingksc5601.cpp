#include "encoding/qencodingksc5601.h"

#include "encoding/doublebyte.h"
#include "encoding/mappingtable.h"

namespace {

// KS X 1001 codes are the CP949 codes whose lead and trail bytes both lie in
// A1-FE; the rest of CP949's two-byte codes is its Hangul extension.
bool IsKsCode(unsigned int code)
{
    const unsigned int lead = code >> 8;
    const unsigned int trail = code & 0xFF;
    return lead >= 0xA1 && lead <= 0xFE && trail >= 0xA1 && trail <= 0xFE;
}

} // namespace

int QEncodingKSC5601::ToUnicode(const QByteArray &in, QString &out)
{
    return doublebyte::DecodeUpToNul(*this, in, out);
}

bool QEncodingKSC5601::CharToUnicode(unsigned int code, quint16 *unit)
{
    quint16 decoded = ' ';
    const bool mapped = KsToUnicode(code, &decoded);
    if (unit)
        *unit = mapped ? decoded : quint16(' ');
    return mapped;
}

bool QEncodingKSC5601::UnicodeToChar(unsigned int unit, char *bytes)
{
    return UnicodeToKs(unit, bytes);
}

bool QEncodingKSC5601::KsToUnicode(unsigned int code, quint16 *unit)
{
    if (code < 0x100) {
        if (unit)
            *unit = quint16(code);
        return true;
    }
    return IsKsCode(code) && encodingtables::kCp949.ToUnit(code, unit);
}

bool QEncodingKSC5601::UnicodeToKs(unsigned int unit, char *bytes)
{
    if (!bytes)
        return false;
    quint16 code = 0;
    if (unit < 0x80) {
        code = quint16(unit);
    } else if (unit > 0xFFFF || !encodingtables::kCp949.ToCode(unit, &code) || !IsKsCode(code)) {
        bytes[0] = 0;
        return false;
    }
    doublebyte::WriteCode(code, bytes);
    return true;
}
