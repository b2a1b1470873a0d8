#include "catalogue/testmodule.h"

#include "catalogue/framework.h"
#include "common/stringhash.h"
#include "common/xmlnode.h"
#include "log/log.h"

#include <QFile>

#include <algorithm>

namespace {

// attribute upper, or attribute lower when upper is empty.
QString EitherAttribute(const XmlNode &element, const char *upper, const char *lower)
{
    const QString value = element.Attribute(QLatin1String(upper));
    return value.isEmpty() ? element.Attribute(QLatin1String(lower)) : value;
}

// A decimal attribute; ok tells whether it parsed.
template <class Element>
unsigned int DecimalAttribute(const Element &element, const QString &name, bool *ok)
{
    return XmlRead::Attribute(element, name).toUInt(ok, 10);
}

template <class Element>
unsigned int DecimalAttribute(const Element &element, const QString &name, unsigned int fallback)
{
    bool ok = false;
    const unsigned int value = DecimalAttribute(element, name, &ok);
    return ok ? value : fallback;
}

// The manifest entry of module, from a DOM element or a light one; true
// when it names the module.
template <class Element>
bool ReadEntry(_TestModule &module, const Element &element)
{
    using namespace XmlRead;
    module.moduleName = Attribute(element, QStringLiteral("moduleName"));
    module.idHash = Attribute(element, QStringLiteral("idhash"));
    module.source = Attribute(element, QStringLiteral("source"));
    module.baseLineFile = Attribute(element, QStringLiteral("baseLineFile"));
    module.sourcePath = Attribute(element, QStringLiteral("sourcePath"));
    module.family = Attribute(element, QStringLiteral("family"));
    module.subFamily = Attribute(element, QStringLiteral("subFamily"));
    module.minKestoVersion = Attribute(element, QStringLiteral("minKestoVersion"));

    ForEachChild(element, [&module](const auto &child) {
        const QString tag = TagName(child).toLower();
        ForEachChild(child, [&module, &tag](const auto &item) {
            const QString itemTag = TagName(item).toLower();
            if (tag == QLatin1String("targets") && itemTag == QLatin1String("target")) {
                QSharedPointer<_CompilerVariant> variant(new _CompilerVariant);
                if (variant->ReadFromXML(item))
                    module.targets.insert(variant->name, variant);
            } else if (tag == QLatin1String("applets") && itemTag == QLatin1String("applet")) {
                bool ok = false;
                Applet applet;
                applet.appletid = DecimalAttribute(item, QStringLiteral("appletid"), &ok);
                if (!ok)
                    return;
                applet.hostid = DecimalAttribute(item, QStringLiteral("hostid"), 0u);
                applet.baseid = static_cast<quint16>(DecimalAttribute(item, QStringLiteral("baseid"), 1000u));
                applet.apptype = static_cast<quint16>(DecimalAttribute(item, QStringLiteral("apptype"), 0u));
                applet.privset = static_cast<quint16>(DecimalAttribute(item, QStringLiteral("privset"), 0u));
                applet.flags = static_cast<quint16>(DecimalAttribute(item, QStringLiteral("flags"), 0u));
                module.applets.append(applet);
            } else if (tag == QLatin1String("classids") && itemTag == QLatin1String("classid")) {
                const unsigned int value = DecimalAttribute(item, QStringLiteral("value"), 0u);
                if (value != 0)
                    module.classids.append(value);
            } else if (tag == QLatin1String("testcases") && itemTag == QLatin1String("testcase")) {
                TestCase testCase;
                testCase.ReadFromXML(item);
                module.testCases.append(testCase);
            } else if (tag == QLatin1String("secondary_modules")
                       && itemTag == QLatin1String("secondary_module")) {
                const QString name = Attribute(item, QStringLiteral("name"));
                if (!name.isEmpty())
                    module.secondaryModules.append(name);
            }
        });
    });
    return !module.moduleName.isEmpty();
}

// The manifest entry of module, into a DOM element or a light one.
template <class Element>
void WriteEntry(_TestModule &module, Element &element)
{
    using namespace XmlBuild;
    module.idHash =
        StringHashName(module.source + module.moduleName + module.family + module.subFamily);

    SetAttribute(element, QStringLiteral("testtype"), module.TestType());
    SetAttribute(element, QStringLiteral("idhash"), module.idHash);
    SetAttribute(element, QStringLiteral("source"), module.source);
    SetAttribute(element, QStringLiteral("moduleName"), module.moduleName);
    SetAttribute(element, QStringLiteral("baseLineFile"), module.baseLineFile);
    SetAttribute(element, QStringLiteral("sourcePath"), module.sourcePath);
    SetAttribute(element, QStringLiteral("family"), module.family);
    SetAttribute(element, QStringLiteral("subFamily"), module.subFamily);
    SetAttribute(element, QStringLiteral("minKestoVersion"), module.minKestoVersion);

    if (!module.targets.isEmpty()) {
        auto &&list = AppendElement(element, QStringLiteral("targets"));
        QList<QSharedPointer<_CompilerVariant>> sorted;
        ToList(module.targets, sorted);
        for (const auto &variant : std::as_const(sorted)) {
            auto &&target = AppendElement(list, QStringLiteral("target"));
            variant->WriteToXML(target);
        }
    }

    if (!module.testCases.isEmpty()) {
        auto &&list = AppendElement(element, QStringLiteral("testcases"));
        for (TestCase &testCase : module.testCases) {
            auto &&item = AppendElement(list, QStringLiteral("testcase"));
            testCase.WriteToXML(item);
        }
    }

    if (!module.applets.isEmpty()) {
        auto &&list = AppendElement(element, QStringLiteral("applets"));
        for (const Applet &applet : std::as_const(module.applets)) {
            auto &&item = AppendElement(list, QStringLiteral("applet"));
            SetAttribute(item, QStringLiteral("appletid"), QString::number(applet.appletid));
            SetAttribute(item, QStringLiteral("appletidhex"), HexClassId(applet.appletid));
            SetAttribute(item, QStringLiteral("hostid"), QString::number(applet.hostid));
            SetAttribute(item, QStringLiteral("baseid"), QString::number(applet.baseid));
            SetAttribute(item, QStringLiteral("apptype"), QString::number(applet.apptype));
            SetAttribute(item, QStringLiteral("privset"), QString::number(applet.privset));
            SetAttribute(item, QStringLiteral("flags"), QString::number(applet.flags));
            SetAttribute(item, QStringLiteral("flagshex"),
                         QStringLiteral("0x%1").arg(applet.flags, 4, 16, QLatin1Char('0')));
        }
    }

    if (!module.classids.isEmpty()) {
        auto &&list = AppendElement(element, QStringLiteral("classids"));
        for (const unsigned int id : std::as_const(module.classids)) {
            auto &&item = AppendElement(list, QStringLiteral("classid"));
            SetAttribute(item, QStringLiteral("value"), QString::number(id));
            SetAttribute(item, QStringLiteral("valuehex"), HexClassId(id));
        }
    }

    const bool anySecondary = std::any_of(module.secondaryModules.cbegin(), module.secondaryModules.cend(),
                                          [](const QString &name) { return !name.isEmpty(); });
    if (anySecondary) {
        auto &&secondaries = AppendElement(element, QStringLiteral("secondary_modules"));
        for (const QString &name : std::as_const(module.secondaryModules)) {
            if (name.isEmpty())
                continue;
            auto &&item = AppendElement(secondaries, QStringLiteral("secondary_module"));
            SetAttribute(item, QStringLiteral("name"), name);
        }
    }
}

} // namespace

_TestModule::_TestModule() = default;
_TestModule::~_TestModule() = default;

void _TestModule::SetLogger(Log *log)
{
    logger = log;
}

void _TestModule::LogMessage(const QString &text, bool flag)
{
    if (logger)
        logger->LogMessage(text, flag);
}

QString _TestModule::IDHash()
{
    return idHash;
}

void _TestModule::SetSource(const QString &text)
{
    source = text;
}

QString _TestModule::Source()
{
    return source;
}

void _TestModule::SetRunOption(const QString &option)
{
    runOption = option;
}

void _TestModule::SetTestCases(const QStringList &cases)
{
    selectedTestCases = cases;
}

void _TestModule::AddDesktopLogFile(const QString &path)
{
    desktopLogFiles.append(path);
}

QSharedPointer<_CompilerVariant> _TestModule::GetCompilerVariant(IKestoDevice::Platform platform,
                                                                 bool debug)
{
    const QLatin1String wanted = debug ? QLatin1String("debug") : QLatin1String("release");
    QSharedPointer<_CompilerVariant> last;
    for (auto it = targets.cbegin(); it != targets.cend(); ++it) {
        const QSharedPointer<_CompilerVariant> &variant = it.value();
        if (!variant || variant->arch != platform)
            continue;
        if (variant->build.toLower().contains(wanted))
            return variant;
        last = variant;
    }
    return last;
}

bool _TestModule::ProcessPackage(const QString &)
{
    return true;
}

bool _TestModule::ProcessModuleXML(const QString &path)
{
    errorText.clear();
    QFile file(path);
    if (!file.exists() || !file.open(QIODevice::ReadOnly))
        return false;

    QString message;
    int line = 0;
    int column = 0;
    const std::unique_ptr<XmlNode> root = XmlNode::Parse(file.readAll(), &message, &line, &column);
    if (!root) {
        errorText = QStringLiteral("Error processing oat xml file:") + path + QStringLiteral("\n\t")
            + message + QStringLiteral(": Line(%1) Column(%2)").arg(line).arg(column);
        return false;
    }
    file.close();

    LogMessage(QStringLiteral("Processing *ModuleXML:\n") + path + QStringLiteral("\n"), false);

    const XmlNode *suite = root->FirstChildElement();
    const QString suiteTag = suite ? suite->Name().toLower() : QString();
    if (suiteTag != QLatin1String("suite") && suiteTag != QLatin1String("oatmodule")) {
        errorText = QStringLiteral("Error processing module xml file:") + path + QStringLiteral("\n\t")
            + QStringLiteral("SUITE node not found.");
        return false;
    }

    moduleName = EitherAttribute(*suite, "NAME", "name");
    family = EitherAttribute(*suite, "FAMILY", "family");
    subFamily = EitherAttribute(*suite, "SUBFAMILY", "subfamily");

    for (const XmlNode *child : suite->ChildElements()) {
        const QString tag = child->Name().toLower();
        if (tag == QLatin1String("testcase")) {
            const QString name = EitherAttribute(*child, "NAME", "name");
            QString type = child->Attribute(QStringLiteral("TYPE"));
            if (type.isEmpty())
                type = child->Attribute(QStringLiteral("type"), QStringLiteral("auto"));
            if (!name.isEmpty())
                testCases.append(TestCase(name, type));
        } else if (tag == QLatin1String("device_classids") || tag == QLatin1String("ddfusage")) {
            continue;
        } else if (tag == QLatin1String("minkestover")) {
            minKestoVersion = child->InnerText();
        } else if (tag == QLatin1String("secondary_modules")) {
            secondaryModules.append(child->InnerText());
        } else {
            LogMessage(QStringLiteral("   Unrecognized Node:") + child->Name() + QStringLiteral("\n"),
                       false);
        }
    }
    return true;
}

bool _TestModule::ReadFromManifest(const QDomElement &element)
{
    return ReadEntry(*this, element);
}

bool _TestModule::ReadFromManifest(const XmlNode &element)
{
    return ReadEntry(*this, element);
}

void _TestModule::WriteToManifest(QDomElement &element)
{
    WriteEntry(*this, element);
}

void _TestModule::WriteToManifest(XmlNode &element)
{
    WriteEntry(*this, element);
}

QString _TestModule::HexModuleName()
{
    return QStringLiteral("0X%1").arg(KestoID(), 8, 16, QLatin1Char('0'));
}

unsigned int _TestModule::FirstAppletId() const
{
    return applets.isEmpty() ? 0 : applets.first().appletid;
}
