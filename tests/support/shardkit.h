#pragma once

// A kit for runs on several emulated handsets at once: CTF and CTF applet
// modules whose behaviour takes a fixed real time and reports fixed verdicts,
// and helpers that add handsets and configure one Harness per handset. Used
// by the multi-handset tests and the sharded-run benchmark.
//
// Every behaviour appends "start <module> <handset>" and, once its log is
// written, "done <module> <handset>" to runs.txt in the handsets folder. A
// handset folder holding "drop-at" (a number n) goes offline in the n-th
// module it starts, before that module writes its log.

#include "support/kitbuilder.h"

#include <QString>
#include <QStringList>

using namespace Qt::StringLiterals;

class Harness;
class Log;

namespace shardkit {

class ShardKit
{
public:
    // Builds the kit below root: ctfModules CTF modules "Ctf00", "Ctf01", ...
    // and appletModules CTF applet modules "App00", ... whose behaviour
    // sleeps `seconds` (a text for sleep(1), "0" for none). Module i reports
    // test case "first" passed and "second" passed, failed or unsupported
    // for i modulo 3 equal to 0, 1 or 2.
    ShardKit(const QString &root, int ctfModules, int appletModules, const QString &seconds);

    bool Ok() const { return m_kit.Ok(); }
    QStringList Errors() const { return m_kit.Errors(); }
    QString KitPath() const { return m_kit.Root(); }
    QStringList ModuleNames() const { return m_names; }

    // Adds handsets "<prefix>1" ... "<prefix>count" (win32) to the fixture;
    // returns their names.
    static QStringList AddHandsets(testutil::HandsetFixture &fixture, int count, const QString &prefix = u"h"_s);

    // Sets up harness for this kit and handset, with logs in
    // logRoot/<handset> and the given logger.
    void Configure(Harness &harness, const QString &handset, const QString &logRoot, Log *log) const;

    // The lines of runs.txt in the fixture's handsets folder.
    static QStringList Runs(const testutil::HandsetFixture &fixture);

private:
    kitbuilder::KitBuilder m_kit;
    QStringList m_names;
};

} // namespace shardkit
