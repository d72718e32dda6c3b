#include "file_codes.h"
#include "file_writing.h"
#include "process_limits.h"
#include "sample_bytes.h"
#include "scoped.h"
#include "test_files.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <string>

#include <fcntl.h>
#include <sys/syscall.h>

namespace {

class FileWritingTest : public testing::Test {
protected:
    TempDir dir;
    std::string path = dir / "file";
};

TEST_F(FileWritingTest, WriteAllWritesEveryByte)
{
    const std::string data(300000, 'x');
    const ScopedFd file(open(path.c_str(), O_WRONLY | O_CREAT, 0600));

    EXPECT_EQ(0, writeAll(file.get(), data.data(), data.size()));

    EXPECT_TRUE(data == readFile(path));
}

TEST_F(FileWritingTest, WriteAllGoesOnAfterAShortWrite)
{
    int ends[2] = {-1, -1};
    ASSERT_EQ(0, pipe2(ends, O_NONBLOCK));
    const ScopedFd reader(ends[0]);
    const ScopedFd writer(ends[1]);
    const std::string data(1000000, 'x'); // more than a pipe takes

    // The first write is short, the next one fails: the pipe is full.
    EXPECT_EQ(5, writeAll(writer.get(), data.data(), data.size()));

    char byte = 0;
    EXPECT_EQ(1, read(reader.get(), &byte, 1));
}

TEST_F(FileWritingTest, WriteAllGoesOnWhereAShortWriteEnded)
{
    int ends[2] = {-1, -1};
    ASSERT_EQ(0, pipe2(ends, O_NONBLOCK));
    const ScopedFd reader(ends[0]);
    const ScopedFd writer(ends[1]);
    const std::string data = noiseBytes(100000, 1); // more than a pipe takes

    EXPECT_TRUE(passesInChild([&] {
        std::string received(data.size(), '\0');
        ssize_t first = 0;
        beforeSystemCall({SYS_write}, 2, [&] {
            first = read(reader.get(), received.data(), received.size());
            return 0;
        });
        EXPECT_EQ(0, writeAll(writer.get(), data.data(), data.size()));
        const ssize_t second = read(reader.get(), received.data() + first, received.size());

        EXPECT_EQ(100000, first + second);
        EXPECT_TRUE(data == received);
    }));
}

TEST_F(FileWritingTest, AWriteOfNothingIsAFailure)
{
    EXPECT_TRUE(passesInChild([&] {
        const ScopedFd file(open(path.c_str(), O_WRONLY | O_CREAT, 0600));
        failSystemCall(SYS_write, 0); // returns 0
        errno = ENOSPC;               // of an earlier call

        EXPECT_EQ(5, writeAll(file.get(), "x", 1));
    }));
}

TEST_F(FileWritingTest, WriteAllOfNothingSucceeds)
{
    EXPECT_EQ(0, writeAll(-1, nullptr, 0));
}

TEST_F(FileWritingTest, WriteAllReportsAFullDisk)
{
    const ScopedFd full(open("/dev/full", O_WRONLY));

    EXPECT_EQ(6, writeAll(full.get(), "x", 1));
}

TEST_F(FileWritingTest, WriteAllReportsAFileThatCannotBeWritten)
{
    writeFile(path, "old");
    const ScopedFd readOnly(open(path.c_str(), O_RDONLY));

    EXPECT_EQ(5, writeAll(readOnly.get(), "x", 1));

    EXPECT_EQ("old", readFile(path));
}

TEST_F(FileWritingTest, AFileThatCannotBeSyncedGivesTheReason)
{
    EXPECT_TRUE(passesInChild([&] {
        const ScopedFd file(open(path.c_str(), O_WRONLY | O_CREAT, 0600));
        failSystemCall(SYS_fsync, EIO);

        EXPECT_EQ(EIO, syncFile(file.get()));
    }));
}

TEST_F(FileWritingTest, WhatTheFileSystemDoesNotSyncCountsAsSynced)
{
    for (const int error : {EINVAL, EROFS, ENOTSUP}) {
        EXPECT_TRUE(passesInChild([&] {
            const ScopedFd file(open(path.c_str(), O_WRONLY | O_CREAT, 0600));
            failSystemCall(SYS_fsync, error);

            EXPECT_EQ(0, syncFile(file.get())) << error;
        }));
    }
}

TEST_F(FileWritingTest, CloseWrittenReleasesTheFile)
{
    ScopedFd file(open(path.c_str(), O_WRONLY | O_CREAT, 0600));

    EXPECT_EQ(0, closeWritten(file));

    EXPECT_FALSE(file.isOpen());
}

TEST_F(FileWritingTest, CloseWrittenReportsAFailedClose)
{
    ScopedFd closed(open(path.c_str(), O_WRONLY | O_CREAT, 0600));
    ASSERT_EQ(0, close(closed.get()));

    EXPECT_EQ(5, closeWritten(closed));
}

} // namespace
