#include "installer_fixtures.h"
#include "process_limits.h"
#include "safe_path.h"

#include <gtest/gtest.h>

#include <cerrno>

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace {

TEST(PathExistsTest, FilesAndDirectoriesExist)
{
    const TempDir dir;
    writeFile(dir / "file", "");

    EXPECT_TRUE(pathExists(dir.path()));
    EXPECT_TRUE(pathExists(dir / "file"));
    EXPECT_FALSE(pathExists(dir / "missing"));
    EXPECT_FALSE(pathExists(dir / "file/below"));
    EXPECT_FALSE(pathExists(""));
}

TEST(PathExistsTest, ALinkExistsIfItsTargetDoes)
{
    const TempDir dir;
    writeFile(dir / "file", "");
    ASSERT_EQ(0, symlink("file", (dir / "link").c_str()));
    ASSERT_EQ(0, symlink("missing", (dir / "dangling").c_str()));

    EXPECT_TRUE(pathExists(dir / "link"));
    EXPECT_FALSE(pathExists(dir / "dangling"));
}

class PathIsMissingTest : public testing::Test {
protected:
    TempDir dir;
};

TEST_F(PathIsMissingTest, WhatExistsIsNotMissing)
{
    writeFile(dir / "file", "");

    EXPECT_FALSE(pathIsMissing(dir / "file"));
    EXPECT_FALSE(pathIsMissing(dir.path()));
}

TEST_F(PathIsMissingTest, ANameThatIsNotThereIsMissing)
{
    EXPECT_TRUE(pathIsMissing(dir / "file"));
}

TEST_F(PathIsMissingTest, ADanglingLinkIsMissing)
{
    ASSERT_EQ(0, symlink("nowhere", (dir / "link").c_str()));

    EXPECT_TRUE(pathIsMissing(dir / "link"));
}

TEST_F(PathIsMissingTest, ALinkToItselfIsMissing)
{
    ASSERT_EQ(0, symlink("link", (dir / "link").c_str()));

    EXPECT_TRUE(pathIsMissing(dir / "link"));
}

TEST_F(PathIsMissingTest, ANameLongerThanTheFileSystemAllowsIsMissing)
{
    EXPECT_TRUE(pathIsMissing(dir / std::string(300, 'n')));
}

TEST_F(PathIsMissingTest, AnythingBelowAFileIsMissing)
{
    writeFile(dir / "file", "");

    EXPECT_TRUE(pathIsMissing(dir / "file/below"));
}

TEST_F(PathIsMissingTest, AnythingInADirectoryThatMayNotBeSearchedIsMissing)
{
    makeDirectories(dir / "closed");
    writeFile(dir / "closed/file", "");
    ASSERT_EQ(0, chmod((dir / "closed").c_str(), 0600));
    const OrdinaryRights rights;

    EXPECT_TRUE(pathIsMissing(dir / "closed/file"));
}

TEST_F(PathIsMissingTest, AnErrorOfTheDiskDoesNotMeanMissing)
{
    EXPECT_TRUE(passesInChild([this] {
        failSystemCall(SYS_openat2, EIO);

        EXPECT_FALSE(pathIsMissing(dir / "file"));
    }));
}

using SafePathTest = InstallerTest;

/// What a walk along `path` ends with: the name, or "error" and its number.
std::string nameAt(const std::string& path, LastLink lastLink)
{
    Place place;
    const int code = findPlace(path, lastLink, place);
    return code == 0 ? place.name : "error " + std::to_string(code);
}

TEST_F(SafePathTest, APlaceIsTheDirectoryAndTheLastName)
{
    makeDirectories(dir / "a/b");

    EXPECT_EQ("file", nameAt(dir / "a/b/file", LastLink::Follow));
    EXPECT_EQ("b", nameAt(dir / "a/b/", LastLink::Follow));
    EXPECT_EQ("b/", nameAt(dir / "a/b/", LastLink::Keep));
    EXPECT_EQ("..", nameAt(dir / "a/..", LastLink::Follow));
    EXPECT_EQ(".", nameAt("/", LastLink::Follow));
}

TEST_F(SafePathTest, APathThatTheSystemRefusesFailsWithTheSameError)
{
    writeFile(dir / "file", "");
    ASSERT_EQ(0, symlink("loop", (dir / "loop").c_str()));

    EXPECT_EQ("error " + std::to_string(ENOENT), nameAt("", LastLink::Follow));
    EXPECT_EQ("error " + std::to_string(ENOENT), nameAt(dir / "missing/x", LastLink::Follow));
    EXPECT_EQ("error " + std::to_string(ENOTDIR), nameAt(dir / "file/x", LastLink::Follow));
    EXPECT_EQ("error " + std::to_string(ENOTDIR), nameAt(dir / "file/", LastLink::Follow));
    EXPECT_EQ("error " + std::to_string(ELOOP), nameAt(dir / "loop", LastLink::Follow));
    EXPECT_EQ("error " + std::to_string(ENAMETOOLONG),
              nameAt("/" + std::string(4095, 'x'), LastLink::Follow));
}

TEST_F(SafePathTest, ANulEndsAPathAsItDoesForTheSystem)
{
    writeFile(dir / "file", "x");

    EXPECT_TRUE(pathExists((dir / "file") + std::string("\0behind", 7)));
}

TEST_F(SafePathTest, OurLinksAreFollowedAtEveryComponent)
{
    makeDirectories(dir / "real/sub");
    writeFile(dir / "real/sub/file", "content");
    ASSERT_EQ(0, symlink((dir / "real").c_str(), (dir / "absolute").c_str()));
    ASSERT_EQ(0, symlink("../real/sub/file", (dir / "real/link").c_str()));

    EXPECT_TRUE(pathExists(dir / "absolute/sub/file"));
    EXPECT_TRUE(pathExists(dir / "absolute/link")) << "relative to the directory of the link";
    EXPECT_EQ("link", nameAt(dir / "absolute/link", LastLink::Keep));
    EXPECT_EQ("file", nameAt(dir / "absolute/link", LastLink::Follow));
}

TEST_F(SafePathTest, LinksOfTheKernelAreFollowed)
{
    const ScopedFd open(::open((dir / "deleted").c_str(), O_RDWR | O_CREAT, 0600));
    ASSERT_EQ(0, unlink((dir / "deleted").c_str()));
    const std::string path = "/proc/self/fd/" + std::to_string(open.get());

    EXPECT_TRUE(openPath(path, O_RDONLY).isOpen()) << "its text names a file that is gone";
}

TEST_F(SafePathTest, RootAndTheRunningUserAreTrusted)
{
    EXPECT_TRUE(isTrustedOwner(0));
    EXPECT_TRUE(isTrustedOwner(getuid()));
    EXPECT_FALSE(isTrustedOwner(getuid() + 1));
}

TEST_F(SafePathTest, OthersCanPlantWhereTheyMayWrite)
{
    struct stat status = {};
    status.st_uid = getuid();
    status.st_mode = S_IFDIR | 0755;
    EXPECT_FALSE(othersCanPlant(status));

    status.st_mode = S_IFDIR | 01777;
    EXPECT_TRUE(othersCanPlant(status));
    status.st_mode = S_IFDIR | 0775;
    EXPECT_TRUE(othersCanPlant(status)) << "a group has members";
    status.st_mode = S_IFDIR | 0755;
    status.st_uid = getuid() + 1;
    EXPECT_TRUE(othersCanPlant(status)) << "its owner may change the mode";
}

TEST_F(SafePathTest, AFifoThatMayBePlantedIsRefusedWithoutWaiting)
{
    makeDirectories(dir / "open");
    ASSERT_EQ(0, chmod((dir / "open").c_str(), 0777));
    ASSERT_EQ(0, mkfifo((dir / "open/fifo").c_str(), 0666));
    WritableFile file;

    EXPECT_FALSE(openPath(dir / "open/fifo", O_RDONLY).isOpen());
    EXPECT_EQ(ENXIO, errno);
    EXPECT_EQ(ENXIO, openForWriting(dir / "open/fifo", Existing::Truncate, 0600, file));
}

TEST_F(SafePathTest, OurOwnFifoIsOpenedAsUsual)
{
    ASSERT_EQ(0, chmod(dir.path().c_str(), 0755));
    ASSERT_EQ(0, mkfifo((dir / "fifo").c_str(), 0600));
    const ScopedFd reader(open((dir / "fifo").c_str(), O_RDONLY | O_NONBLOCK));
    WritableFile file;

    EXPECT_EQ(0, openForWriting(dir / "fifo", Existing::Truncate, 0600, file));

    EXPECT_EQ(0, fcntl(file.fd.get(), F_GETFL) & O_NONBLOCK);
}

TEST_F(SafePathTest, AHardLinkThatMayBePlantedIsNotWrittenTo)
{
    writeFile(dir / "victim", "kept");
    makeDirectories(dir / "open");
    ASSERT_EQ(0, chmod((dir / "open").c_str(), 0777));
    ASSERT_EQ(0, link((dir / "victim").c_str(), (dir / "open/planted").c_str()));
    ASSERT_EQ(0, chmod((dir / "victim").c_str(), 0600));
    WritableFile file;

    EXPECT_EQ(EPERM, openForWriting(dir / "open/planted", Existing::Truncate, 0600, file));
    EXPECT_EQ(EPERM, openForWriting(dir / "open/planted", Existing::Append, 0600, file));
    EXPECT_EQ(ModeChange::Failed, changeMode(dir / "open/planted", 0666));

    EXPECT_EQ("kept", readFile(dir / "victim"));
    EXPECT_EQ(0600U, modeOf(dir / "victim"));
}

TEST_F(SafePathTest, AHardLinkOfOursIsAnOrdinaryFile)
{
    ASSERT_EQ(0, chmod(dir.path().c_str(), 0755));
    writeFile(dir / "one", "old");
    ASSERT_EQ(0, link((dir / "one").c_str(), (dir / "two").c_str()));
    WritableFile file;

    EXPECT_EQ(0, openForWriting(dir / "one", Existing::Truncate, 0600, file));
    EXPECT_EQ(ModeChange::Changed, changeMode(dir / "one", 0640));

    EXPECT_EQ("", readFile(dir / "two"));
    EXPECT_EQ(0640U, modeOf(dir / "two"));
}

TEST_F(SafePathTest, ANewFileIsCreatedAlsoThroughADanglingLinkOfOurs)
{
    ASSERT_EQ(0, symlink("target", (dir / "link").c_str()));
    WritableFile file;

    EXPECT_EQ(0, openForWriting(dir / "link", Existing::Refuse, 0600, file));

    EXPECT_TRUE(file.created);
    EXPECT_EQ(0600U, modeOf(dir / "target"));
    EXPECT_EQ(EEXIST, openForWriting(dir / "link", Existing::Refuse, 0600, file));
}

TEST_F(SafePathTest, ModesAreSetWithoutOpening)
{
    makeDirectories(dir / "closed");
    ASSERT_EQ(0, mkfifo((dir / "fifo").c_str(), 0600));
    ASSERT_EQ(0, chmod((dir / "closed").c_str(), 0));

    EXPECT_TRUE(passesInChild([&] {
        const OrdinaryRights ordinary;
        ASSERT_EQ(ModeChange::Changed, changeMode(dir / "closed", 0755));
        ASSERT_EQ(ModeChange::Changed, changeMode(dir / "fifo", 0644));
    }));

    EXPECT_EQ(0755U, modeOf(dir / "closed"));
    EXPECT_EQ(0644U, modeOf(dir / "fifo"));
    EXPECT_EQ(ModeChange::NothingThere, changeMode(dir / "missing", 0644));
}

TEST_F(SafePathTest, APlainDirectoryIsOneThatNoLinkLeadsTo)
{
    makeDirectories(dir / "real/below");
    writeFile(dir / "file", "");
    ASSERT_EQ(0, symlink("real", (dir / "link").c_str()));

    EXPECT_TRUE(isPlainDirectory(dir / "real"));
    EXPECT_TRUE(isPlainDirectory(dir / "real/below"));
    EXPECT_FALSE(isPlainDirectory(dir / "link"));
    EXPECT_FALSE(isPlainDirectory(dir / "link/below"));
    EXPECT_FALSE(isPlainDirectory(dir / "file"));
    EXPECT_FALSE(isPlainDirectory(dir / "missing"));
    EXPECT_FALSE(isPlainDirectory(""));
}

TEST_F(SafePathTest, DirectoriesAreReusedOnlyWhileAGuardLives)
{
    makeDirectories(dir / "a");
    {
        const ScopedDirectoryReuse reuse;
        writeFile(dir / "a/file", "");
        ASSERT_TRUE(pathExists(dir / "a/file"));
        ASSERT_EQ(0, rename((dir / "a").c_str(), (dir / "b").c_str()));
        EXPECT_TRUE(pathExists(dir / "a/file")) << "found in the directory that is still open";
    }
    EXPECT_FALSE(pathExists(dir / "a/file"));
}

} // namespace
