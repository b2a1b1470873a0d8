#pragma once

#include "../common/export.h"

#include <QString>
#include <QVector>

// The records of a module-information file (".mif"): blocks of resource type
// 0x5000 under fixed IDs, all little-endian. KestoResources reads them
// (GetMifHeader, GetMifClasses, ...); the values the library does not use are
// carried as they stand.

// Block 0: the module header (at least 40 bytes).
struct HARNESS_EXPORT MifHeader
{
    quint32 value1 = 0; // bytes 0 ... 3; not used by the library
    quint32 value2 = 0; // bytes 4 ... 7; not used by the library
    quint8 raw[16] = {}; // bytes 8 ... 23, as stored
    quint16 count1 = 0; // bytes 24 ... 25; not used by the library
    quint16 count2 = 0; // bytes 26 ... 27; not used by the library
    quint16 count3 = 0; // bytes 28 ... 29; not used by the library
    quint16 count4 = 0; // bytes 30 ... 31; not used by the library
    // Number of notification records in block 4.
    quint16 notificationCount = 0;
    // Number of MIME type records in block 5.
    quint16 mimeTypeCount = 0;
    quint16 count7 = 0; // bytes 36 ... 37; not used by the library
};

// Block 2: one applet, 20 bytes.
struct HARNESS_EXPORT Applet
{
    // The applet's class ID.
    quint32 appletid = 0;
    // The record refers to the name in the handset's memory only, so the name
    // is not known on the host and stays empty; the reference is kept in
    // nameRef, never followed.
    QString name;
    quint32 nameRef = 0; // handset address of the name; see name
    quint16 baseid = 0; // carried as stored
    quint16 apptype = 0; // carried as stored
    quint32 hostid = 0; // carried as stored
    quint16 privset = 0; // carried as stored
    quint16 flags = 0; // carried as stored
};

// Block 4: one notification, 12 bytes.
struct HARNESS_EXPORT Notifier
{
    quint32 value1 = 0; // bytes 0 ... 3, as stored
    quint32 value2 = 0; // bytes 4 ... 7, as stored
    quint32 value3 = 0; // bytes 8 ... 11, as stored
};

// Block 5: one MIME type: two values and a NUL-terminated ASCII text.
struct HARNESS_EXPORT MimeType
{
    quint32 value1 = 0; // bytes 0 ... 3, as stored
    quint32 value2 = 0; // bytes 4 ... 7, as stored
    QString mimeType; // the text, read as Latin-1, without its NUL
};

// Every record of one module.
struct HARNESS_EXPORT MifEntry
{
    MifHeader header; // block 0
    QVector<unsigned int> classes; // block 1: the class IDs the module provides
    QVector<Applet> applets; // block 2
    QVector<unsigned int> externalClasses; // block 3: the external class IDs
    QVector<Notifier> notifications; // block 4; empty when absent
    QVector<MimeType> mimeTypes; // block 5; empty when absent
};
