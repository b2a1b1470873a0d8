#include "cli_test.h"

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

TEST(ToolUsage, HashPrintsTheStoredHashName)
{
    const ToolResult r = RunTool({u"hash"_s, u"abcdefgh"_s});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out, QByteArray("#144355384\n"));
    // An argument that names a command is still an argument.
    EXPECT_EQ(RunTool({u"hash"_s, u"run"_s}).out, QByteArray("#31166\n"));
}

TEST(ToolUsage, BadUsageExitsWithTwoAndExplainsOnStandardError)
{
    for (const QStringList &arguments :
         {QStringList{}, QStringList{u"no-such-command"_s}, QStringList{u"hash"_s},
          QStringList{u"hash"_s, u"--bogus"_s, u"x"_s}, QStringList{u"manifest"_s, u"extra"_s}}) {
        const ToolResult r = RunTool(arguments);
        EXPECT_EQ(r.status, 2) << arguments.join(u' ').toStdString();
        EXPECT_TRUE(r.out.isEmpty());
        EXPECT_FALSE(r.err.isEmpty());
    }
}

TEST(ToolUsage, EveryCommandHasHelpAndTheToolAVersion)
{
    const ToolResult top = RunTool({u"--help"_s});
    ASSERT_EQ(top.status, 0);
    QStringList names;
    for (const QByteArray &line : top.out.split('\n')) {
        if (line.startsWith("  ") && !line.trimmed().isEmpty())
            names << QString::fromUtf8(line.trimmed().split(' ').first());
    }
    ASSERT_FALSE(names.isEmpty());
    for (const QString &name : names) {
        const ToolResult r = RunTool({name, u"--help"_s});
        EXPECT_EQ(r.status, 0) << name.toStdString();
        EXPECT_TRUE(r.out.startsWith("Usage: harness " + name.toUtf8())) << r.out.constData();
    }
    const ToolResult help = RunTool({u"help"_s, u"run"_s});
    EXPECT_TRUE(help.out.startsWith("Usage: harness run")) << help.out.left(200).constData();
    const ToolResult version = RunTool({u"--version"_s});
    EXPECT_EQ(version.status, 0);
    EXPECT_TRUE(version.out.startsWith("harness "));
}

} // namespace
