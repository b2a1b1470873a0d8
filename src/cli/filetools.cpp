#include "cli/commands.h"
#include "cli/options.h"

#include "archive/tar.h"
#include "common/stringhash.h"
#include "encoding/qencoding.h"
#include "resources/kestoresources.h"
#include "resources/resourcesource.h"

#include <QFileInfo>
#include <QRegularExpression>

#include <cstdio>

namespace {

QString Hex32(unsigned int value)
{
    return QStringLiteral("0x%1").arg(value, 8, 16, QLatin1Char('0'));
}

QString HexBytes(const QByteArray &bytes)
{
    return QString::fromLatin1(bytes.toHex(' ').toUpper());
}

bool LoadResources(KestoResources &resources, const QString &path, const QString &command)
{
    if (!QFileInfo(path).isFile()) {
        Err(QStringLiteral("%1: %2: no such file\n").arg(command, path));
        return false;
    }
    if (!resources.Read(path)) {
        Err(QStringLiteral("%1: %2 is not a compiled resource file\n").arg(command, path));
        return false;
    }
    return true;
}

int HashCommand(const QStringList &arguments)
{
    QCommandLineParser parser;
    parser.setApplicationDescription(
        QStringLiteral("Prints the string hash that names manifest caches, module ID hashes and cache files."));
    parser.addPositionalArgument(QStringLiteral("TEXT"), QStringLiteral("The text to hash."));
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status, 1, 1))
        return status;
    Out(StringHashName(parser.positionalArguments().at(0)) + QLatin1Char('\n'));
    return ExitSuccess;
}

// ---- res ----

QString ListResources(KestoResources &resources)
{
    QString text;
    QVector<quint16> types;
    resources.GetResourceTypes(types);
    for (quint16 type : types) {
        const QString name = resources.GetResourceTypeName(type);
        text += QStringLiteral("type 0x%1%2\n")
                    .arg(type, 4, 16, QLatin1Char('0'))
                    .arg(name.isEmpty() ? QString() : QStringLiteral(" (%1)").arg(name));
        QVector<quint16> ids;
        resources.GetIDs(type, ids);
        for (quint16 id : ids) {
            const QByteArray block = resources.Stream()->GetResource(type, id);
            QString line = QStringLiteral("  id %1  %2 bytes").arg(id, 5).arg(block.size(), 6);
            quint16 format = 0;
            QString string;
            QString mime;
            QByteArray object;
            if (type == KestoResources::kTypeStrings && resources.GetString(type, id, &format, string)) {
                line += QStringLiteral("  %1  \"%2\"").arg(resources.GetFormatName(format), string);
            } else if (type == KestoResources::kTypeObjects && resources.GetMimeObject(type, id, mime, object)) {
                line += QStringLiteral("  %1, %2 bytes").arg(mime).arg(object.size());
            }
            text += line + QLatin1Char('\n');
        }
    }
    return text;
}

int ResCommand(const QStringList &arguments)
{
    QCommandLineParser parser;
    parser.setApplicationDescription(
        QStringLiteral("Compiled resource files.\n"
                       "  dump FILE             the container's header, map, offsets and blocks\n"
                       "  list FILE             resource types and IDs with sizes; strings decoded\n"
                       "  compile SOURCE OUTPUT compile a resource source (see README) into OUTPUT"));
    parser.addPositionalArgument(QStringLiteral("ACTION"), QStringLiteral("dump, list or compile."));
    parser.addPositionalArgument(QStringLiteral("FILE"), QStringLiteral("The resource file or source."));
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status, 2, 3))
        return status;
    const QStringList args = parser.positionalArguments();
    const QString action = args.at(0);
    const QString command = arguments.at(0) + QLatin1Char(' ') + action;
    if (action == QLatin1String("compile")) {
        if (args.size() != 3) {
            Err(command + QStringLiteral(": needs SOURCE and OUTPUT\n"));
            return ExitUsage;
        }
        QString error;
        QStringList lost;
        if (!CompileResourceSource(args.at(1), args.at(2), &error, &lost)) {
            if (!lost.isEmpty()) {
                for (const QString &character : std::as_const(lost))
                    Err(QStringLiteral("%1: %2 cannot be held by its string's format\n").arg(command, character));
                return ExitTestFailed;
            }
            Err(QStringLiteral("%1: %2\n").arg(command, error));
            return ExitUsage;
        }
        Out(QStringLiteral("Successfully compiled %1 into %2\n").arg(args.at(1), args.at(2)));
        return ExitSuccess;
    }
    if (args.size() != 2 || (action != QLatin1String("dump") && action != QLatin1String("list"))) {
        Err(arguments.at(0) + QStringLiteral(": expected 'dump FILE', 'list FILE' or 'compile SOURCE OUTPUT'\n"));
        return ExitUsage;
    }
    KestoResources resources;
    if (!LoadResources(resources, args.at(1), command))
        return ExitUsage;
    if (action == QLatin1String("list")) {
        Out(ListResources(resources));
        return ExitSuccess;
    }
    // The container pads its hexadecimal values for columns; on the console
    // "17 (0x11)" reads better than "17(0x      11)".
    static const QRegularExpression padded(QStringLiteral("\\(0x +([0-9a-f]+)\\)"));
    Out(resources.Dump().replace(padded, QStringLiteral(" (0x\\1)")));
    return ExitSuccess;
}

// ---- mif ----

int MifCommand(const QStringList &arguments)
{
    QCommandLineParser parser;
    parser.setApplicationDescription(
        QStringLiteral("Prints the records of a module-information file: header counts, class IDs, applets, external "
                       "classes, notifications, MIME types and program records."));
    parser.addPositionalArgument(QStringLiteral("FILE"), QStringLiteral("The .mif file."));
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status, 1, 1))
        return status;
    KestoResources resources;
    if (!LoadResources(resources, parser.positionalArguments().at(0), arguments.at(0)))
        return ExitUsage;

    MifEntry entry;
    if (!resources.GetMifEntry(entry)) {
        Err(arguments.at(0) + QStringLiteral(": no module header in %1\n").arg(parser.positionalArguments().at(0)));
        return ExitUsage;
    }
    const MifHeader &h = entry.header;
    QString text = QStringLiteral("header: value1 %1, value2 %2, counts %3 %4 %5 %6, notifications %7, "
                                  "MIME types %8, count7 %9\n")
                       .arg(Hex32(h.value1), Hex32(h.value2))
                       .arg(h.count1)
                       .arg(h.count2)
                       .arg(h.count3)
                       .arg(h.count4)
                       .arg(h.notificationCount)
                       .arg(h.mimeTypeCount)
                       .arg(h.count7);
    text += QStringLiteral("classes: %1\n").arg(entry.classes.size());
    for (unsigned int id : entry.classes)
        text += QStringLiteral("  %1\n").arg(Hex32(id));
    text += QStringLiteral("applets: %1\n").arg(entry.applets.size());
    for (const Applet &a : entry.applets)
        text += QStringLiteral("  %1  baseid %2  apptype %3  hostid %4  privset %5  flags %6\n")
                    .arg(Hex32(a.appletid))
                    .arg(a.baseid)
                    .arg(a.apptype)
                    .arg(Hex32(a.hostid))
                    .arg(a.privset)
                    .arg(a.flags);
    text += QStringLiteral("external classes: %1\n").arg(entry.externalClasses.size());
    for (unsigned int id : entry.externalClasses)
        text += QStringLiteral("  %1\n").arg(Hex32(id));
    text += QStringLiteral("notifications: %1\n").arg(entry.notifications.size());
    for (const Notifier &n : entry.notifications)
        text += QStringLiteral("  %1 %2 %3\n").arg(Hex32(n.value1), Hex32(n.value2), Hex32(n.value3));
    text += QStringLiteral("MIME types: %1\n").arg(entry.mimeTypes.size());
    for (const MimeType &m : entry.mimeTypes)
        text += QStringLiteral("  %1  %2 %3\n").arg(m.mimeType, Hex32(m.value1), Hex32(m.value2));

    QVector<quint16> ids;
    resources.GetIDs(KestoResources::kTypeSysResource, ids);
    text += QStringLiteral("system resources: %1\n").arg(ids.size());
    for (quint16 id : ids) {
        SysResource record;
        if (!resources.GetSysResource(id, record))
            continue;
        text += QStringLiteral("  id %1  type %2%3\n")
                    .arg(id)
                    .arg(Hex32(record.type))
                    .arg(record.IsProgram() ? QStringLiteral(" (program)") : QString());
        for (const QByteArray &name : record.PropertyNames())
            text += QStringLiteral("    %1: %2\n")
                        .arg(QString::fromLatin1(name), record.Property(name.constData()).toString());
    }
    Out(text);
    return ExitSuccess;
}

// ---- tar ----

// A member name with control characters shown as C escapes, so that a name
// cannot move the cursor or colour the terminal.
QString Printable(const QString &name)
{
    QString text;
    for (const QChar c : name) {
        const char16_t u = c.unicode();
        if (u >= 0x20 && u != 0x7f && (u < 0x80 || u > 0x9f)) {
            text += c;
            continue;
        }
        switch (u) {
        case '\n':
            text += QStringLiteral("\\n");
            break;
        case '\t':
            text += QStringLiteral("\\t");
            break;
        case '\r':
            text += QStringLiteral("\\r");
            break;
        default:
            text += QStringLiteral("\\%1").arg(unsigned(u), 3, 8, QLatin1Char('0'));
        }
    }
    return text;
}

// The first column of a listing line, after ls -l: '-' file, 'd' directory,
// 'l' symbolic link, 'h' hard link, 'c'/'b' devices, 'p' FIFO, '?' other.
QChar TypeLetter(const TarFileEntry &entry)
{
    if (entry.IsDirectory())
        return QLatin1Char('d');
    switch (entry.typeflag) {
    case '1':
        return QLatin1Char('h');
    case '2':
        return QLatin1Char('l');
    case '3':
        return QLatin1Char('c');
    case '4':
        return QLatin1Char('b');
    case '6':
        return QLatin1Char('p');
    default:
        return entry.IsFile() ? QLatin1Char('-') : QLatin1Char('?');
    }
}

// Why a member has no bytes to print; empty for a member that has them.
QString NotAFile(const TarFileEntry &entry)
{
    if (entry.IsDirectory())
        return QStringLiteral("is a directory");
    if (entry.IsSymLink())
        return QStringLiteral("is a symbolic link to %1").arg(Printable(entry.linkName));
    if (entry.IsHardLink() && !entry.IsFile())
        return QStringLiteral("is a hard link to %1, which the archive does not hold before it")
            .arg(Printable(entry.linkName));
    if (!entry.IsFile())
        return QStringLiteral("is a special file (type '%1')").arg(QLatin1Char(entry.typeflag));
    return QString();
}

int TarCommand(const QStringList &arguments)
{
    QCommandLineParser parser;
    parser.setApplicationDescription(
        QStringLiteral("Tar package archives.\n"
                       "  list FILE         one line per member: type (- d l h c b p ?), size, name\n"
                       "                    (tab-separated; links followed by \" -> TARGET\" or\n"
                       "                    \" link to TARGET\"; control characters escaped)\n"
                       "  cat FILE MEMBER   the bytes of a member on standard output\n"
                       "A damaged archive is reported on standard error with exit status 2."));
    parser.addPositionalArgument(QStringLiteral("ACTION"), QStringLiteral("list or cat."));
    parser.addPositionalArgument(QStringLiteral("FILE"), QStringLiteral("The archive."));
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status, 2, 3))
        return status;
    const QStringList args = parser.positionalArguments();
    const bool list = args.at(0) == QLatin1String("list") && args.size() == 2;
    const bool cat = args.at(0) == QLatin1String("cat") && args.size() == 3;
    if (!list && !cat) {
        Err(arguments.at(0) + QStringLiteral(": expected 'list FILE' or 'cat FILE MEMBER'\n"));
        return ExitUsage;
    }
    Tar tar;
    if (!QFileInfo(args.at(1)).isFile() || !tar.Open(QIODevice::ReadOnly, args.at(1))) {
        Err(QStringLiteral("%1: cannot open %2\n").arg(arguments.at(0), args.at(1)));
        return ExitUsage;
    }
    const QString damage = tar.IsDamaged()
        ? QStringLiteral("%1: %2: %3\n").arg(arguments.at(0), args.at(1), tar.ErrorString())
        : QString();
    if (list) {
        QString text;
        for (unsigned int i = 0; i < tar.EntryCount(); ++i) {
            const TarFileEntry entry = tar.Entry(i);
            if (entry.name.isEmpty()) // the zero blocks that end the archive
                break;
            text += QStringLiteral("%1\t%2\t%3").arg(TypeLetter(entry)).arg(entry.size).arg(Printable(entry.name));
            if (entry.IsSymLink())
                text += QStringLiteral(" -> ") + Printable(entry.linkName);
            else if (entry.IsHardLink())
                text += QStringLiteral(" link to ") + Printable(entry.linkName);
            text += QLatin1Char('\n');
        }
        Out(text);
        if (!damage.isEmpty()) {
            Err(damage);
            return ExitUsage;
        }
        return ExitSuccess;
    }
    if (!damage.isEmpty()) {
        Err(damage);
        return ExitUsage;
    }
    // The last member of that name wins, as when the archive is extracted;
    // a name may also be given as the listing shows it.
    const QString wanted = args.at(2);
    for (unsigned int i = tar.EntryCount(); i-- > 0;) {
        TarFileEntry entry = tar.Entry(i);
        if (entry.name.isEmpty() || (entry.name != wanted && Printable(entry.name) != wanted))
            continue;
        const QString why = NotAFile(entry);
        if (!why.isEmpty()) {
            Err(QStringLiteral("%1: %2 %3 in %4\n").arg(arguments.at(0), Printable(entry.name), why, args.at(1)));
            return ExitUsage;
        }
        const QByteArray data = tar.EntryData(entry);
        fwrite(data.constData(), 1, static_cast<size_t>(data.size()), stdout);
        fflush(stdout);
        return ExitSuccess;
    }
    Err(QStringLiteral("%1: no member %2 in %3\n").arg(arguments.at(0), Printable(args.at(2)), args.at(1)));
    return ExitUsage;
}

// ---- encode / decode ----

bool ParseFormat(const QString &text, KestoEncodingFormat &format)
{
    bool number = false;
    const uint value = text.toUInt(&number);
    if (number) {
        if (value > 6)
            return false;
        format = static_cast<KestoEncodingFormat>(value);
        return true;
    }
    format = QEncoding::Name2Format(text);
    return format != ENCODING_NONE;
}

int EncodeCommand(const QStringList &arguments)
{
    QCommandLineParser parser;
    QList<KestoEncodingFormat> formats;
    QEncoding::EncodingFormats(formats);
    QStringList names;
    for (KestoEncodingFormat f : formats)
        names << QStringLiteral("%1 %2").arg(int(f)).arg(QEncoding::Format2Name(f));
    parser.setApplicationDescription(
        QStringLiteral("Encodes a text as a resource string block: the format's mark, then the text. A character "
                       "the format cannot hold is named on standard error, with exit status 1.\n"
                       "Formats (number or name): ")
        + names.join(QStringLiteral(", ")));
    parser.addPositionalArgument(QStringLiteral("FORMAT"), QStringLiteral("Encoding number or name."));
    parser.addPositionalArgument(QStringLiteral("TEXT"), QStringLiteral("The text."));
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status, 2, 2))
        return status;
    KestoEncodingFormat format = ENCODING_NONE;
    if (!ParseFormat(parser.positionalArguments().at(0), format)) {
        Err(arguments.at(0) + QStringLiteral(": unknown format '%1'\n").arg(parser.positionalArguments().at(0)));
        return ExitUsage;
    }
    const QString text = parser.positionalArguments().at(1);
    const QList<LostCharacter> lost = LostCharacters(text, format);
    for (const LostCharacter &character : lost)
        Err(arguments.at(0)
            + QStringLiteral(": %1 cannot be held by %2\n").arg(character.Describe(), QEncoding::Format2Name(format)));
    if (!lost.isEmpty())
        return ExitTestFailed;
    KestoResources resources;
    resources.AddString(KestoResources::kTypeStrings, 1, quint16(format), text);
    Out(HexBytes(resources.Stream()->GetResource(KestoResources::kTypeStrings, 1)) + QLatin1Char('\n'));
    return ExitSuccess;
}

int DecodeCommand(const QStringList &arguments)
{
    QCommandLineParser parser;
    parser.setApplicationDescription(
        QStringLiteral("Detects the encoding of a resource string block from its mark and decodes it."));
    parser.addPositionalArgument(QStringLiteral("HEX"),
                                 QStringLiteral("The block's bytes in hexadecimal (blanks allowed)."));
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status, 1, -1))
        return status;
    const QString hex = parser.positionalArguments().join(QString()).remove(QLatin1Char(' '));
    static const QRegularExpression hexDigits(QStringLiteral("^([0-9A-Fa-f]{2})+$"));
    if (!hexDigits.match(hex).hasMatch()) {
        Err(arguments.at(0) + QStringLiteral(": not a sequence of hexadecimal bytes\n"));
        return ExitUsage;
    }
    KestoResources resources;
    resources.Stream()->AddResource(KestoResources::kTypeStrings, 1, QByteArray::fromHex(hex.toLatin1()));
    quint16 format = 0;
    QString text;
    if (!resources.GetString(KestoResources::kTypeStrings, 1, &format, text)) {
        Err(arguments.at(0) + QStringLiteral(": no known encoding mark\n"));
        return ExitUsage;
    }
    Out(QStringLiteral("%1\t%2\n").arg(resources.GetFormatName(format), text));
    return ExitSuccess;
}

} // namespace

QList<Command> InspectionCommands()
{
    return {
        {"res", "Dump, list or compile compiled resource files", ResCommand},
        {"mif", "Print the records of a module-information file", MifCommand},
        {"tar", "List a tar archive or print one of its members", TarCommand},
        {"encode", "Encode a text as a resource string block (hex, with its mark)", EncodeCommand},
        {"decode", "Detect and decode a resource string block given in hex", DecodeCommand},
        {"hash", "Print the string hash of a text (\"#\" and its decimal value)", HashCommand},
    };
}
