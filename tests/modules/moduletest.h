#pragma once

// Helpers shared by the module kind tests.

#include "catalogue/compilervariant.h"
#include "catalogue/testresults.h"
#include "log/log.h"
#include "resources/mif.h"
#include "support/testutil.h"

#include <QFileInfo>
#include <QList>
#include <QPair>
#include <QSharedPointer>
#include <QString>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace moduletest {

using Pairs = QList<QPair<QString, QString>>;

// The verdicts of results as (test case, result) pairs, in order.
inline Pairs PairsOf(const TestResults &results)
{
    Pairs pairs;
    for (const TestCaseResult &entry : results.caseResults)
        pairs.append({entry.testCase, entry.result});
    return pairs;
}

// A release build of package for arch, named after the package file.
inline QSharedPointer<_CompilerVariant> Target(const QString &package,
                                               IKestoDevice::Platform arch = IKestoDevice::PLATFORM_WIN32)
{
    QSharedPointer<_CompilerVariant> variant(new _CompilerVariant);
    variant->name = QFileInfo(package).completeBaseName();
    variant->arch = arch;
    variant->build = u"Release"_s;
    variant->packagePath = package;
    return variant;
}

// A temporary folder for a test's files, with a log ("log.txt") in it.
class ModuleFolder : public ::testing::Test
{
protected:
    ModuleFolder() { log.SetLogPath(dir.filePath(u"log.txt"_s)); }
    // Writes bytes to name in the folder; the file's path.
    QString Write(const QString &name, const QByteArray &bytes)
    {
        const QString path = dir.filePath(name);
        testutil::WriteFile(path, bytes);
        return path;
    }
    QString LogText() const { return QString::fromLatin1(testutil::ReadFile(dir.filePath(u"log.txt"_s))); }

    QTemporaryDir dir;
    Log log;
};

// A stand-in for the kit's post-processing script: it records its arguments and working folder, prints on both channels
// and leaves "pp-<name>" for each raw log in the temporary folder, headed by the device pack and platform.
inline const QByteArray kPostProcessScript = R"perl(use strict;
use Cwd;
my ($source, $temp, $pack, $platform) = @ARGV;
print "args:", join("|", @ARGV), "\n";
print STDERR "cwd:", getcwd(), "\n";
opendir(my $dh, $source) or die "no source $source";
for my $name (grep { /\.oat$/ } readdir($dh)) {
    open(my $in, "<", "$source/$name") or die;
    open(my $out, ">", "$temp/pp-$name") or die;
    print $out "processed with $pack on $platform\n", <$in>;
    close($out);
}
)perl";

inline Applet AppletWithId(unsigned int id)
{
    Applet applet;
    applet.appletid = id;
    return applet;
}

} // namespace moduletest
