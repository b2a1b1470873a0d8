#pragma once

#include <QDir>
#include <QString>

// Changes the current directory for the lifetime of the object.
class CurrentDirectory
{
public:
    explicit CurrentDirectory(const QString &path) : m_saved(QDir::currentPath()) { QDir::setCurrent(path); }
    ~CurrentDirectory() { QDir::setCurrent(m_saved); }
    CurrentDirectory(const CurrentDirectory &) = delete;
    CurrentDirectory &operator=(const CurrentDirectory &) = delete;

private:
    QString m_saved;
};
