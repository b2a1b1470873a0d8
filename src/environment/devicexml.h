#pragma once

#include "../common/export.h"

#include <QString>

// Writes a self-contained copy of a device-pack XML file: references to
// external entities are replaced by the content of the files they name
// (looked up beside the device pack too), sections of the same name are
// merged into the first one in document order, and the document type
// declaration is dropped when it follows an XML declaration. An include that
// is missing or malformed is skipped and its reference kept. False when the
// source cannot be found, read or parsed, or the destination not written.
HARNESS_EXPORT bool FlattenDeviceXml(const QString &source, const QString &destination);
