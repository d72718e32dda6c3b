#include "durability.h"
#include "installer_fixtures.h"
#include "process_limits.h"
#include "scoped.h"
#include "transaction.h"

#include <gtest/gtest.h>

#include <cerrno>

#include <fcntl.h>
#include <sys/syscall.h>

namespace {

using DurabilityTest = InstallerTest;

TEST_F(DurabilityTest, FileSystemsOfMissingDirectoriesAreThoseOfTheirParents)
{
    const FileSystemSync fileSystems({dir / "not/yet/there", dir.path(), "/"});

    EXPECT_EQ(0, fileSystems.sync());
}

TEST_F(DurabilityTest, EachFileSystemIsHeldByOneDescriptor)
{
    makeDirectories(dir / "a");
    const ScopedFd free(open("/dev/null", O_RDONLY));
    const FileSystemSync fileSystems({dir.path(), dir / "a", dir / "missing"});
    const ScopedFd next(open("/dev/null", O_RDONLY));

    EXPECT_EQ(free.get() + 2, next.get());
}

TEST_F(DurabilityTest, AFileSystemThatCannotWriteIsCode5)
{
    for (const int error : {EIO, ENOSPC, EDQUOT}) {
        EXPECT_TRUE(passesInChild([&] {
            failSystemCall(SYS_syncfs, error);
            ASSERT_EQ(5, FileSystemSync({dir.path()}).sync()) << error;
        }));
    }
}

TEST_F(DurabilityTest, AFileSystemWithoutSyncIsNotAFailure)
{
    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(SYS_syncfs, ENOSYS);
        ASSERT_EQ(0, FileSystemSync({dir.path()}).sync());
    }));
}

TEST_F(DurabilityTest, DirectoriesOfTheJournalAreSynced)
{
    record(transaction, Created, dir / "file");
    record(transaction, Created, dir / "gone/file");

    EXPECT_EQ(0, syncDirectories(changedDirectories(transaction)));
    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(SYS_fsync, EIO);
        ASSERT_EQ(5, syncDirectories(changedDirectories(transaction)));
    }));
}

} // namespace
