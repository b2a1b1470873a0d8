#include "cli/options.h"

#include "cli/commands.h"

#include <QCoreApplication>

namespace {

// Qt names the program by its path; the usage line names the sub-command.
QString HelpText(const QCommandLineParser &parser, const QString &command)
{
    QString text = parser.helpText();
    const QString program = QStringLiteral("Usage: ") + QCoreApplication::arguments().value(0);
    if (text.startsWith(program))
        text.replace(0, program.size(), QStringLiteral("Usage: ") + command);
    return text;
}

} // namespace

bool ParseArguments(QCommandLineParser &parser, const QStringList &arguments, int &status, int minPositional,
                    int maxPositional)
{
    const QCommandLineOption help({QStringLiteral("h"), QStringLiteral("help")}, QStringLiteral("Show this help."));
    parser.addOption(help);
    if (!parser.parse(arguments)) {
        Err(arguments.value(0) + QStringLiteral(": ") + parser.errorText() + QLatin1Char('\n'));
        status = ExitUsage;
        return false;
    }
    if (parser.isSet(help)) {
        Out(HelpText(parser, arguments.value(0)));
        status = ExitSuccess;
        return false;
    }
    const qsizetype count = parser.positionalArguments().size();
    if (count < minPositional || (maxPositional >= 0 && count > maxPositional)) {
        Err(arguments.value(0) + QStringLiteral(": wrong number of arguments\n\n")
            + HelpText(parser, arguments.value(0)));
        status = ExitUsage;
        return false;
    }
    return true;
}
