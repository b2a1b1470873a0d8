// The reports of the tool (summary, JUnit XML, JSON) and the report command.

#include "cli/report.h"

#include "cli/commands.h"
#include "cli/options.h"
#include "cli/setup.h"

#include "controller/harness.h"
#include "controller/moduletimings.h"
#include "controller/resultsmerge.h"
#include "log/log.h"

#include "common/filewriter.h"
#include "common/xmlwriter.h"

#include <algorithm>
#include <utility>

#include <QDir>
#include <QDomDocument>
#include <QFile>
#include <QFileInfo>
#include <QJsonArray>
#include <QJsonDocument>
#include <QJsonObject>

namespace {

const QString kPass = QStringLiteral("pass");
const QString kFail = QStringLiteral("fail");
const QString kUnsupported = QStringLiteral("unsupported");
const QString kUnexecuted = QStringLiteral("unexecuted");

QString Cell(const QString &text, int width)
{
    return text.leftJustified(width, QLatin1Char(' '), false);
}

QString Plural(int count, const char *noun)
{
    return QStringLiteral("%1 %2%3").arg(count).arg(QLatin1String(noun)).arg(count == 1 ? "" : "s");
}

// JUnit's "time": seconds with three decimals.
QString JUnitSeconds(qint64 ms)
{
    return QString::number(double(qMax<qint64>(ms, 0)) / 1000.0, 'f', 3);
}

// JUnit time stamps are ISO 8601 without a zone; ours are UTC.
QString JUnitTime(const QDateTime &utc)
{
    return utc.toUTC().toString(QStringLiteral("yyyy-MM-ddTHH:mm:ss"));
}

QString IsoTime(const QDateTime &utc)
{
    return utc.isValid() ? utc.toUTC().toString(Qt::ISODateWithMs) : QString();
}

QString LogText(const ModuleReport &module)
{
    return module.logs.isEmpty() ? QString() : QStringLiteral(" (log: %1)").arg(module.logs.join(QStringLiteral(", ")));
}

} // namespace

QString VerdictLines(const QString &logPath, const QString &testCase, const QString &verdict)
{
    // How far below the line naming the test case its verdict may stand.
    constexpr int kVerdictReach = 4;
    QFile file(logPath);
    if (testCase.isEmpty() || !file.open(QIODevice::ReadOnly | QIODevice::Text) || file.size() > (16 << 20))
        return {};
    const QStringList lines = QString::fromUtf8(file.readAll()).split(QLatin1Char('\n'));
    for (qsizetype i = 0; i < lines.size(); ++i) {
        if (!lines.at(i).contains(testCase))
            continue;
        for (qsizetype j = i; j < qMin(lines.size(), i + kVerdictReach + 1); ++j) {
            if (j > i && lines.at(j).contains(testCase))
                break;
            if (lines.at(j).contains(verdict, Qt::CaseInsensitive))
                return j == i ? lines.at(i).trimmed()
                              : lines.at(i).trimmed() + QStringLiteral(" / ") + lines.at(j).trimmed();
        }
    }
    return {};
}

QString DurationText(qint64 ms)
{
    if (ms < 0)
        return QString();
    const double seconds = double(ms) / 1000.0;
    return QString::number(seconds, 'f', seconds < 10 ? 1 : 0) + QStringLiteral(" s");
}

QHash<QString, qint64> CaseTimes(const QString &logPath)
{
    QHash<QString, qint64> times;
    QFile file(logPath);
    if (!file.open(QIODevice::ReadOnly | QIODevice::Text) || file.size() > (16 << 20))
        return times;
    for (const QString &line : QString::fromUtf8(file.readAll()).split(QLatin1Char('\n'))) {
        const QStringList words = line.split(QLatin1Char(' '), Qt::SkipEmptyParts);
        if (words.size() != 4)
            continue;
        bool ok = false;
        const double value = words.at(2).toDouble(&ok);
        const QString unit = words.at(3).toLower();
        if (ok && value >= 0 && value < 1e12 && (unit == QLatin1String("ms") || unit == QLatin1String("s")))
            times.insert(words.at(0), qint64(unit == QLatin1String("s") ? value * 1000.0 : value));
    }
    return times;
}

int ModuleReport::Count(const QString &result) const
{
    return int(std::count_if(testCases.cbegin(), testCases.cend(),
                             [&](const TestCaseReport &testCase) { return testCase.result == result; }));
}

bool ModuleReport::Executed() const
{
    return std::any_of(testCases.cbegin(), testCases.cend(),
                       [](const TestCaseReport &testCase) { return testCase.result != kUnexecuted; });
}

bool RunReport::Read(const QString &path, QString *error)
{
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly)) {
        *error = QStringLiteral("cannot open %1: %2").arg(path, file.errorString());
        return false;
    }
    QDomDocument document;
    QString message;
    int line = 0;
    int column = 0;
    if (!document.setContent(&file, &message, &line, &column)) {
        *error = QStringLiteral("%1 is not a processed-results file: %2 (line %3, column %4)")
                     .arg(path, message)
                     .arg(line)
                     .arg(column);
        return false;
    }
    const QDomElement root = document.documentElement();
    if (root.tagName().toLower() != QLatin1String("testmodules")) {
        *error = QStringLiteral("%1 is not a processed-results file").arg(path);
        return false;
    }
    for (QDomElement module = root.firstChildElement(); !module.isNull(); module = module.nextSiblingElement()) {
        if (module.tagName().toLower() != QLatin1String("module"))
            continue;
        ModuleReport report;
        report.name = module.attribute(QStringLiteral("name"));
        report.family = module.attribute(QStringLiteral("family"));
        report.subFamily = module.attribute(QStringLiteral("subfamily"));
        report.source = module.attribute(QStringLiteral("source"));
        report.handset = module.attribute(QStringLiteral("handset"));
        for (QDomElement tc = module.firstChildElement(); !tc.isNull(); tc = tc.nextSiblingElement()) {
            if (tc.tagName().toLower() == QLatin1String("testcase"))
                report.testCases.append(
                    {tc.attribute(QStringLiteral("name")), tc.attribute(QStringLiteral("result")), QString()});
        }
        modules.append(report);
    }
    return true;
}

int RunReport::Total(const QString &result) const
{
    int total = 0;
    for (const ModuleReport &module : modules)
        total += module.Count(result);
    return total;
}

int RunReport::Errors() const
{
    int errors = 0;
    for (const ModuleReport &module : modules) {
        if (!module.Finished())
            errors += qMax(1, int(module.testCases.size()));
    }
    return errors;
}

int RunReport::NotFinished() const
{
    return int(
        std::count_if(modules.cbegin(), modules.cend(), [](const ModuleReport &module) { return !module.Finished(); }));
}

QString RunReport::Summary(bool withHandset) const
{
    const QString totalLabel = QStringLiteral("Total (%1)").arg(Plural(int(modules.size()), "module"));
    int nameWidth = int(totalLabel.size());
    int handsetWidth = 7;
    for (const ModuleReport &module : modules) {
        nameWidth = qMax(nameWidth, int(module.name.size()));
        handsetWidth = qMax(handsetWidth, int(module.handset.size()));
    }
    auto row = [&](const QString &name, const QString &handset, const QString &a, const QString &b, const QString &c,
                   const QString &d) {
        QString line = Cell(name, nameWidth) + QStringLiteral("  ");
        if (withHandset)
            line += Cell(handset, handsetWidth) + QStringLiteral("  ");
        line += a.rightJustified(6) + QStringLiteral("  ") + b.rightJustified(6) + QStringLiteral("  ")
            + c.rightJustified(11) + QStringLiteral("  ") + d.rightJustified(10);
        return line + QLatin1Char('\n');
    };
    QString text = row(QStringLiteral("Module"), QStringLiteral("Handset"), QStringLiteral("Passed"),
                       QStringLiteral("Failed"), QStringLiteral("Unsupported"), QStringLiteral("Unexecuted"));
    for (const ModuleReport &m : modules) {
        text += row(m.name, m.handset, QString::number(m.Count(kPass)), QString::number(m.Count(kFail)),
                    QString::number(m.Count(kUnsupported)), QString::number(m.Count(kUnexecuted)));
    }
    text += row(totalLabel, QString(), QString::number(Total(kPass)), QString::number(Total(kFail)),
                QString::number(Total(kUnsupported)), QString::number(Total(kUnexecuted)));
    for (const ModuleReport &m : modules) {
        if (!m.Finished())
            text += QStringLiteral("Not finished: %1%2: %3\n")
                        .arg(m.name, m.handset.isEmpty() ? QString() : QStringLiteral(" on ") + m.handset, m.reason);
    }
    return text;
}

QByteArray RunReport::JUnit() const
{
    QDomDocument document;
    document.appendChild(document.createProcessingInstruction(QStringLiteral("xml"),
                                                              QStringLiteral("version=\"1.0\" encoding=\"UTF-8\"")));
    QDomElement suites = document.createElement(QStringLiteral("testsuites"));
    suites.setAttribute(QStringLiteral("name"), QStringLiteral("harness"));
    document.appendChild(suites);
    int tests = 0;
    int totalFailures = 0;
    int id = 0;
    for (const ModuleReport &module : modules) {
        QDomElement suite = document.createElement(QStringLiteral("testsuite"));
        const QString className
            = module.family.isEmpty() ? module.name : module.family + QLatin1Char('.') + module.name;
        // A module that did not finish has no verdicts to trust: each of its
        // test cases (or the module itself, without any) is an error.
        QList<TestCaseReport> cases = module.testCases;
        if (!module.Finished() && cases.isEmpty())
            cases.append({module.name, kUnexecuted, QString()});
        int failures = 0;
        int errors = 0;
        int skipped = 0;
        for (const TestCaseReport &testCase : std::as_const(cases)) {
            QDomElement element = document.createElement(QStringLiteral("testcase"));
            element.setAttribute(QStringLiteral("name"), testCase.name);
            element.setAttribute(QStringLiteral("classname"), className);
            if (testCase.timeMs >= 0)
                element.setAttribute(QStringLiteral("time"), JUnitSeconds(testCase.timeMs));
            if (!module.Finished()) {
                QDomElement error = document.createElement(QStringLiteral("error"));
                error.setAttribute(QStringLiteral("message"), module.reason);
                error.setAttribute(QStringLiteral("type"), QStringLiteral("not finished"));
                error.appendChild(document.createTextNode(
                    QStringLiteral("%1 did not finish: %2%3").arg(module.name, module.reason, LogText(module))));
                element.appendChild(error);
                ++errors;
            } else if (testCase.result == kFail) {
                QDomElement failure = document.createElement(QStringLiteral("failure"));
                failure.setAttribute(
                    QStringLiteral("message"),
                    QStringLiteral("%1%2").arg(testCase.detail.isEmpty()
                                                   ? QStringLiteral("test case %1 failed").arg(testCase.name)
                                                   : testCase.detail,
                                               LogText(module)));
                failure.setAttribute(QStringLiteral("type"), kFail);
                element.appendChild(failure);
                ++failures;
            } else if (testCase.result != kPass) {
                QDomElement skip = document.createElement(QStringLiteral("skipped"));
                skip.setAttribute(QStringLiteral("message"), testCase.result);
                element.appendChild(skip);
                ++skipped;
            }
            suite.appendChild(element);
        }
        suite.setAttribute(QStringLiteral("name"), module.name);
        suite.setAttribute(QStringLiteral("id"), id++);
        suite.setAttribute(QStringLiteral("package"), module.family);
        suite.setAttribute(QStringLiteral("tests"), cases.size());
        suite.setAttribute(QStringLiteral("failures"), failures);
        suite.setAttribute(QStringLiteral("errors"), errors);
        suite.setAttribute(QStringLiteral("skipped"), skipped);
        suite.setAttribute(QStringLiteral("time"), JUnitSeconds(module.durationMs));
        if (module.start.isValid())
            suite.setAttribute(QStringLiteral("timestamp"), JUnitTime(module.start));
        if (!module.handset.isEmpty())
            suite.setAttribute(QStringLiteral("hostname"), module.handset);
        tests += int(cases.size());
        totalFailures += failures;
        suites.appendChild(suite);
    }
    suites.setAttribute(QStringLiteral("tests"), tests);
    suites.setAttribute(QStringLiteral("failures"), totalFailures);
    suites.setAttribute(QStringLiteral("errors"), Errors());
    if (durationMs >= 0)
        suites.setAttribute(QStringLiteral("time"), JUnitSeconds(durationMs));
    return XmlWriter::Serialize(document, 1);
}

QByteArray RunReport::Json() const
{
    QJsonArray list;
    for (const ModuleReport &module : modules) {
        QJsonArray cases;
        for (const TestCaseReport &testCase : module.testCases) {
            QJsonObject object{{QStringLiteral("name"), testCase.name}, {QStringLiteral("result"), testCase.result}};
            if (!testCase.detail.isEmpty())
                object.insert(QStringLiteral("detail"), testCase.detail);
            if (testCase.timeMs >= 0)
                object.insert(QStringLiteral("timeMs"), testCase.timeMs);
            cases.append(object);
        }
        QJsonObject object{{QStringLiteral("name"), module.name},
                           {QStringLiteral("family"), module.family},
                           {QStringLiteral("subfamily"), module.subFamily},
                           {QStringLiteral("source"), module.source},
                           {QStringLiteral("finished"), module.Finished()},
                           {QStringLiteral("passed"), module.Count(kPass)},
                           {QStringLiteral("failed"), module.Count(kFail)},
                           {QStringLiteral("unsupported"), module.Count(kUnsupported)},
                           {QStringLiteral("unexecuted"), module.Count(kUnexecuted)},
                           {QStringLiteral("testcases"), cases}};
        if (!module.reason.isEmpty())
            object.insert(QStringLiteral("reason"), module.reason);
        if (!module.handset.isEmpty())
            object.insert(QStringLiteral("handset"), module.handset);
        if (!module.host.isEmpty())
            object.insert(QStringLiteral("host"), module.host);
        if (module.start.isValid())
            object.insert(QStringLiteral("start"), IsoTime(module.start));
        if (module.durationMs >= 0)
            object.insert(QStringLiteral("durationMs"), module.durationMs);
        if (!module.logs.isEmpty())
            object.insert(QStringLiteral("logs"), QJsonArray::fromStringList(module.logs));
        list.append(object);
    }
    const QJsonObject totals{{QStringLiteral("modules"), int(modules.size())},
                             {QStringLiteral("notFinished"), NotFinished()},
                             {QStringLiteral("passed"), Total(kPass)},
                             {QStringLiteral("failed"), Total(kFail)},
                             {QStringLiteral("unsupported"), Total(kUnsupported)},
                             {QStringLiteral("unexecuted"), Total(kUnexecuted)},
                             {QStringLiteral("errors"), Errors()}};
    QJsonObject root{{QStringLiteral("modules"), list}, {QStringLiteral("totals"), totals}};
    if (start.isValid()) {
        root.insert(QStringLiteral("start"), IsoTime(start));
        root.insert(QStringLiteral("durationMs"), durationMs);
        root.insert(QStringLiteral("handsets"), QJsonArray::fromStringList(handsets));
        root.insert(QStringLiteral("host"), host);
        root.insert(QStringLiteral("interrupted"), interrupted);
    }
    return QJsonDocument(root).toJson(QJsonDocument::Indented);
}

void RunReport::DropNotExecuted()
{
    modules.erase(std::remove_if(modules.begin(), modules.end(), [](const ModuleReport &m) { return !m.Executed(); }),
                  modules.end());
}

const QCommandLineOption &JUnitOption()
{
    static const QCommandLineOption option(QStringLiteral("junit"),
                                           QStringLiteral("Write a JUnit XML report to FILE ('-': standard output)."),
                                           QStringLiteral("FILE"));
    return option;
}

const QCommandLineOption &JsonOption()
{
    static const QCommandLineOption option(QStringLiteral("json"),
                                           QStringLiteral("Write a JSON summary to FILE ('-': standard output)."),
                                           QStringLiteral("FILE"));
    return option;
}

const QCommandLineOption &HtmlOption()
{
    static const QCommandLineOption option(
        QStringLiteral("html"), QStringLiteral("Write a self-contained HTML report to FILE ('-': standard output)."),
        QStringLiteral("FILE"));
    return option;
}

bool CheckOutputPath(const QString &path, QString *error)
{
    if (path == QLatin1String("-"))
        return true;
    const QFileInfo info(path);
    if (info.isDir()) {
        *error = QStringLiteral("%1 is a folder").arg(path);
        return false;
    }
    if (info.exists()) {
        if (info.isWritable())
            return true;
        *error = QStringLiteral("%1 is not writable").arg(path);
        return false;
    }
    const QFileInfo folder(info.absolutePath());
    if (!folder.isDir()) {
        *error = QStringLiteral("the folder %1 does not exist").arg(folder.filePath());
        return false;
    }
    if (!folder.isWritable()) {
        *error = QStringLiteral("the folder %1 is not writable").arg(folder.filePath());
        return false;
    }
    return true;
}

bool CheckReportOutputs(const QCommandLineParser &parser, const QString &command)
{
    for (const QCommandLineOption *option : {&JUnitOption(), &JsonOption(), &HtmlOption()}) {
        QString error;
        if (parser.isSet(*option) && !CheckOutputPath(parser.value(*option), &error)) {
            Err(QStringLiteral("%1: cannot write --%2 %3: %4\n")
                    .arg(command, option->names().constFirst(), parser.value(*option), error));
            return false;
        }
    }
    return true;
}

bool ExportsToOutput(const QCommandLineParser &parser)
{
    for (const QCommandLineOption *option : {&JUnitOption(), &JsonOption(), &HtmlOption()}) {
        if (parser.isSet(*option) && parser.value(*option) == QLatin1String("-"))
            return true;
    }
    return false;
}

int PublishReport(const RunReport &report, const QCommandLineParser &parser, bool withHandset,
                  const std::function<QString()> &trailer)
{
    const auto say = ExportsToOutput(parser) ? Err : Out;
    say(QStringLiteral("\n") + report.Summary(withHandset));
    if (trailer)
        say(trailer());
    enum Kind { JUnit, Json, Html };
    for (const auto &[option, kind] :
         {std::pair{&JUnitOption(), JUnit}, std::pair{&JsonOption(), Json}, std::pair{&HtmlOption(), Html}}) {
        if (!parser.isSet(*option))
            continue;
        const QString path = parser.value(*option);
        const QByteArray bytes = kind == Json ? report.Json()
            : kind == Html
            ? report.Html(path == QLatin1String("-") ? QDir::currentPath() : QFileInfo(path).absolutePath())
            : report.JUnit();
        if (path == QLatin1String("-")) {
            Out(QString::fromUtf8(bytes));
            continue;
        }
        QString error;
        if (!FileWriter::Write(path, bytes, true, &error)) {
            Err(QStringLiteral("harness: cannot write %1: %2\n")
                    .arg(path, error.isEmpty() ? QStringLiteral("unknown error") : error));
            return ExitUsage;
        }
        say(QStringLiteral("%1: %2\n")
                .arg(kind == Json       ? QStringLiteral("JSON summary")
                         : kind == Html ? QStringLiteral("HTML report")
                                        : QStringLiteral("JUnit report"),
                     kind == Html ? QFileInfo(path).absoluteFilePath() : path));
    }
    return ExitSuccess;
}

namespace {

// The rows of several processed-results files merged into one report; with
// the selection given, its modules that no file shows run are listed too.
bool MergeReport(const QStringList &paths, const QList<QSharedPointer<_TestModule>> *selection,
                 const QString &saveTimings, const QString &command, RunReport &report)
{
    ResultsMerge merge;
    for (const QString &path : paths) {
        if (!merge.Add(path)) {
            return Fail(command, merge.ErrorString());
        }
    }
    if (selection)
        merge.Expect(ResultsMerge::ExpectedOf(*selection));
    QStringList handsets;
    for (const ResultsMerge::Row &row : merge.Rows()) {
        ModuleReport module;
        module.name = row.name;
        module.source = row.source;
        module.family = row.family;
        module.subFamily = row.subFamily;
        module.host = row.host;
        module.handset = row.handset;
        if (!row.ran)
            module.reason = QStringLiteral("not run by any shard");
        for (const auto &testCase : row.testCases)
            module.testCases.append({testCase.first, testCase.second, QString()});
        if (!row.handset.isEmpty() && !handsets.contains(row.handset))
            handsets.append(row.handset);
        report.modules.append(module);
    }
    report.handsets = handsets;
    if (!saveTimings.isEmpty()) {
        ModuleTimings timings = merge.Timings();
        if (!timings.Save(saveTimings)) {
            return Fail(command, timings.ErrorString());
        }
    }
    return true;
}

int ReportCommand(const QStringList &arguments)
{
    const QString command = arguments.at(0);
    QCommandLineParser parser;
    parser.setApplicationDescription(
        QStringLiteral("Prints the summary of a processed-results file, the verdicts gathered there over every run, "
                       "and exports it as JUnit XML, JSON or a self-contained HTML page.\n"
                       "Modules without any executed test case are left out unless --all is given.\n"
                       "With --merge, merges the processed results of several hosts and handsets (each ran a shard of "
                       "one selection) into one row per module; with --expect-all, the modules of the selection that "
                       "no shard ran are listed as not run.\n"
                       "Exit status 1 when a test case failed or an expected module did not run."));
    parser.addPositionalArgument(QStringLiteral("RESULTS.xml"),
                                 QStringLiteral("The processed-results file (with --merge, several)."),
                                 QStringLiteral("RESULTS.xml..."));
    const QCommandLineOption all(QStringLiteral("all"), QStringLiteral("Include modules that never ran."));
    const QCommandLineOption merge(QStringLiteral("merge"), QStringLiteral("Merge several processed-results files."));
    const QCommandLineOption expectAll(
        QStringLiteral("expect-all"),
        QStringLiteral("With --merge: list the selection's modules no file shows run "
                       "(the selection of --kit, --platform, --family, --features and --pattern)."));
    const QCommandLineOption pattern(QStringLiteral("pattern"),
                                     QStringLiteral("With --expect-all: a module name pattern of the selection."),
                                     QStringLiteral("P"));
    const QCommandLineOption saveTimings(
        QStringLiteral("save-timings"),
        QStringLiteral("With --merge: write the recorded module times found beside the files to FILE."),
        QStringLiteral("FILE"));
    SetupOptions setup;
    SelectionOptions selection;
    setup.AddTo(parser);
    selection.AddTo(parser);
    parser.addOptions({JUnitOption(), JsonOption(), HtmlOption(), all, merge, expectAll, pattern, saveTimings});
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status, 1, -1))
        return status;
    if (!parser.isSet(merge)) {
        for (const QCommandLineOption *option : {&expectAll, &pattern, &saveTimings}) {
            if (parser.isSet(*option))
                return Refuse(command, QStringLiteral("--%1 needs --merge").arg(option->names().constFirst()));
        }
        if (parser.positionalArguments().size() > 1)
            return Refuse(command, QStringLiteral("one processed-results file, or several with --merge"));
    }
    if (!CheckReportOutputs(parser, command))
        return ExitUsage;
    if (parser.isSet(saveTimings)) {
        QString error;
        if (!CheckOutputPath(parser.value(saveTimings), &error))
            return Refuse(command, error);
    }

    RunReport report;
    if (parser.isSet(merge)) {
        QList<QSharedPointer<_TestModule>> modules;
        if (parser.isSet(expectAll)) {
            if (!setup.Check(parser, command) || !selection.Check(parser, command))
                return ExitUsage;
            Harness harness;
            Log log;
            setup.Apply(parser, harness, log);
            const QStringList patterns = parser.values(pattern);
            const EchoToStandardError quiet(true);
            if (!selection.Select(harness, parser, command, modules, &patterns))
                return ExitUsage;
        }
        if (!MergeReport(parser.positionalArguments(), parser.isSet(expectAll) ? &modules : nullptr,
                         parser.value(saveTimings), command, report))
            return ExitUsage;
    } else {
        QString error;
        if (!report.Read(parser.positionalArguments().at(0), &error)) {
            Err(QStringLiteral("%1: %2\n").arg(command, error));
            return ExitUsage;
        }
        if (!parser.isSet(all))
            report.DropNotExecuted();
    }
    const int published = PublishReport(report, parser, parser.isSet(merge));
    if (published != ExitSuccess)
        return published;
    return report.Total(kFail) > 0 || report.NotFinished() > 0 ? ExitTestFailed : ExitSuccess;
}

} // namespace

QList<Command> ReportCommands()
{
    return {
        {"report", "Summarise a processed-results file; export JUnit XML or JSON", ReportCommand},
    };
}
