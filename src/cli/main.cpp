#include "cli/commands.h"

#include "controller/harness.h"

#include <QCoreApplication>

#include <cstdio>

void Out(const QString &text)
{
    const QByteArray bytes = text.toUtf8();
    std::fwrite(bytes.constData(), 1, static_cast<size_t>(bytes.size()), stdout);
    std::fflush(stdout);
}

void Err(const QString &text)
{
    const QByteArray bytes = text.toUtf8();
    std::fwrite(bytes.constData(), 1, static_cast<size_t>(bytes.size()), stderr);
    std::fflush(stderr);
}

bool Fail(const QString &command, const QString &message)
{
    Err(command + QStringLiteral(": ") + message + QLatin1Char('\n'));
    return false;
}

int Refuse(const QString &command, const QString &message)
{
    Fail(command, message);
    return ExitUsage;
}

namespace {

QList<Command> AllCommands()
{
    QList<Command> commands;
    commands += ListingCommands();
    commands += ModuleCommands();
    commands += RunCommands();
    commands += ProcessCommands();
    commands += ReportCommands();
    commands += InspectionCommands();
    commands += DemoCommands();
    return commands;
}

QString Usage(const QList<Command> &commands)
{
    QString text = QStringLiteral("Usage: harness <command> [options]\n\n"
                                  "Drives test runs of Kesto test kits on handsets.\n\nCommands:\n");
    for (const Command &command : commands)
        text += QStringLiteral("  %1%2\n").arg(QLatin1String(command.name), -11).arg(QLatin1String(command.summary));
    text += QStringLiteral("\nRun 'harness <command> --help' for the options of a command.\n");
    return text;
}

} // namespace

int main(int argc, char **argv)
{
    QCoreApplication app(argc, argv);
    QCoreApplication::setApplicationName(QStringLiteral("harness"));
    QCoreApplication::setApplicationVersion(QStringLiteral(HARNESS_VERSION));

    const QStringList arguments = QCoreApplication::arguments();
    const QList<Command> commands = AllCommands();
    if (arguments.size() < 2) {
        Err(Usage(commands));
        return ExitUsage;
    }
    const QString name = arguments.at(1);
    // "help COMMAND" is "COMMAND --help".
    if (name == QLatin1String("help") && arguments.size() > 2) {
        for (const Command &command : commands) {
            if (arguments.at(2) == QLatin1String(command.name))
                return command.run({QStringLiteral("harness ") + arguments.at(2), QStringLiteral("--help")});
        }
    }
    if (name == QLatin1String("--help") || name == QLatin1String("-h") || name == QLatin1String("help")) {
        Out(Usage(commands));
        return ExitSuccess;
    }
    if (name == QLatin1String("--version") || name == QLatin1String("-v")) {
        Out(QStringLiteral("harness %1\n").arg(QCoreApplication::applicationVersion()));
        return ExitSuccess;
    }
    for (const Command &command : commands) {
        if (name == QLatin1String(command.name)) {
            QStringList rest = arguments.mid(2);
            rest.prepend(QStringLiteral("harness ") + name);
            Harness::Initialize();
            const int status = command.run(rest);
            Harness::Uninitialize();
            return status;
        }
    }
    Err(QStringLiteral("harness: unknown command '%1'\n\n").arg(name) + Usage(commands));
    return ExitUsage;
}
