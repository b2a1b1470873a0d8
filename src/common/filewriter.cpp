#include "common/filewriter.h"

#include <QFile>
#include <QSaveFile>

namespace FileWriter {

bool Write(const QString &path, const QByteArray &bytes, bool atomic, QString *error)
{
    auto fail = [error](const QString &why) {
        if (error)
            *error = why;
        return false;
    };
    if (atomic) {
        QSaveFile file(path);
        if (!file.open(QIODevice::WriteOnly))
            return fail(file.errorString());
        if (file.write(bytes) != bytes.size()) {
            const QString why = file.errorString();
            file.cancelWriting();
            return fail(why);
        }
        if (!file.commit())
            return fail(file.errorString());
        return true;
    }
    QFile file(path);
    if (!file.open(QIODevice::WriteOnly | QIODevice::Truncate))
        return fail(file.errorString());
    if (file.write(bytes) != bytes.size())
        return fail(file.errorString());
    if (!file.flush())
        return fail(file.errorString());
    file.close();
    return true;
}

} // namespace FileWriter
