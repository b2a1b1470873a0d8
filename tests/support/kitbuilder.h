#pragma once

// The tests build their kits with the library's KitWriter (modules/kitwriter.h), the writer of the tool's demo
// environment: a KitModule's description, src/ and package/ folders by AddSourceModule, framework packages by
// AddFrameworkPackage; Ok() and Errors() tell whether every file was written.

#include "support/handsetfixture.h"

#include "modules/kitwriter.h"

namespace kitbuilder {

using Module = KitModule;
using KitBuilder = KitWriter;

} // namespace kitbuilder
