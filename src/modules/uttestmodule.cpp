#include "modules/uttestmodule.h"

#include "common/clock.h"
#include "common/xmlwriter.h"
#include "modules/moduleutil.h"

#include <QDir>
#include <QDomDocument>
#include <QFile>
#include <QTemporaryFile>

using namespace ModuleUtil;

namespace {

const QString kXmlEndMarker = QStringLiteral("</TestRunLog>");
const QString kTextEndMarker = QStringLiteral("Elapsed Time:");

// The result word of a table row's second column.
QString RowResult(const QString &word)
{
    if (word.contains(QLatin1String("pass"), Qt::CaseInsensitive))
        return QStringLiteral("pass");
    if (word.contains(QLatin1String("fail"), Qt::CaseInsensitive))
        return QStringLiteral("fail");
    if (word.contains(QLatin1String("unsupport"), Qt::CaseInsensitive))
        return QStringLiteral("unsupported");
    return QStringLiteral("unexecuted");
}

} // namespace

UTTestModule::UTTestModule() = default;
UTTestModule::~UTTestModule() = default;

QString UTTestModule::Type()
{
    return QStringLiteral("uitf");
}

QString UTTestModule::TestType()
{
    return Type();
}

QString UTTestModule::ModuleXMLName()
{
    return QStringLiteral("utmodule.xml");
}

unsigned int UTTestModule::KestoID()
{
    return FirstAppletId();
}

QString UTTestModule::ModuleName()
{
    return HexModuleName();
}

bool UTTestModule::ProcessModuleMIF(const QString &)
{
    return false;
}

void UTTestModule::SetupConfigData(IKestoDevice *device)
{
    if (selectedTestCases.isEmpty() || !device)
        return;
    QString copyPath;
    {
        QTemporaryFile reserve(QDir::tempPath() + QStringLiteral("/test_XXXXXX.dat"));
        if (!reserve.open())
            return;
        copyPath = reserve.fileName();
    }
    // The copy is only the way to the handset: it never stays behind.
    const struct RemoveCopy
    {
        QString path;
        ~RemoveCopy() { QFile::remove(path); }
    } removeCopy{copyPath};
    if (!QFile::copy(sourcePath + QStringLiteral("/utconfig.dat"), copyPath))
        return;
    QFile copy(copyPath);
    if (!copy.open(QIODevice::WriteOnly | QIODevice::Append))
        return;
    const QByteArray section
        = QByteArrayLiteral("\n[TestFramework]\nSkipIfNoGolden=1\nLogSkippedGoldens=0\nSkipKnown=1\n")
        + "Allow=" + selectedTestCases.join(QLatin1Char(',')).toUtf8() + "\n";
    const bool written = copy.write(section) == section.size();
    copy.close();
    if (!written)
        return;
    device->CopyFileToDevice(copyPath,
                             QStringLiteral("fs:/mod/ut") + moduleName.toLower() + QStringLiteral("/utconfig.dat"));
}

bool UTTestModule::Run(IKestoDevice *device, const QMap<QString, QString> &)
{
    const unsigned int classId = KestoID();
    if (classId == 0 || !device)
        return false;
    if (!InstallTest(device))
        return false;
    SetupConfigData(device);
    if (device->StartApplet(classId, QString()) != 0) {
        LogMessage(QStringLiteral("UTTestModule::Run error: ") + DeviceErrorText(device->lastError), false);
        return false;
    }
    return WaitWhileRunning([&] { return device->IsAppletRunning(classId); }, false);
}

bool UTTestModule::GetLogFilePaths(IKestoDevice *device, QStringList &paths)
{
    if (applets.isEmpty() || !device)
        return false;
    if (deviceDirectory.isEmpty() && device->FindModule(FirstAppletId(), deviceDirectory) != 0)
        deviceDirectory.clear();
    if (deviceDirectory.isEmpty())
        deviceDirectory = QStringLiteral("fs:/usermods/%1").arg(moduleName.toLower());
    QSharedPointer<_DirectoryInfo> listing;
    if (device->ListDirectory(deviceDirectory + QStringLiteral("log"), listing) != 0 || !listing)
        return false;
    int matched = 0;
    for (auto it = listing->FirstFile(); it != listing->LastFile(); ++it) {
        if (it->fileName.contains(QLatin1String(".xml")) || it->fileName.contains(QLatin1String(".txt"))) {
            paths.append(it->fileName);
            ++matched;
        }
    }
    if (paths.size() >= 2)
        return true;
    paths.clear();
    return matched == 1;
}

bool UTTestModule::IsLogComplete(IKestoDevice *device)
{
    QStringList paths;
    if (!GetLogFilePaths(device, paths))
        return false;
    QString xmlLog;
    QString textLog;
    for (const QString &path : std::as_const(paths)) {
        if (EndsWithNoCase(path, QStringLiteral(".xml")))
            xmlLog = path;
        else if (EndsWithNoCase(path, QStringLiteral(".txt")))
            textLog = path;
    }
    const auto done = [device](QString &pending, const QString &marker) {
        QByteArray content;
        if (!pending.isEmpty() && FetchDeviceFile(device, pending, content)
            && QString::fromUtf8(content).contains(marker))
            pending.clear();
    };
    qint64 delay = 100;
    qint64 waited = 0;
    for (;;) {
        waited += delay;
        Clock::Sleep(delay);
        delay = qMin<qint64>(delay + 100, 2000);
        done(xmlLog, kXmlEndMarker);
        done(textLog, kTextEndMarker);
        if (xmlLog.isEmpty() && textLog.isEmpty())
            return true;
        // A handset that went away will never complete the logs.
        if (waited > kLogWaitLimitMs || (device && device->connectionLost))
            return false;
    }
}

bool UTTestModule::ParseLog(const QString &hostPath, TestResults &results)
{
    StartParse(results);
    if (!EndsWithNoCase(hostPath, QStringLiteral(".txt")))
        return false;

    bool inTable = false;
    const bool opened = ForEachLogLine(hostPath, [&](const QString &line) {
        if (!results.manifestName.isEmpty() && inTable) {
            if (line.startsWith(QLatin1String("----"))) {
                inTable = false;
                return;
            }
            const QStringList words = line.trimmed().split(QLatin1Char(' '), Qt::SkipEmptyParts);
            if (words.size() > 3)
                results.caseResults.append(TestCaseResult(words.at(0), RowResult(words.at(1))));
            return;
        }
        if (line.startsWith(QLatin1String("----"))) {
            inTable = true;
        } else if (StartsWithNoCase(line, QStringLiteral("SuiteName:"))) {
            const QStringList words
                = PrefixValue(line, QStringLiteral("SuiteName:")).split(QLatin1Char(' '), Qt::SkipEmptyParts);
            if (!words.isEmpty() && results.manifestName.isEmpty())
                results.manifestName = words.at(0);
            if (words.size() >= 3) {
                const QDateTime time = QDateTime::fromString(words.at(1) + QLatin1Char(' ') + words.at(2),
                                                             QStringLiteral("HH:mm:ss dd-MMM-yyyy"));
                if (time.isValid())
                    results.timeStamp = time;
            }
        } else if (StartsWithNoCase(line, QStringLiteral("Manifest Name:"))) {
            results.manifestName = PrefixValue(line, QStringLiteral("Manifest Name:"));
        } else if (StartsWithNoCase(line, QStringLiteral("ID Hash:"))) {
            results.idHash = PrefixValue(line, QStringLiteral("ID Hash:"));
        } else if (line.contains(QLatin1String("Elapsed Time:"), Qt::CaseInsensitive)) {
            results.complete = true;
        }
    });
    if (!opened)
        return false;
    if (StartsWithNoCase(results.manifestName, QStringLiteral("UT")))
        results.manifestName.remove(0, 2);
    return !results.manifestName.isEmpty();
}

void UTTestModule::PostProcess(QMap<QString, QString> &env)
{
    const QString runId = env.value(QStringLiteral("TestRunID"));
    for (const QString &path : std::as_const(desktopLogFiles)) {
        if (EndsWithNoCase(path, QStringLiteral(".txt")))
            StampLogTXT(path, runId);
        else if (EndsWithNoCase(path, QStringLiteral(".xml")))
            StampLogXML(path, runId);
    }
}

void UTTestModule::StampLogTXT(const QString &hostPath, const QString &runId)
{
    StampTextLog(hostPath, runId, StampAnchor::SecondLine);
}

void UTTestModule::StampLogXML(const QString &hostPath, const QString &runId)
{
    QFile file(hostPath);
    if (!file.open(QIODevice::ReadWrite))
        return;
    QDomDocument document;
    if (!document.setContent(&file))
        return;
    file.close();
    QDomElement root = document.documentElement();
    root.setAttribute(QStringLiteral("guid"), runId);
    root.setAttribute(QStringLiteral("manifest_name"), moduleName);
    root.setAttribute(QStringLiteral("id_hash"), IDHash());
    XmlWriter::WriteDocument(document, hostPath, 1, true);
}
