#include "discovery.h"
#include "installer_fixtures.h"
#include "paths.h"
#include "process_limits.h"
#include "settings.h"
#include "toolkit_package.h"

#include <gtest/gtest.h>

#include <sys/stat.h>

namespace {

const std::string Home = "/opt/corvan/zor";

/// The record of "/etc/zor/zor.ini", with a valid installation where a test says so.
class DiscoveryTest : public MachineTest {
protected:
    DiscoveryTest()
    {
        useCompleteLayoutNames();
        commandLine.action = 'i';
        commandLine.request.exploiters = "ABC";
        commandLine.destDir = "/opt/elsewhere";
        commandLine.request.version = {9, 2, 30, 4, 0};
        commandLine.request.buildDate = "22/12/02";
    }

    /// Writes a registry of /opt/corvan/zor with this version and build date.
    static void plantRegistry(const std::string& version = "9.2.30.0004",
                              const std::string& buildDate = "22/12/02")
    {
        makeDirectories("/etc/zor");
        writeFile("/etc/zor/zor.ini", "ZOR_Version = " + version +
                                          "\nZOR_BuildDate = " + buildDate +
                                          "\nZOR_HomeDirectory = /opt/corvan/zor\n"
                                          "ZOR_Exploiters = ABC:\n");
    }

    static void plantScannerControl(const std::string& content = "#!/bin/sh\n")
    {
        makeDirectories(Home + "/bin");
        writeFile(Home + "/bin/trawlcfg", content);
    }

    /// Discovers an intact installation of this version and build date.
    Discovery discoverVersion(const std::string& version, const std::string& buildDate)
    {
        plantRegistry(version, buildDate);
        plantScannerControl();
        return discoverInstallation(commandLine);
    }

    CommandLine commandLine;
};

TEST_F(DiscoveryTest, WithoutARegistryTheDestinationIsInstalledAfresh)
{
    const Discovery found = discoverInstallation(commandLine);

    EXPECT_EQ(1, found.status);
    EXPECT_FALSE(found.registryFound);
    EXPECT_TRUE(found.installAction);
    EXPECT_FALSE(found.homeExists);
    EXPECT_FALSE(found.upgradeNeeded);
    EXPECT_EQ("/opt/elsewhere/ZOR_files", found.indexPath);
    EXPECT_EQ("/opt/elsewhere", found.currentZorHome);
    EXPECT_EQ("/opt/elsewhere", found.currentCfgHome);
    EXPECT_EQ("Looking for INI file: /etc/zor/zor.ini\n"
              "INI file not found or outdated (code=1)\n"
              "Log file is: /opt/elsewhere/ZOR_files\n"
              "currentZorHome = '/opt/elsewhere' currentCfgHome = '/opt/elsewhere'\n",
              log.text());
}

TEST_F(DiscoveryTest, AnExistingDestinationIsDetected)
{
    commandLine.destDir = dir.path();

    EXPECT_TRUE(discoverInstallation(commandLine).homeExists);
}

TEST_F(DiscoveryTest, AnIntactInstallationIsFound)
{
    const Discovery found = discoverVersion("9.2.30.0004", "22/12/02");

    EXPECT_EQ(0, found.status);
    EXPECT_TRUE(found.registryFound);
    EXPECT_TRUE(found.installAction);
    EXPECT_TRUE(found.homeExists);
    EXPECT_EQ("ABC:", found.registry.exploiters);
    EXPECT_EQ("/opt/corvan/zor/ZOR_files", found.indexPath);
    EXPECT_EQ("/opt/corvan/zor", found.currentZorHome);
    EXPECT_EQ("/opt/corvan/zor", found.currentCfgHome);
    EXPECT_EQ("Looking for INI file: /etc/zor/zor.ini\n"
              "INI file found, verifying...\n"
              "ZOR directory verified ok\n"
              "Log file is: /opt/corvan/zor/ZOR_files\n"
              "currentZorHome = '/opt/corvan/zor' currentCfgHome = '/opt/corvan/zor'\n",
              log.text());
    EXPECT_TRUE(ignoreUpdateErrors);
}

TEST_F(DiscoveryTest, TheProbeLeavesNothingBehind)
{
    discoverVersion("9.2.30.0004", "22/12/02");

    EXPECT_EQ((std::vector<std::string>{"d 0755 bin", "f 0644 bin/trawlcfg"}), treeOf(Home));
}

TEST_F(DiscoveryTest, APerUserInstallationHasARegistryOfItsOwn)
{
    localInstall = true;

    (void)discoverInstallation(commandLine);

    EXPECT_EQ(0U, log.text().find("Looking for INI file: /root/.zor/zor.ini\n"));
}

TEST_F(DiscoveryTest, AnIncompleteRegistryIsStatus2)
{
    makeDirectories("/etc/zor");
    writeFile("/etc/zor/zor.ini", "ZOR_Version = 1.2\nZOR_HomeDirectory = /opt/corvan/zor\n");

    const Discovery found = discoverInstallation(commandLine);

    EXPECT_EQ(2, found.status);
    EXPECT_FALSE(found.registryFound);
    EXPECT_EQ("/opt/elsewhere", found.currentZorHome);
    EXPECT_NE(std::string::npos, log.text().find("INI file not found or outdated (code=2)\n"));
    EXPECT_EQ(std::string::npos, log.text().find("verifying"));
}

TEST_F(DiscoveryTest, ARegistryWithABadVersionIsStatus3)
{
    plantRegistry("9.x");

    const Discovery found = discoverInstallation(commandLine);

    EXPECT_EQ(3, found.status);
    EXPECT_FALSE(found.registryFound);
    EXPECT_NE(std::string::npos, log.text().find("INI file not found or outdated (code=3)\n"));
}

TEST_F(DiscoveryTest, TheConfigurationRootOfTheRegistryIsTrimmedOnTheRight)
{
    plantRegistry();
    writeFile("/etc/zor/zor.ini",
              readFile("/etc/zor/zor.ini") + "ZOR_ConfigRootDirectory = /cfg \t\r\n");

    EXPECT_EQ("/cfg", discoverInstallation(commandLine).registry.configRootDirectory);
}

TEST_F(DiscoveryTest, ABlankConfigurationRootIsTheHome)
{
    plantRegistry();
    EXPECT_EQ(Home, discoverInstallation(commandLine).registry.configRootDirectory);

    writeFile("/etc/zor/zor.ini", readFile("/etc/zor/zor.ini") + "ZOR_ConfigRootDirectory =  \t\n");
    EXPECT_EQ(Home, discoverInstallation(commandLine).registry.configRootDirectory);
}

TEST_F(DiscoveryTest, AHomeWhereNoFileCanBeCreatedIsStatus5)
{
    plantRegistry();

    const Discovery found = discoverInstallation(commandLine);

    EXPECT_EQ(5, found.status);
    EXPECT_FALSE(found.registryFound);
    EXPECT_EQ("Looking for INI file: /etc/zor/zor.ini\n"
              "INI file found, verifying...\n"
              "*** Error: cannot create file in INI home dir.\n"
              "Log file is: /opt/elsewhere/ZOR_files\n"
              "currentZorHome = '/opt/elsewhere' currentCfgHome = '/opt/elsewhere'\n",
              log.text());
}

TEST_F(DiscoveryTest, AReadOnlyHomeIsStatus5)
{
    plantRegistry();
    plantScannerControl();
    ASSERT_EQ(0, chmod(Home.c_str(), 0555));
    const OrdinaryRights rights;

    EXPECT_EQ(5, discoverInstallation(commandLine).status);
}

TEST_F(DiscoveryTest, ADiscoveryThatOnlyReadsFindsAnIntactInstallation)
{
    plantRegistry();
    plantScannerControl();

    EXPECT_EQ(0, discoverInstallation(commandLine, true).status);
}

TEST_F(DiscoveryTest, AReadOnlyHomeIsStatus5AlsoForADiscoveryThatOnlyReads)
{
    plantRegistry();
    plantScannerControl();
    ASSERT_EQ(0, chmod(Home.c_str(), 0555));
    const OrdinaryRights rights;

    EXPECT_EQ(5, discoverInstallation(commandLine, true).status);
}

TEST_F(DiscoveryTest, AMissingScannerControlIsStatus6)
{
    commandLine.action = 'r';
    plantRegistry();
    makeDirectories(Home);

    const Discovery found = discoverInstallation(commandLine);

    EXPECT_EQ(6, found.status);
    EXPECT_FALSE(found.registryFound);
    EXPECT_FALSE(found.installAction);
    EXPECT_NE(std::string::npos,
              log.text().find("*** Error: cannot find /opt/corvan/zor/bin/trawlcfg in INI home "
                              "dir.\n"));
    EXPECT_EQ(std::string::npos, log.text().find("forcing update"));
}

TEST_F(DiscoveryTest, AnEmptyScannerControlIsStatus6)
{
    commandLine.action = 'r';
    plantRegistry();
    plantScannerControl("");

    EXPECT_EQ(6, discoverInstallation(commandLine).status);

    EXPECT_NE(std::string::npos,
              log.text().find("*** Error: found /opt/corvan/zor/bin/trawlcfg with invalid "
                              "size.\n"));
}

TEST_F(DiscoveryTest, AHomeThatEndsInASlashGetsASecondOneInTheIndexOnly)
{
    makeDirectories("/etc/zor");
    writeFile("/etc/zor/zor.ini", "ZOR_Version = 1\nZOR_HomeDirectory = /opt/corvan/zor/\n"
                                  "ZOR_Exploiters = ABC:\n");
    makeDirectories(Home);
    commandLine.action = 'i';

    EXPECT_EQ("/opt/corvan/zor//ZOR_files", discoverInstallation(commandLine).indexPath);

    EXPECT_NE(std::string::npos, log.text().find("cannot find /opt/corvan/zor/bin/trawlcfg in"));
}

TEST_F(DiscoveryTest, ABrokenInstallationIsRepairedAsAnOlderOne)
{
    ignoreUpdateErrors = false;
    plantRegistry("9.9.9.9999");
    makeDirectories(Home);

    const Discovery found = discoverInstallation(commandLine);

    EXPECT_EQ(6, found.status);
    EXPECT_TRUE(found.registryFound);
    EXPECT_TRUE(found.installAction);
    EXPECT_TRUE(found.upgradeNeeded);
    EXPECT_EQ("9.2.30.0003", formatVersion(found.registry.version));
    EXPECT_EQ("ABC:", found.registry.exploiters);
    EXPECT_EQ(Home, found.currentZorHome);
    EXPECT_TRUE(ignoreUpdateErrors);
    EXPECT_NE(std::string::npos,
              log.text().find("*** Error: cannot find /opt/corvan/zor/bin/trawlcfg in INI home "
                              "dir.\nZOR broken in existing location, forcing update.\n"));
}

TEST_F(DiscoveryTest, ALevelOf1IsLoweredForARepair)
{
    commandLine.request.version = {9, 2, 30, 1, 0};
    plantRegistry("9.9.9.9999", "22/12/03");
    makeDirectories(Home);

    const Discovery found = discoverInstallation(commandLine);

    EXPECT_EQ("9.2.30.0000", formatVersion(found.registry.version));
    EXPECT_TRUE(found.upgradeNeeded);
}

TEST_F(DiscoveryTest, ALevelOf0IsNotLoweredForARepair)
{
    commandLine.request.version = {9, 2, 30, 0, 0};
    plantRegistry("9.9.9.9999", "22/12/03");
    makeDirectories(Home);

    const Discovery found = discoverInstallation(commandLine);

    EXPECT_EQ("9.2.30.0000", formatVersion(found.registry.version));
    EXPECT_FALSE(found.upgradeNeeded); // by its build date, which the repair keeps
}

TEST_F(DiscoveryTest, AHomeThatCannotBeWrittenIsNotRepaired)
{
    ignoreUpdateErrors = false;
    plantRegistry();

    EXPECT_FALSE(discoverInstallation(commandLine).registryFound);

    EXPECT_FALSE(ignoreUpdateErrors);
}

TEST_F(DiscoveryTest, AnOlderVersionNeedsAnUpgrade)
{
    EXPECT_TRUE(discoverVersion("9.2.30.0003", "23/01/01").upgradeNeeded);
}

TEST_F(DiscoveryTest, TheSameOrAnEarlierBuildOfTheSameVersionNeedsAnUpgrade)
{
    EXPECT_TRUE(discoverVersion("9.2.30.0004", "22/12/02").upgradeNeeded);
    EXPECT_TRUE(discoverVersion("9.2.30.0004", "22/12/01").upgradeNeeded);
}

TEST_F(DiscoveryTest, ALaterBuildOrANewerVersionNeedsNoUpgrade)
{
    EXPECT_FALSE(discoverVersion("9.2.30.0004", "22/12/03").upgradeNeeded);
    EXPECT_FALSE(discoverVersion("9.2.30.0005", "22/01/01").upgradeNeeded);
    EXPECT_FALSE(discoverVersion("9.2.30.0004.1", "22/01/01").upgradeNeeded);
}

TEST_F(DiscoveryTest, ARemovalIsNotAnInstallation)
{
    commandLine.action = 'r';

    const Discovery found = discoverVersion("9.2.30.0004", "22/12/02");

    EXPECT_TRUE(found.registryFound);
    EXPECT_FALSE(found.installAction);
}

TEST_F(DiscoveryTest, PrivateModeTurnsAnInstallationIntoARemoval)
{
    privateMode = true;

    EXPECT_FALSE(discoverInstallation(commandLine).installAction);

    EXPECT_EQ("Looking for INI file: /etc/zor/zor.ini\n"
              "INI file not found or outdated (code=1)\n"
              "Private mode enabled\n"
              "Changing Global install to remove\n"
              "Log file is: /opt/elsewhere/ZOR_files\n"
              "currentZorHome = '/opt/elsewhere' currentCfgHome = '/opt/elsewhere'\n",
              log.text());
}

TEST_F(DiscoveryTest, ARemovalInPrivateModeStaysOne)
{
    privateMode = true;
    commandLine.action = 'r';

    EXPECT_FALSE(discoverInstallation(commandLine).installAction);

    EXPECT_NE(std::string::npos, log.text().find("Private mode enabled\nLog file is: "));
}

TEST_F(DiscoveryTest, InPrivateModeABrokenInstallationIsNotRepaired)
{
    privateMode = true;
    plantRegistry();
    makeDirectories(Home);

    const Discovery found = discoverInstallation(commandLine);

    EXPECT_EQ(6, found.status);
    EXPECT_FALSE(found.registryFound);
    EXPECT_EQ(std::string::npos, log.text().find("forcing update"));
}

} // namespace
