// Reads arbitrary bytes as a kit's cached catalogue, then writes what was read.
#include "catalogue/manifest.h"

#include <QFile>
#include <QTemporaryDir>

#include <cstddef>
#include <cstdint>
#include <cstdlib>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    static QTemporaryDir folder;
    if (!folder.isValid() || !qputenv("KESTIX_DATA_ROOT", folder.filePath(QStringLiteral("data")).toLocal8Bit()))
        abort();
    static Manifest manifest(folder.filePath(QStringLiteral("kit")), false);

    QFile cache(manifest.ManifestFilePath());
    if (!cache.open(QIODevice::WriteOnly | QIODevice::Truncate)
        || cache.write(reinterpret_cast<const char *>(data), qint64(size)) != qint64(size))
        abort();
    cache.close();

    manifest.frameworks.clear();
    manifest.IsVersionOkay();
    if (manifest.ReadManifest())
        manifest.WriteManifest(folder.filePath(QStringLiteral("written.xml")));
    return 0;
}
