#include "package_window.h"
#include "process_limits.h"
#include "sample_bytes.h"
#include "scoped.h"
#include "test_files.h"

#include <gtest/gtest.h>

#include <random>
#include <string>

#include <fcntl.h>
#include <unistd.h>

namespace {

constexpr std::size_t FileSize = 3000000;

class PackageWindowTest : public testing::Test {
protected:
    /// The bytes as text; "(none)" for null.
    std::string bytes(std::int64_t at, std::size_t size)
    {
        const unsigned char* const found = window.bytes(at, size);
        return found == nullptr ? "(none)" : std::string(found, found + size);
    }

    std::string expected(std::int64_t at, std::size_t size) const
    {
        return content.substr(static_cast<std::size_t>(at), size);
    }

    /// How many bytes from `at` on the window holds: what it gives when the file has become empty.
    std::size_t heldFrom(std::int64_t at)
    {
        EXPECT_EQ(0, truncate(path.c_str(), 0));
        std::size_t count = 0;
        while (window.bytes(at + static_cast<std::int64_t>(count), 1) != nullptr)
            ++count;
        return count;
    }

    TempDir dir;
    std::string path = dir / "package";
    std::string content = noiseBytes(FileSize, 1);
    PackageWindow window = [this] {
        writeFile(path, content);
        return PackageWindow(ScopedFd(open(path.c_str(), O_RDONLY)));
    }();
};

TEST_F(PackageWindowTest, AnyBytesAreThoseOfTheFile)
{
    std::mt19937 random(1);
    std::int64_t at = 0;
    for (int i = 0; i < 3000; ++i) {
        if (random() % 20 == 0)
            at = static_cast<std::int64_t>(random() % FileSize);
        const std::size_t size = random() % (random() % 10 == 0 ? 600000 : 3000);
        if (at + static_cast<std::int64_t>(size) > static_cast<std::int64_t>(FileSize))
            at = 0;

        ASSERT_TRUE(expected(at, size) == bytes(at, size)) << at << " " << size;

        at += static_cast<std::int64_t>(size + random() % 200);
        at %= FileSize;
    }
}

TEST_F(PackageWindowTest, TheLastBytesAreThereAndNoneAfterThem)
{
    EXPECT_EQ(expected(FileSize - 5, 5), bytes(FileSize - 5, 5));
    EXPECT_EQ("(none)", bytes(FileSize - 5, 6));
    EXPECT_EQ("(none)", bytes(FileSize, 1));
    EXPECT_EQ("(none)", bytes(FileSize + 100000, 1));
    EXPECT_EQ("(none)", bytes(10, FileSize));
    EXPECT_EQ(expected(0, 5), bytes(0, 5));
}

TEST_F(PackageWindowTest, ZeroBytesCanBeReadAnywhere)
{
    EXPECT_EQ("", bytes(0, 0));
    EXPECT_EQ("", bytes(FileSize, 0));
    EXPECT_EQ("", bytes(2 * FileSize, 0));
}

TEST_F(PackageWindowTest, TheFileOffsetStaysAsItIs)
{
    ASSERT_EQ(7, lseek(window.fd(), 7, SEEK_SET));

    EXPECT_EQ(expected(100, 5000), bytes(100, 5000));

    EXPECT_EQ(7, lseek(window.fd(), 0, SEEK_CUR));
}

TEST_F(PackageWindowTest, AFileThatCannotBeReadHasNoBytes)
{
    PackageWindow closed(ScopedFd(-1));

    EXPECT_EQ(nullptr, closed.bytes(0, 1));
}

TEST_F(PackageWindowTest, TheFirstReadIsSmall)
{
    (void)bytes(100, 30);

    EXPECT_EQ(4096U, heldFrom(100));
}

TEST_F(PackageWindowTest, ForwardReadsGrow)
{
    for (std::int64_t at = 0; at < 1000000; at += 1000)
        (void)bytes(at, 900);

    // 4, 8, ... 128 KiB end at 258048 or shortly before, and from there each window has 256 KiB.
    const std::size_t held = heldFrom(999900);
    EXPECT_GT(held, 20000U);
    EXPECT_LE(held, 262144U);
}

TEST_F(PackageWindowTest, AJumpMakesReadsSmallAgain)
{
    for (std::int64_t at = 0; at < 1000000; at += 1000)
        (void)bytes(at, 900);

    (void)bytes(2000000, 30);
    EXPECT_EQ(4096U, heldFrom(2000000));
}

TEST_F(PackageWindowTest, AStepBackIsAJump)
{
    for (std::int64_t at = 500000; at < 1000000; at += 1000)
        (void)bytes(at, 900);

    (void)bytes(499000, 30);
    EXPECT_EQ(4096U, heldFrom(499000));
}

TEST_F(PackageWindowTest, WhatIsForgottenIsReadAgain)
{
    EXPECT_EQ(expected(100, 10), bytes(100, 10));
    writeFile(path, std::string(200, 'x'));

    window.forget();

    EXPECT_EQ("xxxxxxxxxx", bytes(100, 10));
    EXPECT_EQ("(none)", bytes(200, 1));
}

TEST_F(PackageWindowTest, ALargeReadIsOfItsSize)
{
    (void)bytes(100, 1000000);

    EXPECT_EQ(1000000U, heldFrom(100));
}

TEST_F(PackageWindowTest, ALargeReadMayEndWithTheFile)
{
    constexpr std::size_t size = 300000;

    EXPECT_EQ(expected(FileSize - size, size), bytes(FileSize - size, size));
    EXPECT_EQ("(none)", bytes(FileSize - size, size + 1));
}

TEST_F(PackageWindowTest, WithoutMemoryNoMoreIsReadThanFits)
{
    constexpr std::size_t tooLarge = 1000000;

    EXPECT_TRUE(passesInChild([&] {
        EXPECT_EQ(expected(0, 100), bytes(0, 100));
        if (!takeMemory(tooLarge))
            return;
        EXPECT_EQ(nullptr, window.bytes(50, tooLarge));
        EXPECT_EQ(expected(50, 10), bytes(50, 10));
    }));
}

TEST_F(PackageWindowTest, TheLastByteCanBeReadAlone)
{
    EXPECT_EQ(expected(FileSize - 1, 1), bytes(FileSize - 1, 1));
}

TEST_F(PackageWindowTest, AReadMayBeginWithTheLastByteOfTheOneBefore)
{
    EXPECT_EQ(expected(0, 4096), bytes(0, 4096));

    EXPECT_EQ(expected(4095, 10), bytes(4095, 10));
}

} // namespace
