#include "fresh_install.h"
#include "installer_fixtures.h"
#include "paths.h"
#include "process_limits.h"
#include "registry.h"
#include "safe_path.h"
#include "settings.h"
#include "toolkit_package.h"

#include <gtest/gtest.h>

#include <sys/stat.h>

namespace {

using Lines = std::vector<std::string>;

const std::string Home = "/opt/corvan/zor";
const std::string Index = "/opt/corvan/zor/ZOR_files";

using SubdirTest = InstallerTest;

TEST_F(SubdirTest, IsCreatedWithItsMissingParents)
{
    EXPECT_EQ(0, makeSubdir(transaction, dir / "zor/bin", "etc", 0750));

    const std::vector<std::string> expected = {"d 0750 zor", "d 0750 zor/bin",
                                               "d 0750 zor/bin/etc"};
    EXPECT_EQ(expected, treeOf(dir.path()));
    EXPECT_EQ("4 " + dir / "zor" + "\n4 " + dir / "zor/bin" + "\n4 " + dir / "zor/bin/etc" + "\n",
              journalText(transaction));
    EXPECT_EQ("", log.text());
}

TEST_F(SubdirTest, ThatExistsIsLeftAsItIs)
{
    makeDirectories(dir / "etc");

    EXPECT_EQ(0, makeSubdir(transaction, dir.path(), "etc", 0700));

    EXPECT_EQ(0755U, modeOf(dir / "etc"));
    EXPECT_TRUE(transaction.journal.empty());
}

TEST_F(SubdirTest, ThatCannotBeCreatedIsCode11AndIsLogged)
{
    writeFile(dir / "file", "");

    EXPECT_EQ(11, makeSubdir(transaction, dir / "file", "etc", 0755));

    EXPECT_EQ("Error creating dir etc in " + dir / "file" +
                  " result=11 (Cannot create directory)\n",
              log.text());
}

using InstallDirTest = InstallerTest;

TEST_F(InstallDirTest, IsCreatedWithMode0750UnderTheInstallersUmask)
{
    (void)umask(077);

    EXPECT_EQ(0, createInstallDir(transaction, dir.path()));

    EXPECT_EQ(0750U, modeOf(dir / "install"));
    EXPECT_EQ("4 " + dir / "install" + "\n", journalText(transaction));
}

TEST_F(InstallDirTest, FollowsTheInstallersUmaskAndRestoresThePreviousOne)
{
    globalFilesUmask = 0027;
    (void)umask(003);

    EXPECT_EQ(0, createInstallDir(transaction, dir.path()));

    EXPECT_EQ(0750U, modeOf(dir / "install"));
    EXPECT_EQ(003U, umask(022));
}

TEST_F(InstallDirTest, ThatCannotBeCreatedIsMinus1)
{
    writeFile(dir / "file", "");

    EXPECT_EQ(-1, createInstallDir(transaction, dir / "file"));

    EXPECT_EQ("Error creating dir install in " + dir / "file" +
                  " result=11 (Cannot create directory)\n",
              log.text());
}

/// Installs a small toolkit for the exploiter ABC to /opt/corvan/zor.
class FreshInstallTest : public MachineTest {
protected:
    FreshInstallTest()
    {
        registry.version = {9, 2, 30, 0, 0};
        registry.buildDate = "22/12/02";
        registry.exploiters = "ABC";
        registry.homeDirectory = Home;
        registry.configRootDirectory = Home;
    }

    int install(bool writeRegistry = true, bool useCustomPath = false)
    {
        usePackage(dir / "package.spb", toolkit);
        return freshInstall(transaction, registry, &Index, writeRegistry, useCustomPath,
                            dir / "traces");
    }

    /// Makes the package extract nothing, so that only what is there already is installed.
    void useEmptyPackage() { toolkit = {{"docs/readme", "nothing to install"}}; }

    /// The installed files that an installation works on after its extraction.
    static void plantConfiguration()
    {
        makeDirectories(Home + "/config");
        writeFile(Home + "/config/Zor.properties", "a=1\n");
        writeFile(Home + "/config/ZorTrace.properties", "b=2\n");
    }

    [[nodiscard]] bool logHolds(const std::string& text) const
    {
        return log.text().find(text) != std::string::npos;
    }

    [[nodiscard]] std::string scannerCalls() const
    {
        return pathExists(dir / "calls") ? readFile(dir / "calls") : "";
    }

    InstallRegistry registry;
    PackageFiles toolkit = toolkitFiles(dir / "calls");
};

TEST_F(FreshInstallTest, LogsEachOfItsStepsInOrder)
{
    makeDirectories("/usr/kel/corvan/common/ZOR/logs");

    EXPECT_EQ(0, install());

    EXPECT_EQ("Performing fresh install on /opt/corvan/zor (config=/opt/corvan/zor/config)\n"
              "Starting file extraction...\n"
              "Extracting configs to '/opt/corvan/zor/config'\n"
              "Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 32512\n"
              "SELinux not enabled or not supported\n"
              "Customizing property file: /opt/corvan/zor/config/Zor.properties\n"
              "Customizing property file: /opt/corvan/zor/config/ZorTrace.properties\n"
              "Updating file with variables /opt/corvan/zor/install/trawlcfg.sh\n"
              "Updating: /opt/corvan/zor/install/trawlcfg.sh\n"
              "Updating file with variables /opt/corvan/zor/install/rmdirs.sh\n"
              "Updating: /opt/corvan/zor/install/rmdirs.sh\n"
              "Saving INI file to /etc/zor/zor.ini\n"
              "Created Corvan Common Dir='/usr/kel/corvan/common' result=0\n"
              "Updating common trace path='/usr/kel/corvan/common' result=0\n"
              "Exec '/opt/corvan/zor/bin/trawlcfg -s common_trace_path "
              "/usr/kel/corvan/common/ZOR/logs >/dev/null 2>&1' returned 0\n"
              "Setting common trace path='/usr/kel/corvan/common/ZOR/logs' result=0\n",
              log.text());
}

TEST_F(FreshInstallTest, CreatesTheDirectoriesThatThePackageDoesNotContain)
{
    useEmptyPackage();
    plantConfiguration();
    (void)umask(077);

    EXPECT_EQ(127 << 8, install()); // there is no scanner control

    EXPECT_EQ(0777U, modeOf(Home + "/cache_data"));
    EXPECT_EQ(0777U, modeOf(Home + "/bin/etc"));
    EXPECT_EQ(0750U, modeOf(Home + "/install"));
    EXPECT_EQ(0755U, modeOf("/etc/zor"));
    EXPECT_EQ(0666U, modeOf(Home + "/install/zor_install.properties"));
    EXPECT_EQ(077U, umask(022));
}

TEST_F(FreshInstallTest, TheCacheDirectoryOfAnOrdinaryUserIsClosedToOthers)
{
    EXPECT_TRUE(passesInChild([&] {
        becomeUser(1000);
        localInstall = true;

        EXPECT_EQ(0, install());

        EXPECT_EQ(0770U, modeOf(Home + "/cache_data"));
        EXPECT_EQ(0777U, modeOf(Home + "/bin/etc"));
    }));
}

TEST_F(FreshInstallTest, TheSingleUserFlagAppliesToEveryDirectory)
{
    plantConfiguration();
    writeFile(Home + "/config/SingleUserMode", "");
    (void)umask(0);

    EXPECT_EQ(0, install());

    EXPECT_EQ(0U, log.text().find("Single user mode file found\nPerforming fresh install on "));
    EXPECT_EQ(0755U, modeOf(Home + "/cache_data"));
    EXPECT_EQ(0755U, modeOf(Home + "/bin/etc"));
    EXPECT_EQ(0750U, modeOf(Home + "/install"));
    EXPECT_EQ(0644U, modeOf(Home + "/install/zor_install.properties"));
    EXPECT_EQ(0755U, modeOf("/usr/kel/corvan/common/ZOR/logs"));
}

TEST_F(FreshInstallTest, FillsThePlaceholdersOfTheMainPropertyFile)
{
    fileScannerMode = "provider_remote_cache";

    EXPECT_EQ(0, install());

    EXPECT_EQ("version=9.2.30.0000\n"
              "build_date=22/12/02\n"
              "trace_level=3\n"
              "trace_file_path=/opt/corvan/zor/logs\n"
              "trace_file=zor.trc\n"
              "provider=provider_remote_cache\n"
              "cache=/opt/corvan/zor/cache_data\n"
              "common=$(CorvanCommonDir)\n",
              readFile(Home + "/config/Zor.properties"));
}

TEST_F(FreshInstallTest, FillsTwoPlaceholdersOfTheTraceProperties)
{
    EXPECT_EQ(0, install());

    EXPECT_EQ("handlers.traceFile.fileName=/opt/corvan/zor/x.trc\n"
              "zor.loggers.trcLogger.level=DEBUG_MIN\n"
              "root=/opt/corvan/zor\n"
              "separator=$(FileSeparator)\n",
              readFile(Home + "/config/ZorTrace.properties"));
}

TEST_F(FreshInstallTest, FillsThePlaceholdersOfTheScripts)
{
    EXPECT_EQ(0, install());

    EXPECT_EQ("home=/opt/corvan/zor\nconfig=/opt/corvan/zor\ncommon=/usr/kel/corvan/common\n",
              readFile(Home + "/install/trawlcfg.sh"));
    EXPECT_EQ("rmdir /usr/kel/corvan/common/ZOR\n", readFile(Home + "/install/rmdirs.sh"));
}

TEST_F(FreshInstallTest, APackageWithoutScriptsInstalls)
{
    toolkit = without(toolkit, "install/trawlcfg.sh");

    EXPECT_EQ(0, install());

    EXPECT_TRUE(logHolds("Script does not exist /opt/corvan/zor/install/trawlcfg.sh\n"));
}

TEST_F(FreshInstallTest, RegistersTheExploiterWithItsColon)
{
    EXPECT_EQ(0, install());

    EXPECT_EQ("ZOR_Version = 9.2.30.0000\n"
              "ZOR_BuildDate = 22/12/02\n"
              "ZOR_HomeDirectory = /opt/corvan/zor\n"
              "ZOR_Exploiters = ABC:\n"
              "ZOR_ConfigRootDirectory = /opt/corvan/zor\n",
              readFile("/etc/zor/zor.ini"));
}

TEST_F(FreshInstallTest, ASkippedRegistrationLeavesAColonAlone)
{
    skipExploiterRegistration = true;

    EXPECT_EQ(0, install());

    EXPECT_EQ(":", registry.exploiters);
    EXPECT_NE(std::string::npos, readFile("/etc/zor/zor.ini").find("ZOR_Exploiters = :\n"));
    EXPECT_FALSE(logHolds("Exploiter registration skipped"));
}

TEST_F(FreshInstallTest, WritesNoRegistryUnlessAsked)
{
    EXPECT_EQ(0, install(false));

    EXPECT_FALSE(pathExists("/etc/zor"));
    EXPECT_EQ("ABC", registry.exploiters);
    EXPECT_FALSE(logHolds("Saving INI file"));
}

TEST_F(FreshInstallTest, TheRegistryHasItsModeFromTheProcessUmask)
{
    globalFilesUmask = 0;
    (void)umask(027);

    EXPECT_EQ(0, install());

    EXPECT_EQ(0640U, modeOf("/etc/zor/zor.ini"));
    EXPECT_EQ(0755U, modeOf("/etc/zor"));
}

TEST_F(FreshInstallTest, RecordsASharedInstallationAndListsThatFile)
{
    EXPECT_EQ(0, install());

    EXPECT_EQ("ZOR_InstallType=global\n", readFile(Home + "/install/zor_install.properties"));
    const std::string index = readFile(Index);
    const std::string last = "/opt/corvan/zor/install/zor_install.properties\n";
    EXPECT_EQ(index.size() - last.size(), index.find(last));
}

TEST_F(FreshInstallTest, RecordsAPerUserInstallation)
{
    localInstall = true;

    EXPECT_EQ(0, install());

    EXPECT_EQ("ZOR_InstallType=local\n", readFile(Home + "/install/zor_install.properties"));
    EXPECT_TRUE(pathExists("/root/.zor/zor.ini"));
}

TEST_F(FreshInstallTest, TheRecordOfTheInstallTypeIsNotJournalled)
{
    ASSERT_EQ(0, install());

    EXPECT_EQ(std::string::npos, journalText(transaction).find("zor_install.properties"));
}

TEST_F(FreshInstallTest, AnInstallTypeThatCannotBeRecordedIsNotAFailure)
{
    makeDirectories(Home + "/install/zor_install.properties");

    EXPECT_EQ(0, install());

    EXPECT_TRUE(logHolds("Could not create file /opt/corvan/zor/install/zor_install.properties\n"));
    EXPECT_EQ(std::string::npos, readFile(Index).find("zor_install.properties"));
}

TEST_F(FreshInstallTest, WorksWithoutAnIndex)
{
    usePackage(dir / "package.spb", toolkit);
    createSingleUserModeFile = true;

    EXPECT_EQ(0, freshInstall(transaction, registry, nullptr, true, false, ""));

    EXPECT_FALSE(pathExists(Index));
    EXPECT_EQ("ZOR_InstallType=global\n", readFile(Home + "/install/zor_install.properties"));
    EXPECT_TRUE(pathExists(Home + "/config/SingleUserMode"));
}

TEST_F(FreshInstallTest, CreatesTheSingleUserFlagWhenAsked)
{
    createSingleUserModeFile = true;

    EXPECT_EQ(0, install());

    EXPECT_EQ("", readFile(Home + "/config/SingleUserMode"));
    EXPECT_TRUE(
        logHolds("Creating single user mode flag file: /opt/corvan/zor/config/SingleUserMode\n"));
    const std::string index = readFile(Index);
    const std::string last = "/opt/corvan/zor/config/SingleUserMode\n";
    EXPECT_EQ(index.size() - last.size(), index.rfind(last));
}

TEST_F(FreshInstallTest, CreatesTheSingleUserFlagAlsoAfterAFailure)
{
    createSingleUserModeFile = true;
    makeDirectories(Home + "/config");
    contentOf(toolkit, "bin/trawlhw") = "";

    EXPECT_EQ(1, install());

    EXPECT_TRUE(pathExists(Home + "/config/SingleUserMode"));
}

TEST_F(FreshInstallTest, ASharedInstallationConfiguresTheTraceDirectory)
{
    EXPECT_EQ(0, install());

    EXPECT_EQ("trawlcfg [-s] [common_trace_path] [/usr/kel/corvan/common/ZOR/logs]\n",
              scannerCalls());
}

TEST_F(FreshInstallTest, APerUserInstallationNeverRunsTheScannerControl)
{
    localInstall = true;

    EXPECT_EQ(0, install());

    EXPECT_EQ("", scannerCalls());
    EXPECT_FALSE(pathExists("/usr/kel"));
}

TEST_F(FreshInstallTest, APerUserInstallationConfiguresItsOwnTracePath)
{
    localInstall = true;

    EXPECT_EQ(0, install(true, true));

    EXPECT_EQ("trawlcfg [-s] [common_trace_path] [" + dir / "traces" + "]\n", scannerCalls());
    EXPECT_TRUE(pathExists(dir / "traces"));
}

TEST_F(FreshInstallTest, ACustomTracePathLeavesTheCommonDirectoryUnwritten)
{
    EXPECT_EQ(0, install(true, true));

    EXPECT_FALSE(pathExists("/etc/kel"));
    EXPECT_FALSE(pathExists("/usr/kel"));
    EXPECT_NE(std::string::npos,
              readFile(Home + "/install/trawlcfg.sh").find("common=/usr/kel/corvan/common\n"));
}

TEST_F(FreshInstallTest, AFailingTracePathCommandFailsTheInstallation)
{
    toolkit = toolkitFiles(dir / "calls", "common_trace_path");

    EXPECT_EQ(768, install());

    EXPECT_TRUE(pathExists("/etc/zor/zor.ini"));
}

TEST_F(FreshInstallTest, AFailedExtractionEndsWithItsCodeAfterTheLabelling)
{
    contentOf(toolkit, "bin/trawlhw") = "";

    EXPECT_EQ(1, install());

    EXPECT_EQ("Performing fresh install on /opt/corvan/zor (config=/opt/corvan/zor/config)\n"
              "Starting file extraction...\n"
              "Bin dir file extraction failed\n"
              "File extraction failed, error = 1 (Cannot open file for reading)\n"
              "Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 32512\n"
              "SELinux not enabled or not supported\n",
              log.text());
    EXPECT_FALSE(pathExists(Home + "/cache_data"));
}

TEST_F(FreshInstallTest, ACacheDirectoryThatCannotBeMadeIsCode11)
{
    useEmptyPackage();
    plantConfiguration();
    makeDirectories(Home + "/bin");
    writeFile(Index, "");
    ASSERT_EQ(0, chmod(Home.c_str(), 0555));
    {
        const OrdinaryRights rights;
        EXPECT_EQ(11, install());
    }

    EXPECT_TRUE(logHolds("Error creating dir cache_data in /opt/corvan/zor result=11 "
                         "(Cannot create directory)\nCannot create subdir: cache_data\n"));
    EXPECT_FALSE(logHolds("Customizing"));
    EXPECT_FALSE(pathExists(Home + "/bin/etc"));
}

TEST_F(FreshInstallTest, AnEtcDirectoryThatCannotBeMadeIsCode11)
{
    useEmptyPackage();
    plantConfiguration();
    writeFile(Home + "/bin", "in the way");

    EXPECT_EQ(11, install());

    EXPECT_TRUE(logHolds("Error creating dir etc in /opt/corvan/zor/bin result=11 "
                         "(Cannot create directory)\nCannot create subdir: etc\n"));
    EXPECT_FALSE(pathExists(Home + "/install"));
}

TEST_F(FreshInstallTest, AnInstallDirectoryThatCannotBeMadeIsMinus1)
{
    useEmptyPackage();
    plantConfiguration();
    makeDirectories(Home + "/cache_data");
    makeDirectories(Home + "/bin/etc");
    writeFile(Index, "");
    ASSERT_EQ(0, chmod(Home.c_str(), 0555));
    {
        const OrdinaryRights rights;
        EXPECT_EQ(-1, install());
    }

    EXPECT_TRUE(logHolds("Error creating dir install in /opt/corvan/zor result=11 "
                         "(Cannot create directory)\nCannot create extra directories!\n"));
    EXPECT_FALSE(logHolds("Customizing"));
}

TEST_F(FreshInstallTest, AMissingMainPropertyFileFailsTheInstallation)
{
    toolkit = without(toolkit, "config/Zor.properties");

    EXPECT_EQ(2, install());

    EXPECT_TRUE(logHolds("Customizing property file: /opt/corvan/zor/config/Zor.properties\n"
                         "Loading file /opt/corvan/zor/config/Zor.properties error: 2 "
                         "(No such file or directory)\nCould not load property file\n"));
    EXPECT_FALSE(logHolds("ZorTrace.properties"));
    EXPECT_FALSE(pathExists("/etc/zor"));
}

TEST_F(FreshInstallTest, AMissingTracePropertyFileFailsTheInstallation)
{
    toolkit = without(toolkit, "config/ZorTrace.properties");

    EXPECT_EQ(2, install());

    EXPECT_TRUE(logHolds("Loading file /opt/corvan/zor/config/ZorTrace.properties error: 2 "
                         "(No such file or directory)\nCould not load property file\n"));
    EXPECT_FALSE(logHolds("Updating file with variables"));
    EXPECT_FALSE(pathExists("/etc/zor"));
    EXPECT_FALSE(pathExists("/etc/kel"));
}

TEST_F(FreshInstallTest, APropertyFileThatCannotBeSavedFailsTheInstallation)
{
    for (const char* const name : {"Zor.properties", "ZorTrace.properties"}) {
        useEmptyPackage();
        plantConfiguration();
        const std::string path = Home + "/config/" + name;
        ASSERT_EQ(0, chmod(path.c_str(), 0444));
        {
            const OrdinaryRights rights;
            EXPECT_EQ(13, install()) << name;
        }
        EXPECT_TRUE(logHolds("Saving file " + path +
                             " error: 13 (Permission denied)\nCould not save property file\n"))
            << name;
        ASSERT_EQ(0, chmod(path.c_str(), 0644));
    }
    EXPECT_FALSE(pathExists("/etc/zor"));
}

TEST_F(FreshInstallTest, ARegistryDirectoryThatCannotBeMadeFailsTheSaveOfTheRegistry)
{
    ASSERT_EQ(0, chmod("/etc", 0555));
    {
        const OrdinaryRights rights;
        EXPECT_EQ(2, install());
    }
    ASSERT_EQ(0, chmod("/etc", 0755));

    EXPECT_TRUE(logHolds("Saving INI file to /etc/zor/zor.ini\n"
                         "*** Error: could not open or write to INI file. Error = 2\n"));
    EXPECT_FALSE(pathExists(Home + "/install/zor_install.properties"));
}

TEST_F(FreshInstallTest, ARegistryThatCannotBeSavedFailsTheInstallation)
{
    makeDirectories("/etc/zor/zor.ini");

    EXPECT_EQ(4, install());

    EXPECT_TRUE(logHolds("Saving INI file to /etc/zor/zor.ini\n"
                         "*** Error: could not open or write to INI file. Error = 4\n"));
    EXPECT_FALSE(pathExists(Home + "/install/zor_install.properties"));
    EXPECT_EQ("", scannerCalls());
}

TEST_F(FreshInstallTest, ARollbackLeavesOnlyWhatIsNotJournalled)
{
    toolkit = toolkitFiles(dir / "calls", "common_trace_path");
    ASSERT_EQ(768, install());

    EXPECT_EQ(0, rollback(transaction));

    EXPECT_EQ(
        Lines({"d 0755 corvan", "d 0755 corvan/zor", "f 0644 corvan/zor/ZOR_files",
               "d 0750 corvan/zor/install", "f 0666 corvan/zor/install/zor_install.properties"}),
        treeOf("/opt"));
    EXPECT_FALSE(pathExists("/etc/zor"));
    EXPECT_FALSE(pathExists("/usr/kel"));
}

// Signals.

TEST_F(FreshInstallTest, ASignalAfterTheCustomizationLeavesTheRegistryUnwritten)
{
    EXPECT_TRUE(passesInChild([&] {
        const InterruptionAt customization(
            "Customizing property file: /opt/corvan/zor/config/ZorTrace.properties");

        EXPECT_EQ(14, install());

        EXPECT_EQ(std::string::npos, customization.log().find("Saving INI file"));
    }));
}

TEST_F(FreshInstallTest, ASignalAfterTheRegistrationLeavesTheTracePathUnchanged)
{
    EXPECT_TRUE(passesInChild([&] {
        const InterruptionAt registration("Saving INI file");

        EXPECT_EQ(14, install());

        EXPECT_EQ(std::string::npos, registration.log().find("common trace path"));
    }));
}

TEST_F(FreshInstallTest, ASignalAfterTheRegistrationStopsAPerUserInstallationToo)
{
    localInstall = true;

    EXPECT_TRUE(passesInChild([&] {
        const InterruptionAt registration("Saving INI file");

        EXPECT_EQ(14, install());
    }));
}

} // namespace
