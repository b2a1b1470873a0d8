// Opens arbitrary bytes as a tar archive and reads every member.
#include "archive/tar.h"

#include "fuzzutil.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    const QString path = fuzzutil::ScratchPath(QStringLiteral("package.kestix"));
    fuzzutil::WriteBytes(path, fuzzutil::Bytes(data, size));
    Tar tar;
    if (!tar.Open(QIODevice::ReadOnly, path))
        return 0;
    // A damaged archive always says why.
    fuzzutil::Check(tar.IsDamaged() == !tar.ErrorString().isEmpty());
    for (unsigned int i = 0; i < tar.EntryCount(); ++i) {
        TarFileEntry entry = tar.Entry(i);
        // A sparse member may be far larger than the archive (its holes are
        // not stored); reading a huge one tests nothing but the allocator.
        if (!entry.sparse.isEmpty() && entry.size > (1u << 24))
            continue;
        const QByteArray bytes = tar.EntryData(entry);
        // A member holds its size in bytes and, unless sparse, no more than
        // the archive does.
        fuzzutil::Check(bytes.size() == qint64(entry.size));
        fuzzutil::Check(!entry.sparse.isEmpty() || bytes.size() <= qint64(size));
    }
    return 0;
}
