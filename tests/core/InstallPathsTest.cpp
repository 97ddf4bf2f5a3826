#include "core/InstallPaths.h"

#include <gtest/gtest.h>

#include "tests/support/Registry.h"

namespace tavi {
namespace {

TEST(InstallPaths, FollowTheRegistryAtEveryCall)
{
    test::InstalledService service;
    service.install().SetValue(L"ConfigPath", wxString(L"C:\\conf"));
    service.install().SetValue(L"DataPath", wxString(L"C:\\data"));
    EXPECT_EQ(getConfigFilePath(ConfigFile::database), L"C:\\conf\\taviconf.dat");
    EXPECT_EQ(getDataFilePath(DataFile::log), L"C:\\data\\tavi.log");
    EXPECT_EQ(getDataFilePath(DataFile::directory), L"C:\\data");
    EXPECT_EQ(getConfigFilePath(ConfigFile{2}) + getDataFilePath(DataFile{8}) + getDataFilePath(DataFile{-1}), L"");
    service.install().DeleteValue(L"DataPath");
    EXPECT_EQ(getDataFilePath(DataFile::stateDatabase), L"\\tavistate.dat");
}

} // namespace
} // namespace tavi
