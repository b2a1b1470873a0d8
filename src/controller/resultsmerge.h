#pragma once

#include "../common/export.h"
#include "moduletimings.h"

#include <QHash>
#include <QList>
#include <QPair>
#include <QSharedPointer>
#include <QString>
#include <QStringList>

class _TestModule;

// Merges the processed-results files of several handsets and hosts, each of
// which ran its share of one selection, into one row per module. A module
// ran on a handset when its file shows any test case with a verdict other
// than "unexecuted". Where the same module ran on more than one, the
// verdicts meet with the processed results' own precedence, in the order the
// files were added. Modules of the selection that ran nowhere are listed as
// not run, with every test case "unexecuted".
//
//     ResultsMerge merge;
//     for (const QString &path : paths)
//         if (!merge.Add(path)) fail(merge.ErrorString());
//     merge.Expect(selection);     // optional: what should have run
//     for (const ResultsMerge::Row &row : merge.Rows()) ...
class HARNESS_EXPORT ResultsMerge
{
public:
    // One module of the merged results.
    struct Row
    {
        QString name; // the module's name
        QString source; // "KVK", "PVS", or empty for a module known only from logs
        QString family; // the family the module belongs to; empty when none is given
        QString subFamily; // the sub-family within family; empty when none is given
        QString host; // where it ran; several joined by ", "
        QString handset; // the handset it ran on; several joined by ", "; empty when none
        bool ran = false; // some file shows a verdict other than "unexecuted" for it
        QList<QPair<QString, QString>> testCases; // (name, result word), in file order
    };

    // A module the selection holds.
    struct Expected
    {
        QString name; // the module's name
        QString source; // "KVK" or "PVS"
        QString family; // the family the module belongs to
        QString subFamily; // the sub-family within family
        QStringList testCases; // the names of its test cases, in catalogue order
    };

    // Larger files (in bytes) are not processed-results files: Add refuses them.
    static constexpr qint64 kMaxFileSize = 256 * 1024 * 1024;

    // Reads one processed-results file. handset defaults to the handset
    // folder the file sits in (".../Targets/<handset>/Logs/ProcessedResults/
    // ProcessedResults.xml"), host to "". Where "Timings.json" lies beside the
    // file, a module's latest recorded run there names its handset and host.
    // False with ErrorString() when the file cannot be read, is not a
    // processed-results file or was made for another kit than the files
    // added before it; nothing of it is then merged.
    bool Add(const QString &path, const QString &handset = QString(), const QString &host = QString());

    // The selection's modules, in run order; rows follow this order.
    void Expect(const QList<Expected> &selection);
    // The same from the selected catalogue modules.
    static QList<Expected> ExpectedOf(const QList<QSharedPointer<_TestModule>> &selection);

    // Every module that ran somewhere or was expected: first the expected
    // ones in their order, then the others in the order they were first seen.
    QList<Row> Rows() const;
    // The names of the rows that did not run, in the order of Rows().
    QStringList NotRun() const;

    // The runs of every "Timings.json" found beside the files added, for
    // the next plan.
    const ModuleTimings &Timings() const { return m_timings; }

    // Why the last Add failed; empty after one that succeeded.
    QString ErrorString() const { return m_error; }

private:
    static QString Key(const QString &name, const QString &source);
    // The index of the row a module of a file goes to; -1 when none yet.
    qsizetype Find(const QString &name, const QString &source) const;
    void Merge(const Row &row);

    QList<Row> m_rows; // ran somewhere, in first-seen order
    QHash<QString, qsizetype> m_index; // by source and lower-cased name
    QHash<QString, QList<qsizetype>> m_byName; // by lower-cased name
    QList<Expected> m_expected;
    ModuleTimings m_timings;
    QString m_kitHash;
    QString m_kitHashFile;
    QString m_error;
};
