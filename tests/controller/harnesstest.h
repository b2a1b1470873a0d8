#pragma once

// Shared fixture pieces for the Harness tests: access to the private state, a log captured in a file, and a temporary
// SDK toolset with stand-in resource compilers.

#include "catalogue/manifest.h"
#include "controller/harness.h"
#include "log/log.h"

#include "support/kitrun.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

// The Harness befriends this class so that tests can reach its private operations and fields.
class HarnessTestAccess
{
public:
    static bool SetupEnvironment(Harness &harness) { return harness.SetupEnvironment(); }
    static QMap<QString, QString> &Environment(Harness &harness) { return harness.m_environment; }
    static quint32 CopyDelay(const Harness &harness) { return harness.m_copyDelay; }
    static bool KitNotSelected(const Harness &harness) { return harness.m_kitNotSelected; }
    static void SetKitNotSelected(Harness &harness, bool value) { harness.m_kitNotSelected = value; }
    static bool EnvironmentReady(const Harness &harness) { return harness.m_environmentReady; }
    static IKestoDevice *Device(const Harness &harness) { return harness.m_device; }
    static QString Target(const Harness &harness) { return harness.m_target; }
    static const QStringList &TestCases(const Harness &harness) { return harness.m_testCases; }
    static void Update(Harness &harness, QSharedPointer<_TestModule> run) { harness.UpdateProcessedModulesXML(run); }
    // Set-up keeps the catalogues given here.
    static void SetCatalogues(Harness &harness, QSharedPointer<Manifest> kit, QSharedPointer<Manifest> platform)
    {
        harness.m_kitManifest = kit;
        harness.m_platformManifest = platform;
        harness.m_environmentReady = true;
    }
};

using namespace testutil;

namespace harnesstest {

// A temporary toolset named by KESTIX_TOOLSET, whose resource compilers are one shell script. Every call of it appends
// its arguments, joined by tabs, as a line to calls.txt in the toolset folder.
class Toolset
{
public:
    Toolset() : m_env("KESTIX_TOOLSET", m_dir.path()) { }

    QString Path() const { return m_dir.path(); }
    QString CompilerPath() const { return m_dir.filePath(u"bin/kestormc.exe"_s); }
    QString AltCompilerPath() const { return m_dir.filePath(u"bin/deprecated/ResourceEditor/kestorc.exe"_s); }

    // kestormc: "-convert" copies the input to the output and reports it unless the toolset holds "convert_fails";
    // "-compile" writes "compiled:" and the input to the output among lines of noise, unless the toolset holds
    // "compile_fails".
    void InstallCompiler() { WriteScript(CompilerPath(), QByteArray(kScript).replace("@", Path().toLocal8Bit())); }
    // kestorc: copies the source to the output, or when the toolset holds "alt_empty" leaves an empty output and
    // complains.
    void InstallAltCompiler()
    {
        WriteScript(AltCompilerPath(), QByteArray(kScript).replace("@", Path().toLocal8Bit()));
    }
    void SetFlag(const char *flag, bool on)
    {
        const QString path = m_dir.filePath(QString::fromLatin1(flag));
        if (on)
            WriteFile(path, QByteArray());
        else
            QFile::remove(path);
    }

    // The arguments of every call so far, one list per call.
    QList<QStringList> Calls() const
    {
        QList<QStringList> calls;
        for (const QByteArray &line : ReadFile(m_dir.filePath(u"calls.txt"_s)).split('\n'))
            if (!line.isEmpty())
                calls.append(QString::fromLocal8Bit(line).split(u'\t'));
        return calls;
    }

    static void WriteScript(const QString &path, const QByteArray &script)
    {
        WriteFile(path, script);
        QFile::setPermissions(path, QFileDevice::ReadOwner | QFileDevice::WriteOwner | QFileDevice::ExeOwner);
    }

private:
    static constexpr const char *kScript = R"SH(#!/bin/sh
t='@'
(IFS='	'; printf '%s\n' "$*") >> "$t/calls.txt"
case "$1" in
-convert)
  echo "converting"
  [ -f "$t/convert_fails" ] && { echo "conversion error"; exit 1; }
  cp "$3" "$5" || exit 1
  echo "Successfully converted file $3"
  ;;
-compile)
  echo "compiling"
  [ -f "$t/compile_fails" ] && { echo "compile error"; exit 1; }
  { echo "compiled:"; cat "$3"; } > "$5" || exit 1
  i=0; while [ $i -lt 2000 ]; do echo "noise line $i of the compiler output"; i=$((i+1)); done
  echo "Successfully compiled $5"
  echo "after success"
  ;;
-nh)
  [ -f "$t/alt_empty" ] && { : > "$3"; echo "kestorc: syntax error"; echo "stderr line" >&2; exit 1; }
  cp "$4" "$3"
  ;;
esac
)SH";

    QTemporaryDir m_dir;
    EnvGuard m_env;
};

// Sets a file's modification time, so freshness does not depend on how fast the test runs.
inline void SetModified(const QString &path, const QDateTime &when)
{
    QFile file(path);
    ASSERT_TRUE(file.open(QIODevice::ReadWrite));
    ASSERT_TRUE(file.setFileTime(when, QFileDevice::FileModificationTime));
}

} // namespace harnesstest

using namespace harnesstest;
