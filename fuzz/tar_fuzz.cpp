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
    for (unsigned int i = 0; i < tar.EntryCount(); ++i) {
        TarFileEntry entry = tar.Entry(i);
        // A member holds no more than the archive does.
        fuzzutil::Check(tar.EntryData(entry).size() <= qint64(size));
    }
    return 0;
}
