#include "cli_test.h"

#include <gtest/gtest.h>

namespace {

TEST(ToolUsage, HashPrintsTheStoredHashName)
{
    EXPECT_EQ(OutputOf(Tool("hash abcdefgh")), QByteArray("#144355384\n"));
    // An argument that names a command is still an argument.
    EXPECT_EQ(Tool("hash run").out, QByteArray("#31166\n"));
}

TEST(ToolUsage, BadUsageExitsWithTwoAndExplainsOnStandardError)
{
    for (const char *arguments : {"", "no-such-command", "hash", "hash --bogus x", "manifest extra"}) {
        const ToolResult r = Tool(arguments);
        EXPECT_EQ(r.status, 2) << arguments;
        EXPECT_TRUE(r.out.isEmpty());
        EXPECT_FALSE(r.err.isEmpty());
    }
}

TEST(ToolUsage, EveryCommandHasHelpAndTheToolAVersion)
{
    // Every command of the list, in its order, with its synopsis.
    const QByteArray synopses[] = {"kits [options]",
                                   "platforms [options]",
                                   "targets [options]",
                                   "modules [options] [PATTERN...]",
                                   "manifest [options]",
                                   "run [options] [PATTERN...]",
                                   "process [options]",
                                   "report [options] RESULTS.xml...",
                                   "res [options] ACTION FILE",
                                   "mif [options] FILE",
                                   "tar [options] ACTION FILE",
                                   "encode [options] FORMAT TEXT",
                                   "decode [options] HEX",
                                   "hash [options] TEXT",
                                   "demo [options] init DIR"};
    QList<QByteArray> names;
    for (const QByteArray &line : OutputOf(Tool("--help")).split('\n')) {
        if (line.startsWith("  ")) {
            names << line.mid(2, 11).trimmed();
            EXPECT_NE(line.at(13), ' ') << "the summaries start in one column: " << line.constData();
        }
    }
    ASSERT_EQ(names.size(), std::size(synopses));
    for (qsizetype i = 0; i < names.size(); ++i) {
        EXPECT_TRUE(synopses[i].startsWith(names.at(i) + ' ')) << names.at(i).constData();
        const QByteArray usage = OutputOf(Tool(QString::fromUtf8(names.at(i)), "--help"));
        EXPECT_TRUE(usage.startsWith("Usage: harness " + synopses[i] + '\n')) << usage.constData();
    }
    EXPECT_TRUE(Tool("help run").out.startsWith("Usage: harness run"));
    EXPECT_TRUE(OutputOf(Tool("--version")).startsWith("harness "));
}

} // namespace
