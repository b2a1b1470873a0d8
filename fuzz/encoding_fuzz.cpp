// Detects the encoding of arbitrary bytes and decodes them with every
// converter; encodes what was decoded back again.
#include "encoding/qencoding.h"

#include <cstddef>
#include <cstdint>

namespace {

void Check(bool condition)
{
    if (!condition)
        __builtin_trap();
}

void Exercise(QEncoding *encoder, const QByteArray &bytes)
{
    const QString before = QStringLiteral("x");
    QString text = before;
    const int length = encoder->ToUnicode(bytes, text);
    Check(length == text.size());
    // No converter makes more than one unit per input byte, apart from the
    // text it may append to.
    Check(text.size() <= bytes.size() + before.size());
    Check(!text.contains(QChar(0)));

    QByteArray encoded;
    const unsigned int encodedSize = encoder->FromUnicode(text, encoded);
    Check(encodedSize == unsigned(encoded.size()));
    Check(encoded.size() <= qint64(text.size()) * qint64(encoder->MaxCharSize()));

    // Single codes taken from the input.
    for (int i = 0; i + 1 < bytes.size() && i < 64; i += 2) {
        const unsigned int code = unsigned(uchar(bytes[i])) << 8 | uchar(bytes[i + 1]);
        quint16 unit = 0;
        encoder->CharToUnicode(code, &unit);
        encoder->CharToUnicode(uchar(bytes[i]), &unit);
        char out[QEncoding::kMaxEncodedSize + 1];
        out[QEncoding::kMaxEncodedSize] = 'z';
        if (encoder->UnicodeToChar(code & 0xFFFF, out))
            Check(out[QEncoding::kMaxEncodedSize] == 'z');
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    const QByteArray bytes(reinterpret_cast<const char *>(data), int(size));

    QEncoding *detected = nullptr;
    KestoEncodingFormat format = ENCODING_NONE;
    const bool known = CreateEncoder(bytes, &detected, format);
    if (known && detected)
        Exercise(detected, bytes);
    Check(known || !detected);
    FreeEncoder(detected);

    for (int value = ENCODING_ISOLATIN1; value <= ENCODING_UTF8; ++value) {
        QEncoding *encoder = nullptr;
        Check(CreateEncoder(KestoEncodingFormat(value), &encoder) && encoder);
        Exercise(encoder, bytes);
        FreeEncoder(encoder);
    }
    return 0;
}
