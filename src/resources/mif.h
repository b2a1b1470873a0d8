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
    quint32 value1 = 0;
    quint32 value2 = 0;
    quint8 raw[16] = {};
    quint16 count1 = 0;
    quint16 count2 = 0;
    quint16 count3 = 0;
    quint16 count4 = 0;
    // Number of notification records in block 4.
    quint16 notificationCount = 0;
    // Number of MIME type records in block 5.
    quint16 mimeTypeCount = 0;
    quint16 count7 = 0;
};

// Block 2: one applet, 20 bytes.
struct HARNESS_EXPORT Applet
{
    quint32 appletid = 0;
    // The record refers to the name in the handset's memory only, so the name
    // is not known on the host and stays empty; the reference is kept in
    // nameRef, never followed.
    QString name;
    quint32 nameRef = 0;
    quint16 baseid = 0;
    quint16 apptype = 0;
    quint32 hostid = 0;
    quint16 privset = 0;
    quint16 flags = 0;
};

// Block 4: one notification, 12 bytes.
struct HARNESS_EXPORT Notifier
{
    quint32 value1 = 0;
    quint32 value2 = 0;
    quint32 value3 = 0;
};

// Block 5: one MIME type: two values and a NUL-terminated ASCII text.
struct HARNESS_EXPORT MimeType
{
    quint32 value1 = 0;
    quint32 value2 = 0;
    QString mimeType;
};

// Every record of one module.
struct HARNESS_EXPORT MifEntry
{
    MifHeader header;
    QVector<unsigned int> classes;
    QVector<Applet> applets;
    QVector<unsigned int> externalClasses;
    QVector<Notifier> notifications;
    QVector<MimeType> mimeTypes;
};
