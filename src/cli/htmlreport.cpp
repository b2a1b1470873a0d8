// The HTML report: one self-contained page (inline style sheet and script,
// no external resource) with the counts, a handset timeline drawn as SVG, a
// sortable module table with a failures-only filter ("#failures" in the
// address turns it on) and every module's test cases and logs.

#include "cli/htmlwriter.h"
#include "cli/report.h"

#include <QDir>
#include <QMap>
#include <QUrl>

#include <algorithm>

namespace {

const char kStyle[] = R"(
body{font:14px/1.4 system-ui,sans-serif;margin:24px;color:#222;background:#fff}
h1{font-size:22px;margin:0 0 4px}h2{font-size:17px;margin:28px 0 8px}h3{font-size:15px;margin:18px 0 4px}
.meta{color:#555;margin:0 0 16px}
.counts{display:flex;gap:24px;flex-wrap:wrap;margin:8px 0}
.count b{font-size:24px;display:block}
.bar{display:flex;height:14px;border-radius:4px;overflow:hidden;background:#eee;max-width:900px;margin:6px 0 12px}
.pass{background:#2e7d32;color:#fff}.fail{background:#c62828;color:#fff}.unsupported{background:#f9a825}
.unexecuted{background:#9e9e9e}.notfinished{background:#6a1b9a;color:#fff}
.count.pass,.count.fail,.count.unsupported,.count.unexecuted,.count.notfinished{background:none;color:inherit}
.count.pass b{color:#2e7d32}.count.fail b{color:#c62828}.count.unsupported b{color:#b8860b}.count.notfinished b{color:#6a1b9a}
svg text{font:12px system-ui,sans-serif;fill:#222}svg text.inbar{fill:#fff;pointer-events:none}
svg rect.pass{fill:#2e7d32}svg rect.fail{fill:#c62828}svg rect.unsupported{fill:#f9a825}
svg rect.unexecuted{fill:#9e9e9e}svg rect.notfinished{fill:#6a1b9a}svg rect.lane{fill:#f4f4f4}
table{border-collapse:collapse;margin:6px 0}th,td{padding:3px 10px;border-bottom:1px solid #ddd;text-align:left;vertical-align:top}
#modules th{cursor:pointer;user-select:none;background:#f4f4f4}
#modules th[aria-sort=ascending]::after{content:" \25B2"}#modules th[aria-sort=descending]::after{content:" \25BC"}
td.num{text-align:right}td.verdict{font-weight:600}td.v-pass{color:#2e7d32}td.v-fail{color:#c62828}td.v-unsupported{color:#b8860b}td.v-unexecuted{color:#777}
span.outcome{padding:1px 6px;border-radius:3px}
.detail{font-family:ui-monospace,monospace;font-size:12px;white-space:pre-wrap;color:#444}
.note{background:#fff8e1;padding:6px 10px;border-left:4px solid #f9a825;max-width:900px}
)";

const char kScript[] = R"(
(function () {
  'use strict';
  var table = document.getElementById('modules');
  var box = document.getElementById('failures-only');
  function apply() {
    var on = box.checked;
    var rows = table.tBodies[0].rows;
    for (var i = 0; i < rows.length; ++i)
      rows[i].hidden = on && rows[i].getAttribute('data-ok') === '1';
    var details = document.querySelectorAll('section.module');
    for (var j = 0; j < details.length; ++j)
      details[j].hidden = on && details[j].getAttribute('data-ok') === '1';
    document.body.setAttribute('data-filter', on ? 'failures' : 'all');
  }
  box.addEventListener('change', function () {
    if (box.checked !== (location.hash === '#failures'))
      location.hash = box.checked ? 'failures' : 'all';
    apply();
  });
  window.addEventListener('hashchange', function () {
    box.checked = location.hash === '#failures';
    apply();
  });
  box.checked = location.hash === '#failures';
  apply();

  var heads = table.tHead.rows[0].cells;
  function sortBy(column) {
    var head = heads[column];
    var direction = head.getAttribute('aria-sort') === 'ascending' ? -1 : 1;
    for (var i = 0; i < heads.length; ++i)
      heads[i].removeAttribute('aria-sort');
    head.setAttribute('aria-sort', direction > 0 ? 'ascending' : 'descending');
    var numeric = head.getAttribute('data-type') === 'number';
    var body = table.tBodies[0];
    var rows = Array.prototype.slice.call(body.rows);
    rows.sort(function (a, b) {
      var x = a.cells[column].getAttribute('data-value');
      var y = b.cells[column].getAttribute('data-value');
      return direction * (numeric ? parseFloat(x) - parseFloat(y) : x.localeCompare(y));
    });
    rows.forEach(function (row) { body.appendChild(row); });
  }
  for (var i = 0; i < heads.length; ++i)
    heads[i].addEventListener('click', sortBy.bind(null, i));
})();
)";

const QString kPass = QStringLiteral("pass");
const QString kFail = QStringLiteral("fail");
const QString kUnsupported = QStringLiteral("unsupported");
const QString kUnexecuted = QStringLiteral("unexecuted");

// The class and word of a module's outcome.
QString Outcome(const ModuleReport &module)
{
    if (!module.Finished())
        return QStringLiteral("notfinished");
    if (module.Count(kFail) > 0)
        return kFail;
    if (!module.testCases.isEmpty() && module.Count(kPass) == module.testCases.size())
        return kPass;
    return module.Executed() ? kUnsupported : kUnexecuted;
}

QString OutcomeWord(const QString &outcome)
{
    if (outcome == QLatin1String("notfinished"))
        return QStringLiteral("not finished");
    if (outcome == kPass)
        return QStringLiteral("passed");
    if (outcome == kFail)
        return QStringLiteral("failed");
    return outcome;
}

QString Number(double value)
{
    return QString::number(value, 'f', 1);
}

void Counts(HtmlWriter &html, const RunReport &report, bool withNotFinished)
{
    const int total
        = report.Total(kPass) + report.Total(kFail) + report.Total(kUnsupported) + report.Total(kUnexecuted);
    const struct
    {
        const char *cls;
        const char *word;
        int count;
    } counts[] = {
        {"pass", "passed", report.Total(kPass)},
        {"fail", "failed", report.Total(kFail)},
        {"unsupported", "unsupported", report.Total(kUnsupported)},
        {"unexecuted", "unexecuted", report.Total(kUnexecuted)},
    };
    html.Open("div", {{"class", QStringLiteral("counts")}, {"id", QStringLiteral("counts")}});
    html.Open("div", {{"class", QStringLiteral("count")}});
    html.Element("b", QString::number(report.modules.size()), {{"data-count", QStringLiteral("modules")}});
    html.Text(QStringLiteral("modules"));
    html.Close();
    for (const auto &entry : counts) {
        html.Open("div", {{"class", QStringLiteral("count ") + QLatin1String(entry.cls)}});
        html.Element("b", QString::number(entry.count), {{"data-count", QLatin1String(entry.word)}});
        html.Text(QLatin1String(entry.word));
        html.Close();
    }
    if (withNotFinished) {
        html.Open("div", {{"class", QStringLiteral("count notfinished")}});
        html.Element("b", QString::number(report.NotFinished()), {{"data-count", QStringLiteral("not finished")}});
        html.Text(QStringLiteral("modules not finished"));
        html.Close();
    }
    html.Close();
    html.Open("div",
              {{"class", QStringLiteral("bar")},
               {"role", QStringLiteral("img")},
               {"aria-label", QStringLiteral("test case verdicts")}});
    for (const auto &entry : counts) {
        if (entry.count > 0 && total > 0)
            html.Element("span", QString(),
                         {{"class", QLatin1String(entry.cls)},
                          {"style", QStringLiteral("width:%1%").arg(Number(100.0 * entry.count / total))},
                          {"title", QStringLiteral("%1 %2").arg(entry.count).arg(QLatin1String(entry.word))}});
    }
    html.Close();
}

// One lane per handset, one bar per module that a handset took, placed at
// its start and as long as its duration. Bars of a lane never overlap: a
// module starts no earlier than the one before it on that handset ended.
void Timeline(HtmlWriter &html, const RunReport &report)
{
    struct Bar
    {
        const ModuleReport *module;
        qint64 startMs;
        qint64 durationMs;
    };
    QStringList lanes = report.handsets;
    QMap<QString, QList<Bar>> bars;
    qint64 span = 0;
    QList<const ModuleReport *> taken;
    for (const ModuleReport &module : report.modules) {
        if (!module.handset.isEmpty() && module.start.isValid())
            taken.append(&module);
    }
    std::stable_sort(taken.begin(), taken.end(),
                     [](const ModuleReport *a, const ModuleReport *b) { return a->start < b->start; });
    QMap<QString, qint64> laneEnd;
    for (const ModuleReport *module : std::as_const(taken)) {
        if (!lanes.contains(module->handset))
            lanes.append(module->handset);
        const qint64 offset = report.start.isValid() ? qMax<qint64>(report.start.msecsTo(module->start), 0) : 0;
        const qint64 start = qMax(offset, laneEnd.value(module->handset));
        const qint64 duration = qMax<qint64>(module->durationMs, 0);
        bars[module->handset].append({module, start, duration});
        laneEnd[module->handset] = start + duration;
        span = qMax(span, start + duration);
    }
    constexpr int kLabelWidth = 150;
    constexpr int kPlotWidth = 820;
    constexpr int kLaneHeight = 30;
    constexpr int kBarHeight = 20;
    constexpr int kAxisHeight = 20;
    const int height = int(lanes.size()) * kLaneHeight + kAxisHeight;
    const double scale = span > 0 ? double(kPlotWidth) / double(span) : 0.0;
    html.Element("h2", QStringLiteral("Timeline"));
    if (lanes.isEmpty()) {
        html.Element("p", QStringLiteral("No module was taken by a handset."), {{"class", QStringLiteral("note")}});
        return;
    }
    html.Open("svg",
              {{"id", QStringLiteral("timeline")},
               {"xmlns", QStringLiteral("http://www.w3.org/2000/svg")},
               {"width", QString::number(kLabelWidth + kPlotWidth + 10)},
               {"height", QString::number(height)},
               {"role", QStringLiteral("img")},
               {"aria-label", QStringLiteral("modules per handset over time")}});
    for (qsizetype lane = 0; lane < lanes.size(); ++lane) {
        const int y = int(lane) * kLaneHeight;
        html.Open("g", {{"class", QStringLiteral("lane")}, {"data-handset", lanes.at(lane)}});
        html.Empty("rect",
                   {{"class", QStringLiteral("lane")},
                    {"x", QString::number(kLabelWidth)},
                    {"y", QString::number(y + 2)},
                    {"width", QString::number(kPlotWidth)},
                    {"height", QString::number(kLaneHeight - 4)}});
        html.Element("text", lanes.at(lane),
                     {{"x", QStringLiteral("0")}, {"y", QString::number(y + kLaneHeight / 2 + 4)}});
        qsizetype index = 0;
        const QList<Bar> laneBars = bars.value(lanes.at(lane));
        for (const Bar &bar : laneBars) {
            // With no measurable time (a run at time scale 0), equal shares.
            const double x = scale > 0 ? bar.startMs * scale : double(index) * kPlotWidth / double(laneBars.size());
            const double width = scale > 0 ? bar.durationMs * scale : double(kPlotWidth) / double(laneBars.size());
            const QString outcome = Outcome(*bar.module);
            html.Open("rect",
                      {{"class", QStringLiteral("module ") + outcome},
                       {"data-module", bar.module->name},
                       {"x", Number(kLabelWidth + x)},
                       {"y", QString::number(y + (kLaneHeight - kBarHeight) / 2)},
                       {"width", Number(qMax(width - 1.0, 2.0))},
                       {"height", QString::number(kBarHeight)}});
            html.Element("title",
                         QStringLiteral("%1 on %2: %3, %4")
                             .arg(bar.module->name, bar.module->handset, OutcomeWord(outcome),
                                  DurationText(bar.module->durationMs)));
            html.Close();
            // The name inside the bar when it fits (about 7 pixels a letter).
            if (width > 7.0 * double(bar.module->name.size()) + 8.0)
                html.Element("text", bar.module->name,
                             {{"class", QStringLiteral("inbar")},
                              {"x", Number(kLabelWidth + x + 4)},
                              {"y", QString::number(y + kLaneHeight / 2 + 4)}});
            ++index;
        }
        html.Close();
    }
    html.Element("text", QStringLiteral("0 s"),
                 {{"x", QString::number(kLabelWidth)}, {"y", QString::number(height - 4)}});
    html.Element("text", DurationText(span),
                 {{"x", QString::number(kLabelWidth + kPlotWidth)},
                  {"y", QString::number(height - 4)},
                  {"text-anchor", QStringLiteral("end")}});
    html.Close();
}

void Cell(HtmlWriter &html, const QString &text, const QString &sortValue, bool number = false)
{
    html.Element("td", text, {{"data-value", sortValue}, {"class", number ? QStringLiteral("num") : QString()}});
}

// The handset and duration columns only when some module has them (the
// processed results of report hold neither).
void ModuleTable(HtmlWriter &html, const RunReport &report)
{
    const bool withHandset = std::any_of(report.modules.cbegin(), report.modules.cend(),
                                         [](const ModuleReport &m) { return !m.handset.isEmpty(); });
    const bool withDuration = std::any_of(report.modules.cbegin(), report.modules.cend(),
                                          [](const ModuleReport &m) { return m.durationMs >= 0; });
    html.Element("h2", QStringLiteral("Modules"));
    html.Open("p");
    html.Open("label");
    html.Empty("input", {{"type", QStringLiteral("checkbox")}, {"id", QStringLiteral("failures-only")}});
    html.Text(QStringLiteral(" failures only"));
    html.Close();
    html.Text(QStringLiteral(" (link: "));
    html.Element("a", QStringLiteral("#failures"), {{"href", QStringLiteral("#failures")}});
    html.Text(QStringLiteral(")"));
    html.Close();
    html.Open("table", {{"id", QStringLiteral("modules")}});
    html.Open("thead");
    html.Open("tr");
    const struct
    {
        const char *title;
        bool number;
    } columns[] = {{"Module", false}, {"Family", false},     {"Handset", false},   {"Duration", true}, {"Passed", true},
                   {"Failed", true},  {"Unsupported", true}, {"Unexecuted", true}, {"Outcome", false}};
    for (const auto &column : columns) {
        if ((!withHandset && qstrcmp(column.title, "Handset") == 0)
            || (!withDuration && qstrcmp(column.title, "Duration") == 0))
            continue;
        html.Element("th", QLatin1String(column.title),
                     {{"data-type", column.number ? QStringLiteral("number") : QStringLiteral("text")}});
    }
    html.Close();
    html.Close();
    html.Open("tbody");
    for (qsizetype i = 0; i < report.modules.size(); ++i) {
        const ModuleReport &module = report.modules.at(i);
        const QString outcome = Outcome(module);
        const bool ok = module.Finished() && module.Count(kFail) == 0;
        html.Open("tr",
                  {{"class", QStringLiteral("module")},
                   {"data-module", module.name},
                   {"data-ok", ok ? QStringLiteral("1") : QStringLiteral("0")}});
        html.Open("td", {{"data-value", module.name}});
        html.Element("a", module.name, {{"href", QStringLiteral("#module-%1").arg(i)}});
        html.Close();
        Cell(html,
             module.subFamily.isEmpty() ? module.family : module.family + QStringLiteral(" / ") + module.subFamily,
             module.family);
        if (withHandset)
            Cell(html, module.handset, module.handset);
        if (withDuration)
            Cell(html, DurationText(module.durationMs), QString::number(module.durationMs), true);
        for (const QString &word : {kPass, kFail, kUnsupported, kUnexecuted}) {
            const QString count = QString::number(module.Count(word));
            Cell(html, count, count, true);
        }
        html.Open("td", {{"data-value", outcome}});
        html.Element("span", OutcomeWord(outcome), {{"class", QStringLiteral("outcome ") + outcome}});
        html.Close();
        html.Close();
    }
    html.Close();
    html.Close();
}

void ModuleDetails(HtmlWriter &html, const RunReport &report, const QString &folder)
{
    html.Element("h2", QStringLiteral("Test cases"));
    const QDir base(folder);
    for (qsizetype i = 0; i < report.modules.size(); ++i) {
        const ModuleReport &module = report.modules.at(i);
        const bool ok = module.Finished() && module.Count(kFail) == 0;
        html.Open("section",
                  {{"class", QStringLiteral("module")},
                   {"id", QStringLiteral("module-%1").arg(i)},
                   {"data-ok", ok ? QStringLiteral("1") : QStringLiteral("0")}});
        html.Element(
            "h3", module.handset.isEmpty() ? module.name : QStringLiteral("%1 on %2").arg(module.name, module.handset));
        if (!module.Finished())
            html.Element("p", QStringLiteral("Not finished: ") + module.reason, {{"class", QStringLiteral("note")}});
        if (!module.logs.isEmpty()) {
            html.Open("p");
            html.Text(module.logs.size() == 1 ? QStringLiteral("Log: ") : QStringLiteral("Logs: "));
            for (qsizetype j = 0; j < module.logs.size(); ++j) {
                if (j > 0)
                    html.Text(QStringLiteral(", "));
                const QString relative = base.relativeFilePath(module.logs.at(j));
                // A log name may hold "#", "?" or "%": the link is encoded.
                html.Element(
                    "a", relative,
                    {{"href",
                      QString::fromLatin1(QUrl::toPercentEncoding(QDir::fromNativeSeparators(relative), "/"))}});
            }
            html.Close();
        }
        if (!module.testCases.isEmpty()) {
            html.Open("table", {{"class", QStringLiteral("cases")}});
            for (const TestCaseReport &testCase : module.testCases) {
                html.Open("tr");
                html.Element("td", testCase.name);
                html.Element("td", testCase.result, {{"class", QStringLiteral("verdict v-") + testCase.result}});
                html.Element("td", testCase.detail, {{"class", QStringLiteral("detail")}});
                html.Close();
            }
            html.Close();
        }
        html.Close();
    }
}

} // namespace

QByteArray RunReport::Html(const QString &folder) const
{
    const bool history = !start.isValid();
    HtmlWriter html;
    html.Open("html", {{"lang", QStringLiteral("en")}});
    html.Open("head");
    html.Empty("meta", {{"charset", QStringLiteral("utf-8")}});
    html.Empty("meta", {{"name", QStringLiteral("viewport")}, {"content", QStringLiteral("width=device-width")}});
    html.Element("title", history ? QStringLiteral("Harness: processed results") : QStringLiteral("Harness run"));
    html.Open("style");
    html.Trusted(kStyle);
    html.Close();
    html.Close();
    html.Open("body");
    html.Element("h1", history ? QStringLiteral("Processed results") : QStringLiteral("Harness run"));
    if (history) {
        html.Element("p", QStringLiteral("The standing verdict of every test case a processed-results file holds."),
                     {{"class", QStringLiteral("meta")}});
    } else {
        html.Element("p",
                     QStringLiteral("Started %1 UTC on %2, %3, handsets: %4%5")
                         .arg(start.toUTC().toString(QStringLiteral("yyyy-MM-dd HH:mm:ss")), host,
                              DurationText(durationMs), handsets.join(QStringLiteral(", ")),
                              interrupted ? QStringLiteral(" (stopped by a signal)") : QString()),
                     {{"class", QStringLiteral("meta")}});
    }
    Counts(html, *this, !history);
    if (history) {
        html.Element("h2", QStringLiteral("History"));
        html.Element("p",
                     QStringLiteral("This processed-results file keeps one standing verdict per test case, "
                                    "not the runs that gave it: no history across runs is recorded, so none is shown."),
                     {{"class", QStringLiteral("note")}, {"id", QStringLiteral("history")}});
    } else {
        Timeline(html, *this);
    }
    ModuleTable(html, *this);
    ModuleDetails(html, *this, folder);
    html.Open("script");
    html.Trusted(kScript);
    html.Close();
    return html.Finish();
}
