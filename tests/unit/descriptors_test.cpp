#include "descriptors.h"
#include "process_limits.h"
#include "scoped.h"

#include <gtest/gtest.h>

#include <cerrno>

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace {

bool isNull(int fd)
{
    struct stat status = {};
    struct stat null = {};
    return fstat(fd, &status) == 0 && stat("/dev/null", &null) == 0 &&
           status.st_rdev == null.st_rdev;
}

TEST(DescriptorsTest, ClosedStandardDescriptorsAreOpenedOnDevNull)
{
    EXPECT_TRUE(passesInChild([] {
        (void)close(0);
        (void)close(1);
        secureDescriptors();
        ASSERT_TRUE(isNull(0));
        ASSERT_TRUE(isNull(1));
    }));
}

TEST(DescriptorsTest, NothingElseIsOpened)
{
    EXPECT_TRUE(passesInChild([] {
        const int free = dup(2);
        (void)close(free);
        (void)close(3);
        openStandardDescriptors();
        ASSERT_EQ(-1, fcntl(3, F_GETFD));
        ASSERT_EQ(-1, fcntl(free, F_GETFD));
    }));
}

TEST(DescriptorsTest, OthersAreNotPassedOn)
{
    for (const bool isOld : {false, true}) {
        EXPECT_TRUE(passesInChild([&] {
            const int fd = open("/dev/null", O_RDONLY); // without O_CLOEXEC
            if (isOld)
                failSystemCall(SYS_close_range, ENOSYS);
            secureDescriptors();
            ASSERT_EQ(FD_CLOEXEC, fcntl(fd, F_GETFD)) << isOld;
            ASSERT_EQ(0, fcntl(2, F_GETFD)) << isOld;
        }));
    }
}

TEST(DescriptorsTest, OnAnOldSystemDescriptorsOfAnyNumberAreNotPassedOn)
{
    EXPECT_TRUE(passesInChild([] {
        const int fd = fcntl(2, F_DUPFD, 100);
        failSystemCall(SYS_close_range, ENOSYS);
        secureDescriptors();
        ASSERT_EQ(FD_CLOEXEC, fcntl(fd, F_GETFD));
    }));
}

TEST(DescriptorsTest, AnOldSystemWithoutProcIsNotAFailure)
{
    const SmallDisk noProc("/proc", 16);

    EXPECT_TRUE(passesInChild([] {
        failSystemCall(SYS_close_range, ENOSYS);
        secureDescriptors();
    }));
}

} // namespace
