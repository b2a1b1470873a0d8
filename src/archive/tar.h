#pragma once

#include "../common/export.h"

#include <QByteArray>
#include <QFile>
#include <QIODevice>
#include <QList>
#include <QString>
#include <QVector>

#include <memory>

class QDataStream;

// One stored run of a sparse member: where it lies in the member's contents
// and how many bytes it holds. The member's other bytes are holes (zeros).
struct HARNESS_EXPORT TarSparseRun
{
    quint32 position = 0; // offset in the member's contents, in bytes
    quint32 length = 0; // bytes stored for this run
};

// One member of a tar archive.
struct HARNESS_EXPORT TarFileEntry
{
    // Member name, taken in full from a GNU long-name record, a pax "path"
    // (or sparse "GNU.sparse.name") record or the ustar prefix field when the
    // archive holds one. A name that is not UTF-8 shows its bytes from 0x80
    // up as octal escapes ("\351"); rawName keeps the bytes as stored.
    QString name;
    // Member size in bytes: for a sparse member its full size, holes
    // included; for a hard link the size of the member it links to.
    quint32 size = 0;
    // Position in the archive of the member's first data byte (for a hard
    // link, of the data of the member it links to; 0 when that member is not
    // in the archive before it).
    qint64 offset = 0;
    // The header's type flag: '0' or '\0' for a regular file, '5' for a
    // directory, '2' for a symbolic link, '1' for a hard link, 'S' for a GNU
    // sparse file... ('\0' for a default entry and for the zero blocks that
    // end an archive).
    char typeflag = 0;
    // The target of a symbolic or hard link.
    QString linkName;
    // The name's bytes as stored.
    QByteArray rawName;
    // The stored runs of a sparse member, in order; their bytes follow one
    // another from offset. Empty for any other member.
    QVector<TarSparseRun> sparse;

    // True for a member with contents: a regular file with a name (type flag
    // '0', '\0', '7' or 'S'), or a hard link to one found earlier.
    bool IsFile() const;
    // True for a directory member (type flag '5' or 'D', or a name ending in "/").
    bool IsDirectory() const;
    // True for a symbolic link member (type flag '2'); linkName is its target.
    bool IsSymLink() const;
    // True for a hard link member (type flag '1'); linkName names the member it links to.
    bool IsHardLink() const;
};

// A tar archive on the host: lists the members of an existing archive and
// returns their bytes, and writes new archives (POSIX ustar) from members
// given in memory.
//
// Reading: Open lists the members the way GNU tar reads them: header
// checksums are verified, GNU long names and pax extended headers (path,
// linkpath, size, global headers) apply to the member that follows, GNU and
// pax sparse members read as their full contents, a hard link reads as the
// member it links to, and records that are no members (pax 'x'/'g',
// Solaris 'A'/'X', volume labels) are never listed. The zero blocks that end the
// archive are listed too (entries with an empty name and size 0); nothing
// after them is. Reading stops at the first block that is neither a valid
// header nor a zero block, or at a member cut short by the end of the file:
// the entries before it stay listed and IsDamaged/ErrorString tell where and
// why. Nothing the headers claim is trusted for allocation.
//
// Writing: AddFile / AddDirectory collect members, Write(path) writes them as
// ustar headers (mode, size, time, checksum, magic "ustar" version "00"),
// each member's data padded to whole 512-byte blocks, and two zero blocks at
// the end. Names up to 100 bytes go into the name field; longer names are
// split at a "/" into the 155-byte prefix field and the name field; a name
// that cannot be split so is refused by Write.
//
// Copies: a copy carries the file name, the entry list and the members added
// for writing, but never the open file: a copy starts closed, and each open
// file is closed and deleted by the one Tar that opened it.
class HARNESS_EXPORT Tar
{
public:
    Tar();
    ~Tar();
    // Copies the file name, the entry list and the members added for
    // writing; the copy starts closed.
    Tar(const Tar &other);
    // Closes this archive's open file, then copies as the copy constructor does.
    Tar &operator=(const Tar &other);

    // The archive's path, used by the next Open.
    void SetFileName(const QString &name);
    // The archive's path; empty until set or given to Open.
    QString FileName() const;

    // Opens the archive (path, when not empty, becomes the file name) and
    // lists its entries. False when there is no file name or the file cannot
    // be opened; the previous entry list then stays and no file is left open.
    // True for any file that opens, archive or not: ask IsDamaged.
    bool Open(QFlags<QIODevice::OpenModeFlag> mode, const QString &path = QString());
    // After Open: true when the archive could not be read cleanly to its end
    // (not an archive, a bad header, a member cut short, or a member this
    // reader cannot represent). ErrorString then says where and why, in the
    // words GNU tar uses ("does not look like a tar archive", "unexpected end
    // of archive at offset N", "checksum error at offset N", ...).
    bool IsDamaged() const;
    // Why the archive is damaged; empty when the last Open read it cleanly.
    QString ErrorString() const;
    // Closes the open file; the entry list stays.
    void Close();
    // True while the archive file is open.
    bool IsOpen() const;

    // The number of entries listed by the last successful Open.
    unsigned int EntryCount() const;
    // A copy of entry index, or a default entry when index is out of range.
    TarFileEntry Entry(unsigned int index) const;
    // The member's bytes (holes of a sparse member as zeros): a null array
    // when no archive is open; fewer bytes than its size when the file has
    // become shorter since it was opened.
    QByteArray EntryData(TarFileEntry &entry);

    // Members for Write, in the order added. A name ending in "/" given to
    // AddFile is refused by Write; AddDirectory adds the "/" itself.
    void AddFile(const QString &name, const QByteArray &data, unsigned int mode = 0644);
    // Adds a directory member (type '5'), appending "/" to name when missing.
    void AddDirectory(const QString &name, unsigned int mode = 0755);
    // Drops the members added for writing.
    void ClearMembers();
    // Modification time (seconds since 1970) stamped on written members;
    // the current time when never set.
    void SetModificationTime(qint64 secondsSinceEpoch);
    // Writes the added members as a new archive at path (replacing the file
    // only once it is complete). False, with the destination untouched, when
    // a name is empty or does not fit a ustar header, a member is larger than
    // 8 GiB - 1, or the file cannot be written.
    bool Write(const QString &path);

private:
    friend class TarTestAccess;

    struct Member
    {
        QString name;
        QByteArray data;
        unsigned int mode = 0644;
        char typeflag = '0';
    };

    static unsigned int CalcChecksum(signed char *header);
    static unsigned int ReadOctal(const signed char *field);
    // A numeric header field as GNU tar reads it: leading blanks and NULs
    // skipped, then octal digits ended by a blank, a NUL or the field's end,
    // or GNU's base-256 form. False for anything else, a negative value or
    // one beyond 63 bits.
    static bool ReadNumber(const char *field, int width, quint64 &value);
    static void PutOctalNumber(signed char *field, unsigned int width, int value, bool checksumStyle);
    // Octal into a field, for values of up to 64 bits.
    static bool PutOctal64(signed char *field, unsigned int width, quint64 value);
    static bool SplitUstarName(const QByteArray &name, QByteArray &prefix, QByteArray &base);
    static bool MakeHeader(const Member &member, qint64 mtime, signed char *header);

    bool Read(QDataStream &stream);
    // Marks the archive damaged (the first reason wins); returns false.
    bool Damaged(const QString &reason);
    bool Write(QDataStream &stream);

    QList<TarFileEntry> m_entries;
    std::unique_ptr<QFile> m_file;
    QString m_fileName;
    QList<Member> m_members;
    qint64 m_mtime = -1;
    QString m_error;
};
