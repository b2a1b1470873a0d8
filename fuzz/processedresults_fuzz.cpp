// Reads arbitrary bytes as a processed-results file ("ProcessedResults.xml")
// against a fixed kit and platform catalogue, records verdicts as a run
// does and saves. The file saved must be taken as it is on the next run and
// must hold the verdict recorded.
#include "catalogue/manifest.h"
#include "controller/processedresults.h"
#include "modules/ctftestmodule.h"
#include "modules/uttestmodule.h"

#include "fuzzutil.h"

#include <QDir>
#include <QDomDocument>
#include <QFile>

namespace {

using fuzzutil::Check;

const QString kAudioHash = QStringLiteral("#1234");

template <typename Kind>
void AddModule(Manifest &catalogue, const QString &name, const QString &hash, const QStringList &cases)
{
    QSharedPointer<_TestModule> module(new Kind);
    module->moduleName = name;
    module->idHash = hash;
    module->family = QStringLiteral("media");
    for (const QString &testCase : cases)
        module->testCases.append(TestCase(testCase, QStringLiteral("auto")));
    catalogue.testModules.insert(name.toLower(), module);
}

bool IsNamed(const QDomElement &element, const char *name)
{
    return element.tagName().toLower() == QLatin1String(name);
}

// The module element a results file lets a verdict of key reach: the last
// one, in document order, whose id_hash (or, without one, name) is key.
QDomElement ModuleOf(const QDomDocument &document, const QString &key)
{
    QDomElement found;
    for (QDomElement module = document.documentElement().firstChildElement(); !module.isNull();
         module = module.nextSiblingElement()) {
        if (!IsNamed(module, "module") || !module.hasAttribute(QStringLiteral("name"))
            || !module.hasAttribute(QStringLiteral("id_hash")))
            continue;
        const QString hash = module.attribute(QStringLiteral("id_hash"));
        if ((hash.isEmpty() ? module.attribute(QStringLiteral("name")) : hash).toLower() == key)
            found = module;
    }
    return found;
}

bool HasVerdict(const QDomElement &module, const QString &testCase, const QString &result)
{
    for (QDomElement child = module.firstChildElement(); !child.isNull(); child = child.nextSiblingElement()) {
        if (IsNamed(child, "testcase") && child.attribute(QStringLiteral("name")) == testCase
            && child.attribute(QStringLiteral("result")) == result)
            return true;
    }
    return false;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    static Manifest kit(fuzzutil::ScratchPath(QStringLiteral("kit")), false);
    static Manifest platform(fuzzutil::ScratchPath(QStringLiteral("platform")), true);
    static const bool ready = [] {
        AddModule<CtfTestModule>(kit, QStringLiteral("Audio"), kAudioHash,
                                 {QStringLiteral("play"), QStringLiteral("record")});
        AddModule<UTTestModule>(kit, QStringLiteral("Menu"), QString(), {QStringLiteral("open")});
        AddModule<CtfTestModule>(platform, QStringLiteral("Shell"), QStringLiteral("#99"), {QStringLiteral("boot")});
        return true;
    }();
    (void)ready;

    const QString folder = fuzzutil::ScratchPath(QStringLiteral("results"));
    QDir(folder).removeRecursively();
    QDir().mkpath(folder);
    const QString path = folder + QStringLiteral("/ProcessedResults.xml");
    fuzzutil::WriteBytes(path, fuzzutil::Bytes(data, size));

    ProcessedResults results;
    results.Open(path, &kit, &platform, nullptr);
    results.Record(kAudioHash, QStringLiteral("Audio"), QString(), QString(), QStringLiteral("play"),
                   QStringLiteral("pass"));
    results.Record(kAudioHash, QStringLiteral("Audio"), QString(), QString(), QStringLiteral("record.1"),
                   QStringLiteral("unsupported"));
    results.Record(QString(), QStringLiteral("Menu"), QString(), QString(), QStringLiteral("open_1"),
                   QStringLiteral("fail"));
    results.Record(QStringLiteral("#5"), QStringLiteral("Stranger"), QStringLiteral("f"), QStringLiteral("s"),
                   QStringLiteral("x"), QStringLiteral("unexecuted"));
    Check(results.Save());

    ProcessedResults again;
    again.Open(path, &kit, &platform, nullptr);
    Check(!again.IsModified());
    // Read back with the DOM, a reader of its own.
    QFile saved(path);
    QDomDocument document;
    Check(saved.open(QIODevice::ReadOnly) && document.setContent(&saved));
    const QDomElement audio = ModuleOf(document, kAudioHash);
    Check(!audio.isNull() && HasVerdict(audio, QStringLiteral("play"), QStringLiteral("pass")));
    return 0;
}
