#include "sample_bytes.h"
#include "scoped.h"
#include "sound_entry.h"
#include "test_files.h"
#include "zip_builder.h"
#include "zip_file.h"

#include <gtest/gtest.h>

#include <string>

#include <fcntl.h>

namespace {

class SoundEntryTest : public testing::Test {
protected:
    /// An entry whose `data` begins the archive.
    static ZipEntry entryOf(std::uint32_t method, std::size_t packedSize, std::size_t size)
    {
        ZipEntry entry;
        entry.method = method;
        entry.compressedSize = static_cast<std::uint32_t>(packedSize);
        entry.uncompressedSize = static_cast<std::uint32_t>(size);
        return entry;
    }

    int copy(const std::string& archive, const ZipEntry& entry) const
    {
        const ScopedFd file(open(destination.c_str(), O_WRONLY | O_CREAT, 0600));
        return copyTo(file.get(), archive, entry);
    }

    int copyTo(int file, const std::string& archive, const ZipEntry& entry) const
    {
        writeFile(source, archive);
        const ScopedFd data(open(source.c_str(), O_RDONLY));
        return copySoundEntry(data.get(), entry, file);
    }

    TempDir dir;
    std::string source = dir / "archive";
    std::string destination = dir / "file";
};

TEST_F(SoundEntryTest, ADeflatedEntryArrivesWhole)
{
    const std::string content = textBytes(1000, 1);
    const std::string data = rawDeflate(content);

    EXPECT_EQ(0, copy(data, entryOf(8, data.size(), 1000)));

    EXPECT_EQ(content, readFile(destination));
}

TEST_F(SoundEntryTest, ADeflatedEntryOfManyPiecesArrivesWhole)
{
    // More than one read and more than one piece, the last one full or nearly so.
    for (const std::size_t size : {131071U, 131072U, 131073U, 393216U, 1000000U}) {
        const std::string content = textBytes(size / 2, 2) + noiseBytes(size - size / 2, 3);
        const std::string data = rawDeflate(content);

        EXPECT_EQ(0, copy(data, entryOf(8, data.size(), size))) << size;

        EXPECT_TRUE(content == readFile(destination)) << size;
        ASSERT_EQ(0, unlink(destination.c_str()));
    }
}

TEST_F(SoundEntryTest, AStoredEntryArrivesWhole)
{
    const std::string content = noiseBytes(300000, 4);

    EXPECT_EQ(0, copy(content + "what follows", entryOf(0, 300000, 300000)));

    EXPECT_TRUE(content == readFile(destination));
}

TEST_F(SoundEntryTest, ADeflatedEntryShorterThanRecordedIsSound)
{
    const std::string data = rawDeflate("short");

    EXPECT_EQ(0, copy(data, entryOf(8, data.size(), 6)));

    EXPECT_EQ("short", readFile(destination));
}

TEST_F(SoundEntryTest, ADeflatedEntryThatEndsBeforeItsDataIsSound)
{
    const std::string data = rawDeflate("short");

    EXPECT_EQ(0, copy(data + "more", entryOf(8, data.size() + 4, 5)));

    EXPECT_EQ("short", readFile(destination));
}

TEST_F(SoundEntryTest, AStoredEntryInAShortArchiveIsWhatIsThere)
{
    EXPECT_EQ(0, copy("1234567", entryOf(0, 10, 10)));

    EXPECT_EQ("1234567", readFile(destination));
}

TEST_F(SoundEntryTest, ADeflatedEntryLongerThanRecordedIsNotSound)
{
    const std::string data = rawDeflate("short");

    EXPECT_EQ(EntryNotSound, copy(data, entryOf(8, data.size(), 4)));
}

TEST_F(SoundEntryTest, DataWithoutItsLastByteIsNotSound)
{
    const std::string data = rawDeflate(noiseBytes(70000, 5));

    EXPECT_EQ(EntryNotSound, copy(data, entryOf(8, data.size() - 1, 70000)));
}

TEST_F(SoundEntryTest, DataThatIsNotDeflatedIsNotSound)
{
    EXPECT_EQ(EntryNotSound, copy(std::string(100, '\xFF'), entryOf(8, 100, 100)));
}

TEST_F(SoundEntryTest, AStoredEntryOfTwoGibibytesIsLeftToItsStream)
{
    EXPECT_EQ(EntryNotSound, copy("12345", entryOf(0, 0x80000000U, 0x80000000U)));

    EXPECT_EQ("", readFile(destination));
}

TEST_F(SoundEntryTest, AnOffsetThatCannotBeReachedIsTheStartOfTheArchive)
{
    const std::string data = rawDeflate("text");
    for (const std::uint32_t offset : {0x80000000U, 0xFFFFFFFFU}) {
        ZipEntry stored = entryOf(0, 5, 5);
        ZipEntry deflated = entryOf(8, data.size(), 4);
        stored.dataOffset = deflated.dataOffset = offset;

        EXPECT_EQ(0, copy("the first bytes", stored)) << offset;
        EXPECT_EQ("the f", readFile(destination)) << offset;
        ASSERT_EQ(0, unlink(destination.c_str()));
        EXPECT_EQ(0, copy(data, deflated)) << offset;
        EXPECT_EQ("text", readFile(destination)) << offset;
        ASSERT_EQ(0, unlink(destination.c_str()));
    }
}

TEST_F(SoundEntryTest, AnEntryIsReadFromItsPlaceWhereverTheArchiveStands)
{
    writeFile(source, "before and the entry behind");
    const ScopedFd archive(open(source.c_str(), O_RDONLY));
    ASSERT_EQ(3, lseek(archive.get(), 3, SEEK_SET));
    ZipEntry entry = entryOf(0, 9, 9);
    entry.dataOffset = 11;
    const ScopedFd file(open(destination.c_str(), O_WRONLY | O_CREAT, 0600));

    EXPECT_EQ(0, copySoundEntry(archive.get(), entry, file.get()));

    EXPECT_EQ("the entry", readFile(destination));
    EXPECT_EQ(3, lseek(archive.get(), 0, SEEK_CUR));
}

TEST_F(SoundEntryTest, AFullDiskIsToldForADeflatedEntry)
{
    const ScopedFd full(open("/dev/full", O_WRONLY));
    const std::string data = rawDeflate("text");

    EXPECT_EQ(6, copyTo(full.get(), data, entryOf(8, data.size(), 4)));
}

TEST_F(SoundEntryTest, AFullDiskIsLeftToTheStreamForAStoredEntry)
{
    const ScopedFd full(open("/dev/full", O_WRONLY));

    EXPECT_EQ(EntryNotSound, copyTo(full.get(), "text", entryOf(0, 4, 4)));
}

} // namespace
