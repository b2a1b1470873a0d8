#pragma once

#include "../common/export.h"
#include "../device/device.h"
#include "compilervariant.h"

#include <QDomElement>
#include <QMap>
#include <QSharedPointer>
#include <QString>

class Log;

// A named component that must be on the handset before the tests that use
// it: identified by the class ID of its main component and available in one
// compiler variant per handset architecture.
class HARNESS_EXPORT _Framework
{
public:
    _Framework();
    virtual ~_Framework();
    _Framework(const _Framework &) = delete;
    _Framework &operator=(const _Framework &) = delete;

    // The message sink (not owned; null silences).
    void SetLogger(Log *logger);
    // Writes message to the logger, echoed when flag is set; nothing without a logger.
    void LogMessage(const QString &message, bool flag);

    // The first variant, in name order, built for platform; null when none.
    QSharedPointer<_CompilerVariant> GetVariant(IKestoDevice::Platform platform);

    // Reads "name", the "variant" children and "classid". False without a name.
    bool ReadFromManifest(const QDomElement &element);
    // The same, from an XmlNode.
    bool ReadFromManifest(const XmlNode &element);
    // Writes "name", one "variant" child per variant in name order and a
    // "classid" child with the decimal "value" and the "valuehex" form.
    void WriteToManifest(QDomElement &element);
    // The same, into an XmlNode.
    void WriteToManifest(XmlNode &element);

    // True when the framework's module is installed on the handset (false
    // when the class ID is unknown).
    virtual bool IsLoaded(IKestoDevice *device);
    // Installs the variant for the handset's platform; false when there is
    // none or the handset refuses the package.
    virtual bool Load(IKestoDevice *device, QMap<QString, QString> &environment);
    // Readies a loaded framework for the run; the base framework does nothing and returns true.
    virtual bool PostLoad(IKestoDevice *device, QMap<QString, QString> &environment);
    // Removes the framework's handset directory.
    virtual void Unload(IKestoDevice *device, QMap<QString, QString> &environment);
    // Works on the run's logs before they are parsed; the base framework does nothing.
    virtual void PostProcess(QMap<QString, QString> &environment);

    // The message sink; not owned.
    Log *logger = nullptr;
    // The framework's name (attribute "name"); never empty once read.
    QString name;
    // The class ID of the framework's main component; 0 when unknown.
    unsigned int classId = 0;
    // The compiler variants, keyed by variant name.
    QMap<QString, QSharedPointer<_CompilerVariant>> variants;
};

// "fs:/~0x0000abcd": the handset directory of the module providing classId.
HARNESS_EXPORT QString ClassDirectory(unsigned int classId);
// "0x0000abcd": a class ID as manifests write it beside its decimal value.
HARNESS_EXPORT QString HexClassId(unsigned int classId);
