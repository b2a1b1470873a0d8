#include "environment/testdirectories.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QProcessEnvironment>
#include <QStandardPaths>
#include <QStringList>

namespace {

const char kManifestsFolder[] = "Norvane/TestManifests";
const char kTestDataFolder[] = "Norvane/TestDataCache";
const char kDsoFolder[] = "Norvane/TestDataCache/DSOFiles";
const char kTargetsFolder[] = "Norvane/Targets";
const char kPerlScriptsFolder[] = "Norvane/TestDataCache/PerlScripts";
const char kOatToolsFolder[] = "/testframeworks/oat/tools/bin";

// The folder every other path starts from.
QString BaseFolder()
{
    QString base = QProcessEnvironment::systemEnvironment().value(QStringLiteral("KESTIX_DATA_ROOT"));
    if (base.isEmpty())
        base = QStandardPaths::writableLocation(QStandardPaths::GenericDataLocation);
    return QDir::cleanPath(base);
}

QString Join(const QString &left, const QString &right)
{
    return QDir::cleanPath(left + QDir::separator() + right);
}

QString Below(const char *folder)
{
    return Join(BaseFolder(), QString::fromLatin1(folder));
}

QString MakePath(const QString &path)
{
    QDir().mkpath(path);
    return path;
}

// One folder name for a handset: the name as 8-bit text, percent-encoded so
// that blanks, separators and colons cannot leave the Targets folder. A name
// that Latin-1 cannot hold is taken as UTF-8, so that two such names never
// collapse onto the same folder; "." and ".." would name the Targets folder
// or its parent, so their dots are encoded too.
QString EncodeTargetName(const QString &target)
{
    bool latin1 = true;
    for (const QChar c : target) {
        if (c.unicode() > 0xFF) {
            latin1 = false;
            break;
        }
    }
    const QByteArray bytes = latin1 ? target.toLatin1() : target.toUtf8();
    if (bytes == "." || bytes == "..")
        return QString::fromLatin1(bytes.toPercentEncoding(QByteArray(), "."));
    return QString::fromLatin1(bytes.toPercentEncoding());
}

// The canonical path if it names an existing file (not a folder), else empty.
QString CanonicalIfFile(const QString &path)
{
    const QFileInfo info(path);
    const QString canonical = info.canonicalFilePath();
    return !canonical.isEmpty() && info.isFile() ? canonical : QString();
}

QString FindOnPath(const QString &program)
{
    const QString found = QStandardPaths::findExecutable(program);
    return found.isEmpty() ? QString() : QDir::cleanPath(found);
}

// The interpreter named by a "#!" line: a bare name or "/usr/bin/env NAME" is
// looked up on PATH, a path is taken when it is an executable file.
QString InterpreterOfShebang(const QByteArray &line)
{
    const QStringList words
        = QString::fromLocal8Bit(line.mid(2)).simplified().split(QLatin1Char(' '), Qt::SkipEmptyParts);
    if (words.isEmpty())
        return QString();
    QString program = words.first();
    if (QFileInfo(program).fileName() == QLatin1String("env")) {
        program.clear();
        for (qsizetype i = 1; i < words.size(); ++i) {
            const QString &word = words.at(i);
            // Options of env (-S, -i, ...) and VAR=value assignments come
            // before the program's name.
            if (word.startsWith(QLatin1Char('-')) || word.contains(QLatin1Char('=')))
                continue;
            program = word;
            break;
        }
        if (program.isEmpty())
            return QString();
        if (!program.contains(QLatin1Char('/')))
            return FindOnPath(program);
    }
    if (!program.contains(QLatin1Char('/')))
        return FindOnPath(program);
    const QFileInfo info(program);
    return info.isFile() && info.isExecutable() ? QDir::cleanPath(info.absoluteFilePath()) : QString();
}

} // namespace

TestDirectories::TestDirectories() = default;
TestDirectories::~TestDirectories() = default;

QString TestDirectories::GetManifestDirectory(const QString &name)
{
    return MakePath(Join(Below(kManifestsFolder), name));
}

QString TestDirectories::GetTestDataPath()
{
    return MakePath(Below(kTestDataFolder));
}

QString TestDirectories::GetTestDataCacheFilePath(const QString &name)
{
    return Join(MakePath(Below(kTestDataFolder)), name + QStringLiteral(".kar"));
}

QString TestDirectories::GetDSOCacheFilePath(const QString &name)
{
    return Join(MakePath(Below(kDsoFolder)), name + QStringLiteral(".dso"));
}

QString TestDirectories::GetTargetDirectory(const QString &target)
{
    return MakePath(Join(Below(kTargetsFolder), EncodeTargetName(target)));
}

QString TestDirectories::GetLogDirectory(const QString &target)
{
    return MakePath(Join(GetTargetDirectory(target), QStringLiteral("Logs")));
}

QString TestDirectories::GetProcessResultsPath(const QString &target)
{
    const QString folder = MakePath(Join(GetLogDirectory(target), QStringLiteral("ProcessedResults")));
    return Join(folder, QStringLiteral("ProcessedResults.xml"));
}

QString TestDirectories::GetOatPerlScripts()
{
    const QString scripts = Below(kPerlScriptsFolder);
    if (QFileInfo::exists(scripts))
        return scripts;
    if (!QDir().mkpath(scripts))
        return scripts;

    const QDir source(QDir::cleanPath(GetTestSetSetting() + QString::fromLatin1(kOatToolsFolder)));
    const QStringList files
        = source.entryList(QDir::Files | QDir::NoSymLinks | QDir::Readable | QDir::NoDotAndDotDot, QDir::Unsorted);
    for (const QString &file : files)
        QFile::copy(source.filePath(file), Join(scripts, file));
    return scripts;
}

Platform TestDirectories::GenerateProPlatform(const QString &platformName)
{
    QList<Platform> platforms;
    GetProPlatforms(platforms);

    const QString wanted = platformName.toUpper();
    Platform fallback;
    for (const Platform &platform : platforms) {
        if (platform.isDefault)
            fallback = platform;
        if (platform.name.toUpper() == wanted)
            return platform;
    }
    return fallback;
}

QString ResolveXmlPath(const QString &path, const QString &referenceFile)
{
    if (QFileInfo(path).isAbsolute())
        return path;

    const QString separator = QDir::separator();
    for (const QString &candidate :
         {path, QDir::currentPath() + separator + path, QDir::homePath() + separator + path}) {
        const QString found = CanonicalIfFile(candidate);
        if (!found.isEmpty())
            return found;
    }

    if (referenceFile.isEmpty())
        return QString();
    // Beside the reference file: the relative path as written, then its bare
    // file name.
    const QString folder = QFileInfo(referenceFile).absolutePath();
    for (const QString &candidate : {folder + separator + path, folder + separator + QFileInfo(path).fileName()}) {
        const QString found = CanonicalIfFile(candidate);
        if (!found.isEmpty())
            return found;
    }
    return QString();
}

QString FindAssociatedExecutable(const QString &file)
{
    const QFileInfo info(file);
    if (!info.isFile())
        return QString();

    QFile script(file);
    if (script.open(QIODevice::ReadOnly)) {
        // A "#!" line is short; never read more than a page of a binary.
        const QByteArray line = script.readLine(4096);
        if (line.startsWith("#!")) {
            const QString interpreter = InterpreterOfShebang(line.trimmed());
            if (!interpreter.isEmpty())
                return interpreter;
        }
    }

    const QString suffix = info.suffix().toLower();
    if (suffix == QLatin1String("pl"))
        return FindOnPath(QStringLiteral("perl"));
    if (suffix == QLatin1String("py"))
        return FindOnPath(QStringLiteral("python3"));
    if (suffix == QLatin1String("sh"))
        return FindOnPath(QStringLiteral("sh"));
    return QString();
}
