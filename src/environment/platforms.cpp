#include "environment/platforms.h"

#include <QDir>
#include <QProcessEnvironment>
#include <QRegularExpression>
#include <QStringList>

namespace {

QString ReadVariable(const char *name)
{
    return QProcessEnvironment::systemEnvironment().value(QString::fromLatin1(name));
}

// The sub-directories of root, by name as the original host lists them.
QStringList ListSubDirectories(const QString &root)
{
    return QDir(root).entryList(QDir::Dirs | QDir::NoDotAndDotDot, QDir::Name | QDir::IgnoreCase);
}

// The text up to the last backslash or, without one, the last forward slash
// (index of that separator), -1 without either.
qsizetype LastSeparator(const QString &text)
{
    const qsizetype backslash = text.lastIndexOf(QLatin1Char('\\'));
    return backslash >= 0 ? backslash : text.lastIndexOf(QLatin1Char('/'));
}

// The platform's name without its edition word: " pro" in any case, as a
// word of its own, so that "Foo Pro" is "Foo" while "My Project" stays whole.
QString StripProWord(const QString &entry)
{
    static const QRegularExpression proWord(QStringLiteral(" pro(?![[:alpha:]])"),
                                            QRegularExpression::CaseInsensitiveOption);
    QString name = entry;
    name.remove(proWord);
    return name;
}

unsigned int AppendPlatforms(QList<Platform> &out, bool pro)
{
    QList<Platform> all;
    if (GetPlatforms(all) > 0) {
        for (const Platform &platform : all) {
            if (platform.isPro == pro)
                out.append(platform);
        }
    }
    return static_cast<unsigned int>(out.size());
}

} // namespace

Platform::Platform() = default;
Platform::Platform(const Platform &other) = default;
Platform &Platform::operator=(const Platform &other) = default;

TestKit::TestKit() = default;
TestKit::TestKit(const TestKit &other) = default;
TestKit &TestKit::operator=(const TestKit &other) = default;
TestKit::~TestKit() = default;

QString TestKit::TypeToName(KitType type)
{
    switch (type) {
    case USER_KIT:
        return QStringLiteral("User Kit");
    case TEST_KIT:
        return QStringLiteral("Test Kit");
    case PVS_KIT:
        return QStringLiteral("Pvs Kit");
    }
    return QStringLiteral("unknown");
}

QString GetToolsetSetting()
{
    return ReadVariable("KESTIX_TOOLSET");
}

QString GetPlatformsRoot()
{
    return ReadVariable("KESTIX_PLATFORMS_ALL");
}

QString GetPlatformSetting()
{
    return ReadVariable("KESTIX_PLATFORM");
}

QString GetTestSetSetting()
{
    return ReadVariable("KESTIX_TESTSET");
}

QString GetTestSetsRoot()
{
    const QString root = ReadVariable("KESTIX_TESTSETS_ALL");
    if (!root.isEmpty())
        return root;
    const QString separator = QDir::separator();
    return QDir::cleanPath(GetPlatformsRoot() + separator + QStringLiteral("..") + separator + QStringLiteral("Tests"));
}

bool GetDefaultPlatform(QString &out)
{
    out.clear();
    const QString setting = GetPlatformSetting();
    if (setting.isEmpty())
        return false;
    const qsizetype separator = LastSeparator(setting);
    out = separator >= 0 ? setting.left(separator) : setting;
    return true;
}

unsigned int GetPlatforms(QList<Platform> &out)
{
    out.clear();
    QString defaultPath;
    GetDefaultPlatform(defaultPath);
    // Compared cleaned, so that a root given with a trailing separator still
    // finds its default platform.
    const QString defaultUpper = QDir::cleanPath(defaultPath).toUpper();

    const QString root = GetPlatformsRoot();
    if (root.isEmpty())
        return 0;
    for (const QString &entry : ListSubDirectories(root)) {
        Platform platform;
        platform.path = root + QDir::separator() + entry;
        platform.isPro = entry.contains(QLatin1String("pro"), Qt::CaseInsensitive);
        platform.name = StripProWord(entry);
        platform.isDefault = !defaultUpper.isEmpty() && QDir::cleanPath(platform.path).toUpper() == defaultUpper;
        out.append(platform);
    }
    return static_cast<unsigned int>(out.size());
}

unsigned int GetProPlatforms(QList<Platform> &out)
{
    return AppendPlatforms(out, true);
}

unsigned int GetNonProPlatforms(QList<Platform> &out)
{
    return AppendPlatforms(out, false);
}

unsigned int GetTestKits(QList<TestKit> &out)
{
    out.clear();
    const QString root = QDir::cleanPath(GetTestSetsRoot());
    if (root.isEmpty())
        return 0;
    for (const QString &entry : ListSubDirectories(root)) {
        TestKit kit;
        kit.name = entry;
        kit.path = QDir::cleanPath(root + QDir::separator() + entry);
        kit.type = TestKit::TEST_KIT;
        kit.reserved = false;
        out.append(kit);
    }
    return static_cast<unsigned int>(out.size());
}

QString GetDefaultTestKitName()
{
    const QString setting = GetTestSetSetting();
    const qsizetype separator = LastSeparator(setting);
    return separator >= 0 ? setting.mid(separator + 1) : setting;
}

bool GetDefaultTestKit(TestKit &out)
{
    QList<TestKit> kits;
    if (GetTestKits(kits) == 0)
        return false;

    const QString name = GetDefaultTestKitName();
    if (!name.isEmpty()) {
        for (const TestKit &kit : kits) {
            if (kit.name == name) {
                out = kit;
                return true;
            }
        }
        return false;
    }

    // No kit named: the greatest name wins, whatever out held on entry.
    const TestKit *greatest = &kits.first();
    for (const TestKit &kit : kits) {
        if (kit.name > greatest->name)
            greatest = &kit;
    }
    out = *greatest;
    return true;
}

bool BreakPackageName(const QString &package, QString &first, QString &middle, QString &last)
{
    QString stem = package;
    stem.remove(QLatin1String(".kestix"), Qt::CaseInsensitive);
    const QStringList parts = stem.split(QLatin1Char('_'), Qt::KeepEmptyParts);
    if (parts.size() <= 2)
        return false;

    last = parts.at(parts.size() - 1);
    middle = parts.at(parts.size() - 2);
    // Joined from the back; an empty part leaves first empty, so the part
    // before it replaces rather than joins (callers pass first empty).
    for (qsizetype i = parts.size() - 3; i >= 0; --i)
        first = first.isEmpty() ? parts.at(i) : parts.at(i) + QLatin1Char('_') + first;
    return true;
}
