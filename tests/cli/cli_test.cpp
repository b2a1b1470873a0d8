#include "cli_test.h"

#include "support/testutil.h"

#include <QProcess>
#include <QRegularExpression>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

QString HarnessProgram()
{
    return QStringLiteral(HARNESS_BINARY_DIR "/harness");
}

ToolResult RunTool(const QStringList &arguments, const QProcessEnvironment &environment,
                   const QString &workingDirectory)
{
    ToolResult result;
    QProcess process;
    process.setProcessEnvironment(environment);
    if (!workingDirectory.isEmpty())
        process.setWorkingDirectory(workingDirectory);
    process.start(HarnessProgram(), arguments);
    if (!process.waitForStarted(30000))
        return result;
    process.closeWriteChannel();
    process.waitForFinished(300000);
    result.out = process.readAllStandardOutput();
    result.err = process.readAllStandardError();
    result.status = process.exitStatus() == QProcess::NormalExit ? process.exitCode() : -1;
    return result;
}

QMap<QString, QString> Rows(const QByteArray &out)
{
    QMap<QString, QString> rows;
    static const QRegularExpression row(u"^(\\w+)\\s+([\\w-]*)\\s+(\\d+)\\s+(\\d+)\\s+(\\d+)\\s+(\\d+)$"_s);
    for (const QString &text : QString::fromUtf8(out).split(u'\n')) {
        const QRegularExpressionMatch m = row.match(text);
        if (m.hasMatch())
            rows.insert(m.captured(1), m.capturedTexts().mid(2).join(u' ').trimmed());
    }
    return rows;
}

QDomDocument ReadXml(const QString &path)
{
    QDomDocument doc;
    EXPECT_TRUE(doc.setContent(testutil::ReadFile(path))) << path.toStdString();
    return doc;
}

void ExpectContains(const QByteArray &text, std::initializer_list<QByteArrayView> parts)
{
    for (const QByteArrayView part : parts)
        EXPECT_TRUE(text.contains(part)) << "no '" << part.toByteArray().constData() << "' in\n" << text.constData();
}

void ExpectLacks(const QByteArray &text, std::initializer_list<QByteArrayView> parts)
{
    for (const QByteArrayView part : parts)
        EXPECT_FALSE(text.contains(part)) << "'" << part.toByteArray().constData() << "' in\n" << text.constData();
}

void ExpectRefused(const ToolResult &result, QByteArrayView message)
{
    EXPECT_EQ(result.status, 2) << result.out.constData() << result.err.constData();
    EXPECT_TRUE(result.err.contains(message) && result.err.count('\n') == 1)
        << "not the one line '" << message.toByteArray().constData() << "':\n"
        << result.err.constData();
    EXPECT_TRUE(result.out.isEmpty()) << result.out.constData();
}

QByteArray OutputOf(const ToolResult &result)
{
    EXPECT_EQ(result.status, 0) << result.err.constData();
    return result.out;
}
