#include "file_replacement.h"
#include "installer_fixtures.h"
#include "process_limits.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/xattr.h>
#include <unistd.h>

namespace {

#ifdef SYS_fcntl64
constexpr long FcntlCall = SYS_fcntl64;
constexpr long TruncateCall = SYS_ftruncate64;
constexpr long OwnerCall = SYS_fchown32;
#else
constexpr long FcntlCall = SYS_fcntl;
constexpr long TruncateCall = SYS_ftruncate;
constexpr long OwnerCall = SYS_fchown;
#endif

/// The system calls of a pause.
const std::vector<long> PauseCalls = {
    SYS_nanosleep,
    SYS_clock_nanosleep,
#ifdef SYS_clock_nanosleep_time64
    SYS_clock_nanosleep_time64,
#endif
};

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
    writeFile(dir / "file", "");
    EXPECT_EQ(2, replace(dir / "file/x", "new"));
    EXPECT_EQ(ENOTDIR, errno);
    errno = 0;
    EXPECT_EQ(2, replace("/" + std::string(5000, 'x'), "new"));
    EXPECT_EQ(ENAMETOOLONG, errno);
}

TEST_F(FileReplacementTest, OnlyWhereNoTemporaryFileCanBeMadeIsAFileWrittenInPlace)
{
    for (const auto& [error, code, isInPlace] : {std::tuple{EACCES, 0, true},
                                                 {EPERM, 0, true},
                                                 {EROFS, 0, true},
                                                 {ENAMETOOLONG, 0, true},
                                                 {EIO, 5, false},
                                                 {ENOSPC, 6, false},
                                                 {EMFILE, 5, false}}) {
        writeFile(dir / "file", "old");
        const ino_t old = inodeOf(dir / "file");

        EXPECT_TRUE(passesInChild([&, failure = error, expected = code] {
            beforeSystemCall({SYS_openat}, 2, [&] { return failure; }); // the first opens the file
            EXPECT_EQ(expected, replace(dir / "file", "new")) << failure;
        }));

        EXPECT_EQ(isInPlace ? "new" : "old", readFile(dir / "file")) << error;
        EXPECT_EQ(old, inodeOf(dir / "file")) << error;
    }
}

TEST_F(FileReplacementTest, WithoutADescriptorNothingIsReplaced)
{
    writeFile(dir / "file", "old");

    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(FcntlCall, EMFILE);
        EXPECT_EQ(5, replace(dir / "file", "new"));
    }));

    EXPECT_EQ("old", readFile(dir / "file"));
}

TEST_F(FileReplacementTest, AFailedCloseOfTheNewContentKeepsTheOldOne)
{
    std::string codes;
    for (int nth = 1; nth <= 10; ++nth) {
        writeFile(dir / "file", "old");
        const ScopedFd result(open((dir / "code").c_str(), O_RDWR | O_CREAT | O_TRUNC, 0600));
        EXPECT_TRUE(passesInChild([&] {
            beforeSystemCall({SYS_close}, nth, [] { return EIO; });
            errno = ENOSPC; // of an earlier call
            (void)dprintf(result.get(), "%d", replace(dir / "file", "new"));
            _exit(0);
        }));
        const std::string code = readFile(dir / "code");
        EXPECT_EQ(code == "0" ? "new" : "old", readFile(dir / "file")) << nth;
        codes += code;
    }

    EXPECT_EQ(2, std::count(codes.begin(), codes.end(), '5')) << "as a stream, as a descriptor";
    EXPECT_EQ(8, std::count(codes.begin(), codes.end(), '0'));
}

TEST_F(FileReplacementTest, AFileInPlaceThatCannotBeTruncatedOrExaminedIsNotWritten)
{
    writeFile(dir / "source", "old");
    writeFile(dir / "mounted", "");
    const FileInPlace mounted(dir / "source", dir / "mounted");

    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(TruncateCall, EIO);
        EXPECT_EQ(5, replace(dir / "mounted", "new"));
    }));
    // Calls 1 to 3 find and open the file. If the third fails, it is written in place at once.
    EXPECT_TRUE(passesInChild([&] {
        int calls = 0;
        watchSystemCalls(statusCalls(), [&](long) { return ++calls < 3 || calls > 4 ? 0 : EIO; });
        EXPECT_EQ(5, replace(dir / "mounted", "new"));
        EXPECT_EQ("old", readFile(dir / "mounted"));
    }));
}

TEST_F(FileReplacementTest, TheIdentityIsThatOfTheFileWithTheNewContent)
{
    writeFile(dir / "source", "old");
    writeFile(dir / "mounted", "");
    const FileInPlace mounted(dir / "source", dir / "mounted");

    for (const char* const name : {"new", "mounted"}) {
        FileIdentity written;
        EXPECT_EQ(0, replaceFile(
                         dir / name, 0666, [](std::FILE*) {}, &written));

        struct stat status = {};
        ASSERT_EQ(0, stat((dir / name).c_str(), &status));
        EXPECT_EQ(status.st_ino, written.inode) << name;
        EXPECT_EQ(status.st_dev, written.device) << name;
    }
}

TEST_F(FileReplacementTest, WhatIsNoRegularFileIsWrittenTo)
{
    ASSERT_EQ(0, chmod(dir.path().c_str(), 0755));
    ASSERT_EQ(0, mkfifo((dir / "fifo").c_str(), 0600));
    const ScopedFd reader(open((dir / "fifo").c_str(), O_RDONLY | O_NONBLOCK));

    EXPECT_EQ(0, replace(dir / "fifo", "new"));

    char content[4] = {};
    EXPECT_EQ(3, read(reader.get(), content, sizeof content));
    EXPECT_STREQ("new", content);
    struct stat status = {};
    EXPECT_EQ(0, lstat((dir / "fifo").c_str(), &status));
    EXPECT_TRUE(S_ISFIFO(status.st_mode));
}

TEST_F(FileReplacementTest, AFileIsWrittenThroughItsDescriptor)
{
    writeFile(dir / "file", "old and longer");
    const ScopedFd file(open((dir / "file").c_str(), O_RDONLY));

    EXPECT_EQ(0, replace("/proc/self/fd/" + std::to_string(file.get()), "new"));

    EXPECT_EQ("new", readFile(dir / "file"));
}

TEST_F(FileReplacementTest, TheTemporaryFileIsLockedWhileItIsWritten)
{
    EXPECT_EQ(0, replaceFile(dir / "file", 0666, [&](std::FILE*) {
                  const ScopedFd other(open((dir / "file.wzorinst-new").c_str(), O_RDONLY));
                  EXPECT_EQ(-1, flock(other.get(), LOCK_EX | LOCK_NB));
                  EXPECT_EQ(EWOULDBLOCK, errno);
              }));
}

TEST_F(FileReplacementTest, APlantedLinkIsDeletedAndNotFollowed)
{
    writeFile(dir / "file", "old");
    writeFile(dir / "victim", "kept");
    ASSERT_EQ(0, symlink("victim", (dir / "file.wzorinst-new").c_str()));
    const ino_t old = inodeOf(dir / "file");

    EXPECT_EQ(0, replace(dir / "file", "new"));

    EXPECT_EQ("new", readFile(dir / "file"));
    EXPECT_NE(old, inodeOf(dir / "file"));
    EXPECT_EQ((std::vector<std::string>{"f 0644 file", "f 0644 victim"}), treeOf(dir.path()));
    EXPECT_EQ("kept", readFile(dir / "victim"));
}

// Other runs that replace the same file at the same time.

TEST_F(FileReplacementTest, ARunWaitsForAnotherOneAndLeavesItsTemporaryFile)
{
    const std::string temporary = dir / "file.wzorinst-new";
    writeFile(dir / "file", "old");
    writeFile(temporary, "of a killed run");

    EXPECT_TRUE(passesInChild([&] {
        int locks = 0;
        int other = -1;
        bool hasFinished = false;
        std::vector<long> calls = PauseCalls;
        calls.push_back(SYS_flock);
        watchSystemCalls(calls, [&](long number) {
            if (number == SYS_flock && ++locks == 1) {
                // Another run has deleted that file already, and writes its own.
                EXPECT_EQ(0, unlink(temporary.c_str()));
                writeFile(temporary, "theirs");
                other = open(temporary.c_str(), O_RDONLY);
                EXPECT_EQ(0, flock(other, LOCK_EX | LOCK_NB));
            } else if (number != SYS_flock && !hasFinished) {
                hasFinished = rename(temporary.c_str(), (dir / "file").c_str()) == 0;
                EXPECT_EQ("theirs", readFile(dir / "file"));
                EXPECT_EQ(0, close(other));
            }
            return number == SYS_flock ? 0 : EINTR; // without the pause
        });

        EXPECT_EQ(0, replace(dir / "file", "new"));
        EXPECT_TRUE(hasFinished);
    }));

    EXPECT_EQ("new", readFile(dir / "file"));
    EXPECT_EQ((std::vector<std::string>{"f 0644 file"}), treeOf(dir.path()));
}

TEST_F(FileReplacementTest, ATemporaryFileThatAnotherRunDeletesIsMadeAgain)
{
    writeFile(dir / "file", "old");
    const ino_t old = inodeOf(dir / "file");

    EXPECT_TRUE(passesInChild([&] {
        beforeSystemCall({SYS_flock}, 1,
                         [&] { return unlink((dir / "file.wzorinst-new").c_str()); });
        EXPECT_EQ(0, replace(dir / "file", "new"));
    }));

    EXPECT_EQ("new", readFile(dir / "file"));
    EXPECT_NE(old, inodeOf(dir / "file"));
    EXPECT_EQ((std::vector<std::string>{"f 0644 file"}), treeOf(dir.path()));
}

TEST_F(FileReplacementTest, ARunThatNeverFinishesIsCode5AndKeepsTheOldContent)
{
    writeFile(dir / "file", "old");
    writeFile(dir / "file.wzorinst-new", "theirs");
    const ScopedFd other(open((dir / "file.wzorinst-new").c_str(), O_RDONLY));
    ASSERT_EQ(0, flock(other.get(), LOCK_EX | LOCK_NB));

    EXPECT_TRUE(passesInChild([&] {
        watchSystemCalls(PauseCalls, [](long) { return EINTR; }); // without the pauses
        EXPECT_EQ(5, replace(dir / "file", "new"));
    }));

    EXPECT_EQ("old", readFile(dir / "file"));
    EXPECT_EQ("theirs", readFile(dir / "file.wzorinst-new"));
}

TEST_F(FileReplacementTest, WhatNoRunCanHaveLeftIsDeletedWithoutWaiting)
{
    writeFile(dir / "file", "old");
    ASSERT_EQ(0, mkfifo((dir / "file.wzorinst-new").c_str(), 0600));
    const ScopedFd planted(open((dir / "file.wzorinst-new").c_str(), O_RDONLY | O_NONBLOCK));
    ASSERT_EQ(0, flock(planted.get(), LOCK_EX | LOCK_NB));

    EXPECT_TRUE(passesInChild([&] {
        watchSystemCalls(PauseCalls, [](long) { return EINTR; }); // without the pauses
        EXPECT_EQ(0, replace(dir / "file", "new"));
    }));

    EXPECT_EQ("new", readFile(dir / "file"));
    EXPECT_EQ((std::vector<std::string>{"f 0644 file"}), treeOf(dir.path()));
}

// Attributes.

/// Two open files, and their extended attributes.
class AttributesTest : public InstallerTest {
protected:
    void SetUp() override
    {
        set(from, "user.note", "x");
        if (get(from, "user.note") != "x")
            GTEST_SKIP() << "this file system has no extended attributes";
    }

    /// A file system may refuse it.
    static void set(const ScopedFd& file, const char* name, const std::string& value)
    {
        (void)fsetxattr(file.get(), name, value.data(), value.size(), 0);
    }

    static std::string get(const ScopedFd& file, const char* name)
    {
        char value[100];
        const ssize_t size = fgetxattr(file.get(), name, value, sizeof value);
        return size < 0 ? "none" : std::string(value, static_cast<std::size_t>(size));
    }

    [[nodiscard]] bool copied() const { return copyAttributes(from.get(), to.get()); }

    const ScopedFd from{open((dir / "from").c_str(), O_RDWR | O_CREAT, 0644)};
    const ScopedFd to{open((dir / "to").c_str(), O_RDWR | O_CREAT, 0644)};
};

TEST_F(AttributesTest, AreAllCopied)
{
    set(from, "user.b", "");
    set(from, "user.c", "value");
    set(to, "user.c", "another value");

    EXPECT_TRUE(copied());

    EXPECT_EQ("x", get(to, "user.note"));
    EXPECT_EQ("", get(to, "user.b"));
    EXPECT_EQ("value", get(to, "user.c"));
}

TEST_F(AttributesTest, ThatAreThereNeedNotBeSet)
{
    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(SYS_fsetxattr, EPERM);
        EXPECT_FALSE(copied());
    }));
    set(to, "user.note", "x");

    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(SYS_fsetxattr, EPERM);
        EXPECT_TRUE(copied());
    }));
}

TEST_F(AttributesTest, ThatCannotBeReadCannotBeCopied)
{
    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(SYS_fgetxattr, EIO);
        EXPECT_FALSE(copied());
    }));
    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(SYS_flistxattr, EIO);
        EXPECT_FALSE(copied());
    }));
}

TEST_F(AttributesTest, OfAFileThatCannotBeExaminedCannotBeCopied)
{
    for (const int nth : {1, 2}) {
        EXPECT_TRUE(passesInChild([&] {
            beforeSystemCall(statusCalls(), nth, [] { return EIO; });
            EXPECT_FALSE(copied()) << nth;
        }));
    }
}

TEST_F(AttributesTest, TheOwnerIsSetOnlyIfItIsAnother)
{
    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(OwnerCall, EPERM);
        EXPECT_TRUE(copied());
    }));
}

TEST_F(AttributesTest, AreNoneOnAFileSystemWithoutThem)
{
    for (const int error : {ENOTSUP, ENOSYS}) {
        EXPECT_TRUE(passesInChild([&] {
            failSystemCall(SYS_flistxattr, error);
            EXPECT_TRUE(copied()) << error;
        }));
    }
}

/// An access list: its owner, root, its group and others may read; the owner may write.
const std::string AccessList("\2\0\0\0"
                             "\1\0\6\0\377\377\377\377"
                             "\2\0\4\0\0\0\0\0"
                             "\4\0\4\0\377\377\377\377"
                             "\20\0\4\0\377\377\377\377"
                             "\40\0\4\0\377\377\377\377",
                             44);

TEST_F(AttributesTest, AnAccessListIsCopied)
{
    set(from, "system.posix_acl_access", AccessList);
    if (get(from, "system.posix_acl_access") != AccessList)
        GTEST_SKIP() << "this file system has no access lists";

    EXPECT_TRUE(copied());

    EXPECT_EQ(AccessList, get(to, "system.posix_acl_access"));
}

TEST_F(AttributesTest, AnInheritedAccessListIsRemoved)
{
    set(to, "system.posix_acl_access", AccessList);

    EXPECT_TRUE(copied());

    EXPECT_EQ("none", get(to, "system.posix_acl_access"));
}

} // namespace
