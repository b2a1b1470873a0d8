// Reads arbitrary bytes as a cached catalogue ("Manifest.xml") and runs the
// catalogue queries on what loads. What loads must write a catalogue that
// reads back and writes the same bytes again.
#include "catalogue/framework.h"
#include "catalogue/manifest.h"
#include "catalogue/testmodule.h"

#include "fuzzutil.h"

namespace {

using fuzzutil::Check;

void Query(Manifest &catalogue)
{
    QList<QSharedPointer<_TestModule>> modules;
    catalogue.GetTestModules(modules, QStringList(), QString(), QString());
    catalogue.GetTestModules(modules, QStringList{QStringLiteral("*a*"), QStringLiteral("b*")}, QString(),
                             QString());
    catalogue.GetTestModules(modules, QStringList(), QStringLiteral("m"), QStringLiteral("s"));
    for (const QSharedPointer<_TestModule> &module : std::as_const(catalogue.testModules)) {
        Check(catalogue.FindTestModule(module->moduleName) != nullptr);
        module->TestType();
        module->ModuleName();
        module->IDHash();
        for (IKestoDevice::Platform platform : {IKestoDevice::PLATFORM_ARM, IKestoDevice::PLATFORM_WIN32})
            module->GetCompilerVariant(platform, true);
    }
    QList<QSharedPointer<_Framework>> frameworks;
    catalogue.GetFrameworks(frameworks);
    for (const QSharedPointer<_Framework> &framework : std::as_const(frameworks)) {
        for (IKestoDevice::Platform platform : {IKestoDevice::PLATFORM_ARM, IKestoDevice::PLATFORM_WIN32})
            framework->GetVariant(platform);
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    const QString kit = fuzzutil::ScratchPath(QStringLiteral("kit"));
    Manifest catalogue(kit, false);
    catalogue.cacheFile = fuzzutil::ScratchPath(QStringLiteral("Manifest.xml"));
    fuzzutil::WriteBytes(catalogue.cacheFile, fuzzutil::Bytes(data, size));
    catalogue.IsVersionOkay();
    if (!catalogue.ReadManifest())
        return 0;
    Query(catalogue);
    if (catalogue.testModules.isEmpty())
        return 0;

    const QString first = fuzzutil::ScratchPath(QStringLiteral("first.xml"));
    const QString second = fuzzutil::ScratchPath(QStringLiteral("second.xml"));
    Check(catalogue.WriteManifest(first));
    Manifest back(kit, false);
    back.cacheFile = first;
    Check(back.IsVersionOkay());
    Check(back.ReadManifest());
    Check(back.testModules.size() == catalogue.testModules.size());
    Check(back.frameworks.size() == catalogue.frameworks.size());
    Check(back.WriteManifest(second));
    Check(fuzzutil::ReadBytes(first) == fuzzutil::ReadBytes(second));
    return 0;
}
