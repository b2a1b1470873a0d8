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
unsigned int DecimalAttribute(const XmlNode &element, const QString &name, bool *ok)
{
    return element.Attribute(name).toUInt(ok, 10);
}

unsigned int DecimalAttribute(const XmlNode &element, const QString &name, unsigned int fallback)
{
    bool ok = false;
    const unsigned int value = DecimalAttribute(element, name, &ok);
    return ok ? value : fallback;
}

// The manifest entry of module; true when it names the module.
bool ReadEntry(_TestModule &module, const XmlNode &element)
{
    module.moduleName = element.Attribute(QStringLiteral("moduleName"));
    module.idHash = element.Attribute(QStringLiteral("idhash"));
    module.source = element.Attribute(QStringLiteral("source"));
    module.baseLineFile = element.Attribute(QStringLiteral("baseLineFile"));
    module.sourcePath = element.Attribute(QStringLiteral("sourcePath"));
    module.family = element.Attribute(QStringLiteral("family"));
    module.subFamily = element.Attribute(QStringLiteral("subFamily"));
    module.minKestoVersion = element.Attribute(QStringLiteral("minKestoVersion"));

    element.ForEachChildElement([&module](const XmlNode &child) {
        const QString tag = child.Name().toLower();
        child.ForEachChildElement([&module, &tag](const XmlNode &item) {
            const QString itemTag = item.Name().toLower();
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
            } else if (tag == QLatin1String("secondary_modules") && itemTag == QLatin1String("secondary_module")) {
                const QString name = item.Attribute(QStringLiteral("name"));
                if (!name.isEmpty())
                    module.secondaryModules.append(name);
            }
        });
    });
    return !module.moduleName.isEmpty();
}

// The manifest entry of module.
void WriteEntry(_TestModule &module, XmlNode &element)
{
    module.idHash = StringHashName(module.source + module.moduleName + module.family + module.subFamily);

    element.SetAttribute(QStringLiteral("testtype"), module.TestType());
    element.SetAttribute(QStringLiteral("idhash"), module.idHash);
    element.SetAttribute(QStringLiteral("source"), module.source);
    element.SetAttribute(QStringLiteral("moduleName"), module.moduleName);
    element.SetAttribute(QStringLiteral("baseLineFile"), module.baseLineFile);
    element.SetAttribute(QStringLiteral("sourcePath"), module.sourcePath);
    element.SetAttribute(QStringLiteral("family"), module.family);
    element.SetAttribute(QStringLiteral("subFamily"), module.subFamily);
    element.SetAttribute(QStringLiteral("minKestoVersion"), module.minKestoVersion);

    if (!module.targets.isEmpty()) {
        XmlNode &list = element.AppendElement(QStringLiteral("targets"));
        QList<QSharedPointer<_CompilerVariant>> sorted;
        ToList(module.targets, sorted);
        for (const auto &variant : std::as_const(sorted)) {
            XmlNode &target = list.AppendElement(QStringLiteral("target"));
            variant->WriteToXML(target);
        }
    }

    if (!module.testCases.isEmpty()) {
        XmlNode &list = element.AppendElement(QStringLiteral("testcases"));
        for (TestCase &testCase : module.testCases) {
            XmlNode &item = list.AppendElement(QStringLiteral("testcase"));
            testCase.WriteToXML(item);
        }
    }

    if (!module.applets.isEmpty()) {
        XmlNode &list = element.AppendElement(QStringLiteral("applets"));
        for (const Applet &applet : std::as_const(module.applets)) {
            XmlNode &item = list.AppendElement(QStringLiteral("applet"));
            item.SetAttribute(QStringLiteral("appletid"), QString::number(applet.appletid));
            item.SetAttribute(QStringLiteral("appletidhex"), HexClassId(applet.appletid));
            item.SetAttribute(QStringLiteral("hostid"), QString::number(applet.hostid));
            item.SetAttribute(QStringLiteral("baseid"), QString::number(applet.baseid));
            item.SetAttribute(QStringLiteral("apptype"), QString::number(applet.apptype));
            item.SetAttribute(QStringLiteral("privset"), QString::number(applet.privset));
            item.SetAttribute(QStringLiteral("flags"), QString::number(applet.flags));
            item.SetAttribute(QStringLiteral("flagshex"),
                              QStringLiteral("0x%1").arg(applet.flags, 4, 16, QLatin1Char('0')));
        }
    }

    if (!module.classids.isEmpty()) {
        XmlNode &list = element.AppendElement(QStringLiteral("classids"));
        for (const unsigned int id : std::as_const(module.classids)) {
            XmlNode &item = list.AppendElement(QStringLiteral("classid"));
            item.SetAttribute(QStringLiteral("value"), QString::number(id));
            item.SetAttribute(QStringLiteral("valuehex"), HexClassId(id));
        }
    }

    const bool anySecondary = std::any_of(module.secondaryModules.cbegin(), module.secondaryModules.cend(),
                                          [](const QString &name) { return !name.isEmpty(); });
    if (anySecondary) {
        XmlNode &secondaries = element.AppendElement(QStringLiteral("secondary_modules"));
        for (const QString &name : std::as_const(module.secondaryModules)) {
            if (name.isEmpty())
                continue;
            XmlNode &item = secondaries.AppendElement(QStringLiteral("secondary_module"));
            item.SetAttribute(QStringLiteral("name"), name);
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

QSharedPointer<_CompilerVariant> _TestModule::GetCompilerVariant(IKestoDevice::Platform platform, bool debug)
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

    XmlParseError error;
    const std::unique_ptr<XmlNode> root = XmlNode::Parse(file.readAll(), &error);
    if (!root) {
        errorText = QStringLiteral("Error processing oat xml file:") + path + QStringLiteral("\n\t") + error.message
            + QStringLiteral(": Line(%1) Column(%2)").arg(error.line).arg(error.column);
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
            LogMessage(QStringLiteral("   Unrecognized Node:") + child->Name() + QStringLiteral("\n"), false);
        }
    }
    return true;
}

bool _TestModule::ReadFromManifest(const QDomElement &element)
{
    // The kinds read their own elements in the light-tree overload.
    return ReadFromManifest(*XmlNode::FromDom(element));
}

bool _TestModule::ReadFromManifest(const XmlNode &element)
{
    return ReadEntry(*this, element);
}

void _TestModule::WriteToManifest(QDomElement &element)
{
    XmlNode node(element.tagName());
    WriteToManifest(node);
    node.CopyTo(element);
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
