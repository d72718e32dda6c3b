#include "durability.h"
#include "installer_fixtures.h"
#include "process_limits.h"
#include "transaction.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>
#include <iterator>

#include <sys/syscall.h>

namespace {

using DurabilityTest = InstallerTest;

/// The number of open descriptors, and of the one that counts them.
std::ptrdiff_t openDescriptors()
{
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
}

TEST_F(DurabilityTest, FileSystemsOfMissingDirectoriesAreThoseOfTheirParents)
{
    const FileSystemSync fileSystems({dir / "not/yet/there", dir.path(), "/"});

    EXPECT_EQ(0, fileSystems.sync());
}

TEST_F(DurabilityTest, EachFileSystemIsHeldByOneDescriptor)
{
    makeDirectories(dir / "a");
    const std::ptrdiff_t before = openDescriptors();
    const FileSystemSync fileSystems({dir.path(), dir / "a", dir / "missing"});

    EXPECT_EQ(before + 1, openDescriptors());
}

TEST_F(DurabilityTest, EveryFileSystemIsHeld)
{
    makeDirectories(dir / "disk");
    const SmallDisk disk(dir / "disk", 16);
    const std::ptrdiff_t before = openDescriptors();
    const FileSystemSync fileSystems({dir.path(), dir / "disk/a", dir / "disk"});

    EXPECT_EQ(before + 2, openDescriptors());
}

TEST_F(DurabilityTest, AnErrorOfAnEarlierCallIsNotAFailure)
{
    const FileSystemSync fileSystems({dir.path()});
    errno = EIO;

    EXPECT_EQ(0, fileSystems.sync());
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

TEST_F(DurabilityTest, TheFileSystemOfAMissingDirectoryIsSynced)
{
    EXPECT_TRUE(passesInChild([&] {
        failSystemCall(SYS_syncfs, EIO);
        ASSERT_EQ(5, FileSystemSync({dir / "not/yet/there"}).sync());
    }));
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

TEST_F(DurabilityTest, AFailureIsNotForgottenAtTheNextDirectory)
{
    makeDirectories(dir / "a");
    makeDirectories(dir / "b");

    EXPECT_TRUE(passesInChild([&] {
        beforeSystemCall({SYS_fsync}, 1, [] { return EIO; });
        EXPECT_EQ(5, syncDirectories({dir / "a", dir / "b", dir / "missing"}));
    }));
}

} // namespace
