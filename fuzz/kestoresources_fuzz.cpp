// Reads arbitrary bytes as a compiled resource file and runs every query on
// what loads.
#include "resources/kestoresources.h"

#include <QDomDocument>

#include <cstddef>
#include <cstdint>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    KestoResources resources;
    if (!resources.LoadFrom(QByteArray(reinterpret_cast<const char *>(data), int(size))))
        return 0;
    resources.Dump();
    MifEntry entry;
    resources.GetMifEntry(entry);
    MifHeader header;
    resources.GetMifHeader(header);
    QVector<unsigned int> classes;
    resources.GetMifClasses(classes);
    resources.GetMifExternalClasses(classes);
    QVector<Applet> applets;
    resources.GetMifApplets(applets);
    QVector<Notifier> notifications;
    resources.GetMifNotifications(notifications);
    QVector<MimeType> mimeTypes;
    resources.GetMifMimeTypes(mimeTypes);
    resources.GetCompanyName();
    resources.GetCopyright();
    resources.GetApplicationVersion();
    QVector<quint16> types;
    resources.GetResourceTypes(types);
    for (quint16 type : types) {
        QVector<quint16> ids;
        resources.GetIDs(type, ids);
        for (quint16 id : ids) {
            quint16 format = 0;
            QString text;
            resources.GetString(type, id, &format, text);
            QString mimeType;
            QByteArray bytes;
            resources.GetMimeObject(type, id, mimeType, bytes);
            resources.GetBinary(type, id, bytes);
            if (type == KestoResources::kTypeSysResource) {
                SysResource record;
                resources.GetSysResource(id, record);
                QDomDocument document;
                QDomElement element = document.createElement(QStringLiteral("program"));
                record.WriteToXML(element);
                SysResource back;
                back.ReadFromXML(element);
            }
        }
    }
    QByteArray saved;
    resources.SaveTo(saved);
    return 0;
}
