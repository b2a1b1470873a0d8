#include "catalogue/testmodule.h"

#include "catalogue/framework.h"
#include "common/stringhash.h"
#include "log/log.h"

#include <QFile>

namespace {

// A decimal attribute; ok tells whether it parsed.
unsigned int DecimalAttribute(const QDomElement &element, const QString &name, bool *ok)
{
    return element.attribute(name).toUInt(ok, 10);
}

unsigned int DecimalAttribute(const QDomElement &element, const QString &name,
                              unsigned int fallback)
{
    bool ok = false;
    const unsigned int value = DecimalAttribute(element, name, &ok);
    return ok ? value : fallback;
}

// attribute upper, or attribute lower when upper is empty.
QString EitherAttribute(const QDomElement &element, const char *upper, const char *lower)
{
    const QString value = element.attribute(QLatin1String(upper));
    return value.isEmpty() ? element.attribute(QLatin1String(lower)) : value;
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

    QDomDocument document;
    QString message;
    int line = 0;
    int column = 0;
    if (!document.setContent(&file, &message, &line, &column)) {
        errorText = QStringLiteral("Error processing oat xml file:") + path + QStringLiteral("\n\t")
            + message + QStringLiteral(": Line(%1) Column(%2)").arg(line).arg(column);
        return false;
    }
    file.close();

    LogMessage(QStringLiteral("Processing *ModuleXML:\n") + path + QStringLiteral("\n"), false);

    const QDomElement suite = document.documentElement().firstChildElement();
    const QString suiteTag = suite.tagName().toLower();
    if (suite.isNull()
        || (suiteTag != QLatin1String("suite") && suiteTag != QLatin1String("oatmodule"))) {
        errorText = QStringLiteral("Error processing module xml file:") + path + QStringLiteral("\n\t")
            + QStringLiteral("SUITE node not found.");
        return false;
    }

    moduleName = EitherAttribute(suite, "NAME", "name");
    family = EitherAttribute(suite, "FAMILY", "family");
    subFamily = EitherAttribute(suite, "SUBFAMILY", "subfamily");

    for (QDomElement child = suite.firstChildElement(); !child.isNull();
         child = child.nextSiblingElement()) {
        const QString tag = child.tagName().toLower();
        if (tag == QLatin1String("testcase")) {
            const QString name = EitherAttribute(child, "NAME", "name");
            QString type = child.attribute(QStringLiteral("TYPE"));
            if (type.isEmpty())
                type = child.attribute(QStringLiteral("type"), QStringLiteral("auto"));
            if (!name.isEmpty())
                testCases.append(TestCase(name, type));
        } else if (tag == QLatin1String("device_classids") || tag == QLatin1String("ddfusage")) {
            continue;
        } else if (tag == QLatin1String("minkestover")) {
            minKestoVersion = child.text();
        } else if (tag == QLatin1String("secondary_modules")) {
            secondaryModules.append(child.text());
        } else {
            LogMessage(QStringLiteral("   Unrecognized Node:") + child.tagName() + QStringLiteral("\n"),
                       false);
        }
    }
    return true;
}

bool _TestModule::ReadFromManifest(const QDomElement &element)
{
    moduleName = element.attribute(QStringLiteral("moduleName"));
    idHash = element.attribute(QStringLiteral("idhash"));
    source = element.attribute(QStringLiteral("source"));
    baseLineFile = element.attribute(QStringLiteral("baseLineFile"));
    sourcePath = element.attribute(QStringLiteral("sourcePath"));
    family = element.attribute(QStringLiteral("family"));
    subFamily = element.attribute(QStringLiteral("subFamily"));
    minKestoVersion = element.attribute(QStringLiteral("minKestoVersion"));

    for (QDomElement child = element.firstChildElement(); !child.isNull();
         child = child.nextSiblingElement()) {
        const QString tag = child.tagName().toLower();
        for (QDomElement item = child.firstChildElement(); !item.isNull();
             item = item.nextSiblingElement()) {
            const QString itemTag = item.tagName().toLower();
            if (tag == QLatin1String("targets") && itemTag == QLatin1String("target")) {
                QSharedPointer<_CompilerVariant> variant(new _CompilerVariant);
                if (variant->ReadFromXML(item))
                    targets.insert(variant->name, variant);
            } else if (tag == QLatin1String("applets") && itemTag == QLatin1String("applet")) {
                bool ok = false;
                Applet applet;
                applet.appletid = DecimalAttribute(item, QStringLiteral("appletid"), &ok);
                if (!ok)
                    continue;
                applet.hostid = DecimalAttribute(item, QStringLiteral("hostid"), 0u);
                applet.baseid = static_cast<quint16>(DecimalAttribute(item, QStringLiteral("baseid"), 1000u));
                applet.apptype = static_cast<quint16>(DecimalAttribute(item, QStringLiteral("apptype"), 0u));
                applet.privset = static_cast<quint16>(DecimalAttribute(item, QStringLiteral("privset"), 0u));
                applet.flags = static_cast<quint16>(DecimalAttribute(item, QStringLiteral("flags"), 0u));
                applets.append(applet);
            } else if (tag == QLatin1String("classids") && itemTag == QLatin1String("classid")) {
                const unsigned int value = DecimalAttribute(item, QStringLiteral("value"), 0u);
                if (value != 0)
                    classids.append(value);
            } else if (tag == QLatin1String("testcases") && itemTag == QLatin1String("testcase")) {
                TestCase testCase;
                testCase.ReadFromXML(item);
                testCases.append(testCase);
            } else if (tag == QLatin1String("secondary_modules")
                       && itemTag == QLatin1String("secondary_module")) {
                const QString name = item.attribute(QStringLiteral("name"));
                if (!name.isEmpty())
                    secondaryModules.append(name);
            }
        }
    }
    return !moduleName.isEmpty();
}

void _TestModule::WriteToManifest(QDomElement &element)
{
    QDomDocument document = element.ownerDocument();
    idHash = StringHashName(source + moduleName + family + subFamily);

    element.setAttribute(QStringLiteral("testtype"), TestType());
    element.setAttribute(QStringLiteral("idhash"), idHash);
    element.setAttribute(QStringLiteral("source"), source);
    element.setAttribute(QStringLiteral("moduleName"), moduleName);
    element.setAttribute(QStringLiteral("baseLineFile"), baseLineFile);
    element.setAttribute(QStringLiteral("sourcePath"), sourcePath);
    element.setAttribute(QStringLiteral("family"), family);
    element.setAttribute(QStringLiteral("subFamily"), subFamily);
    element.setAttribute(QStringLiteral("minKestoVersion"), minKestoVersion);

    if (!targets.isEmpty()) {
        QDomElement list = document.createElement(QStringLiteral("targets"));
        QList<QSharedPointer<_CompilerVariant>> sorted;
        ToList(targets, sorted);
        for (const auto &variant : std::as_const(sorted)) {
            QDomElement target = document.createElement(QStringLiteral("target"));
            variant->WriteToXML(target);
            list.appendChild(target);
        }
        element.appendChild(list);
    }

    if (!testCases.isEmpty()) {
        QDomElement list = document.createElement(QStringLiteral("testcases"));
        for (TestCase &testCase : testCases) {
            QDomElement item = document.createElement(QStringLiteral("testcase"));
            testCase.WriteToXML(item);
            list.appendChild(item);
        }
        element.appendChild(list);
    }

    if (!applets.isEmpty()) {
        QDomElement list = document.createElement(QStringLiteral("applets"));
        for (const Applet &applet : std::as_const(applets)) {
            QDomElement item = document.createElement(QStringLiteral("applet"));
            item.setAttribute(QStringLiteral("appletid"), QString::number(applet.appletid));
            item.setAttribute(QStringLiteral("appletidhex"), HexClassId(applet.appletid));
            item.setAttribute(QStringLiteral("hostid"), QString::number(applet.hostid));
            item.setAttribute(QStringLiteral("baseid"), QString::number(applet.baseid));
            item.setAttribute(QStringLiteral("apptype"), QString::number(applet.apptype));
            item.setAttribute(QStringLiteral("privset"), QString::number(applet.privset));
            item.setAttribute(QStringLiteral("flags"), QString::number(applet.flags));
            item.setAttribute(QStringLiteral("flagshex"),
                              QStringLiteral("0x%1").arg(applet.flags, 4, 16, QLatin1Char('0')));
            list.appendChild(item);
        }
        element.appendChild(list);
    }

    if (!classids.isEmpty()) {
        QDomElement list = document.createElement(QStringLiteral("classids"));
        for (const unsigned int id : std::as_const(classids)) {
            QDomElement item = document.createElement(QStringLiteral("classid"));
            item.setAttribute(QStringLiteral("value"), QString::number(id));
            item.setAttribute(QStringLiteral("valuehex"), HexClassId(id));
            list.appendChild(item);
        }
        element.appendChild(list);
    }

    QDomElement secondaries = document.createElement(QStringLiteral("secondary_modules"));
    for (const QString &name : std::as_const(secondaryModules)) {
        if (name.isEmpty())
            continue;
        QDomElement item = document.createElement(QStringLiteral("secondary_module"));
        item.setAttribute(QStringLiteral("name"), name);
        secondaries.appendChild(item);
    }
    if (secondaries.hasChildNodes())
        element.appendChild(secondaries);
}

QString _TestModule::HexModuleName()
{
    return QStringLiteral("0X%1").arg(KestoID(), 8, 16, QLatin1Char('0'));
}

unsigned int _TestModule::FirstAppletId() const
{
    return applets.isEmpty() ? 0 : applets.first().appletid;
}
