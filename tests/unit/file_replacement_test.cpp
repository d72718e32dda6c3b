#include "file_replacement.h"
#include "installer_fixtures.h"
#include "process_limits.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <utility>

#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/xattr.h>
#include <unistd.h>

namespace {

class FileReplacementTest : public MachineTest {
protected:
    /// Replaces the content of `path` by `text`.
    static int replace(const std::string& path, const std::string& text)
    {
        return replaceFile(path, 0666, [&](std::FILE* file) {
            (void)std::fwrite(text.data(), 1, text.size(), file);
        });
    }

    static ino_t inodeOf(const std::string& path)
    {
        struct stat status = {};
        EXPECT_EQ(0, lstat(path.c_str(), &status)) << path;
        return status.st_ino;
    }
};

TEST_F(FileReplacementTest, ANewFileGetsItsModeUnderTheUmask)
{
    (void)umask(027);

    EXPECT_EQ(0, replace(dir / "file", "new"));

    EXPECT_EQ("new", readFile(dir / "file"));
    EXPECT_EQ(0640U, modeOf(dir / "file"));
    EXPECT_EQ((std::vector<std::string>{"f 0640 file"}), treeOf(dir.path()));
}

TEST_F(FileReplacementTest, TheOldFileIsReplacedAsAWholeAndKeepsItsModeAndAttributes)
{
    writeFile(dir / "file", "old and longer");
    ASSERT_EQ(0, chmod((dir / "file").c_str(), 0604));
    const bool hasAttributes = setxattr((dir / "file").c_str(), "user.note", "x", 1, 0) == 0;
    const ino_t old = inodeOf(dir / "file");

    EXPECT_EQ(0, replace(dir / "file", "new"));

    EXPECT_EQ("new", readFile(dir / "file"));
    EXPECT_EQ(0604U, modeOf(dir / "file"));
    EXPECT_NE(old, inodeOf(dir / "file"));
    char value = 0;
    if (hasAttributes) { // not every file system has them
        EXPECT_EQ(1, getxattr((dir / "file").c_str(), "user.note", &value, 1));
        EXPECT_EQ('x', value);
    }
}

TEST_F(FileReplacementTest, ALinkOfOursStaysALink)
{
    makeDirectories(dir / "elsewhere");
    writeFile(dir / "elsewhere/file", "old");
    ASSERT_EQ(0, symlink("elsewhere/file", (dir / "link").c_str()));

    EXPECT_EQ(0, replace(dir / "link", "new"));

    struct stat status = {};
    ASSERT_EQ(0, lstat((dir / "link").c_str(), &status));
    EXPECT_TRUE(S_ISLNK(status.st_mode));
    EXPECT_EQ("new", readFile(dir / "elsewhere/file"));
}

TEST_F(FileReplacementTest, AFullDiskKeepsTheOldContent)
{
    makeDirectories(dir / "disk");
    const SmallDisk disk(dir / "disk", 64);
    writeFile(dir / "disk/file", "old");

    EXPECT_EQ(6, replace(dir / "disk/file", std::string(100000, 'x')));

    EXPECT_EQ("old", readFile(dir / "disk/file"));
    EXPECT_EQ((std::vector<std::string>{"f 0644 file"}), treeOf(dir / "disk"));
}

TEST_F(FileReplacementTest, AFailedWriteOfAShortContentIsReportedAsWhatItIs)
{
    writeFile(dir / "file", "old");

    for (const auto& [error, code] : {std::pair{ENOSPC, 6}, {EACCES, 7}, {EIO, 5}}) {
        EXPECT_TRUE(passesInChild([&, failure = error, expected = code] {
            failSystemCall(SYS_write, failure);
            ASSERT_EQ(expected, replace(dir / "file", "new"));
        })) << error;
    }

    EXPECT_EQ("old", readFile(dir / "file"));
    EXPECT_EQ((std::vector<std::string>{"f 0644 file"}), treeOf(dir.path()));
}

TEST_F(FileReplacementTest, AFailedSyncKeepsTheOldContent)
{
    writeFile(dir / "file", "old");

    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(SYS_fsync, EIO);
        ASSERT_EQ(5, replace(dir / "file", "new"));
    }));

    EXPECT_EQ("old", readFile(dir / "file"));
    EXPECT_EQ((std::vector<std::string>{"f 0644 file"}), treeOf(dir.path()));
}

TEST_F(FileReplacementTest, ATemporaryFileOfAKilledRunIsReplaced)
{
    writeFile(dir / "file", "old");
    writeFile(dir / "file.wzorinst-new", "half");

    EXPECT_EQ(0, replace(dir / "file", "new"));

    EXPECT_EQ("new", readFile(dir / "file"));
    EXPECT_EQ((std::vector<std::string>{"f 0644 file"}), treeOf(dir.path()));
}

TEST_F(FileReplacementTest, ATemporaryFileCanBeDeletedByItself)
{
    writeFile(dir / "file.wzorinst-new", "half");

    deleteTemporaryFile(dir / "file");

    EXPECT_TRUE(treeOf(dir.path()).empty());
}

TEST_F(FileReplacementTest, AFileThatSomethingIsMountedOnIsWrittenInPlace)
{
    writeFile(dir / "file", "below");
    writeFile(dir / "mounted", "old and longer");
    {
        const FileInPlace mount(dir / "mounted", dir / "file");
        EXPECT_EQ(0, replace(dir / "file", "new"));
    }

    EXPECT_EQ("new", readFile(dir / "mounted"));
    EXPECT_EQ("below", readFile(dir / "file"));
    EXPECT_EQ((std::vector<std::string>{"f 0644 file", "f 0644 mounted"}), treeOf(dir.path()));
}

TEST_F(FileReplacementTest, AFileThatIsWrittenInPlaceCanBecomeEmpty)
{
    writeFile(dir / "file", "below");
    writeFile(dir / "mounted", "old");
    const FileInPlace mount(dir / "mounted", dir / "file");

    EXPECT_EQ(0, replace(dir / "file", ""));

    EXPECT_EQ("", readFile(dir / "mounted"));
}

TEST_F(FileReplacementTest, AFileInADirectoryWithoutRightsIsWrittenInPlace)
{
    makeDirectories(dir / "closed");
    writeFile(dir / "closed/file", "old and longer");
    ASSERT_EQ(0, chmod((dir / "closed").c_str(), 0555));

    EXPECT_TRUE(passesInChild([&] {
        const OrdinaryRights ordinary;
        ASSERT_EQ(0, replace(dir / "closed/file", "new"));
    }));

    ASSERT_EQ(0, chmod((dir / "closed").c_str(), 0755));
    EXPECT_EQ("new", readFile(dir / "closed/file"));
}

TEST_F(FileReplacementTest, AFileWhoseOwnerCannotBeKeptIsWrittenInPlace)
{
    writeFile(dir / "file", "old and longer");
    const ino_t old = inodeOf(dir / "file");

    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(SYS_fchmod, EPERM); // as for any attribute that cannot be passed on
        ASSERT_EQ(0, replace(dir / "file", "new"));
    }));

    EXPECT_EQ("new", readFile(dir / "file"));
    EXPECT_EQ(old, inodeOf(dir / "file"));
    EXPECT_EQ((std::vector<std::string>{"f 0644 file"}), treeOf(dir.path()));
}

TEST_F(FileReplacementTest, APathThatCannotBeOpenedIsCode2WithItsReason)
{
    makeDirectories(dir / "directory");

    EXPECT_EQ(2, replace(dir / "directory", "new"));
    EXPECT_EQ(EISDIR, errno);
    EXPECT_EQ(2, replace(dir / "missing/file", "new"));
    EXPECT_EQ(ENOENT, errno);
}

} // namespace
