// Reads arbitrary bytes as the module description file of every module kind.
#include "modules/ctfapplettestmodule.h"
#include "modules/ctftestmodule.h"
#include "modules/oattestmodule.h"
#include "modules/secondarymodule.h"
#include "modules/uttestmodule.h"

#include "fuzzutil.h"

#include <QDomDocument>

#include <memory>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    const QString path = fuzzutil::ScratchPath(QStringLiteral("module.xml"));
    fuzzutil::WriteBytes(path, fuzzutil::Bytes(data, size));

    std::unique_ptr<_TestModule> kinds[]
        = {std::make_unique<CtfTestModule>(), std::make_unique<CtfAppletTestModule>(),
           std::make_unique<OatTestModule>(), std::make_unique<UTTestModule>(), std::make_unique<SecondaryModule>()};
    for (std::unique_ptr<_TestModule> &module : kinds) {
        if (!module->ProcessModuleXML(path))
            continue;
        // What was read must make a manifest entry that reads back.
        QDomDocument document;
        QDomElement entry = document.createElement(QStringLiteral("testmodule"));
        document.appendChild(entry);
        module->WriteToManifest(entry);
        module->ReadFromManifest(entry);
    }
    return 0;
}
