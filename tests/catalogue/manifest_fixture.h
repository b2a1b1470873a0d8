#pragma once

// What the manifest tests share: a private data root and kit folder per test.

#include "catalogue/manifest.h"
#include "catalogue/testmodule.h"
#include "log/log.h"
#include "support/kitbuilder.h"
#include "support/testutil.h"

#include <QDir>
#include <QTemporaryDir>

#include <gtest/gtest.h>

#include <memory>

using namespace Qt::StringLiterals;

class ManifestFixture : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(m_dir.isValid());
        m_env.Set("KESTIX_DATA_ROOT", m_dir.path() + u"/data"_s);
        kit = std::make_unique<kitbuilder::KitBuilder>(m_dir.path() + u"/kit"_s);
        logger.SetLogPath(m_dir.path() + u"/log.txt"_s);
    }

    QString TempPath(const QString &relative) const { return m_dir.path() + u'/' + relative; }

    static kitbuilder::Module MakeModule(const QString &kind, const QString &name)
    {
        kitbuilder::Module module;
        module.kind = kind;
        module.name = name;
        module.testCases = {name + u"_1"_s, name + u"_2"_s};
        return module;
    }

    // Scans the kit from scratch into manifest.
    void Scan(Manifest &manifest)
    {
        ASSERT_TRUE(kit->Ok()) << kit->Errors().join(u'\n').toStdString();
        manifest.SetLogger(&logger);
        ASSERT_TRUE(manifest.GenerateManifest(true));
    }
    Manifest ScanKit(bool platform = false)
    {
        Manifest manifest(kit->Root(), platform);
        Scan(manifest);
        return manifest;
    }

    // The names of the modules in key order.
    static QStringList Names(const QList<QSharedPointer<_TestModule>> &modules)
    {
        QStringList names;
        for (const auto &module : modules)
            names.append(module->moduleName);
        return names;
    }

    QString LogText() const { return QString::fromLatin1(testutil::ReadFile(m_dir.path() + u"/log.txt"_s)); }

    QTemporaryDir m_dir;
    testutil::EnvGuard m_env;
    std::unique_ptr<kitbuilder::KitBuilder> kit;
    Log logger;
};
