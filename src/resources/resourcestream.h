#pragma once

#include "../common/export.h"

#include <QByteArray>
#include <QMap>
#include <QString>
#include <QVector>

// The 32-byte header of a compiled resource file, field by field.
class HARNESS_EXPORT ResourceHeader
{
public:
    ResourceHeader() = default;
    // Back to the values of a new header.
    void Reset() { *this = ResourceHeader(); }

    quint8 fileType = 17; // the file type byte; 17 in a new header
    quint8 reserved = 0; // carried as stored
    quint16 version = 1; // the version field; 1 in a new header
    quint16 oldestCodeVersion = 1; // the oldest code version field; 1 in a new header
    quint16 mapEntries = 0; // number of map entries
    quint32 offsetToMap = 32; // file offset of the map, in bytes (32: just after the header)
    quint32 lengthOfMap = 0; // size of the map in bytes (8 per entry)
    quint32 offsetToEntries = 0; // file offset of the offset table, in bytes
    quint32 resourceCount = 0; // number of (type, ID) pairs; the offset table holds one offset more
    quint32 offsetToResources = 0; // file offset of the first block, in bytes
    quint32 lengthOfResources = 0; // total size of the stored blocks, in bytes
};

// One entry of a resource file's map: the IDs beginningResId ...
// beginningResId + additionalResId of `type`, whose k-th ID has the block with
// index offsetIndex + k.
struct HARNESS_EXPORT FileMapEntry
{
    quint16 type = 0; // the resource type of the range
    quint16 beginningResId = 0; // the first ID of the range
    quint16 additionalResId = 0; // the number of IDs after the first (0 for one ID)
    quint16 offsetIndex = 0; // the index in the offset table of the first ID's block
};

// One (type, ID, block) of a resource table.
struct HARNESS_EXPORT ResourceEntry
{
    quint32 compareMode = 0; // how operator< compares; 0 (by type, then ID) unless set
    quint16 type = 0; // the resource type
    quint16 id = 0; // the resource ID within type
    QByteArray data; // the block's bytes

    // With compareMode 1 on the left: by the block bytes as C strings;
    // otherwise by type, then ID.
    bool operator<(const ResourceEntry &other) const;
};

// A compiled resource file (".kar", ".mif") in memory: a table of byte
// blocks keyed by resource type and ID, read from and written to the file
// format (header, map of ID ranges, offset table, distinct blocks stored
// once).
//
// The table is the content; the header and the file structures are rebuilt
// at every save and replaced at every load. Loading is all or nothing: input
// whose counts, offsets or map ranges point past what it holds is rejected
// (false) and leaves the stream as it was, and nothing is allocated for a
// count the input does not back with bytes.
//
// Copies are deep: each ResourceStream owns its own table, header and file
// structures.
class HARNESS_EXPORT ResourceStream
{
public:
    ResourceStream();
    ~ResourceStream();
    // Copies the name, the table, the header and the file structures.
    ResourceStream(const ResourceStream &other);
    // Replaces everything by a copy of other's.
    ResourceStream &operator=(const ResourceStream &other);

    // Reads a resource file. False when path is empty, the file cannot be
    // read or its content is not a well-formed resource file; the stream is
    // then unchanged. On success path becomes the stream's name.
    bool Load(const QString &path);
    // Reads the file format from memory; the name is unchanged.
    bool LoadFrom(const QByteArray &bytes);
    // Writes the table to path (or, when path is empty, to the file last
    // loaded or saved). False when there is no path, the table holds no
    // block, the table does not fit the format (more than 65,535 blocks,
    // 4 GiB of data) or the file cannot be written; an existing file is then
    // unchanged.
    bool Save(const QString &path);
    // Writes the file format into bytes; false (bytes unchanged) when the
    // table cannot be saved.
    bool SaveTo(QByteArray &bytes);

    // Stores data under (type, id), replacing any block there.
    void AddResource(quint16 type, quint16 id, const QByteArray &data);
    // Removes (type, id); the type stays listed even with no ID left.
    void DeleteResource(quint16 type, quint16 id);
    // The block under (type, id), or a null array.
    QByteArray GetResource(quint16 type, quint16 id) const;
    // Replaces types by the types in the table, ascending (also those left
    // with no ID); returns their count.
    unsigned int GetResourceTypes(QVector<quint16> &types) const;
    // Replaces ids by the IDs of type, ascending; returns their count (0 for an unknown type).
    unsigned int GetResourceIDs(quint16 type, QVector<quint16> &ids) const;
    // Replaces entries by every (type, ID, block) of the table in type, then
    // ID order (compareMode 0); returns their count.
    unsigned int GetResources(QVector<ResourceEntry> &entries) const;

    // Empties the name, the table and the file structures; default header.
    void Clear();
    // The path last loaded or saved; empty when none.
    QString Name() const { return m_name; }
    // The header as last read or written (a new header's values after Clear); never null.
    const ResourceHeader *GetResourceHeader() const { return &m_header; }
    // A text rendering of the header, map, offset table and blocks as last
    // read or written.
    QString Dump() const;

private:
    bool ProcessStructures();
    bool Decompress();
    bool Parse(const QByteArray &bytes);
    QByteArray Serialize() const;

    QString m_name;
    QMap<quint16, QMap<quint16, QByteArray>> m_table;
    ResourceHeader m_header;
    QVector<FileMapEntry> _fileMap;
    QVector<quint32> _offsetTable;
    QVector<QByteArray> _resources;
};
