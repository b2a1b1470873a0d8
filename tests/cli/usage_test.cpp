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
    QStringList names;
    for (const QByteArray &line : OutputOf(Tool("--help")).split('\n')) {
        if (line.startsWith("  ") && !line.trimmed().isEmpty())
            names << QString::fromUtf8(line.trimmed().split(' ').first());
    }
    ASSERT_FALSE(names.isEmpty());
    for (const QString &name : names) {
        const QByteArray usage = OutputOf(Tool(name, "--help"));
        EXPECT_TRUE(usage.startsWith("Usage: harness " + name.toUtf8())) << usage.constData();
    }
    EXPECT_TRUE(Tool("help run").out.startsWith("Usage: harness run"));
    EXPECT_TRUE(OutputOf(Tool("--version")).startsWith("harness "));
}

} // namespace
