// hello-harness [MODULE]: connects to the first emulated handset, lists the
// modules of the selected test kit, runs MODULE (default: the first one) and
// prints its verdicts. The library's log goes to hello-harness.log.
#include <harness/catalogue/testmodule.h>
#include <harness/catalogue/testresults.h>
#include <harness/controller/harness.h>
#include <harness/log/log.h>

#include <QCoreApplication>
#include <QTextStream>

static int Hello(const QStringList &arguments)
{
    QTextStream out(stdout);
    QTextStream err(stderr);

    Log log;
    log.SetLogPath(QStringLiteral("hello-harness.log"));
    Harness harness;
    harness.SetLogger(&log);

    // Handsets come from KESTIX_HANDSETS, the kit from KESTIX_TESTSET; the
    // library's progress messages are echoed to standard output as well.
    QList<ConnectTarget> targets;
    if (Harness::ListTargets(targets) == 0 || !harness.ConnectToTarget(targets.first())) {
        err << "no handset to connect to (see hello-harness.log)\n";
        return 2;
    }
    out << "Connected to " << harness.ConnectedTarget() << Qt::endl;

    QList<QSharedPointer<_TestModule>> modules;
    harness.GetTestModules(modules, QStringList(), QString(), QString());
    if (modules.isEmpty()) {
        err << "the test kit has no modules (see hello-harness.log)\n";
        return 2;
    }
    QSharedPointer<_TestModule> chosen = modules.first();
    for (const QSharedPointer<_TestModule> &module : modules) {
        out << "  " << module->TestType() << "  " << module->moduleName << "  (" << module->testCases.size()
            << " test cases)" << Qt::endl;
        if (arguments.size() > 1 && module->moduleName.compare(arguments.at(1), Qt::CaseInsensitive) == 0)
            chosen = module;
    }

    out << "Running " << chosen->moduleName << Qt::endl;
    harness.AddTest(chosen);
    TestResults results;
    if (!harness.Run() || !chosen->ParseLog(results)) {
        err << "the run failed (see hello-harness.log)\n";
        return 1;
    }
    for (const TestCaseResult &verdict : results.caseResults)
        out << "  " << verdict.testCase << ": " << verdict.result << "\n";
    return 0;
}

int main(int argc, char **argv)
{
    QCoreApplication app(argc, argv);
    Harness::Initialize();
    const int status = Hello(QCoreApplication::arguments());
    Harness::Uninitialize();
    return status;
}
