#include "cli_test.h"

#include <gtest/gtest.h>

namespace {

TEST(ToolUsage, HashPrintsTheStoredHashName)
{
    const ToolResult r = RunTool({QStringLiteral("hash"), QStringLiteral("abcdefgh")});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out, QByteArray("#144355384\n"));
    // An argument that names a command is still an argument.
    EXPECT_EQ(RunTool({QStringLiteral("hash"), QStringLiteral("run")}).out, QByteArray("#31166\n"));
}

TEST(ToolUsage, BadUsageExitsWithTwoAndExplainsOnStandardError)
{
    for (const QStringList &arguments :
         {QStringList{}, QStringList{QStringLiteral("no-such-command")}, QStringList{QStringLiteral("hash")},
          QStringList{QStringLiteral("hash"), QStringLiteral("--bogus"), QStringLiteral("x")},
          QStringList{QStringLiteral("manifest"), QStringLiteral("extra")}}) {
        const ToolResult r = RunTool(arguments);
        EXPECT_EQ(r.status, 2) << arguments.join(QLatin1Char(' ')).toStdString();
        EXPECT_TRUE(r.out.isEmpty());
        EXPECT_FALSE(r.err.isEmpty());
    }
}

TEST(ToolUsage, EveryCommandHasHelpAndTheToolAVersion)
{
    const ToolResult top = RunTool({QStringLiteral("--help")});
    ASSERT_EQ(top.status, 0);
    QStringList names;
    for (const QByteArray &line : top.out.split('\n')) {
        if (line.startsWith("  ") && !line.trimmed().isEmpty())
            names << QString::fromUtf8(line.trimmed().split(' ').first());
    }
    ASSERT_FALSE(names.isEmpty());
    for (const QString &name : names) {
        const ToolResult r = RunTool({name, QStringLiteral("--help")});
        EXPECT_EQ(r.status, 0) << name.toStdString();
        EXPECT_TRUE(r.out.startsWith("Usage: harness " + name.toUtf8())) << r.out.constData();
    }
    const ToolResult help = RunTool({QStringLiteral("help"), QStringLiteral("run")});
    EXPECT_TRUE(help.out.startsWith("Usage: harness run")) << help.out.left(200).constData();
    const ToolResult version = RunTool({QStringLiteral("--version")});
    EXPECT_EQ(version.status, 0);
    EXPECT_TRUE(version.out.startsWith("harness "));
}

} // namespace
