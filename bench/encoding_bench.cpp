// Decoding and encoding 10 MB of text in every handset encoding, against
// glibc's iconv converting the same bytes.

#include "encoding/qencoding.h"

#include <QByteArray>
#include <QRandomGenerator>
#include <QString>
#include <QVector>

#include "support/benchutil.h"

#include <benchmark/benchmark.h>

#include <iconv.h>

#include <map>
#include <memory>

namespace {

constexpr qsizetype kTextBytes = 10 * 1024 * 1024;

struct Encoding
{
    KestoEncodingFormat format;
    const char *iconvName;
};

const Encoding kEncodings[] = {
    {ENCODING_ISOLATIN1, "ISO-8859-1"}, {ENCODING_KSC5601, "EUC-KR"}, {ENCODING_SJIS, "SHIFT_JIS"},
    {ENCODING_GB2312, "GB2312"},        {ENCODING_CP949, "CP949"},    {ENCODING_UTF8, "UTF-8"},
};

const Encoding &EncodingAt(int index)
{
    return kEncodings[index];
}

struct IconvHandle
{
    explicit IconvHandle(const char *to, const char *from) : cd(iconv_open(to, from)) { }
    ~IconvHandle()
    {
        if (cd != iconv_t(-1))
            iconv_close(cd);
    }
    bool Ok() const { return cd != iconv_t(-1); }
    // Converts all of in; false when iconv stops early.
    bool Convert(const char *in, size_t size, QByteArray &out, size_t capacity) const
    {
        out.resize(qsizetype(capacity));
        char *src = const_cast<char *>(in);
        char *dst = out.data();
        size_t left = size;
        size_t room = capacity;
        iconv(cd, nullptr, nullptr, nullptr, nullptr);
        if (iconv(cd, &src, &left, &dst, &room) == size_t(-1) || left != 0)
            return false;
        out.resize(qsizetype(capacity - room));
        return true;
    }
    iconv_t cd;
};

// The same text as Unicode and as the encoding's bytes (made by iconv).
struct Sample
{
    QString text;
    QByteArray bytes;
    QString error;
};

// Characters that both iconv and the library encode to the same bytes: the
// text is drawn from them so that both sides do the same work.
QVector<char16_t> CommonCharacters(const Encoding &encoding, QEncoding &encoder)
{
    IconvHandle toEncoding(encoding.iconvName, "UTF-16LE");
    QVector<char16_t> common;
    if (!toEncoding.Ok())
        return common;
    const char16_t last = encoding.format == ENCODING_ISOLATIN1 ? 0xFF : 0xFFFD;
    for (char32_t c = 0x20; c <= last; ++c) {
        if ((c >= 0x7F && c < 0xA0) || (c >= 0xD800 && c < 0xE000) || (c >= 0xE000 && c < 0xF900))
            continue;
        const char16_t unit = char16_t(c);
        char mine[QEncoding::kMaxEncodedSize + 1] = {};
        if (!encoder.UnicodeToChar(unit, mine))
            continue;
        QByteArray theirs;
        if (!toEncoding.Convert(reinterpret_cast<const char *>(&unit), 2, theirs, 8))
            continue;
        if (theirs == QByteArray(mine))
            common.append(unit);
    }
    return common;
}

// About kTextBytes of text: a quarter ASCII (words and blanks), the rest
// drawn from the encoding's own repertoire.
const Sample &SampleFor(int index)
{
    static std::map<int, Sample> samples;
    auto found = samples.find(index);
    if (found != samples.end())
        return found->second;
    Sample &sample = samples[index];
    const Encoding &encoding = EncodingAt(index);
    QEncoding *raw = nullptr;
    if (!CreateEncoder(encoding.format, &raw)) {
        sample.error = QStringLiteral("no converter");
        return sample;
    }
    std::unique_ptr<QEncoding, void (*)(QEncoding *)> encoder(raw, FreeEncoder);
    QVector<char16_t> wide;
    for (char16_t unit : CommonCharacters(encoding, *encoder)) {
        if (unit >= 0x80)
            wide.append(unit);
    }
    if (wide.isEmpty()) {
        sample.error = QStringLiteral("iconv lacks %1").arg(QLatin1String(encoding.iconvName));
        return sample;
    }
    QRandomGenerator random(42u + unsigned(index));
    QByteArray probe;
    qsizetype size = 0;
    while (size < kTextBytes) {
        QString chunk;
        for (int i = 0; i < 64; ++i) {
            if (random.bounded(4) == 0)
                chunk.append(QChar(char16_t(random.bounded(int('a'), int('z') + 1))));
            else
                chunk.append(QChar(wide.at(int(random.bounded(qsizetype(wide.size()))))));
        }
        chunk.append(QLatin1Char(' '));
        encoder->FromUnicode(chunk, probe);
        size += probe.size();
        sample.text += chunk;
    }
    IconvHandle toEncoding(encoding.iconvName, "UTF-16LE");
    if (!toEncoding.Convert(reinterpret_cast<const char *>(sample.text.utf16()), size_t(sample.text.size()) * 2,
                            sample.bytes, size_t(sample.text.size()) * 4 + 16))
        sample.error = QStringLiteral("iconv cannot encode the sample");
    return sample;
}

void SetLabel(benchmark::State &state, int index, qsizetype bytes)
{
    state.SetLabel(EncodingAt(index).iconvName);
    state.SetBytesProcessed(int64_t(state.iterations()) * bytes);
}

// The sample of encoding index, or null (the benchmark skipped with the
// reason) when it could not be made.
const Sample *ReadySample(benchmark::State &state, int index)
{
    const Sample &sample = SampleFor(index);
    if (!sample.error.isEmpty()) {
        state.SkipWithError(sample.error.toStdString().c_str());
        return nullptr;
    }
    return &sample;
}

void BM_Decode(benchmark::State &state)
{
    const int index = int(state.range(0));
    const Sample *ready = ReadySample(state, index);
    if (!ready)
        return;
    const Sample &sample = *ready;
    QEncoding *encoder = nullptr;
    CreateEncoder(EncodingAt(index).format, &encoder);
    for (auto _ : state) {
        QString out;
        encoder->ToUnicode(sample.bytes, out);
        benchmark::DoNotOptimize(out.constData());
        if (out.size() != sample.text.size()) {
            state.SkipWithError("decoded text differs in length");
            break;
        }
    }
    FreeEncoder(encoder);
    SetLabel(state, index, sample.bytes.size());
}

void BM_DecodeIconv(benchmark::State &state)
{
    const int index = int(state.range(0));
    const Sample *ready = ReadySample(state, index);
    if (!ready)
        return;
    const Sample &sample = *ready;
    IconvHandle decoder("UTF-16LE", EncodingAt(index).iconvName);
    for (auto _ : state) {
        QByteArray out;
        if (!decoder.Convert(sample.bytes.constData(), size_t(sample.bytes.size()), out,
                             size_t(sample.bytes.size()) * 2 + 16)) {
            state.SkipWithError("iconv cannot decode the sample");
            break;
        }
        benchmark::DoNotOptimize(out.constData());
    }
    SetLabel(state, index, sample.bytes.size());
}

void BM_Encode(benchmark::State &state)
{
    const int index = int(state.range(0));
    const Sample *ready = ReadySample(state, index);
    if (!ready)
        return;
    const Sample &sample = *ready;
    QEncoding *encoder = nullptr;
    CreateEncoder(EncodingAt(index).format, &encoder);
    for (auto _ : state) {
        QByteArray out;
        encoder->FromUnicode(sample.text, out);
        benchmark::DoNotOptimize(out.constData());
        if (out.size() != sample.bytes.size()) {
            state.SkipWithError("encoded text differs in length");
            break;
        }
    }
    FreeEncoder(encoder);
    SetLabel(state, index, sample.bytes.size());
}

void BM_EncodeIconv(benchmark::State &state)
{
    const int index = int(state.range(0));
    const Sample *ready = ReadySample(state, index);
    if (!ready)
        return;
    const Sample &sample = *ready;
    IconvHandle encoder(EncodingAt(index).iconvName, "UTF-16LE");
    for (auto _ : state) {
        QByteArray out;
        if (!encoder.Convert(reinterpret_cast<const char *>(sample.text.utf16()), size_t(sample.text.size()) * 2, out,
                             size_t(sample.text.size()) * 4 + 16)) {
            state.SkipWithError("iconv cannot encode the sample");
            break;
        }
        benchmark::DoNotOptimize(out.constData());
    }
    SetLabel(state, index, sample.bytes.size());
}

void Encodings(benchmark::internal::Benchmark *benchmark)
{
    benchmark->ArgName("encoding");
    for (int i = 0; i < int(std::size(kEncodings)); ++i)
        benchmark->Arg(i);
    benchmark->Unit(benchmark::kMillisecond);
    benchutil::SetMinTime(benchmark, 0.3);
}

BENCHMARK(BM_Decode)->Apply(Encodings);
BENCHMARK(BM_DecodeIconv)->Apply(Encodings);
BENCHMARK(BM_Encode)->Apply(Encodings);
BENCHMARK(BM_EncodeIconv)->Apply(Encodings);

} // namespace
