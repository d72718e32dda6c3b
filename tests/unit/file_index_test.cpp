#include "file_index.h"
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

class FileIndexTest : public InstallerTest {
protected:
    /// The lines after the header of the index at `index`, whose header must be valid.
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

TEST_F(FileIndexTest, IsAFileOfTheHomeDirectory)
{
    EXPECT_EQ("/opt/corvan/zor/ZOR_files", fileIndexPath("/opt/corvan/zor"));
    EXPECT_EQ("/opt/zor//ZOR_files", fileIndexPath("/opt/zor/"));
}

// Reading.

TEST_F(FileIndexTest, EmptyLinesAndCommentsAreNoFiles)
{
    writeFile(index, "# header\n/a/x\n#comment\n\n/a/b\n");
    Files files;

    readFileIndex(index, files);

    EXPECT_EQ((Files{"/a/b", "/a/x"}), files);
}

TEST_F(FileIndexTest, AnyOtherLineIsAWholePath)
{
    writeFile(index, " #a\n/a/b \n /a/b\n/a\tb\r\n" + std::string("/a\0b\n", 5) + "relative\n \n");
    Files files;

    readFileIndex(index, files);

    EXPECT_EQ((Files{" #a", "/a/b ", " /a/b", "/a\tb\r", std::string("/a\0b", 4), "relative", " "}),
              files);
}

TEST_F(FileIndexTest, ALastLineWithoutANewlineIsAPath)
{
    writeFile(index, "/a/x\n/a/b");
    Files files;

    readFileIndex(index, files);

    EXPECT_EQ((Files{"/a/b", "/a/x"}), files);
}

TEST_F(FileIndexTest, ReadingAddsToTheSet)
{
    writeFile(index, "/b\n/a\n/b\n");
    Files files = {"/a", "/old"};

    readFileIndex(index, files);

    EXPECT_EQ((Files{"/a", "/b", "/old"}), files);
}

TEST_F(FileIndexTest, AMissingIndexAddsNothingSilently)
{
    Files files = {"/old"};

    readFileIndex(index, files);

    EXPECT_EQ(Files{"/old"}, files);
    EXPECT_EQ("", log.text());
}

// The installer's own files.

TEST_F(FileIndexTest, TheInstallerOwnsFiveFiles)
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

TEST_F(FileIndexTest, AHomeThatEndsWithASlashGetsNoSecondOne)
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

TEST_F(FileIndexTest, TheIndexListsEachPathAfterItsHeader)
{
    writeFileIndex(index, {"/a/x", "/a/b"});

    EXPECT_EQ("/a/b\n/a/x\n", pathsOfIndex());
}

TEST_F(FileIndexTest, PathsAreSortedByTheirBytes)
{
    writeFileIndex(index, {"/\xC3\xA4", "/z", "/a", "/B", "/a/b", "/a.b", "/\x7F"});

    EXPECT_EQ("/B\n/a\n/a.b\n/a/b\n/z\n/\x7F\n/\xC3\xA4\n", pathsOfIndex());
}

TEST_F(FileIndexTest, PathsAreWrittenAsTheyAre)
{
    writeFileIndex(index, {"/a b ", "/a\tb", std::string("/a\0b", 4)});

    EXPECT_EQ(std::string("/a\0b\n", 5) + "/a\tb\n/a b \n", pathsOfIndex());
}

TEST_F(FileIndexTest, TheHeaderHasTheLocalTime)
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

TEST_F(FileIndexTest, AnOlderIndexIsReplaced)
{
    writeFile(index, std::string(10000, 'x'));

    writeFileIndex(index, {"/a"});

    EXPECT_EQ("/a\n", pathsOfIndex());
}

TEST_F(FileIndexTest, AnIndexThatCannotBeWrittenIsSkippedSilently)
{
    writeFileIndex(dir / "missing/ZOR_files", {"/a"});

    EXPECT_EQ(Tree(), treeOf(dir.path()));
    EXPECT_EQ("", log.text());
}

TEST_F(FileIndexTest, WhatWasReadIsWrittenBackSortedWithoutDuplicates)
{
    writeFile(index, "/a/x\n#comment\n\n/a/b\n/a/x\n");
    Files files;

    readFileIndex(index, files);
    writeFileIndex(index, files);

    EXPECT_EQ("/a/b\n/a/x\n", pathsOfIndex());
}

TEST_F(FileIndexTest, ATrailingBlankMakesADifferentPath)
{
    writeFile(index, "/a/b\n/a/b \n");
    Files files;

    readFileIndex(index, files);
    writeFileIndex(index, files);

    EXPECT_EQ("/a/b\n/a/b \n", pathsOfIndex());
}

TEST_F(FileIndexTest, ARefreshedIndexListsTheInstallersFilesToo)
{
    InstallRegistry registry;
    registry.homeDirectory = "/h";
    writeFile(index, "# old header\n/z\n/a\n");

    refreshFileIndex(registry, index);

    EXPECT_EQ("/a\n/h/bin/libzor.so\n/h/config/SingleUserMode\n/h/config/Zor.tmp\n/h/zor.log\n"
              "/h/zor.log.bak\n/z\n",
              pathsOfIndex());
}

TEST_F(FileIndexTest, ARefreshCreatesAMissingIndex)
{
    InstallRegistry registry;
    registry.homeDirectory = "/h";

    refreshFileIndex(registry, index);

    EXPECT_EQ("/h/bin/libzor.so\n/h/config/SingleUserMode\n/h/config/Zor.tmp\n/h/zor.log\n"
              "/h/zor.log.bak\n",
              pathsOfIndex());
}

// The transient index.

TEST_F(FileIndexTest, TheTransientIndexHasAHeaderWithoutATime)
{
    openTransientIndex(transaction, index);
    ASSERT_NE(nullptr, zor_file_handle);
    (void)std::fputs("/b\n/a\n", zor_file_handle);
    closeTransientIndex();

    EXPECT_EQ(nullptr, zor_file_handle);
    EXPECT_EQ("# File created by ZOR: 22/12/02zor_9.2.30.0000\n/b\n/a\n", readFile(index));
    EXPECT_EQ("", log.text());
}

TEST_F(FileIndexTest, TheTransientIndexReplacesTheOldOne)
{
    writeFile(index, std::string(1000, 'x'));

    openTransientIndex(transaction, index);
    closeTransientIndex();

    EXPECT_EQ("# File created by ZOR: 22/12/02zor_9.2.30.0000\n", readFile(index));
}

TEST_F(FileIndexTest, TheTransientIndexIsOpenForReadingToo)
{
    openTransientIndex(transaction, index);
    const int flags = fcntl(fileno(zor_file_handle), F_GETFL);
    closeTransientIndex();

    EXPECT_EQ(O_RDWR, flags & O_ACCMODE);
}

TEST_F(FileIndexTest, TheTransientIndexIsReadAsFiles)
{
    openTransientIndex(transaction, index);
    (void)std::fputs("/b\n/a\n/b\n", zor_file_handle);
    closeTransientIndex();
    Files files;

    readFileIndex(index, files);

    EXPECT_EQ((Files{"/a", "/b"}), files);
}

TEST_F(FileIndexTest, DirectoriesAndIndexAreMadeUnderTheUmaskOfTheInstallation)
{
    index = dir / "etc/zor/ZOR_files";
    const ScopedUmask strict(077);

    openTransientIndex(transaction, index);
    closeTransientIndex();

    EXPECT_EQ((Tree{"d 0755 etc", "d 0755 etc/zor", "f 0644 etc/zor/ZOR_files"}),
              treeOf(dir.path()));
    EXPECT_EQ(077U, umask(077));
}

TEST_F(FileIndexTest, AStricterInstallationMakesAStricterIndex)
{
    index = dir / "etc/ZOR_files";
    globalFilesUmask = 027;

    openTransientIndex(transaction, index);
    closeTransientIndex();

    EXPECT_EQ((Tree{"d 0750 etc", "f 0640 etc/ZOR_files"}), treeOf(dir.path()));
}

TEST_F(FileIndexTest, TheDirectoriesOfTheIndexAreJournalledAndTheIndexIsNot)
{
    index = dir / "etc/zor/ZOR_files";

    openTransientIndex(transaction, index);
    closeTransientIndex();

    EXPECT_EQ("4 " + (dir / "etc") + "\n4 " + (dir / "etc/zor") + "\n", journalText(transaction));
}

TEST_F(FileIndexTest, AnIndexThatCannotBeOpenedCausesAWarning)
{
    writeFile(dir / "file", "");
    index = dir / "file/ZOR_files";

    openTransientIndex(transaction, index);

    EXPECT_EQ(nullptr, zor_file_handle);
    EXPECT_EQ("Warning! Failed to create install log file: " + index + "\n", log.text());
}

TEST_F(FileIndexTest, ClosingWhatIsNotOpenDoesNothing)
{
    closeTransientIndex();

    EXPECT_EQ(nullptr, zor_file_handle);
}

} // namespace
