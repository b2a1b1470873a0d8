#include "modules/modulekinds.h"

#include "modules/ctfapplettestmodule.h"
#include "modules/ctftestmodule.h"
#include "modules/oatframework.h"
#include "modules/oattestmodule.h"
#include "modules/secondarymodule.h"
#include "modules/uttestmodule.h"

#include <QFileInfo>

namespace {

template <class Kind> QSharedPointer<_TestModule> Create()
{
    return QSharedPointer<_TestModule>(new Kind);
}

QSharedPointer<_Framework> CreateOatFramework()
{
    return QSharedPointer<_Framework>(new _OatFramework);
}

bool HasSuffix(const QString &path, const char *suffix)
{
    return QFileInfo(path).suffix().compare(QLatin1String(suffix), Qt::CaseInsensitive) == 0;
}

// CTF program logs are named "...-CTF-..." and applet logs are not; the CTF
// kind is asked first.
bool ReadsCtfLog(const QString &path)
{
    return HasSuffix(path, "log") && path.contains(QLatin1String("-ctf-"), Qt::CaseInsensitive);
}

bool ReadsCtfAppletLog(const QString &path)
{
    return HasSuffix(path, "log");
}

bool ReadsOatLog(const QString &path)
{
    return HasSuffix(path, "oat");
}

bool ReadsUtLog(const QString &path)
{
    return HasSuffix(path, "txt") || HasSuffix(path, "xml");
}

template <class Kind>
ModuleKind Entry(unsigned int frameworkClassId, bool (*readsLog)(const QString &),
                 QSharedPointer<_Framework> (*createFramework)() = nullptr)
{
    ModuleKind kind;
    kind.type = Kind::Type();
    kind.descriptionFile = Kind().ModuleXMLName();
    kind.frameworkClassId = frameworkClassId;
    kind.hasBaseLine = Kind::Type() == OatTestModule::Type();
    kind.fromPackageFolder = Kind::Type() == SecondaryModule::Type();
    kind.createModule = &Create<Kind>;
    kind.createFramework = createFramework;
    kind.readsLog = readsLog;
    return kind;
}

// Installs the table in the catalogue when the library is loaded.
[[maybe_unused]] const bool g_installed = (SetModuleKinds(&ModuleKindTable()), true);

} // namespace

const QList<ModuleKind> &ModuleKindTable()
{
    static const QList<ModuleKind> kinds{
        Entry<OatTestModule>(0x0107556Bu, &ReadsOatLog, &CreateOatFramework),
        Entry<CtfTestModule>(0x0102F2AAu, &ReadsCtfLog),
        Entry<CtfAppletTestModule>(0x010C02E5u, &ReadsCtfAppletLog),
        Entry<UTTestModule>(0x010421E8u, &ReadsUtLog),
        Entry<SecondaryModule>(0, nullptr),
    };
    return kinds;
}
