#include "installer_fixtures.h"
#include "paths.h"
#include "process_limits.h"
#include "registry.h"
#include "removal.h"
#include "safe_path.h"
#include "settings.h"
#include "toolkit_package.h"

#include <gtest/gtest.h>

#include <cstdlib>

#include <sys/stat.h>

namespace {

using Lines = std::vector<std::string>;

using RemoveListedFilesTest = InstallerTest;

TEST_F(RemoveListedFilesTest, WithoutAnIndexNothingIsListed)
{
    const std::string missing = dir / "missing";

    EXPECT_FALSE(removeListedFiles(nullptr));
    EXPECT_FALSE(removeListedFiles(&missing));

    EXPECT_EQ("", log.text());
}

TEST_F(RemoveListedFilesTest, DeletesEveryListedFileAndThenTheIndex)
{
    const std::string index = dir / "ZOR_files";
    writeFile(dir / "a", "");
    writeFile(dir / "b ", "");
    writeFile(dir / "other", "");
    writeFile(index, "# header\n" + dir / "a" + "\n# comment\n" + dir / "b " + "\n");

    EXPECT_TRUE(removeListedFiles(&index));

    EXPECT_EQ(Lines{"f 0644 other"}, treeOf(dir.path()));
    EXPECT_EQ("RM FILE: " + dir / "a" + "\nRM FILE: " + dir / "b " + "\n", log.text());
}

TEST_F(RemoveListedFilesTest, AnIndexThatListsNothingStays)
{
    const std::string index = dir / "ZOR_files";
    writeFile(index, "# header\n#" + dir / "ZOR_files" + "\n");

    EXPECT_FALSE(removeListedFiles(&index));

    EXPECT_TRUE(pathExists(index));
    EXPECT_EQ("", log.text());
}

TEST_F(RemoveListedFilesTest, AnEmptyIndexListsNothing)
{
    const std::string index = dir / "ZOR_files";
    writeFile(index, "");

    EXPECT_FALSE(removeListedFiles(&index));

    EXPECT_TRUE(pathExists(index));
}

TEST_F(RemoveListedFilesTest, AnEmptyLineCountsAsAFile)
{
    const std::string index = dir / "ZOR_files";
    writeFile(index, "# header\n\n");

    EXPECT_TRUE(removeListedFiles(&index));

    EXPECT_EQ("RM FILE: \n", log.text());
    EXPECT_FALSE(pathExists(index));
}

TEST_F(RemoveListedFilesTest, ALastLineWithoutNewlineCounts)
{
    const std::string index = dir / "ZOR_files";
    writeFile(dir / "a", "");
    writeFile(index, dir / "a");

    EXPECT_TRUE(removeListedFiles(&index));

    EXPECT_FALSE(pathExists(dir / "a"));
}

TEST_F(RemoveListedFilesTest, FilesThatCannotBeDeletedAreSkipped)
{
    const std::string index = dir / "ZOR_files";
    makeDirectories(dir / "directory");
    writeFile(dir / "a", "");
    writeFile(index, dir / "missing" + "\n" + dir / "directory" + "\n" + dir / "a" + "\n");

    EXPECT_TRUE(removeListedFiles(&index));

    EXPECT_EQ(Lines{"d 0755 directory"}, treeOf(dir.path()));
}

TEST_F(RemoveListedFilesTest, ALineOf1023BytesIsOnePath)
{
    const std::string index = dir / "ZOR_files";
    const std::string line(1023, 'x');
    writeFile(index, line);

    EXPECT_TRUE(removeListedFiles(&index));

    EXPECT_EQ("RM FILE: " + line + "\n", log.text());
}

TEST_F(RemoveListedFilesTest, ALongerLineIsSplitIntoPieces)
{
    const std::string index = dir / "ZOR_files";
    writeFile(dir / "victim", "");
    writeFile(index, std::string(1023, 'x') + dir / "victim" + "\n");

    EXPECT_TRUE(removeListedFiles(&index));

    EXPECT_EQ("RM FILE: " + std::string(1023, 'x') + "\nRM FILE: " + dir / "victim" + "\n",
              log.text());
    EXPECT_FALSE(pathExists(dir / "victim"));
}

TEST_F(RemoveListedFilesTest, TheRestOfALongCommentIsTakenAsAPath)
{
    const std::string index = dir / "ZOR_files";
    writeFile(index, "#" + std::string(1022, 'x') + "rest\n");

    EXPECT_TRUE(removeListedFiles(&index));

    EXPECT_EQ("RM FILE: rest\n", log.text());
}

TEST_F(RemoveListedFilesTest, ALineEndsAtItsFirstNul)
{
    const std::string index = dir / "ZOR_files";
    writeFile(dir / "a", "");
    writeFile(index, dir / "a" + std::string(1, '\0') + "more\n");

    EXPECT_TRUE(removeListedFiles(&index));

    EXPECT_EQ("RM FILE: " + dir / "a" + "\n", log.text());
    EXPECT_FALSE(pathExists(dir / "a"));
}

const std::string Home = "/opt/corvan/zor";
const std::string Index = "/opt/corvan/zor/ZOR_files";

/// An installation in /opt/corvan/zor that ABC wants removed.
class RemovalTest : public MachineTest {
protected:
    RemovalTest()
    {
        useCompleteLayoutNames();
        registry.homeDirectory = Home;
        registry.exploiters = "ABC:";
        request.exploiters = "ABC";
    }

    void SetUp() override
    {
        MachineTest::SetUp();
        if (HasFatalFailure())
            return;
        plantScanners(Home, dir / "calls");
        makeDirectories("/etc/zor");
        writeFile("/etc/zor/zor.ini", "as it was\n");
    }

    int remove(const std::string* indexPath = &Index)
    {
        return removeInstallation(transaction, registry, request, indexPath);
    }

    /// A file at `name` of the installation, with its directories.
    static void plant(const std::string& name)
    {
        const std::string path = Home + "/" + name;
        makeDirectories(path.substr(0, path.rfind('/')));
        writeFile(path, "");
    }

    /// Writes an index that lists `names` of the installation.
    static void list(const Lines& names)
    {
        std::string text;
        for (const std::string& name : names)
            text += Home + "/" + name + "\n";
        writeFile(Index, text);
    }

    /// One file in each directory that a removal knows.
    static void plantEverywhere()
    {
        for (const char* const name : {"_uninst/f",
                                       "install/QMX_CLI/linux-ix86/bin/f",
                                       "install/QMX_CLI/linux-ix86/lib/f",
                                       "install/QMX_CLI/linux-ix86/msg_cat/C/f",
                                       "install/QMX_CLI/linux-ix86/msg_cat/f",
                                       "install/QMX_CLI/linux-ix86/f",
                                       "install/QMX_CLI/f",
                                       "install/f",
                                       "bin/etc/trawlhw/f",
                                       "bin/etc/trawluse/f",
                                       "bin/etc/trawlnet/f",
                                       "bin/etc/trawlfs/f",
                                       "bin/etc/trawlsw/f",
                                       "bin/etc/trawlvpd/f",
                                       "bin/etc/f",
                                       "bin/plugins/f",
                                       "bin/customscanners/f",
                                       "properties/f",
                                       "config/xss/f",
                                       "config/f",
                                       "logs/f",
                                       "cache_data/f",
                                       "zor.log"})
            plant(name);
    }

    /// What follows `prefix` in the lines of the log that begin with it, relative to the home.
    [[nodiscard]] Lines logged(const std::string& prefix) const
    {
        Lines found;
        std::istringstream stream(log.text());
        for (std::string line; std::getline(stream, line);) {
            if (!line.starts_with(prefix))
                continue;
            line.erase(0, prefix.size());
            found.push_back(line.starts_with(Home + "/") ? line.substr(Home.size() + 1) : line);
        }
        return found;
    }

    [[nodiscard]] bool logHolds(const std::string& text) const
    {
        return log.text().find(text) != std::string::npos;
    }

    InstallRegistry registry;
    InstallRegistry request;
};

TEST_F(RemovalTest, AnExploiterThatIsNotRegisteredLeavesEverythingAsItIs)
{
    registry.exploiters = "XYZ:";

    EXPECT_EQ(0, remove());

    EXPECT_EQ("ZOR not installed for exploiter ABC, nothing to do\n", log.text());
    EXPECT_EQ("as it was\n", readFile("/etc/zor/zor.ini"));
    EXPECT_TRUE(pathExists(Home + "/bin/trawlcfg"));
    EXPECT_FALSE(pathExists(dir / "calls"));
}

TEST_F(RemovalTest, AnEmptyListIsNoReasonToRemove)
{
    registry.exploiters = "";

    EXPECT_EQ(0, remove());

    EXPECT_EQ("ZOR not installed for exploiter ABC, nothing to do\n", log.text());
    EXPECT_TRUE(pathExists(Home));
}

TEST_F(RemovalTest, AnyExploiterMayRemoveAnInstallationWithoutExploiters)
{
    registry.exploiters = ":";
    list({"bin/trawlcfg", "bin/trawlfs"});

    EXPECT_EQ(0, remove());

    EXPECT_EQ(0U, log.text().find("ZOR not installed for exploiter ABC, nothing to do\n"
                                  "Exploiter list empty, ok to remove anyway\n"
                                  "Exec '"));
    EXPECT_FALSE(pathExists(Home));
    EXPECT_FALSE(pathExists("/etc/zor"));
}

TEST_F(RemovalTest, WhileOthersRemainOnlyTheRegistryIsRewritten)
{
    registry.exploiters = "ABC:XYZ:";
    registry.version = {9, 2, 30, 0, 0};
    registry.buildDate = "22/12/02";
    registry.configRootDirectory = Home;

    EXPECT_EQ(0, remove());

    EXPECT_EQ("Exploiter list not empty, updating INI file only\n"
              "Saving INI file to /etc/zor/zor.ini\n",
              log.text());
    EXPECT_EQ("ZOR_Version = 9.2.30.0000\n"
              "ZOR_BuildDate = 22/12/02\n"
              "ZOR_HomeDirectory = /opt/corvan/zor\n"
              "ZOR_Exploiters = XYZ:\n"
              "ZOR_ConfigRootDirectory = /opt/corvan/zor\n",
              readFile("/etc/zor/zor.ini"));
    EXPECT_EQ("1 /etc/zor/zor.ini\n2 /etc/zor/zor.ini\n", journalText(transaction));
    EXPECT_FALSE(pathExists(dir / "calls"));
}

TEST_F(RemovalTest, ARegistryThatCannotBeSavedGivesItsCodeWhileOthersRemain)
{
    registry.exploiters = "ABC:XYZ:";
    ASSERT_EQ(0, std::remove("/etc/zor/zor.ini"));
    makeDirectories("/etc/zor/zor.ini");

    EXPECT_EQ(4, remove());
}

TEST_F(RemovalTest, AnIdentifierThatEndsAnotherIsCutOutOfThatOne)
{
    registry.exploiters = "XABC:ABC:";

    EXPECT_EQ(0, remove());

    EXPECT_EQ("XABC:", registry.exploiters);
    EXPECT_TRUE(logHolds("updating INI file only"));
    EXPECT_TRUE(pathExists(Home + "/bin/trawlcfg"));
}

TEST_F(RemovalTest, ScannersThatCannotBeStoppedEndItWith7)
{
    ignoreUpdateErrors = false;
    plantScanners(Home, dir / "calls", "-force");
    list({"bin/trawlcfg"});

    EXPECT_EQ(7, remove());

    EXPECT_TRUE(logHolds("Could not shutdown ZOR.\n"));
    EXPECT_TRUE(pathExists(Home + "/bin/trawlcfg"));
    EXPECT_EQ("/opt/corvan/zor/bin/trawlcfg\n", readFile(Index));
    EXPECT_EQ("as it was\n", readFile("/etc/zor/zor.ini"));
    EXPECT_EQ("", registry.exploiters);
}

TEST_F(RemovalTest, TheScannersAreDisabledAndStoppedFirst)
{
    EXPECT_EQ(0, remove());

    EXPECT_EQ("trawlfs [-shutdown]\n"
              "trawlcfg [-disable] [all]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [60] [-force]\n"
              "trawlcfg [-shutdown] [all] [-timeout] [120]\n",
              readFile(dir / "calls"));
    EXPECT_STREQ("/opt/corvan/zor/bin", std::getenv("LD_LIBRARY_PATH"));
}

TEST_F(RemovalTest, TheListedFilesAreDeletedOneByOneAndTheInstallersOwnWithThem)
{
    plant("config/SingleUserMode");
    plant("zor.log");
    list({"bin/trawlcfg", "bin/trawlfs"});

    EXPECT_EQ(0, remove());

    EXPECT_EQ(Lines({"bin/libzor.so", "bin/trawlcfg", "bin/trawlfs", "config/SingleUserMode",
                     "config/Zor.tmp", "zor.log", "zor.log.bak"}),
              logged("RM FILE: "));
    EXPECT_FALSE(pathExists(Home));
}

TEST_F(RemovalTest, AfterTheListedFilesTheDirectoriesAreRemovedInOrder)
{
    plantEverywhere();
    list({"bin/trawlcfg", "bin/trawlfs", "bin/plugins/f", "bin/customscanners/f",
          "install/QMX_CLI/linux-ix86/bin/f", "install/QMX_CLI/linux-ix86/lib/f",
          "install/QMX_CLI/linux-ix86/msg_cat/C/f"});

    EXPECT_EQ(0, remove());

    EXPECT_EQ(
        Lines({"_uninst", "install/QMX_CLI/linux-ix86/msg_cat", "install/QMX_CLI/linux-ix86",
               "install/QMX_CLI", "install", "bin/etc/trawlhw", "bin/etc/trawluse",
               "bin/etc/trawlnet", "bin/etc/trawlfs", "bin/etc/trawlsw", "bin/etc/trawlvpd",
               "bin/etc", "properties", "config/xss", "config", "logs", "cache_data", "/etc/zor"}),
        logged("RMDIR: "));
    EXPECT_FALSE(pathExists(Home));
}

TEST_F(RemovalTest, AUsersFileInADirectoryThatIsRemovedWithEverythingIsDeleted)
{
    for (const char* const name : {"properties/mine/f", "config/mine/f", "cache_data/mine/f",
                                   "logs/f", "install/f", "_uninst/f"})
        plant(name);
    list({"bin/trawlcfg", "bin/trawlfs"});

    EXPECT_EQ(0, remove());

    EXPECT_FALSE(pathExists(Home));
}

TEST_F(RemovalTest, AUsersFileAmongTheBinariesKeepsTheirDirectoryAndTheHome)
{
    plant("bin/mine");
    list({"bin/trawlcfg", "bin/trawlfs"});

    EXPECT_EQ(0, remove());

    EXPECT_EQ(Lines({"d 0755 bin", "f 0644 bin/mine"}), treeOf(Home));
    EXPECT_FALSE(pathExists("/etc/zor"));
}

TEST_F(RemovalTest, UsersFilesStayInDirectoriesThatAreRemovedOnlyWhenEmpty)
{
    for (const char* const name :
         {"bin/plugins/f", "bin/customscanners/f", "install/QMX_CLI/linux-ix86/bin/f",
          "install/QMX_CLI/linux-ix86/lib/f", "install/QMX_CLI/linux-ix86/msg_cat/C/f", "mine"})
        plant(name);
    list({"bin/trawlcfg", "bin/trawlfs"});

    EXPECT_EQ(0, remove());

    for (const char* const name :
         {"bin/plugins/f", "bin/customscanners/f", "install/QMX_CLI/linux-ix86/bin/f",
          "install/QMX_CLI/linux-ix86/lib/f", "install/QMX_CLI/linux-ix86/msg_cat/C/f", "mine"})
        EXPECT_TRUE(pathExists(Home + "/" + name)) << name;
}

TEST_F(RemovalTest, SubdirectoriesOfTheLogsStayAndKeepThem)
{
    plant("logs/old/f");
    plant("logs/f");
    list({"bin/trawlcfg", "bin/trawlfs"});

    EXPECT_EQ(0, remove());

    EXPECT_EQ(Lines({"d 0755 logs", "d 0755 logs/old", "f 0644 logs/old/f"}), treeOf(Home));
}

TEST_F(RemovalTest, WithoutAnIndexTheKnownDirectoriesAreEmptiedInOrder)
{
    plantEverywhere();

    EXPECT_EQ(0, remove(nullptr));

    EXPECT_EQ(Lines({"_uninst",
                     "install/QMX_CLI/linux-ix86/bin",
                     "install/QMX_CLI/linux-ix86/lib",
                     "install/QMX_CLI/linux-ix86/msg_cat/C",
                     "install/QMX_CLI/linux-ix86/msg_cat",
                     "install/QMX_CLI/linux-ix86",
                     "install/QMX_CLI",
                     "install",
                     "bin/etc/trawlhw",
                     "bin/etc/trawluse",
                     "bin/etc/trawlnet",
                     "bin/etc/trawlfs",
                     "bin/etc/trawlsw",
                     "bin/etc/trawlvpd",
                     "bin/etc",
                     "bin/plugins",
                     "bin/customscanners",
                     "bin",
                     "properties",
                     "config/xss",
                     "config",
                     "logs",
                     "cache_data",
                     "/opt/corvan/zor",
                     "/etc/zor"}),
              logged("RMDIR: "));
    EXPECT_TRUE(logged("RM FILE: ").empty());
    EXPECT_FALSE(pathExists(Home));
}

TEST_F(RemovalTest, WithoutAnIndexUsersFilesAmongTheBinariesAreDeletedToo)
{
    plant("bin/mine");
    plant("mine");

    EXPECT_EQ(0, remove(nullptr));

    EXPECT_FALSE(pathExists(Home));
}

TEST_F(RemovalTest, WithoutAnIndexUnknownDirectoriesStay)
{
    plant("bin/mine/f");

    EXPECT_EQ(0, remove(nullptr));

    EXPECT_EQ(Lines({"d 0755 bin", "d 0755 bin/mine", "f 0644 bin/mine/f"}), treeOf(Home));
}

TEST_F(RemovalTest, AnIndexThatListsNothingIsLikeNone)
{
    plant("bin/mine");
    writeFile(Index, "# nothing\n");
    ASSERT_EQ(0, chmod(Index.c_str(), 0444)); // so that the installer cannot add its own files
    {
        const OrdinaryRights rights;
        EXPECT_EQ(0, remove());
    }

    EXPECT_TRUE(logged("RM FILE: ").empty());
    EXPECT_TRUE(logHolds("DEL: /opt/corvan/zor/ZOR_files\n"));
    EXPECT_FALSE(pathExists(Home));
}

TEST_F(RemovalTest, AnIndexThatCannotBeWrittenIsLikeNone)
{
    const std::string nowhere = dir / "missing/ZOR_files";
    plant("bin/mine");

    EXPECT_EQ(0, remove(&nowhere));

    EXPECT_TRUE(logged("RM FILE: ").empty());
    EXPECT_FALSE(pathExists(Home));
}

TEST_F(RemovalTest, AMissingIndexIsWrittenWithTheInstallersOwnFiles)
{
    plant("bin/mine");

    EXPECT_EQ(0, remove());

    EXPECT_EQ(Lines({"bin/libzor.so", "config/SingleUserMode", "config/Zor.tmp", "zor.log",
                     "zor.log.bak"}),
              logged("RM FILE: "));
    EXPECT_TRUE(pathExists(Home + "/bin/mine"));
    EXPECT_FALSE(pathExists(Index));
}

TEST_F(RemovalTest, TheCommonLogDirectoryOfASharedInstallationGoes)
{
    makeDirectories("/usr/kel/corvan/common/ZOR/logs");
    writeFile("/usr/kel/corvan/common/ZOR/logs/a.trc", "");

    EXPECT_EQ(0, remove());

    EXPECT_TRUE(treeOf("/usr/kel/corvan/common").empty());
    EXPECT_TRUE(logHolds("DEL: /usr/kel/corvan/common/ZOR/logs/a.trc\n"
                         "RMDIR: /usr/kel/corvan/common/ZOR/logs\n"
                         "RMDIR: /usr/kel/corvan/common/ZOR\n"
                         "DEL: /etc/zor/zor.ini\n"
                         "RMDIR: /etc/zor\n"));
}

TEST_F(RemovalTest, TheCommonDirectoryIsNeitherCreatedNorNamed)
{
    EXPECT_EQ(0, remove());

    EXPECT_FALSE(pathExists("/usr/kel"));
    EXPECT_FALSE(pathExists("/etc/kel"));
}

TEST_F(RemovalTest, TheCommonLogDirectoryIsWhereTheSettingSays)
{
    makeDirectories("/etc/kel/corvan/common/cfg");
    writeFile("/etc/kel/corvan/common/cfg/log.properties",
              "corvan_common_dir=" + dir / "common" + "\n");
    makeDirectories(dir / "common/ZOR/logs");

    EXPECT_EQ(0, remove());

    EXPECT_TRUE(treeOf(dir / "common").empty());
}

TEST_F(RemovalTest, TheTemporaryFilesOfKilledRunsAreDeleted)
{
    makeDirectories("/etc/kel/corvan/common/cfg");
    writeFile("/etc/kel/corvan/common/cfg/log.properties.wzorinst-new", "");
    writeFile("/etc/zor/zor.ini.wzorinst-new", "");

    EXPECT_EQ(0, remove());

    EXPECT_TRUE(treeOf("/etc/kel/corvan/common/cfg").empty());
    EXPECT_FALSE(pathExists("/etc/zor"));
}

TEST_F(RemovalTest, WhatOthersKeepInTheCommonLogDirectoryStays)
{
    makeDirectories("/usr/kel/corvan/common/ZOR/logs/others");

    EXPECT_EQ(0, remove());

    EXPECT_TRUE(pathExists("/usr/kel/corvan/common/ZOR/logs/others"));
}

TEST_F(RemovalTest, APerUserInstallationLeavesTheCommonDirectoryAlone)
{
    localInstall = true;
    makeDirectories("/root/.zor");
    writeFile("/root/.zor/zor.ini", "");
    makeDirectories("/usr/kel/corvan/common/ZOR/logs");

    EXPECT_EQ(0, remove());

    EXPECT_TRUE(pathExists("/usr/kel/corvan/common/ZOR/logs"));
    EXPECT_FALSE(pathExists("/root/.zor"));
    EXPECT_TRUE(pathExists("/etc/zor/zor.ini"));
    EXPECT_TRUE(logHolds("DEL: /root/.zor/zor.ini\nRMDIR: /root/.zor\n"));
}

TEST_F(RemovalTest, TheDirectoryOfTheRegistryStaysWithAnotherFileInItButIsLogged)
{
    writeFile("/etc/zor/other", "");

    EXPECT_EQ(0, remove());

    EXPECT_EQ(Lines{"f 0644 other"}, treeOf("/etc/zor"));
    EXPECT_TRUE(logHolds("DEL: /etc/zor/zor.ini\nRMDIR: /etc/zor\n"));
}

TEST_F(RemovalTest, SucceedsWhateverCannotBeDeleted)
{
    list({"bin/trawlcfg"});
    ASSERT_EQ(0, chmod((Home + "/bin").c_str(), 0555));
    ASSERT_EQ(0, chmod(Home.c_str(), 0555));
    {
        const OrdinaryRights rights;
        EXPECT_EQ(0, remove());
    }

    EXPECT_TRUE(pathExists(Home + "/bin/trawlcfg"));
    EXPECT_FALSE(pathExists("/etc/zor"));
}

TEST_F(RemovalTest, NothingIsJournalled)
{
    EXPECT_EQ(0, remove());

    EXPECT_TRUE(transaction.journal.empty());
}

} // namespace
