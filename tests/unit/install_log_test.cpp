#include "install_log.h"
#include "installer_fixtures.h"
#include "process_limits.h"
#include "registry.h"
#include "settings.h"

#include <gtest/gtest.h>

#include <ctime>
#include <set>
#include <string>
#include <vector>

#include <fcntl.h>
#include <sys/stat.h>

namespace {

using Files = std::set<std::string>;
using Tree = std::vector<std::string>;

const std::string HeaderStart = "# File created by ZOR: 22/12/02zor_9.2.30.0000 installed on ";

class InstallLogTest : public InstallerTest {
protected:
    /// The lines behind the header of the index at `index`, whose header must be sound.
    std::string pathsOfIndex()
    {
        const std::string content = readFile(index);
        const std::size_t end = content.find('\n');
        EXPECT_EQ(HeaderStart, content.substr(0, HeaderStart.size()));
        EXPECT_EQ(HeaderStart.size() + 19, end); // 2022-12-02T10:11:12
        return content.substr(end + 1);
    }

    std::string index = dir / "ZOR_files";
};

TEST_F(InstallLogTest, TheSingleUserFlagIsAFileOfTheConfiguration)
{
    EXPECT_EQ("/opt/corvan/zor/config/SingleUserMode", singleUserFlagPath("/opt/corvan/zor"));
}

// Reading.

TEST_F(InstallLogTest, EmptyLinesAndCommentsAreNoFiles)
{
    writeFile(index, "# header\n/a/x\n#comment\n\n/a/b\n");
    Files files;

    readFileIndex(index, files);

    EXPECT_EQ((Files{"/a/b", "/a/x"}), files);
}

TEST_F(InstallLogTest, AnyOtherLineIsAWholePath)
{
    writeFile(index, " #a\n/a/b \n /a/b\n/a\tb\r\n" + std::string("/a\0b\n", 5) + "relative\n \n");
    Files files;

    readFileIndex(index, files);

    EXPECT_EQ((Files{" #a", "/a/b ", " /a/b", "/a\tb\r", std::string("/a\0b", 4), "relative", " "}),
              files);
}

TEST_F(InstallLogTest, ALastLineWithoutANewlineIsAPath)
{
    writeFile(index, "/a/x\n/a/b");
    Files files;

    readFileIndex(index, files);

    EXPECT_EQ((Files{"/a/b", "/a/x"}), files);
}

TEST_F(InstallLogTest, ReadingAddsToTheSet)
{
    writeFile(index, "/b\n/a\n/b\n");
    Files files = {"/a", "/old"};

    readFileIndex(index, files);

    EXPECT_EQ((Files{"/a", "/b", "/old"}), files);
}

TEST_F(InstallLogTest, AMissingIndexAddsNothingSilently)
{
    Files files = {"/old"};

    readFileIndex(index, files);

    EXPECT_EQ(Files{"/old"}, files);
    EXPECT_EQ("", log.text());
}

// The installer's own files.

TEST_F(InstallLogTest, TheInstallerOwnsFiveFiles)
{
    InstallRegistry registry;
    registry.homeDirectory = "/opt/corvan/zor";
    Files files = {"/old"};

    addInstallerFiles(registry, files);

    EXPECT_EQ((Files{"/old", "/opt/corvan/zor/bin/libzor.so", "/opt/corvan/zor/config/Zor.tmp",
                     "/opt/corvan/zor/config/SingleUserMode", "/opt/corvan/zor/zor.log",
                     "/opt/corvan/zor/zor.log.bak"}),
              files);
}

TEST_F(InstallLogTest, AHomeThatEndsWithASlashGetsNoSecondOne)
{
    InstallRegistry registry;
    registry.homeDirectory = "/opt/zor/";
    Files files;

    addInstallerFiles(registry, files);

    EXPECT_EQ((Files{"/opt/zor/bin/libzor.so", "/opt/zor/config/Zor.tmp",
                     "/opt/zor/config/SingleUserMode", "/opt/zor/zor.log", "/opt/zor/zor.log.bak"}),
              files);
}

// Writing.

TEST_F(InstallLogTest, TheIndexListsEachPathBehindItsHeader)
{
    writeFileIndex(index, {"/a/x", "/a/b"});

    EXPECT_EQ("/a/b\n/a/x\n", pathsOfIndex());
}

TEST_F(InstallLogTest, PathsComeInTheOrderOfTheirBytes)
{
    writeFileIndex(index, {"/\xC3\xA4", "/z", "/a", "/B", "/a/b", "/a.b", "/\x7F"});

    EXPECT_EQ("/B\n/a\n/a.b\n/a/b\n/z\n/\x7F\n/\xC3\xA4\n", pathsOfIndex());
}

TEST_F(InstallLogTest, PathsAreWrittenAsTheyAre)
{
    writeFileIndex(index, {"/a b ", "/a\tb", std::string("/a\0b", 4)});

    EXPECT_EQ(std::string("/a\0b\n", 5) + "/a\tb\n/a b \n", pathsOfIndex());
}

TEST_F(InstallLogTest, TheHeaderTellsTheLocalTime)
{
    const std::time_t before = std::time(nullptr);
    writeFileIndex(index, {});
    const std::time_t after = std::time(nullptr);

    std::tm time = {};
    const std::string stamp = readFile(index).substr(HeaderStart.size());
    ASSERT_NE(nullptr, strptime(stamp.c_str(), "%Y-%m-%dT%H:%M:%S", &time)) << stamp;
    time.tm_isdst = -1;
    const std::time_t written = mktime(&time);
    EXPECT_LE(before, written);
    EXPECT_LE(written, after);
}

TEST_F(InstallLogTest, AnIndexOfBeforeIsReplaced)
{
    writeFile(index, std::string(10000, 'x'));

    writeFileIndex(index, {"/a"});

    EXPECT_EQ("/a\n", pathsOfIndex());
}

TEST_F(InstallLogTest, AnIndexThatCannotBeWrittenIsSkippedSilently)
{
    writeFileIndex(dir / "missing/ZOR_files", {"/a"});

    EXPECT_EQ(Tree(), treeOf(dir.path()));
    EXPECT_EQ("", log.text());
}

TEST_F(InstallLogTest, WhatWasReadIsWrittenBackSortedAndOnce)
{
    writeFile(index, "/a/x\n#comment\n\n/a/b\n/a/x\n");
    Files files;

    readFileIndex(index, files);
    writeFileIndex(index, files);

    EXPECT_EQ("/a/b\n/a/x\n", pathsOfIndex());
}

TEST_F(InstallLogTest, ATrailingBlankMakesAnotherPath)
{
    writeFile(index, "/a/b\n/a/b \n");
    Files files;

    readFileIndex(index, files);
    writeFileIndex(index, files);

    EXPECT_EQ("/a/b\n/a/b \n", pathsOfIndex());
}

TEST_F(InstallLogTest, ARefreshedIndexListsTheInstallersFilesToo)
{
    InstallRegistry registry;
    registry.homeDirectory = "/h";
    writeFile(index, "# old header\n/z\n/a\n");

    refreshFileIndex(registry, index);

    EXPECT_EQ("/a\n/h/bin/libzor.so\n/h/config/SingleUserMode\n/h/config/Zor.tmp\n/h/zor.log\n"
              "/h/zor.log.bak\n/z\n",
              pathsOfIndex());
}

TEST_F(InstallLogTest, ARefreshMakesAMissingIndex)
{
    InstallRegistry registry;
    registry.homeDirectory = "/h";

    refreshFileIndex(registry, index);

    EXPECT_EQ("/h/bin/libzor.so\n/h/config/SingleUserMode\n/h/config/Zor.tmp\n/h/zor.log\n"
              "/h/zor.log.bak\n",
              pathsOfIndex());
}

// The transient index.

TEST_F(InstallLogTest, TheTransientIndexHasAHeaderWithoutATime)
{
    openTransientIndex(transaction, index);
    ASSERT_NE(nullptr, zor_file_handle);
    (void)std::fputs("/b\n/a\n", zor_file_handle);
    closeTransientIndex();

    EXPECT_EQ(nullptr, zor_file_handle);
    EXPECT_EQ("# File created by ZOR: 22/12/02zor_9.2.30.0000\n/b\n/a\n", readFile(index));
    EXPECT_EQ("", log.text());
}

TEST_F(InstallLogTest, TheTransientIndexReplacesTheOldOne)
{
    writeFile(index, std::string(1000, 'x'));

    openTransientIndex(transaction, index);
    closeTransientIndex();

    EXPECT_EQ("# File created by ZOR: 22/12/02zor_9.2.30.0000\n", readFile(index));
}

TEST_F(InstallLogTest, TheTransientIndexIsOpenForReadingToo)
{
    openTransientIndex(transaction, index);
    const int flags = fcntl(fileno(zor_file_handle), F_GETFL);
    closeTransientIndex();

    EXPECT_EQ(O_RDWR, flags & O_ACCMODE);
}

TEST_F(InstallLogTest, TheTransientIndexIsReadAsFiles)
{
    openTransientIndex(transaction, index);
    (void)std::fputs("/b\n/a\n/b\n", zor_file_handle);
    closeTransientIndex();
    Files files;

    readFileIndex(index, files);

    EXPECT_EQ((Files{"/a", "/b"}), files);
}

TEST_F(InstallLogTest, DirectoriesAndIndexAreMadeUnderTheUmaskOfTheInstallation)
{
    index = dir / "etc/zor/ZOR_files";
    const ScopedUmask strict(077);

    openTransientIndex(transaction, index);
    closeTransientIndex();

    EXPECT_EQ((Tree{"d 0755 etc", "d 0755 etc/zor", "f 0644 etc/zor/ZOR_files"}),
              treeOf(dir.path()));
    EXPECT_EQ(077U, umask(077));
}

TEST_F(InstallLogTest, AStricterInstallationMakesAStricterIndex)
{
    index = dir / "etc/ZOR_files";
    globalFilesUmask = 027;

    openTransientIndex(transaction, index);
    closeTransientIndex();

    EXPECT_EQ((Tree{"d 0750 etc", "f 0640 etc/ZOR_files"}), treeOf(dir.path()));
}

TEST_F(InstallLogTest, TheDirectoriesOfTheIndexAreJournalledAndTheIndexIsNot)
{
    index = dir / "etc/zor/ZOR_files";

    openTransientIndex(transaction, index);
    closeTransientIndex();

    EXPECT_EQ("4 " + (dir / "etc") + "\n4 " + (dir / "etc/zor") + "\n", journalText(transaction));
}

TEST_F(InstallLogTest, AnIndexThatCannotBeOpenedIsWarnedOf)
{
    writeFile(dir / "file", "");
    index = dir / "file/ZOR_files";

    openTransientIndex(transaction, index);

    EXPECT_EQ(nullptr, zor_file_handle);
    EXPECT_EQ("Warning! Failed to create install log file: " + index + "\n", log.text());
}

TEST_F(InstallLogTest, ClosingWhatIsNotOpenDoesNothing)
{
    closeTransientIndex();

    EXPECT_EQ(nullptr, zor_file_handle);
}

// The single-user flag.

class SingleUserFlagTest : public InstallLogTest {
protected:
    SingleUserFlagTest() { makeDirectories(dir / "home/config"); }

    std::string home = dir / "home";
    std::string flag = dir / "home/config/SingleUserMode";
};

TEST_F(SingleUserFlagTest, AFlagTurnsSingleUserModeOn)
{
    writeFile(flag, "");

    detectSingleUserMode(home);

    EXPECT_EQ("Single user mode file found\n", log.text());
    EXPECT_EQ(022U, globalFilesUmask);
    EXPECT_EQ(0755U, LogDirMode);
    EXPECT_EQ(0755U, CommonLogDirMode);
    EXPECT_EQ(0755U, CacheDirRootMode);
    EXPECT_EQ(0755U, EtcDirMode);
    EXPECT_TRUE(applySingleUserMode);
}

TEST_F(SingleUserFlagTest, TheContentOfAFlagDoesNotMatter)
{
    writeFile(flag, "no");

    detectSingleUserMode(home);

    EXPECT_TRUE(applySingleUserMode);
}

TEST_F(SingleUserFlagTest, DetectionDoesNotAskForAFlag)
{
    writeFile(flag, "");

    detectSingleUserMode(home);

    EXPECT_FALSE(createSingleUserModeFile);
}

TEST_F(SingleUserFlagTest, WithoutAFlagNothingChanges)
{
    writeFile(home + "/SingleUserMode", "in the wrong directory");

    detectSingleUserMode(home);

    EXPECT_EQ("", log.text());
    EXPECT_EQ(0U, globalFilesUmask);
    EXPECT_EQ(0777U, LogDirMode);
    EXPECT_EQ(0777U, CommonLogDirMode);
    EXPECT_EQ(0777U, CacheDirRootMode);
    EXPECT_EQ(0777U, EtcDirMode);
    EXPECT_FALSE(applySingleUserMode);
}

TEST_F(SingleUserFlagTest, AFlagThatMayNotBeReadCountsAsNone)
{
    writeFile(flag, "");
    ASSERT_EQ(0, chmod(flag.c_str(), 0));
    const OrdinaryRights ordinary;

    detectSingleUserMode(home);

    EXPECT_FALSE(applySingleUserMode);
}

TEST_F(SingleUserFlagTest, TheFlagIsAnEmptyFile)
{
    writeFile(flag, "of before");

    createSingleUserModeFlag(transaction, home, nullptr);

    EXPECT_EQ("", readFile(flag));
    EXPECT_EQ("Creating single user mode flag file: " + flag + "\n", log.text());
}

TEST_F(SingleUserFlagTest, TheFlagIsMadeUnderTheUmaskOfTheInstallation)
{
    const ScopedUmask strict(077);
    globalFilesUmask = 022;

    createSingleUserModeFlag(transaction, home, nullptr);

    EXPECT_EQ(0644U, modeOf(flag));
    EXPECT_EQ(077U, umask(077));
}

TEST_F(SingleUserFlagTest, TheFlagIsNotJournalled)
{
    createSingleUserModeFlag(transaction, home, nullptr);

    EXPECT_EQ("", journalText(transaction));
}

TEST_F(SingleUserFlagTest, TheFlagIsAppendedToTheIndex)
{
    writeFile(index, "# header\n/z\n");

    createSingleUserModeFlag(transaction, home, &index);

    EXPECT_EQ("# header\n/z\n" + flag + "\n", readFile(index));
}

TEST_F(SingleUserFlagTest, AMissingIndexIsMadeWithItsDirectories)
{
    index = dir / "etc/zor/ZOR_files";
    globalFilesUmask = 022;

    createSingleUserModeFlag(transaction, home, &index);

    EXPECT_EQ(flag + "\n", readFile(index));
    EXPECT_EQ((Tree{"d 0755 zor", "f 0644 zor/ZOR_files"}), treeOf(dir / "etc"));
    EXPECT_EQ("4 " + (dir / "etc") + "\n4 " + (dir / "etc/zor") + "\n", journalText(transaction));
}

TEST_F(SingleUserFlagTest, AnIndexThatCannotBeOpenedIsSkippedSilently)
{
    index = dir / "home"; // a directory

    createSingleUserModeFlag(transaction, home, &index);

    EXPECT_EQ("", readFile(flag));
    EXPECT_EQ("Creating single user mode flag file: " + flag + "\n", log.text());
}

TEST_F(SingleUserFlagTest, AFlagThatCannotBeMadeIsLoggedAndNotListed)
{
    home = dir / "nowhere";
    writeFile(index, "/z\n");

    createSingleUserModeFlag(transaction, home, &index);

    EXPECT_EQ("Creating single user mode flag file: " + home + "/config/SingleUserMode\n" +
                  "Unable to create single user mode flag file\n",
              log.text());
    EXPECT_EQ("/z\n", readFile(index));
}

} // namespace
