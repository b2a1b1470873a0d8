#pragma once

#include "../common/export.h"

#include <QDateTime>
#include <QHash>
#include <QList>
#include <QString>

// Recent wall times of test modules, kept per handset in "Timings.json"
// beside its processed results, and gathered from several hosts to plan how
// a selection is split between them. Our own small JSON format:
//
//   {"format": "harness-timings", "version": 1,
//    "modules": [{"name": "Audio", "source": "KVK",
//                 "runs": [{"ms": 5230, "handset": "h1", "host": "lab-3",
//                           "at": "2026-12-06T21:40:00.000Z"}]}]}
//
// Modules are kept by lower-cased name and source; each keeps its
// kRecentRuns most recent runs.
class HARNESS_EXPORT ModuleTimings
{
public:
    // One recorded run of a module.
    struct Run
    {
        qint64 ms = 0; // its wall time in milliseconds, on the library's clock
        QString handset; // the name of the handset it ran on
        QString host; // the name of the host machine that ran it
        QDateTime at; // when it ended (UTC)

        // The same run: equal time, handset, host and end. Such runs are kept once.
        bool operator==(const Run &other) const
        {
            return ms == other.ms && handset == other.handset && host == other.host && at == other.at;
        }
    };

    // Runs kept per module; older ones are dropped.
    static constexpr int kRecentRuns = 10;
    // Larger files are not timings files.
    static constexpr qint64 kMaxFileSize = 64 * 1024 * 1024;

    // "Timings.json" in the folder of the handset's processed results.
    static QString PathFor(const QString &target);
    // "Timings.json" beside a processed-results file.
    static QString PathBeside(const QString &resultsPath);

    // Replaces the content with the file's. A file that cannot be read, is
    // not JSON or is not a timings file (another format, a newer version, a
    // field of the wrong kind) is refused: false, ErrorString() says why, and
    // the content is unchanged.
    bool Read(const QString &path);
    // Adds the file's runs to the content; refused as Read.
    bool Merge(const QString &path);
    // Adds the other's runs to the content (a run already known is kept once).
    void Merge(const ModuleTimings &other);

    // Adds one run (runs with a negative time are ignored).
    void Add(const QString &name, const QString &source, const Run &run);

    // Writes the content atomically; false with ErrorString() when it cannot,
    // the file being then unchanged.
    bool Save(const QString &path);

    // Records one run of a module in the file at path: reads it (a missing
    // file is an empty one), adds the run and saves. A file that is there but
    // cannot be read as timings is left as it is: false with *error.
    static bool Record(const QString &path, const QString &name, const QString &source, const Run &run,
                       QString *error = nullptr);

    // The median of the module's recent runs; -1 when none is known.
    qint64 ExpectedMs(const QString &name, const QString &source) const;
    // The module's recent runs, oldest first.
    QList<Run> Runs(const QString &name, const QString &source) const;
    // The number of modules known, by lower-cased name and source.
    int ModuleCount() const { return int(m_modules.size()); }

    // Why the last Read, Merge of a file or Save failed; empty after one that succeeded.
    QString ErrorString() const { return m_error; }

private:
    struct Module
    {
        QString name;
        QString source;
        QList<Run> runs;
    };

    static QString Key(const QString &name, const QString &source);
    bool Parse(const QString &path, QHash<QString, Module> &modules);
    void Insert(Module &module, const Run &run);

    QHash<QString, Module> m_modules;
    QString m_error;
};
