#include "installer_fixtures.h"
#include "locations.h"
#include "process_limits.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <string>

namespace {

const std::string HomeError = "*** Error: cannot retrieve home directory for current user.\n";

/// Replaces the machine's users while it lives.
class Users {
public:
    explicit Users(const std::string& entries) { writeFile("/etc/passwd", entries); }
    Users(const Users&) = delete;
    Users& operator=(const Users&) = delete;
    ~Users() { writeFile("/etc/passwd", previous_); }

private:
    std::string previous_ = readFile("/etc/passwd");
};

using LocationsTest = MachineTest;

TEST(LocationNamesTest, TheRegistryOfAUserIsBelowItsHomeDirectory)
{
    EXPECT_EQ("/home/ann/.zor/zor.ini", registryPathBelow("/home/ann"));
    EXPECT_EQ("/.zor/zor.ini", registryPathBelow("/"));
}

TEST(LocationNamesTest, TheNamesHaveTheirTexts)
{
    EXPECT_EQ("zor.ini", ZorIniName);
    EXPECT_EQ("ZOR_InstallType", keyInstallType);
    EXPECT_EQ("global", valueInstallGlobal);
    EXPECT_EQ("local", valueInstallLocal);
    EXPECT_EQ("local", installTypeName(true));
    EXPECT_EQ("global", installTypeName(false));
}

TEST_F(LocationsTest, UserZeroIsRoot)
{
    EXPECT_TRUE(isRoot());
}

TEST_F(LocationsTest, AnotherUserIsNotRoot)
{
    EXPECT_TRUE(passesInChild([] {
        becomeUser(1234);
        EXPECT_FALSE(isRoot());
    }));
}

TEST_F(LocationsTest, TheRealUserCountsAndNotTheEffectiveOne)
{
    const Users users("root:x:0:0::/root:/bin/sh\n");

    EXPECT_TRUE(passesInChild([] {
        changeEffectiveUser();

        EXPECT_TRUE(isRoot());
        EXPECT_EQ("/root", homeDirectory());
    }));
}

TEST_F(LocationsTest, TheHomeDirectoryIsThatOfThePasswordEntry)
{
    const Users users("ann:x:0:0::/home/ann:/bin/sh\n");

    EXPECT_EQ("/home/ann", homeDirectory());
}

TEST_F(LocationsTest, TheEnvironmentDoesNotNameTheHomeDirectory)
{
    const VariableGuard guard("HOME");
    (void)setenv("HOME", "/elsewhere", 1);

    EXPECT_EQ("/root", homeDirectory());
}

TEST_F(LocationsTest, WithoutAPasswordEntryThereIsNoHomeDirectory)
{
    const Users users("other:x:77:77::/home/other:/bin/sh\n");

    EXPECT_EQ("", homeDirectory());
    EXPECT_EQ("", log.text());
}

TEST_F(LocationsTest, WithoutAPasswordEntryTheLoginNamesHomeDirectoryCounts)
{
    if (!std::filesystem::exists("/proc/self/loginuid"))
        GTEST_SKIP() << "this kernel keeps no login name of a process";
    const Users users("ann:x:77:77::/home/ann:/bin/sh\n");
    writeFile(dir / "login", "77");
    const FileInPlace login(dir / "login", "/proc/self/loginuid");

    EXPECT_EQ("/home/ann", homeDirectory());
}

TEST_F(LocationsTest, AnotherUserHasAnotherHomeDirectory)
{
    const Users users("root:x:0:0::/root:/bin/sh\nann:x:1234:1234::/home/ann:/bin/sh\n");

    EXPECT_TRUE(passesInChild([] {
        becomeUser(1234);
        EXPECT_EQ("/home/ann", homeDirectory());
    }));
}

TEST_F(LocationsTest, TheSharedInstallationHasFixedPlaces)
{
    const Users users("");

    EXPECT_EQ("/opt/corvan/zor", defaultInstallDir(false));
    EXPECT_EQ("/etc/zor", registryDirectory(false));
    EXPECT_EQ("/etc/zor/zor.ini", registryPath(false));
    EXPECT_EQ("", log.text());
}

TEST_F(LocationsTest, AUsersInstallationIsInTheHomeDirectory)
{
    const Users users("ann:x:0:0::/home/ann:/bin/sh\n");

    EXPECT_EQ("/home/ann/corvan/zor", defaultInstallDir(true));
    EXPECT_EQ("/home/ann/.zor", registryDirectory(true));
    EXPECT_EQ("/home/ann/.zor/zor.ini", registryPath(true));
    EXPECT_EQ("", log.text());
}

TEST_F(LocationsTest, AHomeDirectoryThatEndsWithASlashGetsNoSecondOne)
{
    const Users users("ann:x:0:0::/:/bin/sh\n");

    EXPECT_EQ("/corvan/zor", defaultInstallDir(true));
    EXPECT_EQ("/.zor", registryDirectory(true));
    EXPECT_EQ("/.zor/zor.ini", registryPath(true));
}

TEST_F(LocationsTest, WithoutAHomeDirectoryAUserHasTheSharedPlacesAndOneLineSaysSo)
{
    const Users users("");

    EXPECT_EQ("/etc/zor", registryDirectory(true));
    EXPECT_EQ("/etc/zor/zor.ini", registryPath(true));
    EXPECT_EQ("", log.text());

    EXPECT_EQ("/opt/corvan/zor", defaultInstallDir(true));
    EXPECT_EQ(HomeError, log.text());
}

TEST_F(LocationsTest, AnEmptyHomeDirectoryIsNone)
{
    const Users users("ann:x:0:0:::/bin/sh\n");

    EXPECT_EQ("/etc/zor", registryDirectory(true));
    EXPECT_EQ("/opt/corvan/zor", defaultInstallDir(true));
    EXPECT_EQ(HomeError, log.text());
}

// The type of an installation.

class InstallTypeTest : public InstallerTest {
protected:
    /// Makes the property file of an installation in `dir` hold `content`.
    void record(const std::string& content)
    {
        makeDirectories(dir / "install");
        writeFile(dir / "install/zor_install.properties", content);
    }
};

TEST_F(InstallTypeTest, WithoutAPropertyFileItIsUnknown)
{
    EXPECT_EQ(0, installedTypeOf(dir.path()));

    EXPECT_EQ("Loading file " + dir.path() + "/install/zor_install.properties error: 2 " +
                  "(No such file or directory)\n",
              log.text());
}

TEST_F(InstallTypeTest, TheKeyIdentifiesALocalInstallation)
{
    record("# comment\nZOR_InstallType=local\n");
    EXPECT_EQ(1, installedTypeOf(dir.path()));

    record(" ZOR_InstallType =\tlocal \r\n");
    EXPECT_EQ(1, installedTypeOf(dir.path()));
}

TEST_F(InstallTypeTest, AnyOtherValueIsGlobal)
{
    for (const char* const value : {"global", "", "Local", "local2", "x"}) {
        record(std::string("ZOR_InstallType=") + value + "\n");
        EXPECT_EQ(2, installedTypeOf(dir.path())) << value;
    }
}

TEST_F(InstallTypeTest, WithoutTheKeyItIsGlobal)
{
    record("");
    EXPECT_EQ(2, installedTypeOf(dir.path()));

    record("#ZOR_InstallType=local\nzor_installtype=local\nZOR_InstallType\n");
    EXPECT_EQ(2, installedTypeOf(dir.path()));
}

TEST_F(InstallTypeTest, TheFirstLineOfTheKeyCounts)
{
    record("ZOR_InstallType=local\nZOR_InstallType=global\n");

    EXPECT_EQ(1, installedTypeOf(dir.path()));
}

TEST_F(InstallTypeTest, AFreshTargetTakesEitherType)
{
    EXPECT_TRUE(checkInstallTypeCompatibility(true, dir.path()));
    EXPECT_TRUE(checkInstallTypeCompatibility(false, dir.path()));
}

TEST_F(InstallTypeTest, AnInstallationOfTheSameTypeIsCompatible)
{
    record("ZOR_InstallType=local\n");
    EXPECT_TRUE(checkInstallTypeCompatibility(true, dir.path()));

    record("ZOR_InstallType=global\n");
    EXPECT_TRUE(checkInstallTypeCompatibility(false, dir.path()));

    EXPECT_EQ("", log.text());
}

TEST_F(InstallTypeTest, ALocalInstallationRefusesAGlobalOne)
{
    record("ZOR_InstallType=local\n");

    EXPECT_FALSE(checkInstallTypeCompatibility(false, dir.path()));

    EXPECT_EQ("*** Error: incompatible install type\n"
              "ZOR already installed as local in " +
                  dir.path() + "\n",
              log.text());
}

TEST_F(InstallTypeTest, AGlobalInstallationRefusesALocalOne)
{
    record("ZOR_InstallType=global\n");

    EXPECT_FALSE(checkInstallTypeCompatibility(true, dir.path()));

    EXPECT_EQ("*** Error: incompatible install type\n"
              "ZOR already installed as global in " +
                  dir.path() + "\n",
              log.text());
}

TEST_F(InstallTypeTest, AnInstallationWithoutATypeRefusesALocalOne)
{
    record("other=1\n");

    EXPECT_FALSE(checkInstallTypeCompatibility(true, dir.path()));
}

} // namespace
