// Flattens arbitrary bytes as a device pack that may include two files lying
// beside it: one well-formed, one not.
#include "environment/testdirectories.h"

#include <QFile>
#include <QTemporaryDir>

#include <cstddef>
#include <cstdint>
#include <cstdlib>

namespace {

bool WriteBytes(const QString &path, const QByteArray &bytes)
{
    QFile file(path);
    return file.open(QIODevice::WriteOnly | QIODevice::Truncate) && file.write(bytes) == bytes.size();
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    static QTemporaryDir folder;
    // Includes are also looked for below the home folder: keep it private.
    static const bool ready = folder.isValid() && qputenv("HOME", folder.path().toLocal8Bit())
        && WriteBytes(folder.filePath(QStringLiteral("keys.xml")), "<i><keys><key n=\"1\"/></keys></i>")
        && WriteBytes(folder.filePath(QStringLiteral("broken.xml")), "<i><open></i>");
    if (!ready)
        abort();

    const QString source = folder.filePath(QStringLiteral("device.xml"));
    const QString destination = folder.filePath(QStringLiteral("device.dso"));
    if (!WriteBytes(source, QByteArray(reinterpret_cast<const char *>(data), int(size))))
        abort();
    FlattenDeviceXml(source, destination);
    return 0;
}
