#include "encoding/qencodinggb2312.h"

#include "encoding/doublebyte.h"
#include "encoding/mappingtable.h"

namespace {

bool IsLeadByte(unsigned char byte)
{
    return byte >= 0xA1 && byte <= 0xF7;
}

} // namespace

QEncodingGB2312::QEncodingGB2312() : m_table(&encodingtables::kGB2312)
{
}

int QEncodingGB2312::ToUnicode(const QByteArray &in, QString &out)
{
    return doublebyte::DecodeEveryByte(*this, in, out, IsLeadByte);
}

bool QEncodingGB2312::CharToUnicode(unsigned int code, quint16 *unit)
{
    return m_table->ToUnit(code, unit);
}

bool QEncodingGB2312::UnicodeToChar(unsigned int unit, char *bytes)
{
    return doublebyte::EncodeWithTable(*m_table, unit, bytes);
}
