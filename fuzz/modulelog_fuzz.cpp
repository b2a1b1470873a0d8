// Parses arbitrary bytes as the copied log of every module kind (under each
// kind's file name), stamps it as the run does and parses it again.
#include "modules/ctfapplettestmodule.h"
#include "modules/ctftestmodule.h"
#include "modules/oattestmodule.h"
#include "modules/uttestmodule.h"

#include "fuzzutil.h"

#include <QMap>

#include <memory>

namespace {

using fuzzutil::Check;
using fuzzutil::ReadBytes;

// A log yields at most one verdict per line.
void Parse(_TestModule &module, const QString &path, const QByteArray &bytes)
{
    TestResults results;
    module.ParseLog(path, results);
    Check(results.caseResults.size() <= bytes.count('\n') + 1);
    for (const TestCaseResult &verdict : std::as_const(results.caseResults))
        Check(!verdict.testCase.isEmpty() && !verdict.result.isEmpty());

    // Through the list of copied logs, as result processing does.
    module.desktopLogFiles = QStringList{path};
    TestResults again;
    module.ParseLog(again);
}

// Stamping inserts exactly three lines and keeps every byte of the log.
void Stamp(_TestModule &module, const QString &path, const QByteArray &bytes)
{
    QMap<QString, QString> env{{QStringLiteral("TestRunID"), QStringLiteral("{run}")}};
    module.desktopLogFiles = QStringList{path};
    module.PostProcess(env);
    const QByteArray stamped = ReadBytes(path);
    if (stamped == bytes)
        return; // a log the kind does not stamp
    QList<QByteArray> lines = stamped.split('\n');
    QList<QByteArray> original = bytes.split('\n');
    original.append(QByteArray());
    for (qsizetype i = 0; i + 2 < lines.size(); ++i) {
        if (lines[i] == "GUID:{run}" && lines[i + 1].startsWith("Manifest Name:")
            && lines[i + 2].startsWith("ID Hash:")) {
            QList<QByteArray> rest = lines;
            rest.remove(i, 3);
            if (rest == original)
                return;
        }
    }
    Check(false);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    const QByteArray bytes = fuzzutil::Bytes(data, size);

    struct Kind
    {
        std::unique_ptr<_TestModule> module;
        const char *fileName;
        bool stamps;
    };
    Kind kinds[] = {
        {std::make_unique<CtfTestModule>(), "ctf-2026-12-03-14-05-09.log", true},
        {std::make_unique<CtfAppletTestModule>(), "applet-2026-12-03-14-05-09.log", true},
        // OAT post-processing runs Perl on a folder of logs: parsed only.
        {std::make_unique<OatTestModule>(), "oat-2026-12-03-14-05-09.oat", false},
        {std::make_unique<UTTestModule>(), "ut-2026-12-03-14-05-09.txt", true},
        {std::make_unique<UTTestModule>(), "ut-2026-12-03-14-05-09.xml", false},
    };
    for (Kind &kind : kinds) {
        kind.module->moduleName = QStringLiteral("Fuzzed");
        const QString path = fuzzutil::ScratchPath(QString::fromLatin1(kind.fileName));
        fuzzutil::WriteBytes(path, bytes);
        Parse(*kind.module, path, bytes);
        if (kind.stamps) {
            Stamp(*kind.module, path, bytes);
            Parse(*kind.module, path, ReadBytes(path));
        } else if (kind.module->TestType() == UTTestModule::Type()) {
            QMap<QString, QString> env{{QStringLiteral("TestRunID"), QStringLiteral("{run}")}};
            kind.module->desktopLogFiles = QStringList{path};
            kind.module->PostProcess(env); // the XML log is stamped as XML
        }
    }
    return 0;
}
