#include "installer_fixtures.h"
#include "process_limits.h"
#include "safe_path.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <cstdio>
#include <thread>

#include <fcntl.h>
#include <sched.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

#ifdef SYS_ftruncate64
constexpr long TruncateCall = SYS_ftruncate64;
#else
constexpr long TruncateCall = SYS_ftruncate;
#endif

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

TEST_F(PathIsMissingTest, ASingleRefusalDoesNotMeanMissing)
{
    writeFile(dir / "file", "");

    EXPECT_TRUE(passesInChild([this] {
        beforeSystemCall({SYS_openat2}, 1, [] { return EACCES; });

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

TEST_F(SafePathTest, APathOf4095BytesIsTheLongest)
{
    writeFile(dir / "file", "");
    std::string path = dir / "file";
    path.insert(dir.path().size(), 4095 - path.size(), '/');

    EXPECT_EQ("file", nameAt(path, LastLink::Follow));
    EXPECT_EQ("error " + std::to_string(ENAMETOOLONG), nameAt("/" + path, LastLink::Follow));
}

TEST_F(SafePathTest, AsManyLinksAreFollowedAsTheKernelFollows)
{
    writeFile(dir / "0", "");
    for (int link = 1; link <= 41; ++link)
        ASSERT_EQ(0,
                  symlink(std::to_string(link - 1).c_str(), (dir / std::to_string(link)).c_str()));

    EXPECT_EQ("0", nameAt(dir / "40", LastLink::Follow));
    EXPECT_EQ("error " + std::to_string(ELOOP), nameAt(dir / "41", LastLink::Follow));
    EXPECT_EQ(0, access((dir / "40").c_str(), F_OK));
    EXPECT_NE(0, access((dir / "41").c_str(), F_OK));
}

TEST_F(SafePathTest, BehindALinkAMissingDirectoryIsNoPlace)
{
    makeDirectories(dir / "real");
    ASSERT_EQ(0, symlink("real", (dir / "link").c_str()));

    EXPECT_EQ("error " + std::to_string(ENOENT), nameAt(dir / "link/missing/x", LastLink::Follow));
    EXPECT_EQ("x", nameAt(dir / "link/x", LastLink::Follow));
}

TEST_F(SafePathTest, ASystemWithoutTheFastCallWalks)
{
    makeDirectories(dir / "real");
    writeFile(dir / "real/file", "");

    for (const int error : {ENOSYS, EPERM}) {
        EXPECT_TRUE(passesInChild([&] {
            failSystemCall(SYS_openat2, error);
            EXPECT_EQ("file", nameAt(dir / "real/file", LastLink::Follow));
            EXPECT_EQ("error " + std::to_string(ENOENT),
                      nameAt(dir / "missing/file", LastLink::Follow));
        }));
    }
}

TEST_F(SafePathTest, ALinkThatCannotBeReadEndsTheWalk)
{
    writeFile(dir / "file", "");
    ASSERT_EQ(0, symlink("file", (dir / "link").c_str()));

    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(SYS_readlinkat, EIO);
        EXPECT_EQ("error " + std::to_string(EIO), nameAt(dir / "link", LastLink::Follow));
    }));
}

TEST_F(SafePathTest, AComponentThatCannotBeExaminedEndsTheWalk)
{
    makeDirectories(dir / "real");
    ASSERT_EQ(0, symlink("real", (dir / "link").c_str()));

    EXPECT_TRUE(passesInChild([&] {
        beforeSystemCall(statusCalls(), 1, [] { return EIO; });
        EXPECT_EQ("error " + std::to_string(EIO), nameAt(dir / "link/file", LastLink::Follow));
    }));
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

    const ScopedFd again = openPath(path, O_RDONLY);

    EXPECT_TRUE(again.isOpen()) << "its text names a file that is gone";
    EXPECT_EQ(O_RDONLY, fcntl(again.get(), F_GETFL) & O_ACCMODE);
}

TEST_F(SafePathTest, OnlyALastLinkOfTheKernelIsLeftToTheSystem)
{
    writeFile(dir / "file", "");
    ASSERT_EQ(0, symlink("file", (dir / "link").c_str()));
    const ScopedFd open(::open(dir.path().c_str(), O_PATH | O_DIRECTORY));
    const std::string path = "/proc/self/fd/" + std::to_string(open.get());
    struct stat status = {};

    Place last;
    EXPECT_EQ(0, findPlace(path, LastLink::Follow, last));
    EXPECT_TRUE(last.isMagic);
    EXPECT_EQ(0, statPath(path, status));
    EXPECT_TRUE(S_ISDIR(status.st_mode));

    Place below;
    EXPECT_EQ(0, findPlace(path + "/link", LastLink::Follow, below));
    EXPECT_FALSE(below.isMagic);
    EXPECT_EQ("file", below.name);
    EXPECT_EQ(0, statPath(path + "/link", status));
    EXPECT_TRUE(S_ISREG(status.st_mode));
}

TEST_F(SafePathTest, ALinkOfTheKernelThatLeadsNowhereEndsTheWalk)
{
    const pid_t child = fork();
    if (child == 0)
        _exit(0);
    siginfo_t ended = {};
    ASSERT_EQ(0, waitid(P_PID, static_cast<id_t>(child), &ended, WEXITED | WNOWAIT));

    EXPECT_EQ("error " + std::to_string(ENOENT),
              nameAt("/proc/" + std::to_string(child) + "/cwd/file", LastLink::Follow));

    EXPECT_EQ(child, waitpid(child, nullptr, 0));
}

TEST_F(SafePathTest, AFailureIsMinus1WithItsReason)
{
    struct stat status = {};

    EXPECT_EQ(-1, statPath(dir / "missing", status));
    EXPECT_EQ(ENOENT, errno);
    EXPECT_FALSE(openForReading(dir / "missing"));
    EXPECT_EQ(ENOENT, errno);
    EXPECT_FALSE(openStream(dir / "missing/file", Existing::Truncate, 0600));
    EXPECT_EQ(ENOENT, errno);
}

TEST_F(SafePathTest, APathBelowAFileCannotBeOpened)
{
    writeFile(dir / "file", "");
    WritableFile file;

    EXPECT_FALSE(openPath(dir / "file/x", O_RDONLY).isOpen());
    EXPECT_EQ(ENOTDIR, errno);
    EXPECT_EQ(ENOTDIR, openForWriting(dir / "file/x", Existing::Truncate, 0600, file));
    EXPECT_EQ(ModeChange::NothingThere, changeMode(dir / "file/x", 0600));
}

TEST_F(SafePathTest, WhatMayNotBeOpenedGivesTheReasonOfTheSystem)
{
    writeFile(dir / "file", "");
    ASSERT_EQ(0, chmod((dir / "file").c_str(), 0));
    ASSERT_EQ(0, chmod(dir.path().c_str(), 0777));
    makeDirectories(dir / "closed");
    ASSERT_EQ(0, chmod((dir / "closed").c_str(), 0555));
    const OrdinaryRights ordinary;
    WritableFile file;

    EXPECT_FALSE(openPath(dir / "file", O_RDONLY).isOpen());
    EXPECT_EQ(EACCES, errno);
    EXPECT_EQ(EACCES, openForWriting(dir / "closed/file", Existing::Truncate, 0600, file));
}

TEST_F(SafePathTest, ALinkThatIsPlantedMeanwhileCountsAsMissing)
{
    writeFile(dir / "file", "");
    writeFile(dir / "other", "");
    Place place;
    ASSERT_EQ(0, findPlace(dir / "file", LastLink::Follow, place));
    ASSERT_EQ(0, unlink((dir / "file").c_str()));
    ASSERT_EQ(0, symlink("other", (dir / "file").c_str()));

    EXPECT_FALSE(openPlace(place, O_RDONLY).isOpen());
    EXPECT_EQ(ENOENT, errno);
}

TEST_F(SafePathTest, RootAndTheRunningUserAreTrusted)
{
    EXPECT_TRUE(isTrustedOwner(0));
    EXPECT_TRUE(isTrustedOwner(getuid()));
    EXPECT_FALSE(isTrustedOwner(getuid() + 1));
}

TEST_F(SafePathTest, AUserTrustsRoot)
{
    EXPECT_TRUE(passesInChild([] {
        becomeUser(1000);
        EXPECT_TRUE(isTrustedOwner(0));
        EXPECT_TRUE(isTrustedOwner(1000));
        EXPECT_FALSE(isTrustedOwner(1001));
    }));
}

/// Whether the user 65534 trusts files of 65534, where the map of the user namespace is `map`.
bool overflowUserIsTrusted(const TempDir& dir, const std::string& map)
{
    writeFile(dir / "map", map);
    writeFile(dir / "answer", "");
    EXPECT_TRUE(passesInChild([&] {
        becomeUser(65534);
        ASSERT_EQ(0, unshare(CLONE_NEWNS));
        const FileInPlace shown(dir / "map", "/proc/self/uid_map");
        writeFile(dir / "answer", isTrustedOwner(65534) ? "yes" : "no");
    }));
    return readFile(dir / "answer") == "yes";
}

TEST_F(SafePathTest, TheNumberOfUnmappedOwnersIsTrustedOnlyWhereEverybodyIsMapped)
{
    EXPECT_TRUE(overflowUserIsTrusted(dir, "         0          0 4294967295\n"));

    EXPECT_FALSE(overflowUserIsTrusted(dir, "         0          0 4294967294\n"));
    EXPECT_FALSE(overflowUserIsTrusted(dir, "         1          0 4294967295\n"));
    EXPECT_FALSE(overflowUserIsTrusted(dir, "         0          1 4294967295\n"));
    EXPECT_FALSE(overflowUserIsTrusted(dir, "         0          0          1\n"));
    EXPECT_FALSE(overflowUserIsTrusted(dir, ""));
}

TEST_F(SafePathTest, WithoutProcTheNumberOfUnmappedOwnersIsNotTrusted)
{
    EXPECT_TRUE(passesInChild([&] {
        becomeUser(65534);
        ASSERT_EQ(0, unshare(CLONE_NEWNS));
        const SmallDisk noProc("/proc", 16);
        EXPECT_FALSE(isTrustedOwner(65534));
    }));
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

TEST_F(SafePathTest, OurOwnFifoIsOpenedForWritingOnceItHasAReader)
{
    ASSERT_EQ(0, chmod(dir.path().c_str(), 0755));
    ASSERT_EQ(0, mkfifo((dir / "fifo").c_str(), 0600));

    EXPECT_TRUE(passesInChild([&] {
        // Two attempts to create it, one to open it without waiting, one that waits.
        beforeSystemCall({SYS_openat}, 4, [&] {
            std::thread([&] { EXPECT_LE(0, open((dir / "fifo").c_str(), O_RDONLY)); }).detach();
            return 0;
        });
        WritableFile file;
        EXPECT_EQ(0, openForWriting(dir / "fifo", Existing::Truncate, 0600, file));
    }));
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
    EXPECT_FALSE(openStream(dir / "open/planted", Existing::Truncate, 0600));
    EXPECT_EQ(EPERM, errno);

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

TEST_F(SafePathTest, AFileWithOneNameMayBeWhereOthersCanPlant)
{
    writeFile(dir / "file", "x");
    ASSERT_EQ(0, chmod(dir.path().c_str(), 0777));
    WritableFile file;

    EXPECT_EQ(0, openForWriting(dir / "file", Existing::Truncate, 0600, file));
    EXPECT_EQ(ModeChange::Changed, changeMode(dir / "file", 0640));

    EXPECT_EQ("", readFile(dir / "file"));
    EXPECT_EQ(0640U, modeOf(dir / "file"));
}

TEST_F(SafePathTest, AnExistingFileIsOpenedAsTheCallerAsks)
{
    writeFile(dir / "file", "old");
    WritableFile file;

    EXPECT_EQ(0, openForWriting(dir / "file", Existing::Append, 0600, file));
    EXPECT_EQ(O_WRONLY | O_APPEND, fcntl(file.fd.get(), F_GETFL) & (O_ACCMODE | O_APPEND));
    EXPECT_EQ("old", readFile(dir / "file"));

    EXPECT_EQ(0, openForWriting(dir / "file", Existing::Truncate, 0600, file, O_RDWR));
    EXPECT_EQ(O_RDWR, fcntl(file.fd.get(), F_GETFL) & (O_ACCMODE | O_APPEND));
    EXPECT_EQ("", readFile(dir / "file"));
}

TEST_F(SafePathTest, ANewFileIsOpenedAsTheCallerAsks)
{
    WritableFile file;

    EXPECT_EQ(0, openForWriting(dir / "a", Existing::Append, 0600, file));
    EXPECT_EQ(O_WRONLY | O_APPEND, fcntl(file.fd.get(), F_GETFL) & (O_ACCMODE | O_APPEND));

    EXPECT_EQ(0, openForWriting(dir / "b", Existing::Truncate, 0600, file, O_RDWR));
    EXPECT_EQ(O_RDWR, fcntl(file.fd.get(), F_GETFL) & (O_ACCMODE | O_APPEND));
}

TEST_F(SafePathTest, OnlyAStreamThatAppendsAlwaysWritesAtTheEnd)
{
    const ScopedFile appends = openStream(dir / "a", Existing::Append, 0600);
    const ScopedFile replaces = openStream(dir / "b", Existing::Truncate, 0600);
    ASSERT_TRUE(appends && replaces);

    EXPECT_EQ(O_APPEND, fcntl(fileno(appends.get()), F_GETFL) & O_APPEND);
    EXPECT_EQ(0, fcntl(fileno(replaces.get()), F_GETFL) & O_APPEND);
}

TEST_F(SafePathTest, AModeUnderTheUmaskLeavesTheUmask)
{
    EXPECT_EQ(0644U, underUmask(0666));
    EXPECT_EQ(022U, umask(022));
}

TEST_F(SafePathTest, AFileThatCannotBeTruncatedIsNotOpened)
{
    writeFile(dir / "file", "old");

    EXPECT_TRUE(passesInChild([&] {
        WritableFile file;
        failSystemCall(TruncateCall, EIO);
        EXPECT_EQ(EIO, openForWriting(dir / "file", Existing::Truncate, 0600, file));
    }));
}

TEST_F(SafePathTest, AFileThatCannotBeExaminedIsNotOpened)
{
    writeFile(dir / "file", "old");

    for (const int nth : {1, 2}) {
        EXPECT_TRUE(passesInChild([&] {
            WritableFile file;
            beforeSystemCall(statusCalls(), nth + 1,
                             [] { return EIO; }); // the first is findPlace()
            EXPECT_EQ(EIO, openForWriting(dir / "file", Existing::Truncate, 0600, file)) << nth;
        }));
    }
    EXPECT_EQ("old", readFile(dir / "file"));
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

TEST_F(SafePathTest, AModeThatTheSystemRefusesToSetIsAFailure)
{
    writeFile(dir / "file", "");

    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(SYS_chmod, EIO);
        EXPECT_EQ(ModeChange::Failed, changeMode(dir / "file", 0640));
    }));
}

TEST_F(SafePathTest, ModesAreSetWithoutProc)
{
    writeFile(dir / "file", "");
    makeDirectories(dir / "directory");
    {
        const SmallDisk noProc("/proc", 16);
        EXPECT_EQ(ModeChange::Changed, changeMode(dir / "file", 0640));
        EXPECT_EQ(ModeChange::Changed, changeMode(dir / "directory", 0750));
    }

    EXPECT_EQ(0640U, modeOf(dir / "file"));
    EXPECT_EQ(0750U, modeOf(dir / "directory"));
}

TEST_F(SafePathTest, WithoutProcAFileThatCannotBeOpenedKeepsItsMode)
{
    writeFile(dir / "file", "");
    ASSERT_EQ(0, chmod((dir / "file").c_str(), 0));
    {
        const SmallDisk noProc("/proc", 16);
        const OrdinaryRights ordinary;
        EXPECT_EQ(ModeChange::Failed, changeMode(dir / "file", 0640));
    }

    EXPECT_EQ(0U, modeOf(dir / "file"));
}

TEST_F(SafePathTest, WithoutProcAFileThatIsSwappedMeanwhileKeepsItsMode)
{
    writeFile(dir / "file", "");
    writeFile(dir / "other", "");
    const SmallDisk noProc("/proc", 16);

    EXPECT_TRUE(passesInChild([&] {
        beforeSystemCall({SYS_openat}, 2, [&] { // the first opens the file to examine it
            return rename((dir / "other").c_str(), (dir / "file").c_str());
        });
        EXPECT_EQ(ModeChange::Failed, changeMode(dir / "file", 0640));
    }));

    EXPECT_EQ(0644U, modeOf(dir / "file"));
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

TEST_F(SafePathTest, DirectoriesAreReusedUntilTheLastGuardEnds)
{
    makeDirectories(dir / "a");
    const ScopedDirectoryReuse reuse;
    {
        const ScopedDirectoryReuse inner;
        writeFile(dir / "a/file", "");
        ASSERT_TRUE(pathExists(dir / "a/file"));
    }
    ASSERT_EQ(0, rename((dir / "a").c_str(), (dir / "b").c_str()));

    EXPECT_TRUE(pathExists(dir / "a/file"));
}

} // namespace
