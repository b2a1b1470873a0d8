// Opens arbitrary bytes as a tar archive and reads every member.
#include "archive/tar.h"

#include <QTemporaryFile>

#include <cstddef>
#include <cstdint>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    QTemporaryFile file;
    if (!file.open())
        return 0;
    if (file.write(reinterpret_cast<const char *>(data), qint64(size)) != qint64(size) || !file.flush())
        return 0;
    Tar tar;
    if (!tar.Open(QIODevice::ReadOnly, file.fileName()))
        return 0;
    for (unsigned int i = 0; i < tar.EntryCount(); ++i) {
        TarFileEntry entry = tar.Entry(i);
        const QByteArray bytes = tar.EntryData(entry);
        if (bytes.size() > qint64(size))
            __builtin_trap();
    }
    return 0;
}
