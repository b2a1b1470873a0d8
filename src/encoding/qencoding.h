#pragma once

#include "../common/export.h"

#include <QByteArray>
#include <QList>
#include <QString>

// The string encodings of resource files. The numbers are stored in resource
// files and exchanged with callers, so they never change.
enum KestoEncodingFormat {
    ENCODING_UNICODE = 0, // UTF-16 little-endian, handled by the caller
    ENCODING_ISOLATIN1 = 1,
    ENCODING_KSC5601 = 2,
    ENCODING_SJIS = 3,
    ENCODING_GB2312 = 4,
    ENCODING_CP949 = 5,
    ENCODING_UTF8 = 6,
    ENCODING_NONE = 999
};

// A converter between Unicode and one handset encoding, plus the table of
// encoding names and marks. Converters are stateless: one object serves any
// number of conversions. Create them with CreateEncoder and release them with
// FreeEncoder.
class HARNESS_EXPORT QEncoding
{
public:
    virtual ~QEncoding();

    // Decodes a whole block (a leading mark included, except for ISO Latin-1
    // which skips its own) and puts the units before the first NUL unit into
    // `out`: the UTF-8 converter replaces `out`, the others append to it.
    // Returns the length of `out`. Never reads past the block.
    virtual int ToUnicode(const QByteArray &in, QString &out) = 0;

    // Encodes every UTF-16 unit of `in` (surrogate halves one by one) with
    // UnicodeToChar into `out` (cleared first); a unit that cannot be encoded
    // becomes "?". Returns the size of `out`.
    virtual unsigned int FromUnicode(const QString &in, QByteArray &out);

    // Decodes one character code (a byte, or lead byte * 256 + trail byte).
    // False when the code has no mapping.
    virtual bool CharToUnicode(unsigned int code, quint16 *unit) = 0;

    // Encodes one UTF-16 unit into `bytes` as a NUL-terminated sequence;
    // `bytes` must hold at least kMaxEncodedSize bytes. False when the unit
    // has no encoding.
    virtual bool UnicodeToChar(unsigned int unit, char *bytes) = 0;

    // The most and the fewest bytes one character takes in the encoding.
    virtual unsigned int MaxCharSize() = 0;
    // See MaxCharSize().
    virtual unsigned int MinCharSize() = 0;

    // Room UnicodeToChar needs: at most 4 bytes plus the terminating NUL.
    static constexpr int kMaxEncodedSize = 5;

    // Length of the mark of `format` (2, 1 or 0; 0 for 999 and unknown values).
    static unsigned int BOMSize(KestoEncodingFormat format);
    // The mark of `format`; FF FE for 0, 999 and unknown values.
    static QByteArray GetBOM(KestoEncodingFormat format);

    // Fills the process-wide name table when it is empty. Call it (or any of
    // the three operations below) once before using the table from several
    // threads.
    static void InitFormatMap();
    // The name of `format` ("UTF-8", "S-JIS", ...); empty for unknown values.
    static QString Format2Name(KestoEncodingFormat format);
    // The format whose name matches `name` case-insensitively; 999 for an
    // empty or unknown name.
    static KestoEncodingFormat Name2Format(const QString &name);
    // Clears `formats`, appends 0 ... 6 in ascending order and returns 7.
    static unsigned int EncodingFormats(QList<KestoEncodingFormat> &formats);
};

// Detects the encoding of a stored block from its leading mark. Destroys any
// converter `*encoder` held first. On return `*encoder` is the converter for
// the detected format, or null for Unicode (format 0, result true) and for an
// unknown mark (format 999, result false). An empty block returns false and
// leaves `format` unchanged.
HARNESS_EXPORT bool CreateEncoder(const QByteArray &data, QEncoding **encoder, KestoEncodingFormat &format);

// Creates the converter for `format` (1 ... 6), destroys the one `*encoder`
// held before and stores the new one (null for 0, 999 and unknown values).
// True when a converter was created.
HARNESS_EXPORT bool CreateEncoder(KestoEncodingFormat format, QEncoding **encoder);

// Destroys a converter from CreateEncoder; null is ignored.
HARNESS_EXPORT void FreeEncoder(QEncoding *encoder);

// One character of a text that an encoding cannot hold.
struct HARNESS_EXPORT LostCharacter
{
    qsizetype position = 0; // 1-based, counted in characters (code points)
    char32_t codePoint = 0; // the character's Unicode code point

    // "character 7 U+30C6 'テ'"
    QString Describe() const;
};

// The characters of text that the converter for format does not give back:
// encoding a character and decoding the result yields something else (ISO
// Latin-1 keeping the low byte of U+30C6, a "?" for an unmapped character).
// Empty for Unicode (format 0) and when every character survives.
HARNESS_EXPORT QList<LostCharacter> LostCharacters(const QString &text, KestoEncodingFormat format);
