#pragma once

#include "../common/export.h"

#include <QByteArray>
#include <QList>
#include <QString>
#include <QVector>

// Writes module-information files (".mif"): the compiled resource file that a
// package carries to tell the handset which class IDs, applets and programs
// its module provides. What it writes reads back through KestoResources
// (GetMifClasses, GetMifApplets, GetSysResource).
//
//   MifBuilder mif;
//   mif.AddClass(0x10203040);
//   mif.AddProgram("ITimer_k", "-v");
//   QByteArray bytes = mif.Build();
class HARNESS_EXPORT MifBuilder
{
public:
    void AddClass(unsigned int classId);
    void AddApplet(unsigned int classId, quint16 appletType = 1, quint16 baseId = 1000);
    // A program record started by name (type 0x0102FAF7 or 0x0102C305).
    void AddProgram(const QString &name, const QString &arguments = QString(), unsigned int type = 0x0102FAF7);
    // A program record of the OAT framework: its key is
    // "<vendor>:<suite>:<program name>" and holds the program name.
    void AddSuiteProgram(const QString &key);

    // The bytes of the resource file: a 40-byte module header, the class
    // list, the applet list and one system resource per program.
    QByteArray Build() const;

private:
    struct AppletRecord
    {
        unsigned int id;
        quint16 type;
        quint16 baseId;
    };
    QVector<unsigned int> m_classes;
    QVector<AppletRecord> m_applets;
    QList<QByteArray> m_programs;
};
