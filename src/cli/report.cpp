#include "cli/report.h"

#include "cli/commands.h"

#include "common/xmlwriter.h"

#include <algorithm>
#include <utility>

#include <QDomDocument>
#include <QFile>
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

} // namespace

int ModuleReport::Count(const QString &result) const
{
    int count = 0;
    for (const auto &testCase : testCases)
        count += testCase.second == result ? 1 : 0;
    return count;
}

bool ModuleReport::Executed() const
{
    for (const auto &testCase : testCases) {
        if (testCase.second != kUnexecuted)
            return true;
    }
    return false;
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
    for (QDomElement module = root.firstChildElement(); !module.isNull();
         module = module.nextSiblingElement()) {
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
                report.testCases.append({tc.attribute(QStringLiteral("name")),
                                         tc.attribute(QStringLiteral("result"))});
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

QString RunReport::Summary(bool withHandset) const
{
    const QString totalLabel = QStringLiteral("Total (%1 modules)").arg(modules.size());
    int nameWidth = int(totalLabel.size());
    int handsetWidth = 7;
    for (const ModuleReport &module : modules) {
        nameWidth = qMax(nameWidth, int(module.name.size()));
        handsetWidth = qMax(handsetWidth, int(module.handset.size()));
    }
    auto row = [&](const QString &name, const QString &handset, const QString &a, const QString &b,
                   const QString &c, const QString &d) {
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
    text += row(totalLabel, QString(),
                QString::number(Total(kPass)), QString::number(Total(kFail)),
                QString::number(Total(kUnsupported)), QString::number(Total(kUnexecuted)));
    return text;
}

bool RunReport::WriteJUnit(const QString &path, QString *error) const
{
    QDomDocument document;
    document.appendChild(document.createProcessingInstruction(
        QStringLiteral("xml"), QStringLiteral("version=\"1.0\" encoding=\"UTF-8\"")));
    QDomElement suites = document.createElement(QStringLiteral("testsuites"));
    suites.setAttribute(QStringLiteral("name"), QStringLiteral("harness"));
    document.appendChild(suites);
    int tests = 0;
    for (const ModuleReport &module : modules) {
        QDomElement suite = document.createElement(QStringLiteral("testsuite"));
        suite.setAttribute(QStringLiteral("name"), module.name);
        suite.setAttribute(QStringLiteral("tests"), module.testCases.size());
        suite.setAttribute(QStringLiteral("failures"), module.Count(kFail));
        suite.setAttribute(QStringLiteral("errors"), 0);
        suite.setAttribute(QStringLiteral("skipped"), module.testCases.size() - module.Count(kPass) - module.Count(kFail));
        if (!module.handset.isEmpty())
            suite.setAttribute(QStringLiteral("hostname"), module.handset);
        tests += int(module.testCases.size());
        for (const auto &testCase : module.testCases) {
            QDomElement element = document.createElement(QStringLiteral("testcase"));
            element.setAttribute(QStringLiteral("name"), testCase.first);
            element.setAttribute(QStringLiteral("classname"),
                                 module.family.isEmpty() ? module.name : module.family + QLatin1Char('.') + module.name);
            if (testCase.second == kFail) {
                QDomElement failure = document.createElement(QStringLiteral("failure"));
                failure.setAttribute(QStringLiteral("message"), kFail);
                element.appendChild(failure);
            } else if (testCase.second != kPass) {
                QDomElement skipped = document.createElement(QStringLiteral("skipped"));
                skipped.setAttribute(QStringLiteral("message"), testCase.second);
                element.appendChild(skipped);
            }
            suite.appendChild(element);
        }
        suites.appendChild(suite);
    }
    suites.setAttribute(QStringLiteral("tests"), tests);
    suites.setAttribute(QStringLiteral("failures"), Total(kFail));
    return XmlWriter::WriteDocument(document, path, 1, true, error);
}

bool RunReport::WriteJson(const QString &path, QString *error) const
{
    QJsonArray list;
    for (const ModuleReport &module : modules) {
        QJsonArray cases;
        for (const auto &testCase : module.testCases)
            cases.append(QJsonObject{{QStringLiteral("name"), testCase.first},
                                     {QStringLiteral("result"), testCase.second}});
        QJsonObject object{{QStringLiteral("name"), module.name},
                           {QStringLiteral("family"), module.family},
                           {QStringLiteral("subfamily"), module.subFamily},
                           {QStringLiteral("source"), module.source},
                           {QStringLiteral("passed"), module.Count(kPass)},
                           {QStringLiteral("failed"), module.Count(kFail)},
                           {QStringLiteral("unsupported"), module.Count(kUnsupported)},
                           {QStringLiteral("unexecuted"), module.Count(kUnexecuted)},
                           {QStringLiteral("testcases"), cases}};
        if (!module.handset.isEmpty())
            object.insert(QStringLiteral("handset"), module.handset);
        list.append(object);
    }
    const QJsonObject totals{{QStringLiteral("modules"), int(modules.size())},
                             {QStringLiteral("passed"), Total(kPass)},
                             {QStringLiteral("failed"), Total(kFail)},
                             {QStringLiteral("unsupported"), Total(kUnsupported)},
                             {QStringLiteral("unexecuted"), Total(kUnexecuted)}};
    const QJsonObject root{{QStringLiteral("modules"), list}, {QStringLiteral("totals"), totals}};
    return XmlWriter::WriteFile(path, QJsonDocument(root).toJson(QJsonDocument::Indented), true, error);
}

void RunReport::DropNotExecuted()
{
    modules.erase(std::remove_if(modules.begin(), modules.end(),
                                 [](const ModuleReport &m) { return !m.Executed(); }),
                  modules.end());
}

const QCommandLineOption &JUnitOption()
{
    static const QCommandLineOption option(QStringLiteral("junit"), QStringLiteral("Write a JUnit XML report to FILE."),
                                           QStringLiteral("FILE"));
    return option;
}

const QCommandLineOption &JsonOption()
{
    static const QCommandLineOption option(QStringLiteral("json"), QStringLiteral("Write a JSON summary to FILE."),
                                           QStringLiteral("FILE"));
    return option;
}

int PublishReport(const RunReport &report, const QCommandLineParser &parser, bool withHandset)
{
    Out(QStringLiteral("\n") + report.Summary(withHandset));
    QString error;
    for (const auto &[option, json] : {std::pair{&JUnitOption(), false}, std::pair{&JsonOption(), true}}) {
        if (!parser.isSet(*option))
            continue;
        const QString path = parser.value(*option);
        const bool ok = json ? report.WriteJson(path, &error) : report.WriteJUnit(path, &error);
        if (!ok) {
            Err(QStringLiteral("harness: cannot write %1: %2\n").arg(path, error));
            return ExitUsage;
        }
        Out(QStringLiteral("%1: %2\n").arg(json ? QStringLiteral("JSON summary") : QStringLiteral("JUnit report"), path));
    }
    return ExitSuccess;
}
