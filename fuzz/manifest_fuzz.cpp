// Reads arbitrary bytes as a cached catalogue ("Manifest.xml") and runs the
// catalogue queries on what loads. What loads must write a catalogue that
// reads back whole and settles after one write.
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
    catalogue.GetTestModules(modules, QStringList{QStringLiteral("*a*"), QStringLiteral("b*")}, QString(), QString());
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

    // Written and read back, a catalogue keeps its modules and frameworks;
    // from the second write on the bytes no longer change. (The first write
    // may drop what carries no meaning, such as properties without values,
    // which leave an empty list behind.)
    Manifest *current = &catalogue;
    Manifest copies[] = {Manifest(kit, false), Manifest(kit, false), Manifest(kit, false)};
    QByteArray written[3];
    for (int i = 0; i < 3; ++i) {
        const QString path = fuzzutil::ScratchPath(QStringLiteral("written%1.xml").arg(i));
        Check(current->WriteManifest(path));
        written[i] = fuzzutil::ReadBytes(path);
        copies[i].cacheFile = path;
        Check(copies[i].IsVersionOkay());
        Check(copies[i].ReadManifest());
        Check(copies[i].testModules.size() == catalogue.testModules.size());
        Check(copies[i].frameworks.size() == catalogue.frameworks.size());
        current = &copies[i];
    }
    Check(written[1] == written[2]);
    return 0;
}
