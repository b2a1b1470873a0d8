#pragma once

#include "../catalogue/modulekind.h"
#include "../common/export.h"

#include <QList>

// Every kind of test module, in the order OAT, CTF, CTF applet, UT,
// secondary: type word, description file, framework class ID, how to create
// one and which saved logs it reads. The catalogue receives this table when
// the library is loaded; kit writers read it for the same facts.
HARNESS_EXPORT const QList<ModuleKind> &ModuleKindTable();
