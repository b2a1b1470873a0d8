#include "encoding/qencodingsjis.h"

#include "encoding/doublebyte.h"
#include "encoding/mappingtable.h"

namespace {

// The user-defined area: 188 trail bytes (40-FC without 7F) per lead byte.
constexpr unsigned int kUserFirstLead = 0xF0;
constexpr unsigned int kUserFirstUnit = 0xE000;
constexpr unsigned int kUserLastUnit = 0xE757;
constexpr unsigned int kUserTrailsPerLead = 188;
constexpr unsigned int kFirstTrail = 0x40;
constexpr unsigned int kSkippedTrail = 0x7F;
constexpr unsigned int kLastTrail = 0xFC;

bool IsLeadByte(unsigned char byte)
{
    return (byte >= 0x81 && byte <= 0x9F) || (byte >= 0xE0 && byte <= 0xFC);
}

} // namespace

QEncodingSJIS::QEncodingSJIS() : m_table(&encodingtables::kShiftJis)
{
}

int QEncodingSJIS::ToUnicode(const QByteArray &in, QString &out)
{
    return doublebyte::DecodeEveryByte(*this, in, out, IsLeadByte);
}

bool QEncodingSJIS::CharToUnicode(unsigned int code, quint16 *unit)
{
    const unsigned int lead = code >> 8;
    const unsigned int trail = code & 0xFF;
    if (code <= 0xFFFF && lead >= kUserFirstLead && trail >= kFirstTrail && trail <= kLastTrail
        && trail != kSkippedTrail) {
        const unsigned int column = trail - (trail > kSkippedTrail ? kFirstTrail + 1 : kFirstTrail);
        if (unit)
            *unit = quint16(kUserFirstUnit + (lead - kUserFirstLead) * kUserTrailsPerLead + column);
        return true;
    }
    return m_table->ToUnit(code, unit);
}

bool QEncodingSJIS::UnicodeToChar(unsigned int unit, char *bytes)
{
    if (!bytes)
        return false;
    if (unit >= kUserFirstUnit && unit <= kUserLastUnit) {
        const unsigned int row = (unit - kUserFirstUnit) / kUserTrailsPerLead;
        const unsigned int column = (unit - kUserFirstUnit) % kUserTrailsPerLead;
        const unsigned int trail
            = column < kSkippedTrail - kFirstTrail ? kFirstTrail + column : kFirstTrail + 1 + column;
        doublebyte::WriteCode(quint16((kUserFirstLead + row) << 8 | trail), bytes);
        return true;
    }
    return doublebyte::EncodeWithTable(*m_table, unit, bytes);
}
