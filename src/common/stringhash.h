#pragma once

#include "export.h"

#include <QString>

// The string hash that names manifest caches, module ID hashes and the cache
// files of compiled test data. Stored files depend on this exact function, so
// it never changes and never uses Qt's per-process seeded hash:
// h = (h << 4) + unit; h ^= (h & 0xF0000000) >> 23; h &= 0x0FFFFFFF over the
// UTF-16 code units.
HARNESS_EXPORT unsigned int StringHash(const QString &text);

// "#" followed by the decimal StringHash of the text, e.g. "#0" for "".
HARNESS_EXPORT QString StringHashName(const QString &text);
