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

    quint8 fileType = 17;
    quint8 reserved = 0;
    quint16 version = 1;
    quint16 oldestCodeVersion = 1;
    quint16 mapEntries = 0;
    quint32 offsetToMap = 32;
    quint32 lengthOfMap = 0;
    quint32 offsetToEntries = 0;
    quint32 resourceCount = 0;
    quint32 offsetToResources = 0;
    quint32 lengthOfResources = 0;
};

// One entry of a resource file's map: the IDs beginningResId ...
// beginningResId + additionalResId of `type`, whose k-th ID has the block with
// index offsetIndex + k.
struct HARNESS_EXPORT FileMapEntry
{
    quint16 type = 0;
    quint16 beginningResId = 0;
    quint16 additionalResId = 0;
    quint16 offsetIndex = 0;
};

// One (type, ID, block) of a resource table.
struct HARNESS_EXPORT ResourceEntry
{
    quint32 compareMode = 0;
    quint16 type = 0;
    quint16 id = 0;
    QByteArray data;

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
    ResourceStream(const ResourceStream &other);
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
    unsigned int GetResourceTypes(QVector<quint16> &types) const;
    unsigned int GetResourceIDs(quint16 type, QVector<quint16> &ids) const;
    unsigned int GetResources(QVector<ResourceEntry> &entries) const;

    // Empties the name, the table and the file structures; default header.
    void Clear();
    QString Name() const { return m_name; }
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
