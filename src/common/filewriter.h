#pragma once

#include "export.h"

#include <QByteArray>
#include <QString>

// Writing whole files: XML documents, JSON and plain text alike.
namespace FileWriter {

// Writes bytes to path. With atomic set the file is written beside the
// destination and renamed over it only once complete, so a crash or a full
// disk never leaves a truncated file. Returns false (and fills error when
// given) when the file cannot be written; an existing file is then unchanged.
HARNESS_EXPORT bool Write(const QString &path, const QByteArray &bytes, bool atomic = true, QString *error = nullptr);

} // namespace FileWriter
