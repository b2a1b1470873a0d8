#include "common/handsetpath.h"

#include <QDir>
#include <QFileInfo>

namespace {

// True when path is root or lies below it; both cleaned, both absolute.
bool IsWithin(const QString &root, const QString &path)
{
    if (path == root)
        return true;
    const QString base = root.endsWith(QLatin1Char('/')) ? root : root + QLatin1Char('/');
    return path.startsWith(base);
}

bool Exists(const QFileInfo &info)
{
    // A dangling link does not "exist" for QFileInfo but must still be
    // checked: whatever is written through it lands at its target.
    return info.exists() || info.isSymLink();
}

} // namespace

namespace HandsetPath {

QString FsFolder(const QString &handsetFolder)
{
    return QDir::cleanPath(QDir(handsetFolder).absolutePath() + QStringLiteral("/fs"));
}

QString Clean(const QString &handsetPath)
{
    const QLatin1String prefix(kPrefix);
    if (!handsetPath.startsWith(prefix) || handsetPath.contains(QChar(0)))
        return QString();
    // Cleaning below a fixed root shows whether ".." climbs above it.
    const QString root = QStringLiteral("/fs");
    const QString cleaned = QDir::cleanPath(root + QLatin1Char('/') + handsetPath.mid(prefix.size()));
    if (!IsWithin(root, cleaned))
        return QString();
    return prefix + cleaned.mid(root.size() + 1);
}

QString ToHost(const QString &handsetFolder, const QString &handsetPath)
{
    const QString cleaned = Clean(handsetPath);
    if (cleaned.isEmpty() || handsetFolder.isEmpty())
        return QString();
    const QString fs = FsFolder(handsetFolder);
    const QString relative = cleaned.mid(int(qstrlen(kPrefix)));
    const QString host = relative.isEmpty() ? fs : fs + QLatin1Char('/') + relative;

    // Resolve the deepest part of the path that exists and check that it
    // still lies inside the fs folder; the parts below it do not exist yet
    // and hold no "..", so whatever gets created there stays inside too.
    const QFileInfo fsInfo(fs);
    if (!Exists(fsInfo))
        return host; // nothing below fs exists yet: there is no link to follow
    const QString canonicalFs = fsInfo.canonicalFilePath();
    if (canonicalFs.isEmpty())
        return QString(); // fs itself is a dangling link
    QString existing = host;
    while (existing != fs && !Exists(QFileInfo(existing)))
        existing = QFileInfo(existing).absolutePath();
    const QString canonical = QFileInfo(existing).canonicalFilePath();
    if (canonical.isEmpty() || !IsWithin(canonicalFs, canonical))
        return QString();
    return host;
}

QString FromHost(const QString &handsetFolder, const QString &hostPath)
{
    if (handsetFolder.isEmpty() || hostPath.isEmpty())
        return QString();
    const QString fs = FsFolder(handsetFolder);
    const QString path = QDir::cleanPath(QDir(hostPath).absolutePath());
    if (!IsWithin(fs, path))
        return QString();
    return QLatin1String(kPrefix) + path.mid(fs.size() + 1);
}

} // namespace HandsetPath
