#pragma once

#include "../common/export.h"
#include "../device/device.h"

#include <QDomElement>
#include <QList>
#include <QMap>
#include <QSharedPointer>
#include <QString>
#include <QStringList>

class XmlNode;

// One build of one package for one handset architecture.
class HARNESS_EXPORT _CompilerVariant
{
public:
    _CompilerVariant();
    ~_CompilerVariant();

    // packagePath when there is one, else binPath.
    QString VariantPath();

    // Reads the attributes and the "files" list of element. Returns false when
    // the element has no "name" (the other fields then hold what was read).
    bool ReadFromXML(const QDomElement &element);
    // The same, from an XmlNode.
    bool ReadFromXML(const XmlNode &element);
    // Writes every attribute (even empty ones) and, when there are files, a
    // "files" child holding one "File" element per path.
    void WriteToXML(QDomElement &element);
    // The same, into an XmlNode.
    void WriteToXML(XmlNode &element);

    // The variant's name (attribute "name"); never empty once read.
    QString name;
    // The variant label (attribute "variant"); may be empty.
    QString variant;
    // Host path of the built binaries (attribute "binpath"); empty when none.
    QString binPath;
    // Host path of the installable package (attribute "packagepath"); empty when none.
    QString packagePath;
    // The handset architecture built for (attribute "arch"); PLATFORM_UNKNOWN when not recognised.
    IKestoDevice::Platform arch = IKestoDevice::PLATFORM_UNKNOWN;
    // The build type (attribute "build"); may be empty.
    QString build;
    // Paths of the files making up the variant, from the "files" list.
    QStringList files;
};

// Replaces out by the variants of map sorted by name; returns their count.
HARNESS_EXPORT unsigned int ToList(const QMap<QString, QSharedPointer<_CompilerVariant>> &map,
                                   QList<QSharedPointer<_CompilerVariant>> &out);
