#pragma once

#include "common/export.h"

#include <QByteArray>
#include <QFile>
#include <QIODevice>
#include <QList>
#include <QString>

#include <memory>

class QDataStream;

// One member of a tar archive.
struct HARNESS_EXPORT TarFileEntry
{
    // Member name. Names longer than the 100-byte header field are taken in
    // full from a GNU long-name record, a pax "path" record or the ustar
    // prefix field when the archive holds one.
    QString name;
    // Member size in bytes (saturated at 0xFFFFFFFF for larger members).
    quint32 size = 0;
    // Position in the archive of the member's first data byte.
    qint64 offset = 0;
    // The header's type flag: '0' or '\0' for a regular file, '5' for a
    // directory, '2' for a symbolic link, ... ('\0' for a default entry and for
    // the zero blocks that end an archive).
    char typeflag = 0;

    // True for a regular file member with a name (type flag '0', '\0' or '7').
    bool IsFile() const;
    // True for a directory member (type flag '5', or a name ending in "/").
    bool IsDirectory() const;
};

// A tar archive on the host: lists the members of an existing archive and
// returns their bytes, and writes new archives (POSIX ustar) from members
// given in memory.
//
// Reading: Open lists every 512-byte header block of the archive as an entry,
// including the zero blocks that end it (entries with an empty name and size
// 0). Header checksums and magic values are not verified, so a file that is
// not an archive still opens and lists whatever its blocks describe; nothing
// the headers claim is trusted for allocation.
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
    Tar &operator=(const Tar &other);

    // The archive's path, used by the next Open.
    void SetFileName(const QString &name);
    QString FileName() const;

    // Opens the archive (path, when not empty, becomes the file name) and
    // lists its entries. False when there is no file name or the file cannot
    // be opened; the previous entry list then stays and no file is left open.
    bool Open(QFlags<QIODevice::OpenModeFlag> mode, const QString &path = QString());
    // Closes the open file; the entry list stays.
    void Close();
    // True while the archive file is open.
    bool IsOpen() const;

    // The number of entries listed by the last successful Open.
    unsigned int EntryCount() const;
    // A copy of entry index, or a default entry when index is out of range.
    TarFileEntry Entry(unsigned int index) const;
    // The member's bytes: a null array when no archive is open; fewer bytes
    // than its size when the member is cut short by the end of the file.
    QByteArray EntryData(TarFileEntry &entry);

    // Members for Write, in the order added. A name ending in "/" given to
    // AddFile is refused by Write; AddDirectory adds the "/" itself.
    void AddFile(const QString &name, const QByteArray &data, unsigned int mode = 0644);
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
    static void PutOctalNumber(signed char *field, unsigned int width, int value, bool checksumStyle);
    // ReadOctal over at most width bytes, without the 32-bit limit.
    static quint64 ReadOctal64(const signed char *field, unsigned int width);
    // Octal into a field, for values of up to 64 bits.
    static bool PutOctal64(signed char *field, unsigned int width, quint64 value);
    static bool SplitUstarName(const QByteArray &name, QByteArray &prefix, QByteArray &base);
    static bool MakeHeader(const Member &member, qint64 mtime, signed char *header);

    bool Read(QDataStream &stream);
    bool Write(QDataStream &stream);

    QList<TarFileEntry> m_entries;
    std::unique_ptr<QFile> m_file;
    QString m_fileName;
    QList<Member> m_members;
    qint64 m_mtime = -1;
};
