#include "encoding/qencoding.h"

#include "encoding/qencodingcp949.h"
#include "encoding/qencodinggb2312.h"
#include "encoding/qencodingisolatin1.h"
#include "encoding/qencodingksc5601.h"
#include "encoding/qencodingsjis.h"
#include "encoding/qencodingutf8.h"

#include <QMap>

#include <cstring>

namespace {

struct FormatRow
{
    KestoEncodingFormat format;
    const char *name;
    const char *mark;
    unsigned int markSize;
};

// Unicode and "None" share the mark FF FE; KSC5601 and CP949 share FE FE.
constexpr FormatRow kFormats[] = {
    {ENCODING_UNICODE, "Unicode", "\xFF\xFE", 2}, {ENCODING_ISOLATIN1, "ISOLATIN1", "\x03", 1},
    {ENCODING_KSC5601, "KSC5601", "\xFE\xFE", 2}, {ENCODING_SJIS, "S-JIS", "\xFD\xFE", 2},
    {ENCODING_GB2312, "GB2312", "\xFC\xFE", 2},   {ENCODING_CP949, "CP949", "\xFE\xFE", 2},
    {ENCODING_UTF8, "UTF-8", "\x02", 1},          {ENCODING_NONE, "None", "\xFF\xFE", 0},
};

const FormatRow *FindRow(KestoEncodingFormat format)
{
    for (const FormatRow &row : kFormats) {
        if (row.format == format)
            return &row;
    }
    return nullptr;
}

// Filled once, on first use (safely, even when several threads get there at
// once); read-only afterwards.
const QMap<KestoEncodingFormat, QString> &FormatMap()
{
    static const QMap<KestoEncodingFormat, QString> map = [] {
        QMap<KestoEncodingFormat, QString> names;
        for (const FormatRow &row : kFormats)
            names.insert(row.format, QString::fromLatin1(row.name));
        return names;
    }();
    return map;
}

QEncoding *NewEncoder(KestoEncodingFormat format)
{
    switch (format) {
    case ENCODING_ISOLATIN1:
        return new QEncodingIsoLatin1;
    case ENCODING_KSC5601:
        return new QEncodingKSC5601;
    case ENCODING_SJIS:
        return new QEncodingSJIS;
    case ENCODING_GB2312:
        return new QEncodingGB2312;
    case ENCODING_CP949:
        return new QEncodingCP949;
    case ENCODING_UTF8:
        return new QEncodingUTF8;
    default:
        return nullptr;
    }
}

} // namespace

QEncoding::~QEncoding() = default;

unsigned int QEncoding::FromUnicode(const QString &in, QByteArray &out)
{
    // Each unit is encoded straight into out's buffer, which always has room
    // for one more sequence and its NUL: it starts at one byte per unit (the
    // common case), grows by doubling and is cut to size at the end.
    out.resize(in.size() + kMaxEncodedSize);
    char *buffer = out.data();
    qsizetype used = 0;
    for (QChar c : in) {
        if (out.size() - used < kMaxEncodedSize) {
            out.resize(out.size() * 2);
            buffer = out.data();
        }
        char *bytes = buffer + used;
        bytes[0] = 0;
        if (UnicodeToChar(c.unicode(), bytes)) {
            int length = 0;
            while (length < kMaxEncodedSize - 1 && bytes[length])
                ++length;
            used += length;
        } else {
            bytes[0] = '?';
            used += 1;
        }
    }
    out.resize(used);
    return unsigned(out.size());
}

unsigned int QEncoding::BOMSize(KestoEncodingFormat format)
{
    const FormatRow *row = FindRow(format);
    return row ? row->markSize : 0;
}

QByteArray QEncoding::GetBOM(KestoEncodingFormat format)
{
    const FormatRow *row = FindRow(format);
    if (!row || row->markSize == 0)
        return QByteArray("\xFF\xFE", 2);
    return QByteArray(row->mark, int(row->markSize));
}

void QEncoding::InitFormatMap()
{
    FormatMap();
}

QString QEncoding::Format2Name(KestoEncodingFormat format)
{
    return FormatMap().value(format);
}

KestoEncodingFormat QEncoding::Name2Format(const QString &name)
{
    if (name.isEmpty())
        return ENCODING_NONE;
    const QMap<KestoEncodingFormat, QString> &map = FormatMap();
    for (auto it = map.constBegin(); it != map.constEnd(); ++it) {
        if (it.value().compare(name, Qt::CaseInsensitive) == 0)
            return it.key();
    }
    return ENCODING_NONE;
}

unsigned int QEncoding::EncodingFormats(QList<KestoEncodingFormat> &formats)
{
    formats.clear();
    const QMap<KestoEncodingFormat, QString> &map = FormatMap();
    for (auto it = map.constBegin(); it != map.constEnd(); ++it) {
        if (it.key() != ENCODING_NONE)
            formats.append(it.key());
    }
    return unsigned(formats.size());
}

bool CreateEncoder(const QByteArray &data, QEncoding **encoder, KestoEncodingFormat &format)
{
    if (!encoder)
        return false;
    FreeEncoder(*encoder);
    *encoder = nullptr;
    if (data.isEmpty())
        return false;

    const auto first = static_cast<unsigned char>(data.at(0));
    KestoEncodingFormat detected = ENCODING_NONE;
    if (data.size() >= 2 && static_cast<unsigned char>(data.at(1)) == 0xFE && first >= 0xFC) {
        // FE FE is shared by KSC5601 and CP949; CP949 reads both.
        static constexpr KestoEncodingFormat kByLead[]
            = {ENCODING_GB2312, ENCODING_SJIS, ENCODING_CP949, ENCODING_UNICODE};
        detected = kByLead[first - 0xFC];
    } else if (first == 0x03) {
        detected = ENCODING_ISOLATIN1;
    } else if (first == 0x02) {
        detected = ENCODING_UTF8;
    }

    format = detected;
    if (detected == ENCODING_UNICODE)
        return true;
    *encoder = NewEncoder(detected);
    return *encoder != nullptr;
}

bool CreateEncoder(KestoEncodingFormat format, QEncoding **encoder)
{
    QEncoding *created = NewEncoder(format);
    if (encoder) {
        FreeEncoder(*encoder);
        *encoder = created;
    } else {
        delete created;
        created = nullptr;
    }
    return created != nullptr;
}

void FreeEncoder(QEncoding *encoder)
{
    delete encoder;
}

QString LostCharacter::Describe() const
{
    return QStringLiteral("character %1 U+%2 '%3'")
        .arg(QString::number(position),
             QString::number(uint(codePoint), 16).toUpper().rightJustified(4, QLatin1Char('0')),
             QString::fromUcs4(&codePoint, 1));
}

QList<LostCharacter> LostCharacters(const QString &text, KestoEncodingFormat format)
{
    QList<LostCharacter> lost;
    QEncoding *encoder = nullptr;
    if (format == ENCODING_UNICODE || !CreateEncoder(format, &encoder))
        return lost;
    // ISO Latin-1 skips its own mark; the others decode what follows it.
    const QByteArray mark = format == ENCODING_ISOLATIN1 ? QEncoding::GetBOM(format) : QByteArray();
    qsizetype position = 0;
    for (qsizetype i = 0; i < text.size(); ++position) {
        const qsizetype length
            = text.at(i).isHighSurrogate() && i + 1 < text.size() && text.at(i + 1).isLowSurrogate() ? 2 : 1;
        const QString character = text.mid(i, length);
        QByteArray bytes;
        encoder->FromUnicode(character, bytes);
        QString back;
        encoder->ToUnicode(mark + bytes, back);
        if (back != character)
            lost.append({position + 1, character.toUcs4().value(0)});
        i += length;
    }
    FreeEncoder(encoder);
    return lost;
}
