#include "catalogue/modulekind.h"

namespace {

// Constant-initialised, so a table installed while the library loads is
// never overwritten by this file's own initialisation.
const QList<ModuleKind> *g_kinds = nullptr;

} // namespace

const QList<ModuleKind> &ModuleKinds()
{
    static const QList<ModuleKind> none;
    return g_kinds ? *g_kinds : none;
}

const ModuleKind *FindModuleKind(const QString &type)
{
    for (const ModuleKind &kind : ModuleKinds()) {
        if (kind.type == type)
            return &kind;
    }
    return nullptr;
}

const ModuleKind *FindModuleKind(bool ModuleKind::*flag)
{
    for (const ModuleKind &kind : ModuleKinds()) {
        if (kind.*flag)
            return &kind;
    }
    return nullptr;
}

void SetModuleKinds(const QList<ModuleKind> *kinds)
{
    g_kinds = kinds;
}
