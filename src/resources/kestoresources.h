#pragma once

#include "../common/export.h"
#include "mif.h"
#include "resourcestream.h"
#include "sysresource.h"

#include <QByteArray>
#include <QList>
#include <QPair>
#include <QString>
#include <QVector>

#include <memory>

// Typed access to a compiled resource file: strings in the handset encodings,
// MIME-typed objects, binaries, module-information records and system
// resources, on top of one owned ResourceStream.
//
// Resource types with a fixed meaning: 1 strings, 6 MIME objects, 0x5000
// binaries (module information under IDs 0 ... 5), 0x6000 system resources,
// 0x6001 / 0x6002 privilege lists, 0x6011 privilege data.
//
// Queries report absence through their result (false, 0 or an empty string).
// Copies are deep: each KestoResources owns its own stream.
class HARNESS_EXPORT KestoResources
{
public:
    static constexpr quint16 kTypeStrings = 0x0001;
    static constexpr quint16 kTypeObjects = 0x0006;
    static constexpr quint16 kTypeBinaries = 0x5000;
    static constexpr quint16 kTypeSysResource = 0x6000;
    static constexpr quint16 kTypeGrantedPrivileges = 0x6001;
    static constexpr quint16 kTypeRequiredPrivileges = 0x6002;
    static constexpr quint16 kTypePrivilegeData = 0x6011;

    KestoResources();
    ~KestoResources();
    KestoResources(const KestoResources &other);
    KestoResources &operator=(const KestoResources &other);

    // ResourceStream::Load, Save and LoadFrom.
    bool Read(const QString &path);
    bool Write(const QString &path);
    bool LoadFrom(const QByteArray &bytes);
    // ResourceStream::SaveTo: the file format in memory.
    bool SaveTo(QByteArray &bytes);

    // The last error text, emptied by the call.
    QString LastError();

    unsigned int GetResourceTypes(QVector<quint16> &types);
    unsigned int GetIDs(quint16 type, QVector<quint16> &ids);
    void Clear(quint16 type, quint16 id);
    void ClearAll();

    // Stores the mark of `format` followed by the text: UTF-16 little-endian
    // for format 0, the format's converter otherwise (an empty block for a
    // format without one). Always true.
    bool AddString(quint16 type, quint16 id, quint16 format, const QString &text);
    // The text of a string resource and the format detected from its mark;
    // false (format and text untouched) for an absent or empty block or an
    // unknown mark.
    bool GetString(quint16 type, quint16 id, quint16 *format, QString &text);

    // Objects are stored as: a count byte N (MIME type length + 1), a zero
    // byte, the N bytes of the MIME type (Latin-1) and its NUL, a zero byte,
    // then the object bytes. A MIME type longer than 128 bytes is refused.
    bool AddMimeObject(quint16 type, quint16 id, const QString &mimeType, const QByteArray &data);
    // False for an absent block, or one too short for the lengths it holds.
    bool GetMimeObject(quint16 type, quint16 id, QString &mimeType, QByteArray &data);

    bool AddBinary(quint16 type, quint16 id, const QByteArray &data);
    // data = the block (null when absent); true when it is not empty.
    bool GetBinary(quint16 type, quint16 id, QByteArray &data);

    unsigned int GetFormats(QList<QPair<unsigned int, QString>> &formats);
    QString GetFormatName(quint16 format);
    QString GetResourceTypeName(quint16 type);

    QString GetCompanyName();
    QString GetCopyright();
    QString GetApplicationVersion();

    // A pseudo-random class ID (0 ... 16,777,216) seeded from the current
    // second: two calls within one second give the same value.
    unsigned int GenerateLocalClassID();

    bool ResourceHeader(quint8 &fileType, quint16 &version, quint16 &oldestCodeVersion, quint16 &mapEntries,
                        quint32 &offsetToMap, quint32 &lengthOfMap, quint32 &offsetToEntries, quint32 &resourceCount,
                        quint32 &offsetToResources, quint32 &lengthOfResources);
    QString Dump();

    // Module information (type 0x5000, IDs 0 ... 5). Each clears its output
    // first. Records are read only inside their block.
    bool GetMifEntry(MifEntry &entry);
    bool GetMifHeader(MifHeader &header);
    bool GetMifClasses(QVector<unsigned int> &classes);
    bool GetMifApplets(QVector<Applet> &applets);
    bool GetMifExternalClasses(QVector<unsigned int> &classes);
    bool GetMifNotifications(QVector<Notifier> &notifications);
    bool GetMifMimeTypes(QVector<MimeType> &mimeTypes);
    // The system resource (0x6000, id), decoded; false when absent or empty.
    bool GetSysResource(unsigned int id, SysResource &record);

    // The stream itself, for callers that need the raw table.
    ResourceStream *Stream() { return m_stream.get(); }

private:
    bool GetClassList(quint16 id, QVector<unsigned int> &classes);
    QString GetWellKnownString(quint16 id);

    std::unique_ptr<ResourceStream> m_stream;
    QString m_lastError;
};
