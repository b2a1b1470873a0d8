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
    // Strings in the handset encodings (AddString, GetString).
    static constexpr quint16 kTypeStrings = 0x0001;
    // MIME-typed objects (AddMimeObject, GetMimeObject).
    static constexpr quint16 kTypeObjects = 0x0006;
    // Raw binaries; the module information lives under IDs 0 ... 5.
    static constexpr quint16 kTypeBinaries = 0x5000;
    // System resources (GetSysResource).
    static constexpr quint16 kTypeSysResource = 0x6000;
    // The list of privileges granted.
    static constexpr quint16 kTypeGrantedPrivileges = 0x6001;
    // The list of privileges required.
    static constexpr quint16 kTypeRequiredPrivileges = 0x6002;
    // Privilege data.
    static constexpr quint16 kTypePrivilegeData = 0x6011;

    KestoResources();
    ~KestoResources();
    // Copies the stream (deeply) and the last error text.
    KestoResources(const KestoResources &other);
    // Replaces the stream by a deep copy of other's; copies the last error text.
    KestoResources &operator=(const KestoResources &other);

    // ResourceStream::Load, Save and LoadFrom.
    bool Read(const QString &path);
    // See Read().
    bool Write(const QString &path);
    // See Read().
    bool LoadFrom(const QByteArray &bytes);
    // ResourceStream::SaveTo: the file format in memory.
    bool SaveTo(QByteArray &bytes);

    // The last error text, emptied by the call.
    QString LastError();

    // Replaces types by the resource types in the table, ascending (a type
    // stays listed after its last ID is cleared); returns their count.
    unsigned int GetResourceTypes(QVector<quint16> &types);
    // Replaces ids by the IDs of type, ascending; returns their count (0 for an unknown type).
    unsigned int GetIDs(quint16 type, QVector<quint16> &ids);
    // Removes the block under (type, id); nothing when there is none.
    void Clear(quint16 type, quint16 id);
    // Empties the table, the stream's name and its file structures.
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

    // Stores data as it stands under (type, id), replacing any block there; always true.
    bool AddBinary(quint16 type, quint16 id, const QByteArray &data);
    // data = the block (null when absent); true when it is not empty.
    bool GetBinary(quint16 type, quint16 id, QByteArray &data);

    // Replaces formats by every known string format with its name; returns their count.
    unsigned int GetFormats(QList<QPair<unsigned int, QString>> &formats);
    // The name of a string format, as QEncoding::Format2Name gives it.
    QString GetFormatName(quint16 format);
    // "Strings", "Objects", "Binaries", "Sys Resource" or a privilege list's
    // name for the fixed types; "Type: N (0xNNNN)" for any other.
    QString GetResourceTypeName(quint16 type);

    // The well-known strings (type 1, IDs 6, 7 and 8); empty when absent or
    // not decodable.
    QString GetCompanyName();
    // See GetCompanyName().
    QString GetCopyright();
    // See GetCompanyName().
    QString GetApplicationVersion();

    // A pseudo-random class ID (0 ... 16,777,216) seeded from the current
    // second: two calls within one second give the same value.
    unsigned int GenerateLocalClassID();

    // Copies the stream's header fields (those last read or written) into the
    // arguments; always true.
    bool ResourceHeader(quint8 &fileType, quint16 &version, quint16 &oldestCodeVersion, quint16 &mapEntries,
                        quint32 &offsetToMap, quint32 &lengthOfMap, quint32 &offsetToEntries, quint32 &resourceCount,
                        quint32 &offsetToResources, quint32 &lengthOfResources);
    // ResourceStream::Dump: a text rendering of the file structures.
    QString Dump();

    // Module information (type 0x5000, IDs 0 ... 5). The list getters clear
    // their output first. Records are read only inside their block.
    // GetMifEntry fills entry from every block present; false (entry
    // untouched) without a readable header block.
    bool GetMifEntry(MifEntry &entry);
    // False (header untouched) when block 0 is absent or shorter than 40 bytes.
    bool GetMifHeader(MifHeader &header);
    // Class IDs of block 1, up to the first 0 or 0xFFFFFFFF; false when the block is absent or empty.
    bool GetMifClasses(QVector<unsigned int> &classes);
    // The 20-byte records of block 2 (a shorter trailing one is dropped);
    // false when the block is absent or empty.
    bool GetMifApplets(QVector<Applet> &applets);
    // Class IDs of block 3, read as GetMifClasses reads block 1.
    bool GetMifExternalClasses(QVector<unsigned int> &classes);
    // The records of block 4, as many as the header announces and the block
    // holds; false when the block is absent or empty.
    bool GetMifNotifications(QVector<Notifier> &notifications);
    // The records of block 5, as many as the header announces and the block
    // holds (a text without its NUL ends the list); false when the block is absent or empty.
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
