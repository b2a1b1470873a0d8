// Lookups that let several Harness objects work on one selection: each finds
// its own catalogue module for a module chosen elsewhere.

#include "controller/harness.h"

#include "catalogue/manifest.h"
#include "catalogue/testmodule.h"

QSharedPointer<_TestModule> Harness::FindTestModule(const QString &name, const QString &source)
{
    if (!Setup())
        return {};
    const QString wanted = source.toUpper();
    const QSharedPointer<Manifest> catalogue = wanted == QLatin1String("KVK") ? m_kitManifest
        : wanted == QLatin1String("PVS")                                      ? m_platformManifest
                                                                              : QSharedPointer<Manifest>();
    return catalogue ? catalogue->FindTestModule(name) : QSharedPointer<_TestModule>();
}

QString Harness::ConnectedTarget() const
{
    return m_device ? m_device->GetConnectTarget().name : QString();
}

QString Harness::GetTarget() const
{
    return m_target;
}
