#include "scoped.h"
#include "test_files.h"

#include <gtest/gtest.h>

#include <cerrno>

#include <fcntl.h>
#include <sys/stat.h>

namespace {

bool isOpen(int fd)
{
    return fcntl(fd, F_GETFD) != -1 || errno != EBADF;
}

/// The umask, which can only be read by setting it.
mode_t currentUmask()
{
    const mode_t mask = umask(0);
    (void)umask(mask);
    return mask;
}

int openDescriptor()
{
    return open("/dev/null", O_RDONLY | O_CLOEXEC);
}

TEST(ScopedFileTest, ClosesItsStream)
{
    int fd = -1;
    {
        const ScopedFile file(std::fopen("/dev/null", "r"));
        fd = fileno(file.get());
        EXPECT_TRUE(isOpen(fd));
    }

    EXPECT_FALSE(isOpen(fd));
}

TEST(ScopedFileTest, IsNullForAStreamThatDoesNotOpen)
{
    const ScopedFile file(std::fopen("/nonexistent/file", "r"));

    EXPECT_FALSE(file);
}

TEST(ScopedDirTest, ClosesItsDirectory)
{
    int fd = -1;
    {
        const ScopedDir dir(opendir("/"));
        fd = dirfd(dir.get());
        EXPECT_TRUE(isOpen(fd));
    }

    EXPECT_FALSE(isOpen(fd));
}

TEST(ScopedFdTest, ClosesItsDescriptor)
{
    const int fd = openDescriptor();
    {
        const ScopedFd scoped(fd);
        EXPECT_TRUE(scoped.isOpen());
        EXPECT_EQ(fd, scoped.get());
    }

    EXPECT_FALSE(isOpen(fd));
}

TEST(ScopedFdTest, IsNotOpenForAFailedOpen)
{
    const ScopedFd scoped(-1);

    EXPECT_FALSE(scoped.isOpen());
}

TEST(ScopedFdTest, GivesItsDescriptorUpOnRelease)
{
    int fd = -1;
    {
        ScopedFd scoped(openDescriptor());
        fd = scoped.release();
        EXPECT_FALSE(scoped.isOpen());
    }

    EXPECT_TRUE(isOpen(fd));
    EXPECT_EQ(0, close(fd));
}

TEST(ScopedFdTest, HandsItsDescriptorOverWhenItIsMoved)
{
    ScopedFd first(openDescriptor());
    const int fd = first.get();
    {
        const ScopedFd second(std::move(first));
        EXPECT_EQ(fd, second.get());
        EXPECT_FALSE(
            first.isOpen()); // NOLINT(bugprone-use-after-move, clang-analyzer-cplusplus.Move)
    }

    EXPECT_FALSE(isOpen(fd));
}

TEST(ScopedFdTest, ClosesItsDescriptorWhenItIsGivenAnother)
{
    ScopedFd scoped(openDescriptor());
    const int first = scoped.get();
    const int second = openDescriptor();

    scoped = ScopedFd(second);

    EXPECT_EQ(second, scoped.get());
    EXPECT_FALSE(isOpen(first));
    EXPECT_TRUE(isOpen(second));
}

TEST(ScopedUmaskTest, RestoresThePreviousUmask)
{
    const ScopedUmask outer(027);
    {
        const ScopedUmask inner(0);
        EXPECT_EQ(0U, currentUmask());
    }

    EXPECT_EQ(027U, currentUmask());
}

} // namespace
