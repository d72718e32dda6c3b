#include "installer_fixtures.h"
#include "process_limits.h"
#include "registry.h"
#include "settings.h"

#include <gtest/gtest.h>

#include <string>

#include <unistd.h>

namespace {

class RegistryTest : public InstallerTest {
protected:
    int codeOf(const std::string& content)
    {
        writeFile(path, content);
        return parseRegistry(path, &registry);
    }

    std::string path = dir / "zor.ini";
    InstallRegistry registry;
};

const InstallRegistry Sample = {{9, 2, 30, 4, 7}, "22/12/02", "ABC:XYZ:", "/opt/zor", "/opt/cfg"};

const std::string SampleText = "ZOR_Version = 9.2.30.0004\n"
                               "ZOR_BuildDate = 22/12/02\n"
                               "ZOR_HomeDirectory = /opt/zor\n"
                               "ZOR_Exploiters = ABC:XYZ:\n"
                               "ZOR_ConfigRootDirectory = /opt/cfg\n";

TEST_F(RegistryTest, TheKeysHaveTheirTexts)
{
    EXPECT_EQ("ZOR_Version", KeyVersion);
    EXPECT_EQ("ZOR_BuildDate", KeyBuildDate);
    EXPECT_EQ("ZOR_HomeDirectory", KeyHomeDir);
    EXPECT_EQ("ZOR_Exploiters", KeyExploiters);
    EXPECT_EQ("ZOR_ConfigRootDirectory", KeyConfigRootDirectory);
}

// Parsing.

TEST_F(RegistryTest, ACompleteFileFillsTheRecord)
{
    EXPECT_EQ(0, codeOf(SampleText));

    EXPECT_EQ("9.2.30.0004", formatVersion(registry.version));
    EXPECT_EQ("22/12/02", registry.buildDate);
    EXPECT_EQ("/opt/zor", registry.homeDirectory);
    EXPECT_EQ("ABC:XYZ:", registry.exploiters);
    EXPECT_EQ("/opt/cfg", registry.configRootDirectory);
}

TEST_F(RegistryTest, AnyOrderAndSpacingIsRead)
{
    EXPECT_EQ(0, codeOf("ZOR_Exploiters=ABC:\r\n"
                        "\t ZOR_HomeDirectory \t=\t /opt/my zor \t\r\n"
                        "ZOR_Version=2.3.0.12"));

    EXPECT_EQ("ABC:", registry.exploiters);
    EXPECT_EQ("/opt/my zor", registry.homeDirectory);
    EXPECT_EQ("2.3.0.0012", formatVersion(registry.version));
}

TEST_F(RegistryTest, TheFifthNumberOfAVersionIsRead)
{
    EXPECT_EQ(0, codeOf("ZOR_Version = 1.2.3.4.5\nZOR_Exploiters =\nZOR_HomeDirectory = /h\n"));

    EXPECT_EQ(5U, registry.version.fifth);
}

TEST_F(RegistryTest, LinesWithoutAnEqualsSignAndUnknownKeysAreSkipped)
{
    EXPECT_EQ(0, codeOf("# a comment\n"
                        "\n"
                        "[section]\n"
                        "ZOR_Version\n"
                        "Other = 1\n"
                        "#ZOR_HomeDirectory = /wrong\n" +
                        SampleText));

    EXPECT_EQ("/opt/zor", registry.homeDirectory);
}

TEST_F(RegistryTest, LinesWithoutAnEqualsSignAndUnknownKeysChangeNothing)
{
    EXPECT_EQ(0,
              codeOf(SampleText + "ZOR_Version\nZOR_HomeDirectory\nZOR_Exploiters\nOther = 1\n"));

    EXPECT_EQ("9.2.30.0004", formatVersion(registry.version));
    EXPECT_EQ("/opt/zor", registry.homeDirectory);
    EXPECT_EQ("ABC:XYZ:", registry.exploiters);
    EXPECT_EQ("/opt/cfg", registry.configRootDirectory);
}

TEST_F(RegistryTest, TheLaterLineOfAKeyWins)
{
    EXPECT_EQ(0, codeOf(SampleText + "ZOR_HomeDirectory = /later\nZOR_Version = 1.1\n"));

    EXPECT_EQ("/later", registry.homeDirectory);
    EXPECT_EQ("1.1.0.0000", formatVersion(registry.version));
}

TEST_F(RegistryTest, AValueKeepsItsEqualsSigns)
{
    EXPECT_EQ(0, codeOf(SampleText + "ZOR_HomeDirectory = /opt/a=b\n"));

    EXPECT_EQ("/opt/a=b", registry.homeDirectory);
}

TEST_F(RegistryTest, BuildDateAndConfigurationRootAreOptional)
{
    registry.buildDate = "date of before";
    registry.configRootDirectory = "root of before";

    EXPECT_EQ(0, codeOf("ZOR_Version = 1.0\nZOR_Exploiters = A:\nZOR_HomeDirectory = /h\n"));

    EXPECT_EQ("date of before", registry.buildDate);
    EXPECT_EQ("root of before", registry.configRootDirectory);
}

TEST_F(RegistryTest, AnEmptyVersionIsVersionZero)
{
    registry.version = {1, 1, 1, 1, 1};

    EXPECT_EQ(0, codeOf("ZOR_Version =\nZOR_Exploiters = A:\nZOR_HomeDirectory = /h\n"));

    EXPECT_EQ("0.0.0.0000", formatVersion(registry.version));
}

TEST_F(RegistryTest, AnEmptyExploiterListIsOneBlank)
{
    EXPECT_EQ(0, codeOf("ZOR_Version = 1.0\nZOR_Exploiters = \nZOR_HomeDirectory = /h\n"));

    EXPECT_EQ(" ", registry.exploiters);
}

TEST_F(RegistryTest, AnExploiterListOfNoCharactersIsEmpty)
{
    EXPECT_EQ(0, codeOf("ZOR_Version = 1.0\nZOR_Exploiters =\nZOR_HomeDirectory = /h\n"));

    EXPECT_EQ("", registry.exploiters);
}

TEST_F(RegistryTest, TheBlankOfAnEmptyListIsGoneAfterTheNextSave)
{
    ASSERT_EQ(0, codeOf("ZOR_Version = 1.0\nZOR_Exploiters = \nZOR_HomeDirectory = /h\n"));
    registry.exploiters += "ABC:";
    ASSERT_EQ(0, writeRegistry(transaction, path, registry));
    EXPECT_EQ(" ABC:", registry.exploiters);

    EXPECT_EQ(0, parseRegistry(path, &registry));

    EXPECT_EQ("ABC:", registry.exploiters);
}

TEST_F(RegistryTest, AMissingFileGives1)
{
    EXPECT_EQ(1, parseRegistry(dir / "missing", &registry));
    EXPECT_EQ(1, parseRegistry(dir / "missing", nullptr));
    EXPECT_EQ(1, parseRegistry("", &registry));
}

TEST_F(RegistryTest, AFileThatMayNotBeReadGives1)
{
    writeFile(path, SampleText);
    ASSERT_EQ(0, chmod(path.c_str(), 0));
    const OrdinaryRights ordinary;

    EXPECT_EQ(1, parseRegistry(path, &registry));
}

TEST_F(RegistryTest, WithoutOneOfTheRequiredKeysTheCodeIs2)
{
    EXPECT_EQ(2, codeOf("ZOR_Exploiters = A:\nZOR_HomeDirectory = /h\n"));
    EXPECT_EQ(2, codeOf("ZOR_Version = 1.0\nZOR_HomeDirectory = /h\n"));
    EXPECT_EQ(2, codeOf("ZOR_Version = 1.0\nZOR_Exploiters = A:\n"));
    EXPECT_EQ(2, codeOf(""));
}

TEST_F(RegistryTest, KeysAreComparedWithTheirCase)
{
    EXPECT_EQ(2, codeOf("zor_version = 1.0\nZOR_Exploiters = A:\nZOR_HomeDirectory = /h\n"));
}

TEST_F(RegistryTest, ADirectoryGives2)
{
    EXPECT_EQ(2, parseRegistry(dir.path(), &registry));
}

TEST_F(RegistryTest, ABadVersionGives3AndNothingAfterItIsRead)
{
    EXPECT_EQ(3, codeOf("ZOR_HomeDirectory = /before\n"
                        "ZOR_Version = 2.x\n"
                        "ZOR_HomeDirectory = /after\n"));

    EXPECT_EQ("/before", registry.homeDirectory);
    EXPECT_EQ("0.0.0.0000", formatVersion(registry.version));
}

TEST_F(RegistryTest, ABadVersionGives3AlsoAfterAGoodOne)
{
    EXPECT_EQ(3, codeOf(SampleText + "ZOR_Version = 1..2\n"));
}

TEST_F(RegistryTest, WithoutARecordTheFileIsOnlyChecked)
{
    writeFile(path, SampleText);
    EXPECT_EQ(0, parseRegistry(path, nullptr));

    writeFile(path, "ZOR_Version = 1.0\n");
    EXPECT_EQ(2, parseRegistry(path, nullptr));

    writeFile(path, "ZOR_Version = x\n");
    EXPECT_EQ(3, parseRegistry(path, nullptr));
}

TEST_F(RegistryTest, ParsingPrintsNothing)
{
    (void)parseRegistry(dir / "missing", &registry);
    (void)codeOf("");
    (void)codeOf("ZOR_Version = x\n");

    EXPECT_EQ("", log.text());
}

// The decision between two builds.

class IsUpgradeNeededTest : public testing::Test {
protected:
    static bool isNeeded(const ZorVersion& installed, const std::string& installedDate,
                         const ZorVersion& package, const std::string& packageDate)
    {
        InstallRegistry old;
        old.version = installed;
        old.buildDate = installedDate;
        InstallRegistry now;
        now.version = package;
        now.buildDate = packageDate;
        return isUpgradeNeeded(old, now);
    }
};

TEST_F(IsUpgradeNeededTest, AnOlderVersionIsUpgradedWhateverTheDates)
{
    EXPECT_TRUE(isNeeded({9, 2, 29, 9, 9}, "23/01/01", {9, 2, 30, 0, 0}, "22/12/02"));
}

TEST_F(IsUpgradeNeededTest, ANewerVersionIsNotUpgradedWhateverTheDates)
{
    EXPECT_FALSE(isNeeded({9, 2, 30, 1, 0}, "21/01/01", {9, 2, 30, 0, 0}, "22/12/02"));
    EXPECT_FALSE(isNeeded({9, 2, 30, 0, 1}, "21/01/01", {9, 2, 30, 0, 0}, "22/12/02"));
}

TEST_F(IsUpgradeNeededTest, TheSameVersionIsUpgradedUnlessItsBuildIsLater)
{
    const ZorVersion version = {9, 2, 30, 0, 0};

    EXPECT_TRUE(isNeeded(version, "22/12/01", version, "22/12/02"));
    EXPECT_TRUE(isNeeded(version, "22/12/02", version, "22/12/02"));
    EXPECT_FALSE(isNeeded(version, "22/12/03", version, "22/12/02"));
}

TEST_F(IsUpgradeNeededTest, ADateThatIsNoneCountsAsTheEarliest)
{
    const ZorVersion version = {9, 2, 30, 0, 0};

    EXPECT_TRUE(isNeeded(version, "2023-01-01", version, "22/12/02"));
    EXPECT_TRUE(isNeeded(version, "", version, ""));
    EXPECT_FALSE(isNeeded(version, "22/12/02", version, ""));
}

// Writing.

TEST_F(RegistryTest, TheFileHasFiveLinesInTheirOrder)
{
    EXPECT_EQ(0, writeRegistry(transaction, path, Sample));

    EXPECT_EQ(SampleText, readFile(path));
}

TEST_F(RegistryTest, AnEmptyRecordIsWrittenWithItsBlanks)
{
    EXPECT_EQ(0, writeRegistry(transaction, path, InstallRegistry()));

    EXPECT_EQ("ZOR_Version = 0.0.0.0000\n"
              "ZOR_BuildDate = \n"
              "ZOR_HomeDirectory = \n"
              "ZOR_Exploiters = \n"
              "ZOR_ConfigRootDirectory = \n",
              readFile(path));
}

TEST_F(RegistryTest, AnUnpaddedVersionIsWrittenBackPadded)
{
    ASSERT_EQ(0, codeOf("ZOR_Version=2.3.0.12\nZOR_Exploiters=A:\nZOR_HomeDirectory=/h\n"));

    EXPECT_EQ(0, writeRegistry(transaction, path, registry));

    EXPECT_EQ("ZOR_Version = 2.3.0.0012\n", readFile(path).substr(0, 25));
}

TEST_F(RegistryTest, ANewFileIsJournalledAsCreated)
{
    EXPECT_EQ(0, writeRegistry(transaction, path, Sample));

    EXPECT_EQ("2 " + path + "\n", journalText(transaction));
    EXPECT_EQ((std::vector<std::string>{"f 0644 zor.ini"}), treeOf(dir.path()));
}

TEST_F(RegistryTest, AnExistingFileIsCopiedToItsBackupNameFirst)
{
    writeFile(path, "old");

    EXPECT_EQ(0, writeRegistry(transaction, path, Sample));

    EXPECT_EQ(SampleText, readFile(path));
    EXPECT_EQ("old", readFile(path + ".bak"));
    EXPECT_EQ("1 " + path + "\n2 " + path + "\n", journalText(transaction));
}

TEST_F(RegistryTest, AnExistingFileKeepsItsMode)
{
    writeFile(path, "old");
    ASSERT_EQ(0, chmod(path.c_str(), 0600));

    EXPECT_EQ(0, writeRegistry(transaction, path, Sample));

    EXPECT_EQ(0600U, modeOf(path));
}

TEST_F(RegistryTest, WithoutBackupsAnExistingFileIsOverwrittenAndJournalledAsCreated)
{
    writeFile(path, "old");
    transaction.backup = false;

    EXPECT_EQ(0, writeRegistry(transaction, path, Sample));

    EXPECT_EQ(SampleText, readFile(path));
    EXPECT_EQ("2 " + path + "\n", journalText(transaction));
    EXPECT_EQ((std::vector<std::string>{"f 0644 zor.ini"}), treeOf(dir.path()));
}

TEST_F(RegistryTest, AFailedBackupIsReturnedAndNothingIsWritten)
{
    writeFile(path, "old");
    makeDirectories(path + ".bak"); // cannot be opened for writing

    EXPECT_EQ(2, writeRegistry(transaction, path, Sample));

    EXPECT_EQ("old", readFile(path));
    EXPECT_EQ("", journalText(transaction));
}

TEST_F(RegistryTest, AFileThatMayNotBeReadCannotBeBackedUp)
{
    writeFile(path, "old");
    ASSERT_EQ(0, chmod(path.c_str(), 0200));
    {
        const OrdinaryRights ordinary;
        EXPECT_EQ(1, writeRegistry(transaction, path, Sample));
    }
    EXPECT_EQ("old", readFile(path));
    EXPECT_EQ("", journalText(transaction));
}

TEST_F(RegistryTest, AFileThatCannotBeOpenedForWritingGives2)
{
    EXPECT_EQ(2, writeRegistry(transaction, dir / "missing/zor.ini", Sample));

    EXPECT_EQ("", journalText(transaction));
}

TEST_F(RegistryTest, AFileThatMayNotBeWrittenIsBackedUpAndGives2)
{
    writeFile(path, "old");
    ASSERT_EQ(0, chmod(path.c_str(), 0400));
    {
        const OrdinaryRights ordinary;
        EXPECT_EQ(2, writeRegistry(transaction, path, Sample));
    }
    EXPECT_EQ("1 " + path + "\n2 " + path + "\n", journalText(transaction));
    EXPECT_EQ("old", readFile(path + ".bak"));
}

TEST_F(RegistryTest, AFullDiskGives5AndTheFileIsJournalled)
{
    ASSERT_EQ(0, symlink("/dev/full", path.c_str()));
    transaction.backup = false;

    EXPECT_EQ(5, writeRegistry(transaction, path, Sample));

    EXPECT_EQ("2 " + path + "\n", journalText(transaction));
}

TEST_F(RegistryTest, ALongListOnAFullDiskGives5)
{
    ASSERT_EQ(0, symlink("/dev/full", path.c_str()));
    transaction.backup = false;
    registry.exploiters = std::string(100000, 'x'); // more than a stream buffers

    EXPECT_EQ(5, writeRegistry(transaction, path, registry));
}

TEST_F(RegistryTest, ARollbackRestoresTheFileThatWasRewritten)
{
    writeFile(path, "old");
    ASSERT_EQ(0, writeRegistry(transaction, path, Sample));

    rollback(transaction);

    EXPECT_EQ("old", readFile(path));
    EXPECT_EQ((std::vector<std::string>{"f 0644 zor.ini"}), treeOf(dir.path()));
}

TEST_F(RegistryTest, ARollbackDeletesTheFileThatWasNew)
{
    ASSERT_EQ(0, writeRegistry(transaction, path, Sample));

    rollback(transaction);

    EXPECT_EQ(std::vector<std::string>(), treeOf(dir.path()));
}

TEST_F(RegistryTest, ARollbackLeavesTheFileThatAnotherRunPutThereMeanwhile)
{
    ASSERT_EQ(0, writeRegistry(transaction, path, Sample));
    writeFile(dir / "of another run", "theirs");
    ASSERT_EQ(0, rename((dir / "of another run").c_str(), path.c_str()));

    rollback(transaction);

    EXPECT_EQ("theirs", readFile(path));
}

TEST_F(RegistryTest, ARollbackAfterAFailedSaveRestoresTheFileAndLeavesNoBackup)
{
    makeDirectories(dir / "disk");
    const SmallDisk disk(dir / "disk", 64);
    writeFile(dir / "disk/zor.ini", "old");
    registry.exploiters = std::string(100000, 'x');
    ASSERT_EQ(5, writeRegistry(transaction, dir / "disk/zor.ini", registry));

    rollback(transaction);

    EXPECT_EQ("old", readFile(dir / "disk/zor.ini"));
    EXPECT_EQ((std::vector<std::string>{"f 0644 zor.ini"}), treeOf(dir / "disk"));
}

TEST_F(RegistryTest, WritingPrintsNothing)
{
    (void)writeRegistry(transaction, path, Sample);
    (void)writeRegistry(transaction, dir / "missing/zor.ini", Sample);

    EXPECT_EQ("", log.text());
}

// Saving at its place.

using SavedRegistryTest = MachineTest;

TEST_F(SavedRegistryTest, TheSharedRegistryIsSavedInEtc)
{
    makeDirectories("/etc/zor");

    EXPECT_EQ(0, saveRegistry(transaction, Sample));

    EXPECT_EQ(SampleText, readFile("/etc/zor/zor.ini"));
    EXPECT_EQ("Saving INI file to /etc/zor/zor.ini\n", log.text());
    EXPECT_EQ("2 /etc/zor/zor.ini\n", journalText(transaction));
}

TEST_F(SavedRegistryTest, AUsersRegistryIsSavedInTheHomeDirectory)
{
    makeDirectories("/root/.zor");
    localInstall = true;

    EXPECT_EQ(0, saveRegistry(transaction, Sample));

    EXPECT_EQ(SampleText, readFile("/root/.zor/zor.ini"));
    EXPECT_EQ("Saving INI file to /root/.zor/zor.ini\n", log.text());
}

TEST_F(SavedRegistryTest, AFailureIsLoggedWithItsCode)
{
    EXPECT_EQ(2, saveRegistry(transaction, Sample));

    EXPECT_EQ("Saving INI file to /etc/zor/zor.ini\n"
              "*** Error: could not open or write to INI file. Error = 2\n",
              log.text());
}

TEST_F(SavedRegistryTest, AFullDiskIsLoggedAs5)
{
    makeDirectories("/etc/zor");
    ASSERT_EQ(0, symlink("/dev/full", "/etc/zor/zor.ini"));
    transaction.backup = false;

    EXPECT_EQ(5, saveRegistry(transaction, Sample));

    EXPECT_EQ("Saving INI file to /etc/zor/zor.ini\n"
              "*** Error: could not open or write to INI file. Error = 5\n",
              log.text());
}

} // namespace
