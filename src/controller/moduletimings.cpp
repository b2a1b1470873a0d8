#include "controller/moduletimings.h"

#include "common/filewriter.h"
#include "environment/testdirectories.h"

#include <QFile>
#include <QFileInfo>
#include <QJsonArray>
#include <QJsonDocument>
#include <QJsonObject>

#include <algorithm>
#include <tuple>

namespace {

const QString kFormat = QStringLiteral("harness-timings");
constexpr int kVersion = 1;
// Longer than any module may take; a larger number is a damaged file.
constexpr double kMaxMs = 366.0 * 24 * 3600 * 1000;

bool Earlier(const ModuleTimings::Run &a, const ModuleTimings::Run &b)
{
    return std::tie(a.at, a.ms, a.host, a.handset) < std::tie(b.at, b.ms, b.host, b.handset);
}

QString Stamp(const QDateTime &at)
{
    return at.toUTC().toString(Qt::ISODateWithMs);
}

} // namespace

QString ModuleTimings::PathFor(const QString &target)
{
    return PathBeside(TestDirectories::GetProcessResultsPath(target));
}

QString ModuleTimings::PathBeside(const QString &resultsPath)
{
    return QFileInfo(resultsPath).absolutePath() + QStringLiteral("/Timings.json");
}

QString ModuleTimings::Key(const QString &name, const QString &source)
{
    return source + QLatin1Char('/') + name.toLower();
}

void ModuleTimings::Insert(Module &module, const Run &run)
{
    if (run.ms < 0)
        return;
    const auto at = std::lower_bound(module.runs.begin(), module.runs.end(), run, Earlier);
    if (at != module.runs.end() && *at == run)
        return;
    module.runs.insert(at, run);
    if (module.runs.size() > kRecentRuns)
        module.runs.erase(module.runs.begin(), module.runs.end() - kRecentRuns);
}

void ModuleTimings::Add(const QString &name, const QString &source, const Run &run)
{
    if (run.ms < 0 || name.isEmpty())
        return;
    Module &module = m_modules[Key(name, source)];
    if (module.name.isEmpty()) {
        module.name = name;
        module.source = source;
    }
    Insert(module, run);
}

bool ModuleTimings::Parse(const QString &path, QHash<QString, Module> &modules)
{
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly)) {
        m_error = QStringLiteral("cannot open %1: %2").arg(path, file.errorString());
        return false;
    }
    if (file.size() > kMaxFileSize) {
        m_error = QStringLiteral("%1 is too large for a timings file (%2 bytes)").arg(path).arg(file.size());
        return false;
    }
    QJsonParseError parseError;
    const QJsonDocument document = QJsonDocument::fromJson(file.readAll(), &parseError);
    if (document.isNull()) {
        m_error = QStringLiteral("%1 is not JSON: %2 at offset %3")
                      .arg(path, parseError.errorString())
                      .arg(parseError.offset);
        return false;
    }
    const QJsonObject root = document.object();
    if (!document.isObject() || root.value(QStringLiteral("format")).toString() != kFormat) {
        m_error = QStringLiteral("%1 is not a timings file (no \"format\": \"%2\")").arg(path, kFormat);
        return false;
    }
    const QJsonValue version = root.value(QStringLiteral("version"));
    if (!version.isDouble() || version.toDouble() != kVersion) {
        m_error = QStringLiteral("%1 has timings version %2; this harness reads version %3")
                      .arg(path, version.isDouble() ? QString::number(version.toDouble()) : QStringLiteral("(none)"))
                      .arg(kVersion);
        return false;
    }
    const QJsonValue list = root.value(QStringLiteral("modules"));
    if (!list.isArray()) {
        m_error = QStringLiteral("%1: \"modules\" is not a list").arg(path);
        return false;
    }
    const QJsonArray entries = list.toArray();
    for (qsizetype i = 0; i < entries.size(); ++i) {
        const QJsonObject entry = entries.at(i).toObject();
        const QJsonValue name = entry.value(QStringLiteral("name"));
        const QJsonValue source = entry.value(QStringLiteral("source"));
        const QJsonValue runs = entry.value(QStringLiteral("runs"));
        if (!entries.at(i).isObject() || !name.isString() || name.toString().isEmpty() || !source.isString()
            || !runs.isArray()) {
            m_error = QStringLiteral("%1: module %2 needs a \"name\", a \"source\" and a list of \"runs\"")
                          .arg(path)
                          .arg(i);
            return false;
        }
        Module &module = modules[Key(name.toString(), source.toString())];
        if (module.name.isEmpty()) {
            module.name = name.toString();
            module.source = source.toString();
        }
        for (const QJsonValue &value : runs.toArray()) {
            const QJsonObject object = value.toObject();
            const QJsonValue ms = object.value(QStringLiteral("ms"));
            const QJsonValue handset = object.value(QStringLiteral("handset"));
            const QJsonValue host = object.value(QStringLiteral("host"));
            Run run;
            run.at = QDateTime::fromString(object.value(QStringLiteral("at")).toString(), Qt::ISODateWithMs);
            if (!value.isObject() || !ms.isDouble() || ms.toDouble() < 0 || ms.toDouble() > kMaxMs
                || ms.toDouble() != double(qint64(ms.toDouble())) || !handset.isString() || !host.isString()
                || !run.at.isValid()) {
                m_error = QStringLiteral("%1: a run of module %2 (%3) needs \"ms\" (whole milliseconds), "
                                         "\"handset\", \"host\" and \"at\" (ISO date and time)")
                              .arg(path, name.toString())
                              .arg(i);
                return false;
            }
            run.ms = qint64(ms.toDouble());
            run.handset = handset.toString();
            run.host = host.toString();
            run.at = run.at.toUTC();
            Insert(module, run);
        }
    }
    return true;
}

bool ModuleTimings::Read(const QString &path)
{
    QHash<QString, Module> modules;
    if (!Parse(path, modules))
        return false;
    m_modules = modules;
    m_error.clear();
    return true;
}

bool ModuleTimings::Merge(const QString &path)
{
    ModuleTimings other;
    if (!other.Read(path)) {
        m_error = other.m_error;
        return false;
    }
    Merge(other);
    m_error.clear();
    return true;
}

void ModuleTimings::Merge(const ModuleTimings &other)
{
    for (const Module &module : other.m_modules) {
        for (const Run &run : module.runs)
            Add(module.name, module.source, run);
    }
}

bool ModuleTimings::Save(const QString &path)
{
    QStringList keys = m_modules.keys();
    keys.sort();
    QJsonArray list;
    for (const QString &key : std::as_const(keys)) {
        const Module &module = m_modules[key];
        QJsonArray runs;
        for (const Run &run : module.runs)
            runs.append(QJsonObject{{QStringLiteral("ms"), run.ms},
                                    {QStringLiteral("handset"), run.handset},
                                    {QStringLiteral("host"), run.host},
                                    {QStringLiteral("at"), Stamp(run.at)}});
        list.append(QJsonObject{{QStringLiteral("name"), module.name},
                                {QStringLiteral("source"), module.source},
                                {QStringLiteral("runs"), runs}});
    }
    const QJsonObject root{
        {QStringLiteral("format"), kFormat}, {QStringLiteral("version"), kVersion}, {QStringLiteral("modules"), list}};
    QString error;
    if (!FileWriter::Write(path, QJsonDocument(root).toJson(QJsonDocument::Indented), true, &error)) {
        m_error = QStringLiteral("cannot write %1: %2").arg(path, error);
        return false;
    }
    m_error.clear();
    return true;
}

bool ModuleTimings::Record(const QString &path, const QString &name, const QString &source, const Run &run,
                           QString *error)
{
    ModuleTimings timings;
    if (QFileInfo::exists(path) && !timings.Read(path)) {
        if (error)
            *error = timings.ErrorString();
        return false;
    }
    timings.Add(name, source, run);
    if (!timings.Save(path)) {
        if (error)
            *error = timings.ErrorString();
        return false;
    }
    return true;
}

qint64 ModuleTimings::ExpectedMs(const QString &name, const QString &source) const
{
    const auto found = m_modules.constFind(Key(name, source));
    if (found == m_modules.cend() || found->runs.isEmpty())
        return -1;
    QList<qint64> times;
    for (const Run &run : found->runs)
        times.append(run.ms);
    std::sort(times.begin(), times.end());
    const qsizetype middle = times.size() / 2;
    return times.size() % 2 ? times.at(middle) : (times.at(middle - 1) + times.at(middle)) / 2;
}

QList<ModuleTimings::Run> ModuleTimings::Runs(const QString &name, const QString &source) const
{
    return m_modules.value(Key(name, source)).runs;
}
