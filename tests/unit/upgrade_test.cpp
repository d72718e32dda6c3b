#include "installer_fixtures.h"
#include "paths.h"
#include "process_limits.h"
#include "registry.h"
#include "safe_path.h"
#include "settings.h"
#include "toolkit_package.h"
#include "upgrade.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>

#include <sys/stat.h>

namespace {

const std::string Home = "/opt/corvan/zor";
const std::string Index = "/opt/corvan/zor/ZOR_files";
const std::string Properties = "/opt/corvan/zor/config/Zor.properties";

const std::string Deploying = "Installed ZOR is older (or the same version), performing upgrade "
                              "(deploying files)\n";
const std::string NotDeploying =
    "Installed ZOR is not older than this version, updating exploiters only\n";

/// Upgrades an installation of exploiter ABC in /opt/corvan/zor by a package of 9.2.30.0 of
/// 22/12/02, called by exploiter XYZ.
class UpgradeTest : public MachineTest {
protected:
    UpgradeTest()
    {
        installed.version = {9, 2, 29, 7, 0};
        installed.buildDate = "22/01/01";
        installed.exploiters = "ABC:";
        installed.homeDirectory = Home;
        installed.configRootDirectory = Home;
        request.version = {9, 2, 30, 0, 0};
        request.buildDate = "22/12/02";
        request.exploiters = "XYZ";
        request.homeDirectory = "/the/home/of/the/request/is/not/used";
    }

    void SetUp() override
    {
        MachineTest::SetUp();
        if (HasFatalFailure())
            return;
        plantScanners(Home, dir / "calls");
        makeDirectories(Home + "/config");
        writeFile(Properties, "version=9.2.29.0007\n");
        makeDirectories("/etc/zor");
    }

    int upgrade(bool disable = true, bool useCustomPath = false)
    {
        usePackage(dir / "package.spb", toolkit);
        const bool deploys = isUpgradeNeeded(installed, request);
        return upgradeInstall(transaction, installed, request, &Index, deploys, disable,
                              useCustomPath, dir / "traces");
    }

    [[nodiscard]] bool logHolds(const std::string& text) const
    {
        return log.text().find(text) != std::string::npos;
    }

    [[nodiscard]] std::string scannerCalls() const
    {
        return pathExists(dir / "calls") ? readFile(dir / "calls") : "";
    }

    InstallRegistry installed;
    InstallRegistry request;
    PackageFiles toolkit = toolkitFiles(dir / "calls");
};

TEST_F(UpgradeTest, LogsEachOfItsStepsInOrder)
{
    makeDirectories("/usr/kel/corvan/common/ZOR/logs");

    EXPECT_EQ(0, upgrade());

    const std::string selinux = "Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 32512\n"
                                "SELinux not enabled or not supported\n";
    EXPECT_EQ(Deploying + selinux +
                  "Exec '/opt/corvan/zor/bin/trawlfs -shutdown >/dev/null 2>&1' returned 0\n"
                  "Exec '/opt/corvan/zor/bin/trawlcfg -disable all >/dev/null 2>&1' returned 0\n"
                  "Exec '/opt/corvan/zor/bin/trawlcfg -shutdown all -timeout 60 -force "
                  ">/dev/null 2>&1' returned 0\n"
                  "Exec '/opt/corvan/zor/bin/trawlcfg -shutdown all -timeout 120 "
                  ">/dev/null 2>&1' returned 0\n"
                  "Starting file extraction...\n"
                  "Extracting configs to '/opt/corvan/zor/config'\n" +
                  selinux +
                  "Customizing properties file: /opt/corvan/zor/config/Zor.properties\n"
                  "Looking for Trace Dir\n"
                  "Customizing property file: /opt/corvan/zor/config/ZorTrace.properties\n"
                  "File saved successfully\n"
                  "Updating file with variables /opt/corvan/zor/install/trawlcfg.sh\n"
                  "Updating: /opt/corvan/zor/install/trawlcfg.sh\n"
                  "Updating file with variables /opt/corvan/zor/install/rmdirs.sh\n"
                  "Updating: /opt/corvan/zor/install/rmdirs.sh\n"
                  "Created Corvan Common Dir='/usr/kel/corvan/common' result=0\n"
                  "Adding exploiter XYZ to INI file\n"
                  "Updating BuildDate informations to: 22/12/02\n"
                  "Saving INI file to /etc/zor/zor.ini\n"
                  "Exec '/opt/corvan/zor/bin/trawlcfg -enable all >/dev/null 2>&1' returned 0\n",
              log.text());
}

// What is deployed when.

class UpgradeDecisionTest : public UpgradeTest {
protected:
    /// What an upgrade of this installed version logs first.
    std::string decisionFor(const ZorVersion& version, const std::string& buildDate)
    {
        installed.version = version;
        installed.buildDate = buildDate;
        EXPECT_EQ(0, upgrade());
        return log.text().substr(0, log.text().find('\n') + 1);
    }
};

TEST_F(UpgradeDecisionTest, AnOlderVersionIsReplaced)
{
    EXPECT_EQ(Deploying, decisionFor({9, 2, 29, 9999, 0}, "23/01/01"));
}

TEST_F(UpgradeDecisionTest, TheSameBuildIsDeployedAgain)
{
    EXPECT_EQ(Deploying, decisionFor({9, 2, 30, 0, 0}, "22/12/02"));
}

TEST_F(UpgradeDecisionTest, AnEarlierBuildOfTheSameVersionIsReplaced)
{
    EXPECT_EQ(Deploying, decisionFor({9, 2, 30, 0, 0}, "22/12/01"));
}

TEST_F(UpgradeDecisionTest, ABuildWithoutADateCountsAsTheEarliest)
{
    EXPECT_EQ(Deploying, decisionFor({9, 2, 30, 0, 0}, ""));
}

TEST_F(UpgradeDecisionTest, ALaterBuildOfTheSameVersionStays)
{
    EXPECT_EQ(NotDeploying, decisionFor({9, 2, 30, 0, 0}, "22/12/03"));

    EXPECT_EQ("", scannerCalls());
    EXPECT_EQ("version=9.2.29.0007\n", readFile(Properties));
}

TEST_F(UpgradeDecisionTest, ANewerVersionStaysWhateverItsBuildDate)
{
    EXPECT_EQ(NotDeploying, decisionFor({9, 2, 30, 0, 1}, "01/01/01"));

    EXPECT_EQ("", scannerCalls());
}

// Exploiters only.

class RegistrationOnlyTest : public UpgradeTest {
protected:
    RegistrationOnlyTest()
    {
        installed.version = {9, 3, 0, 0, 0};
        installed.buildDate = "23/01/01";
    }
};

TEST_F(RegistrationOnlyTest, AddsTheExploiterAndSavesTheRegistry)
{
    EXPECT_EQ(0, upgrade());

    EXPECT_EQ("ZOR_Version = 9.3.0.0000\n"
              "ZOR_BuildDate = 23/01/01\n"
              "ZOR_HomeDirectory = /opt/corvan/zor\n"
              "ZOR_Exploiters = ABC:XYZ:\n"
              "ZOR_ConfigRootDirectory = /opt/corvan/zor\n",
              readFile("/etc/zor/zor.ini"));
    EXPECT_EQ(NotDeploying + "Created Corvan Common Dir='/usr/kel/corvan/common' result=0\n"
                             "Setting logs dir='/usr/kel/corvan/common/ZOR/logs'\n"
                             "Adding exploiter XYZ to INI file\n"
                             "Saving INI file to /etc/zor/zor.ini\n",
              log.text());
}

TEST_F(RegistrationOnlyTest, AKnownExploiterChangesNothing)
{
    request.exploiters = "ABC";

    EXPECT_EQ(0, upgrade());

    EXPECT_FALSE(pathExists("/etc/zor/zor.ini"));
    EXPECT_FALSE(logHolds("Saving INI file"));
}

TEST_F(RegistrationOnlyTest, ASkippedRegistrationIsLoggedAndChangesNothing)
{
    skipExploiterRegistration = true;

    EXPECT_EQ(0, upgrade());

    EXPECT_TRUE(logHolds("Exploiter registration skipped\n"));
    EXPECT_EQ("ABC:", installed.exploiters);
    EXPECT_FALSE(pathExists("/etc/zor/zor.ini"));
}

TEST_F(RegistrationOnlyTest, TheSkippedRegistrationOfAKnownExploiterIsNotLogged)
{
    skipExploiterRegistration = true;
    request.exploiters = "ABC";

    EXPECT_EQ(0, upgrade());

    EXPECT_FALSE(logHolds("Exploiter registration skipped"));
}

TEST_F(RegistrationOnlyTest, ALaterBuildDateOfThePackageIsStored)
{
    installed.buildDate = "22/12/01";
    request.exploiters = "ABC";

    EXPECT_EQ(0, upgrade());

    EXPECT_TRUE(logHolds("Updating BuildDate informations to: 22/12/02\n"));
    EXPECT_EQ("22/12/02", installed.buildDate);
    EXPECT_TRUE(pathExists("/etc/zor/zor.ini"));
}

TEST_F(RegistrationOnlyTest, TheVersionOfThePackageIsNotStored)
{
    EXPECT_EQ(0, upgrade());

    EXPECT_EQ(3U, installed.version.minor);
}

TEST_F(RegistrationOnlyTest, ARegistryThatCannotBeSavedIsTheResult)
{
    makeDirectories("/etc/zor/zor.ini");

    EXPECT_EQ(4, upgrade());

    EXPECT_TRUE(logHolds("*** Error: could not open or write to INI file. Error = 4\n"));
}

TEST_F(RegistrationOnlyTest, APerUserInstallationDoesNotSetUpTheCommonLogDirectory)
{
    localInstall = true;
    makeDirectories("/root/.zor");

    EXPECT_EQ(0, upgrade());

    EXPECT_FALSE(pathExists("/usr/kel"));
    EXPECT_TRUE(pathExists("/root/.zor/zor.ini"));
}

TEST_F(RegistrationOnlyTest, ACustomTracePathDoesNotSetUpALogDirectory)
{
    EXPECT_EQ(0, upgrade(true, true));

    EXPECT_FALSE(pathExists("/usr/kel"));
    EXPECT_FALSE(pathExists("/etc/kel"));
    EXPECT_FALSE(pathExists(dir / "traces"));
}

TEST_F(RegistrationOnlyTest, DetectsSingleUserMode)
{
    writeFile(Home + "/config/SingleUserMode", "");

    EXPECT_EQ(0, upgrade());

    EXPECT_EQ(0U, log.text().find("Single user mode file found\n" + NotDeploying));
    EXPECT_EQ(0755U, modeOf("/usr/kel/corvan/common/ZOR/logs"));
}

TEST_F(RegistrationOnlyTest, CreatesTheSingleUserFlagWhenAsked)
{
    createSingleUserModeFile = true;

    EXPECT_EQ(0, upgrade());

    EXPECT_EQ("", readFile(Home + "/config/SingleUserMode"));
    EXPECT_EQ("/opt/corvan/zor/config/SingleUserMode\n", readFile(Index));
}

TEST_F(RegistrationOnlyTest, ASignalLeavesTheRegistryUnwritten)
{
    EXPECT_TRUE(passesInChild([&] {
        const InterruptionAt decision(NotDeploying);

        EXPECT_EQ(14, upgrade());
    }));

    EXPECT_FALSE(pathExists("/etc/zor/zor.ini"));
}

// Deployment.

using DeploymentTest = UpgradeTest;

TEST_F(DeploymentTest, StoresVersionBuildDateAndExploiter)
{
    EXPECT_EQ(0, upgrade());

    EXPECT_EQ("ZOR_Version = 9.2.30.0000\n"
              "ZOR_BuildDate = 22/12/02\n"
              "ZOR_HomeDirectory = /opt/corvan/zor\n"
              "ZOR_Exploiters = ABC:XYZ:\n"
              "ZOR_ConfigRootDirectory = /opt/corvan/zor\n",
              readFile("/etc/zor/zor.ini"));
}

TEST_F(DeploymentTest, ABuildDateThatIsNotLaterIsKeptWithTheNewVersion)
{
    installed.buildDate = "23/05/05";

    EXPECT_EQ(0, upgrade());

    EXPECT_EQ("23/05/05", installed.buildDate);
    EXPECT_EQ(30U, installed.version.release);
    EXPECT_FALSE(logHolds("Updating BuildDate"));
}

TEST_F(DeploymentTest, SavesTheRegistryAlsoForAKnownExploiter)
{
    request.exploiters = "ABC";
    request.buildDate = installed.buildDate;

    EXPECT_EQ(0, upgrade());

    EXPECT_FALSE(logHolds("Adding exploiter"));
    EXPECT_NE(std::string::npos, readFile("/etc/zor/zor.ini").find("ZOR_Version = 9.2.30.0000\n"));
}

TEST_F(DeploymentTest, StopsTheScannersAndStartsThemAgain)
{
    EXPECT_EQ(0, upgrade());

    EXPECT_EQ("trawlfs [-shutdown]\n"
              "trawlcfg [-disable] [all]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [60] [-force]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [120]\n"
              "trawlcfg [-enable] [all]\n",
              scannerCalls());
}

TEST_F(DeploymentTest, DisablesTheScannersOnlyWhenAsked)
{
    EXPECT_EQ(0, upgrade(false));

    EXPECT_EQ("trawlfs [-shutdown]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [60] [-force]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [120]\n"
              "trawlcfg [-enable] [all]\n",
              scannerCalls());
}

TEST_F(DeploymentTest, LetsTheScannersFindTheirLibraries)
{
    EXPECT_EQ(0, upgrade());

    EXPECT_STREQ("/opt/corvan/zor/bin", std::getenv("LD_LIBRARY_PATH"));
}

TEST_F(DeploymentTest, ScannersThatCannotBeStoppedEndItWith7)
{
    ignoreUpdateErrors = false;
    plantScanners(Home, dir / "calls", "-disable");
    makeDirectories(Home + "/properties");

    EXPECT_EQ(7, upgrade());

    EXPECT_TRUE(logHolds("Cannot stop ZOR for update\n"));
    EXPECT_FALSE(logHolds("Starting file extraction"));
    EXPECT_TRUE(pathExists(Home + "/properties"));
    EXPECT_EQ("ABC:", installed.exploiters);
    EXPECT_EQ("trawlfs [-shutdown]\ntrawlcfg [-disable] [all]\n", scannerCalls());
}

TEST_F(DeploymentTest, CreatesTheSingleUserFlagAlsoWhenTheScannersCannotBeStopped)
{
    ignoreUpdateErrors = false;
    createSingleUserModeFile = true;
    plantScanners(Home, dir / "calls", "-shutdown");

    EXPECT_EQ(7, upgrade());

    EXPECT_TRUE(pathExists(Home + "/config/SingleUserMode"));
}

TEST_F(DeploymentTest, ARestartThatFailsIsLoggedAndIsNotAFailure)
{
    toolkit = toolkitFiles(dir / "calls", "-enable");

    EXPECT_EQ(0, upgrade());

    EXPECT_TRUE(logHolds("returned 768\n*** Error: could not restart ZOR.\n"));
}

TEST_F(DeploymentTest, RemovesTheOldPropertiesWithEverythingInThem)
{
    makeDirectories(Home + "/properties/mine");
    writeFile(Home + "/properties/mine/file", "");

    EXPECT_EQ(0, upgrade());

    EXPECT_TRUE(logHolds("DEL: /opt/corvan/zor/properties/mine/file\n"
                         "RMDIR: /opt/corvan/zor/properties/mine\n"
                         "RMDIR: /opt/corvan/zor/properties\n"));
    EXPECT_EQ(std::vector<std::string>{"f 0755 scan.properties"}, treeOf(Home + "/properties"));
}

TEST_F(DeploymentTest, ARollbackDoesNotBringTheOldPropertiesBack)
{
    makeDirectories(Home + "/properties");
    writeFile(Home + "/properties/old", "");
    contentOf(toolkit, "bin/trawlhw") = "";
    ASSERT_EQ(1, upgrade());

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_FALSE(pathExists(Home + "/properties"));
}

TEST_F(DeploymentTest, AFailedExtractionEndsItWithItsCodeAndStartsTheScannersAgain)
{
    createSingleUserModeFile = true;
    contentOf(toolkit, "bin/trawlhw") = "";

    EXPECT_EQ(1, upgrade());

    EXPECT_TRUE(logHolds("File extraction failed, error = 1 (Cannot open file for reading)\n"
                         "File extraction failed\n"
                         "Creating single user mode flag file: "
                         "/opt/corvan/zor/config/SingleUserMode\n"
                         "Exec '/opt/corvan/zor/bin/trawlcfg -enable all >/dev/null 2>&1' "
                         "returned 0\n"));
    EXPECT_FALSE(logHolds("Customizing"));
    EXPECT_FALSE(pathExists("/etc/zor/zor.ini"));
}

TEST_F(DeploymentTest, ReplacesFilesWithABackupAndKeepsTheMainPropertyFile)
{
    writeFile(Home + "/bin/trawlhw", "old scanner\n");

    EXPECT_EQ(0, upgrade());

    EXPECT_EQ("hardware scanner\n", readFile(Home + "/bin/trawlhw"));
    EXPECT_EQ("old scanner\n", readFile(Home + "/bin/trawlhw.bak"));
    EXPECT_EQ(0U, readFile(Properties).find("version=9.2.30.0000\nbuild_date=22/12/02\n"));
    EXPECT_FALSE(pathExists(Properties + ".bak"));
}

TEST_F(DeploymentTest, WorksWithoutAnIndex)
{
    usePackage(dir / "package.spb", toolkit);
    createSingleUserModeFile = true;

    EXPECT_EQ(0, upgradeInstall(transaction, installed, request, nullptr, true, true, false, ""));

    EXPECT_FALSE(pathExists(Index));
    EXPECT_EQ("hardware scanner\n", readFile(Home + "/bin/trawlhw"));
}

TEST_F(DeploymentTest, UpdatesTheScriptsOfASharedInstallation)
{
    EXPECT_EQ(0, upgrade());

    EXPECT_EQ("home=/opt/corvan/zor\nconfig=/opt/corvan/zor\ncommon=/usr/kel/corvan/common\n",
              readFile(Home + "/install/trawlcfg.sh"));
    EXPECT_EQ("rmdir /usr/kel/corvan/common/ZOR\n", readFile(Home + "/install/rmdirs.sh"));
}

TEST_F(DeploymentTest, LeavesTheScriptsOfAPerUserInstallationAlone)
{
    localInstall = true;
    makeDirectories("/root/.zor");

    EXPECT_EQ(0, upgrade());

    EXPECT_FALSE(logHolds("Updating file with variables"));
    EXPECT_EQ("rmdir $(CorvanCommonDir)/ZOR\n", readFile(Home + "/install/rmdirs.sh"));
}

TEST_F(DeploymentTest, SetsUpTheCommonLogDirectoryOfASharedInstallation)
{
    EXPECT_EQ(0, upgrade());

    EXPECT_EQ(0777U, modeOf("/usr/kel/corvan/common/ZOR/logs"));
}

TEST_F(DeploymentTest, ACustomTracePathLeavesTheCommonDirectoryUnwritten)
{
    EXPECT_EQ(0, upgrade(true, true));

    EXPECT_FALSE(pathExists("/usr/kel"));
    EXPECT_FALSE(pathExists("/etc/kel"));
    EXPECT_EQ("rmdir /usr/kel/corvan/common/ZOR\n", readFile(Home + "/install/rmdirs.sh"));
}

TEST_F(DeploymentTest, ARegistryThatCannotBeSavedIsTheResult)
{
    makeDirectories("/etc/zor/zor.ini");

    EXPECT_EQ(4, upgrade());

    EXPECT_TRUE(logHolds("*** Error: could not open or write to INI file. Error = 4\n"
                         "Exec '/opt/corvan/zor/bin/trawlcfg -enable all"));
}

TEST_F(DeploymentTest, LabelsTheFilesBeforeAndAfterTheExtraction)
{
    writeFile("/usr/sbin/selinuxenabled",
              "#!/bin/sh\necho selinuxenabled >>\"" + dir / "calls" + "\"\nexit 1\n");
    ASSERT_EQ(0, chmod("/usr/sbin/selinuxenabled", 0755));

    EXPECT_EQ(0, upgrade());

    EXPECT_EQ("selinuxenabled\n"
              "trawlfs [-shutdown]\n"
              "trawlcfg [-disable] [all]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [60] [-force]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [120]\n"
              "selinuxenabled\n"
              "trawlcfg [-enable] [all]\n",
              scannerCalls());
}

TEST_F(DeploymentTest, ASignalDuringTheLabellingLeavesTheSettingsUnchanged)
{
    EXPECT_TRUE(passesInChild([&] {
        const InterruptionAt labelling("Extracting configs to '/opt/corvan/zor/config'\n"
                                       "Exec '/usr/sbin/selinuxenabled");

        EXPECT_EQ(14, upgrade());

        EXPECT_EQ(std::string::npos, labelling.log().find("Customizing"));
    }));

    EXPECT_EQ("version=9.2.29.0007\n", readFile(Properties));
}

TEST_F(DeploymentTest, ASignalDuringTheCustomizationLeavesTheRegistryUnwritten)
{
    EXPECT_TRUE(passesInChild([&] {
        const InterruptionAt customization("Customizing property file: ");

        EXPECT_EQ(14, upgrade());
    }));

    EXPECT_FALSE(pathExists("/etc/zor/zor.ini"));
}

// Obsolete files.

using ObsoleteFilesTest = InstallerTest;

TEST_F(ObsoleteFilesTest, AreDeletedFromTheBinariesInTheirOrder)
{
    const std::string bin = dir / "bin/";
    makeDirectories(bin);
    for (const char* const name :
         {"libxerces-c.so.26", "kpo_config.xml", "libzor.so", "trawluse.so", "trawluse",
          "trawlnet.so", "trawlnet", "trawlhw", "trawlnet.txt"})
        writeFile(bin + name, "");

    removeObsoleteFiles(dir.path());

    EXPECT_EQ(
        std::vector<std::string>({"d 0755 bin", "f 0644 bin/trawlhw", "f 0644 bin/trawlnet.txt"}),
        treeOf(dir.path()));
    EXPECT_EQ("DEL: " + bin + "trawlnet\nDEL: " + bin + "trawlnet.so\nDEL: " + bin +
                  "trawluse\nDEL: " + bin + "trawluse.so\nDEL: " + bin + "libzor.so\nDEL: " + bin +
                  "kpo_config.xml\nDEL: " + bin + "libxerces-c.so.26\n",
              log.text());
}

TEST_F(ObsoleteFilesTest, ThatAreMissingAreSkippedSilently)
{
    makeDirectories(dir / "bin");
    writeFile(dir / "bin/libzor.so", "");

    removeObsoleteFiles(dir.path());

    EXPECT_EQ("DEL: " + dir / "bin/libzor.so" + "\n", log.text());
}

TEST_F(ObsoleteFilesTest, EmptyDirectoriesOfTheirNamesAreDeletedToo)
{
    makeDirectories(dir / "bin/trawlnet");

    removeObsoleteFiles(dir.path());

    EXPECT_FALSE(pathExists(dir / "bin/trawlnet"));
}

TEST_F(DeploymentTest, DeletesObsoleteFilesBeforeTheExtractionForGood)
{
    writeFile(Home + "/bin/trawlnet", "");
    writeFile(Home + "/bin/libzor.so", "old");
    toolkit.emplace_back("bin/libzor.so", "new");
    contentOf(toolkit, "config/ZorHWConfig.xml") = "";
    ASSERT_EQ(1, upgrade());

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_TRUE(logHolds("DEL: /opt/corvan/zor/bin/trawlnet\nDEL: /opt/corvan/zor/bin/libzor.so\n"
                         "Starting file extraction...\n"));
    EXPECT_FALSE(pathExists(Home + "/bin/trawlnet"));
    EXPECT_FALSE(pathExists(Home + "/bin/libzor.so"));
}

TEST_F(DeploymentTest, AMissingMainPropertyFileEndsItBeforeTheCommonDirectoryIsRead)
{
    std::filesystem::remove(Properties);

    EXPECT_EQ(2, upgrade());

    EXPECT_TRUE(logHolds("Customizing properties file: /opt/corvan/zor/config/Zor.properties\n"
                         "Loading file /opt/corvan/zor/config/Zor.properties error: 2 "
                         "(No such file or directory)\n"
                         "Could not load property file\n"
                         "Exec '/opt/corvan/zor/bin/trawlcfg -enable all"));
    EXPECT_FALSE(pathExists("/etc/kel"));
    EXPECT_FALSE(pathExists("/etc/zor/zor.ini"));
}

TEST_F(DeploymentTest, AMissingTracePropertyFileEndsIt)
{
    toolkit = without(toolkit, "config/ZorTrace.properties");

    EXPECT_EQ(2, upgrade());

    EXPECT_TRUE(logHolds("Customizing property file: "
                         "/opt/corvan/zor/config/ZorTrace.properties\n"
                         "Loading file /opt/corvan/zor/config/ZorTrace.properties error: 2 "
                         "(No such file or directory)\n"
                         "Could not load property file\n"
                         "Exec '/opt/corvan/zor/bin/trawlcfg -enable all"));
    EXPECT_FALSE(pathExists("/etc/zor/zor.ini"));
}

} // namespace
