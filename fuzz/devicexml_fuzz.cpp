// Flattens arbitrary bytes as a device pack that may include two files lying
// beside it: one well-formed, one not.
#include "environment/devicexml.h"

#include "fuzzutil.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    // Includes are also looked for below the home folder: keep it private.
    static const bool ready = [] {
        qputenv("HOME", fuzzutil::Scratch().toLocal8Bit());
        fuzzutil::WriteBytes(fuzzutil::ScratchPath(QStringLiteral("keys.xml")), "<i><keys><key n=\"1\"/></keys></i>");
        fuzzutil::WriteBytes(fuzzutil::ScratchPath(QStringLiteral("broken.xml")), "<i><open></i>");
        return true;
    }();
    (void)ready;

    const QString source = fuzzutil::ScratchPath(QStringLiteral("device.xml"));
    const QString destination = fuzzutil::ScratchPath(QStringLiteral("device.dso"));
    fuzzutil::WriteBytes(source, fuzzutil::Bytes(data, size));
    FlattenDeviceXml(source, destination);
    return 0;
}
