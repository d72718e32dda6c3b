#include "process_limits.h"
#include "sample_bytes.h"
#include "test_files.h"
#include "zip_builder.h"
#include "zip_file.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <csignal>
#include <memory>
#include <string>
#include <vector>

#include <fcntl.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace {

constexpr int WriterBlock = 8192; // what the installer's file writer asks for

/// One block of deflate data that holds `content` as it is, written by hand.
std::string storedBlock(const std::string& content, bool last = false)
{
    const auto size = static_cast<unsigned>(content.size());
    std::string block = {static_cast<char>(last ? 1 : 0), static_cast<char>(size & 0xFFU),
                         static_cast<char>(size >> 8), static_cast<char>(~size & 0xFFU),
                         static_cast<char>(~size >> 8 & 0xFFU)};
    return block + content;
}

const std::string DamagedBlock = "\x07"; // a block of the type that does not exist

/// Reads the stream to its end as the file writer does.
std::string readAll(InputStream& stream, int block = WriterBlock)
{
    std::string content;
    std::string buffer(static_cast<std::size_t>(block), '\0');
    for (int count = 1; count > 0;) {
        count = stream.read(buffer.data(), block);
        EXPECT_GE(count, 0);
        content.append(buffer, 0, static_cast<std::size_t>(count));
    }
    return content;
}

/// One block of the stream.
std::string readBlock(InputStream& stream, int len)
{
    std::string buffer(static_cast<std::size_t>(len), '\0');
    const int count = stream.read(buffer.data(), len);
    EXPECT_GE(count, 0);
    return buffer.substr(0, static_cast<std::size_t>(count));
}

class ZipStreamTest : public testing::Test {
protected:
    /// A stream over the first item of an archive that has only one, followed by `tail`.
    std::unique_ptr<InputStream> openItem(const ZipItem& item, const std::string& tail = {})
    {
        return openOf({{item}}, tail);
    }

    std::unique_ptr<InputStream> openOf(const ZipArchive& archive, const std::string& tail = {})
    {
        writeFile(path, zipBytes(archive) + tail);
        const ZipFile file(path.c_str());
        EXPECT_FALSE(file.entries().empty());
        return std::unique_ptr<InputStream>(file.getInputStream(&file.entries().front()));
    }

    TempDir dir;
    std::string path = dir / "package.spb";
};

// Opening an entry.

TEST_F(ZipStreamTest, NoEntryGivesNoStream)
{
    writeFile(path, zipBytes({{storedItem("a", "1")}}));

    EXPECT_EQ(nullptr, ZipFile(path.c_str()).getInputStream(nullptr));
}

TEST_F(ZipStreamTest, AnEmptyFileGivesNoStream)
{
    EXPECT_EQ(nullptr, openItem(storedItem("empty", "")));
    EXPECT_EQ(nullptr, openItem(deflatedItem("empty", ""))); // two bytes of compressed data
}

TEST_F(ZipStreamTest, AnEntryWithoutCompressedBytesGivesNoStream)
{
    ZipItem item = storedItem("a", "text");
    item.central.compressedSize = 0;

    EXPECT_EQ(nullptr, openItem(item));
}

TEST_F(ZipStreamTest, AnUnknownMethodGivesNoStream)
{
    ZipItem item = storedItem("a", "text");
    for (const std::uint32_t method : {1U, 6U, 7U, 9U, 12U, 14U, 95U, 65535U}) {
        item.local.method = item.central.method = method;

        EXPECT_EQ(nullptr, openItem(item)) << method;
    }
}

TEST_F(ZipStreamTest, AnUnknownMethodLeavesNoFileOpen)
{
    ZipItem item = storedItem("a", "text");
    item.local.method = item.central.method = 12;
    const int before = dup(0);
    close(before);

    EXPECT_EQ(nullptr, openItem(item));

    const int after = dup(0); // the lowest free descriptor
    close(after);
    EXPECT_EQ(before, after);
}

TEST_F(ZipStreamTest, AnArchiveThatIsGoneGivesNoStream)
{
    writeFile(path, zipBytes({{storedItem("a", "1")}}));
    const ZipFile file(path.c_str());
    ASSERT_EQ(0, unlink(path.c_str()));

    EXPECT_EQ(nullptr, file.getInputStream(&file.entries().front()));
}

TEST_F(ZipStreamTest, AnArchiveWithoutAPathGivesNoStream)
{
    ZipEntry entry;
    entry.compressedSize = entry.uncompressedSize = 1;

    EXPECT_EQ(nullptr, ZipFile(nullptr).getInputStream(&entry));
}

TEST_F(ZipStreamTest, AStreamClosesItsFileAtItsEnd)
{
    const int before = dup(0);
    close(before);

    openItem(storedItem("a", "1")).reset();
    openItem(deflatedItem("b", "22")).reset();

    const int after = dup(0);
    close(after);
    EXPECT_EQ(before, after);
}

TEST_F(ZipStreamTest, AStreamOutlivesItsArchiveObjectAndItsFileName)
{
    const auto stream = openItem(deflatedItem("a", textBytes(20000, 1)));
    ASSERT_EQ(0, unlink(path.c_str()));

    EXPECT_EQ(textBytes(20000, 1), readAll(*stream));
}

TEST_F(ZipStreamTest, TwoStreamsOfOneArchiveDoNotDisturbEachOther)
{
    const std::string first = textBytes(50000, 1);
    const std::string second = noiseBytes(50000, 2);
    const std::string third = noiseBytes(50000, 3);
    writeFile(path, zipBytes({{deflatedItem("a", first), deflatedItem("b", second),
                               storedItem("c", third)}}));
    const ZipFile file(path.c_str());
    std::vector<std::unique_ptr<InputStream>> streams;
    for (const ZipEntry& entry : file.entries())
        streams.emplace_back(file.getInputStream(&entry));

    std::string read[3];
    for (int round = 0; round < 50; ++round) {
        for (std::size_t i = 0; i < 3; ++i)
            read[i] += readBlock(*streams[i], 1000);
    }

    EXPECT_EQ(first, read[0]);
    EXPECT_EQ(second, read[1]);
    EXPECT_EQ(third, read[2]);
}

TEST_F(ZipStreamTest, AnOffsetThatCannotBeReachedLeavesTheStreamAtTheStartOfTheArchive)
{
    writeFile(path, "the archive's first bytes");
    ZipEntry entry;
    entry.compressedSize = entry.uncompressedSize = 11;
    for (const std::uint32_t offset : {0x80000000U, 0xFFFFFFFFU}) {
        entry.dataOffset = offset;
        const std::unique_ptr<InputStream> stream(ZipFile(path.c_str()).getInputStream(&entry));

        EXPECT_EQ("the archive", readAll(*stream)) << offset;
    }
}

TEST_F(ZipStreamTest, DataJustBelow2ToThe31IsRead)
{
    writeSparseFile(path, {{0x7FFFFFF0U, "far away"}});
    ZipEntry entry;
    entry.compressedSize = entry.uncompressedSize = 8;
    entry.dataOffset = 0x7FFFFFF0U;

    const std::unique_ptr<InputStream> stream(ZipFile(path.c_str()).getInputStream(&entry));

    EXPECT_EQ("far away", readAll(*stream));
}

// Stored entries.

TEST_F(ZipStreamTest, AStoredEntryOfTenBytesGivesTenThenNone)
{
    const auto stream = openItem(storedItem("a", "0123456789"));
    char buffer[8192];

    EXPECT_EQ(10, stream->read(buffer, 8192));
    EXPECT_EQ("0123456789", std::string(buffer, 10));
    EXPECT_EQ(0, stream->read(buffer, 8192));
    EXPECT_EQ(0, stream->read(buffer, 8192));
}

TEST_F(ZipStreamTest, AStoredEntryIsDeliveredInBlocksOfAnySize)
{
    const std::string content = noiseBytes(100000, 7);
    for (const int block : {1, 100, 4096, 8191, 8192, 8193, 100000, 200000})
        EXPECT_EQ(content, readAll(*openItem(storedItem("a", content)), block)) << block;
}

TEST_F(ZipStreamTest, AStoredStreamReportsWhatItHasNotDelivered)
{
    const auto stream = openItem(storedItem("a", "0123456789"));
    EXPECT_EQ(10, stream->available());

    (void)readBlock(*stream, 3);
    EXPECT_EQ(7, stream->available());

    (void)stream->read();
    EXPECT_EQ(6, stream->available());

    (void)readBlock(*stream, 100);
    EXPECT_EQ(0, stream->available());
}

TEST_F(ZipStreamTest, AStoredStreamGoesByTheUncompressedSize)
{
    ZipItem item = storedItem("a", "0123456789");
    item.central.uncompressedSize = 4;
    EXPECT_EQ("0123", readAll(*openItem(item)));

    item.central.uncompressedSize = 10;
    item.central.compressedSize = 4;
    EXPECT_EQ("0123456789", readAll(*openItem(item)));
}

TEST_F(ZipStreamTest, AStoredEntryThatTheFileCutsShortReadsAsAShorterOne)
{
    writeFile(path, "0123456789");
    ZipEntry entry;
    entry.compressedSize = entry.uncompressedSize = 100;
    const std::unique_ptr<InputStream> stream(ZipFile(path.c_str()).getInputStream(&entry));

    EXPECT_EQ("0123456789", readAll(*stream));
    EXPECT_EQ(90, stream->available());
    EXPECT_EQ(-1, stream->read());
    EXPECT_EQ(90, stream->available());
}

TEST_F(ZipStreamTest, AStoredStreamGivesSingleBytesFrom0To255)
{
    const auto stream = openItem(storedItem("a", std::string("\0\x7F\x80\xFF", 4)));

    EXPECT_EQ(0, stream->read());
    EXPECT_EQ(127, stream->read());
    EXPECT_EQ(128, stream->read());
    EXPECT_EQ(255, stream->read());
}

TEST_F(ZipStreamTest, SingleBytesPastTheEndOfAStoredEntryAreThoseThatFollowInTheArchive)
{
    const auto stream = openOf({{storedItem("a", "1"), storedItem("b", "2")}});

    EXPECT_EQ('1', stream->read());
    EXPECT_EQ('P', stream->read());
    EXPECT_EQ('K', stream->read());
    EXPECT_EQ(3, stream->read());
    EXPECT_EQ(-3, stream->available());
}

TEST_F(ZipStreamTest, SingleBytesEndWithTheFileOnly)
{
    writeFile(path, "12");
    ZipEntry entry;
    entry.compressedSize = entry.uncompressedSize = 1;
    const std::unique_ptr<InputStream> stream(ZipFile(path.c_str()).getInputStream(&entry));

    EXPECT_EQ('1', stream->read());
    EXPECT_EQ('2', stream->read());
    EXPECT_EQ(-1, stream->read());
    EXPECT_EQ(-1, stream->read());
    EXPECT_EQ(-1, stream->available());
}

TEST_F(ZipStreamTest, ABlockPastTheEndOfAStoredEntryIsEmptyAndTouchesNoMemory)
{
    const auto stream = openItem(storedItem("a", "1"));
    (void)stream->read();
    (void)stream->read();
    ASSERT_EQ(-1, stream->available());

    char buffer[3] = {'x', 'y', 'z'};
    EXPECT_EQ(0, stream->read(buffer, 3));
    EXPECT_EQ(0, stream->read(buffer, -3));

    EXPECT_EQ("xyz", std::string(buffer, 3));
    EXPECT_EQ(-1, stream->available());
}

TEST_F(ZipStreamTest, AStoredEntryOf2ToThe31BytesOrMoreGivesNoBlocks)
{
    ZipItem item = storedItem("a", "0123456789");
    item.central.uncompressedSize = 0x80000000U;
    const auto stream = openItem(item);
    char buffer[4] = {'w', 'x', 'y', 'z'};

    EXPECT_EQ(std::int32_t{-2147483647 - 1}, stream->available());
    EXPECT_EQ(0, stream->read(buffer, 4));
    EXPECT_EQ("wxyz", std::string(buffer, 4));
}

TEST_F(ZipStreamTest, AStoredEntryOf2ToThe31BytesOrMoreGivesSingleBytes)
{
    ZipItem item = storedItem("a", "0123456789");
    item.central.uncompressedSize = 0x80000001U;
    const auto stream = openItem(item);

    EXPECT_EQ('0', stream->read());
    EXPECT_EQ(std::int32_t{-2147483647 - 1}, stream->available());
    EXPECT_EQ('1', stream->read());
    EXPECT_EQ(2147483647, stream->available()); // 32 bits wrap around
    EXPECT_EQ("2345", readBlock(*stream, 4));
}

TEST_F(ZipStreamTest, AStoredStreamAskedForNothingGivesNothing)
{
    const auto stream = openItem(storedItem("a", "0123456789"));
    char buffer[1] = {'x'};

    EXPECT_EQ(0, stream->read(buffer, 0));
    EXPECT_EQ(0, stream->read(buffer, -1));
    EXPECT_EQ('x', buffer[0]);
    EXPECT_EQ(10, stream->available());
}

TEST_F(ZipStreamTest, AStoredStreamWithoutAFileGivesNothing)
{
    X__StoredInputStream stream(ScopedFd(-1), 10);
    char buffer[10];

    EXPECT_EQ(0, static_cast<InputStream&>(stream).read(buffer, 10));
    EXPECT_EQ(-1, stream.read());
    EXPECT_EQ(10, stream.available());
}

TEST_F(ZipStreamTest, AReadThatGoesOnAfterAShortOneStaysWithinItsBuffer)
{
    writeFile(path, "abcd");

    EXPECT_TRUE(passesInChild([&] {
        X__StoredInputStream stream(ScopedFd(open(path.c_str(), O_RDONLY)), 10);
        std::string buffer(100, '#');
        beforeSystemCall({SYS_read}, 2, [&] {
            writeFile(path, "abcd" + std::string(90, 'e'));
            return 0;
        });

        EXPECT_EQ(10, static_cast<InputStream&>(stream).read(buffer.data(), 10));
        EXPECT_EQ("abcdeeeeee" + std::string(90, '#'), buffer);
    }));
}

TEST_F(ZipStreamTest, ClosingAStoredStreamDoesNothing)
{
    const auto stream = openItem(storedItem("a", "0123456789"));

    stream->close();

    EXPECT_EQ("0123456789", readAll(*stream));
}

// Deflated entries.

TEST_F(ZipStreamTest, ADeflatedEntryIsDeliveredWholeAndThenNothing)
{
    const std::string content = textBytes(20000, 3);
    const auto stream = openItem(deflatedItem("a", content));
    char buffer[8192];
    std::string read;

    EXPECT_EQ(8192, stream->read(buffer, 8192));
    read.append(buffer, 8192);
    EXPECT_EQ(8192, stream->read(buffer, 8192));
    read.append(buffer, 8192);
    EXPECT_EQ(3616, stream->read(buffer, 8192));
    read.append(buffer, 3616);
    EXPECT_EQ(0, stream->read(buffer, 8192));
    EXPECT_EQ(0, stream->read(buffer, 8192));

    EXPECT_EQ(content, read);
}

TEST_F(ZipStreamTest, ADeflatedStreamReportsWhatItHasNotDelivered)
{
    const auto stream = openItem(deflatedItem("a", textBytes(20000, 3)));
    EXPECT_EQ(20000, stream->available());

    (void)readBlock(*stream, 8192);
    EXPECT_EQ(11808, stream->available());

    (void)stream->read();
    EXPECT_EQ(11807, stream->available());

    (void)readBlock(*stream, 20000);
    EXPECT_EQ(0, stream->available());
}

TEST_F(ZipStreamTest, ADeflatedEntryIsDeliveredInBlocksOfAnySize)
{
    const std::string content = textBytes(100000, 7);
    for (const int block : {1, 100, 4096, 8191, 8192, 8193, 100000, 200000})
        EXPECT_EQ(content, readAll(*openItem(deflatedItem("a", content)), block)) << block;
}

TEST_F(ZipStreamTest, EveryLevelOfCompressionIsRead)
{
    const std::string content = textBytes(100000, 5) + noiseBytes(50000, 6);
    for (int level = 0; level <= 9; ++level)
        EXPECT_EQ(content, readAll(*openItem(deflatedItem("a", content, level)))) << level;
}

TEST_F(ZipStreamTest, MoreCompressedBytesThanAreReadAheadAreRead)
{
    const std::string content = noiseBytes(1000000, 5); // a million compressed bytes as well

    EXPECT_EQ(content, readAll(*openItem(deflatedItem("a", content))));
}

TEST_F(ZipStreamTest, FewCompressedBytesCanHoldMany)
{
    const std::string content(5000000, '\0');

    EXPECT_EQ(content, readAll(*openItem(deflatedItem("a", content, 9))));
}

TEST_F(ZipStreamTest, ADeflatedStreamGivesSingleBytesWithTheirSign)
{
    const auto stream = openItem(deflatedItem("a", std::string("\0\x7F\x80\xFE", 4)));

    EXPECT_EQ(0, stream->read());
    EXPECT_EQ(127, stream->read());
    EXPECT_EQ(-128, stream->read());
    EXPECT_EQ(-2, stream->read());
}

TEST_F(ZipStreamTest, AByte0xFFOfADeflatedStreamLooksLikeTheEnd)
{
    const auto stream = openItem(deflatedItem("a", "a\xFF\xFF"
                                                   "b"));

    EXPECT_EQ('a', stream->read());
    EXPECT_EQ(-1, stream->read());
    EXPECT_EQ(-1, stream->read());
    EXPECT_EQ(1, stream->available());
    EXPECT_EQ('b', stream->read());
    EXPECT_EQ(-1, stream->read());
    EXPECT_EQ(0, stream->available());
}

TEST_F(ZipStreamTest, ASingleByteOfADeflatedStreamIsABlockOfOne)
{
    class Stream : public X__DeflatedInputStream {
    public:
        Stream() : X__DeflatedInputStream(ScopedFd(-1), 1, 1) {}
        using X__DeflatedInputStream::read;
        int read(char* buf, int len) override
        {
            *buf = 'o';
            return len;
        }
    };
    Stream stream;

    EXPECT_EQ('o', stream.read());
}

TEST_F(ZipStreamTest, BytesAfterTheEndMarkAreNotDelivered)
{
    ZipItem item = deflatedItem("a", "content");
    item.data += "more data";
    item.local.compressedSize = item.central.compressedSize += 9;

    EXPECT_EQ("content", readAll(*openItem(item)));
}

TEST_F(ZipStreamTest, AnEntryThatInflatesToLessThanItsSizeEndsBeforeIt)
{
    ZipItem item = deflatedItem("a", "content");
    item.central.uncompressedSize = 10;
    const auto stream = openItem(item);

    EXPECT_EQ("content", readAll(*stream));
    EXPECT_EQ(3, stream->available()); // the end of the data changes nothing about it
}

TEST_F(ZipStreamTest, TheSizeOfADeflatedEntryHas32Bits)
{
    ZipItem item = deflatedItem("a", "content");
    item.central.uncompressedSize = 0xFFFFFFFFU;
    const auto stream = openItem(item);

    EXPECT_EQ(-1, stream->available());
    EXPECT_EQ("content", readAll(*stream));
    EXPECT_EQ(-8, stream->available());
}

TEST_F(ZipStreamTest, ACompressedSizeOf2ToThe31AndMoreIsRead)
{
    ZipItem item = deflatedItem("a", "content");
    item.central.compressedSize = 0xFFFFFFFFU;

    EXPECT_EQ("content", readAll(*openItem(item)));
}

TEST_F(ZipStreamTest, ADeflatedStreamWithoutAFileGivesNothing)
{
    X__DeflatedInputStream stream(ScopedFd(-1), 10, 10);
    char buffer[10];

    EXPECT_EQ(0, static_cast<InputStream&>(stream).read(buffer, 10));
    EXPECT_EQ(0, static_cast<InputStream&>(stream).read(buffer, -10));
    EXPECT_EQ(-1, stream.read());
    EXPECT_EQ(10, stream.available());
}

TEST_F(ZipStreamTest, ClosingADeflatedStreamDoesNothing)
{
    const auto stream = openItem(deflatedItem("a", "content"));

    stream->close();

    EXPECT_EQ("content", readAll(*stream));
}

// Damaged and truncated data.

TEST_F(ZipStreamTest, DamagedDataYieldsTheBlocksBeforeItsOwn)
{
    const std::string before = textBytes(8192, 1);
    ZipItem item = deflatedItem("a", textBytes(20000, 1));
    item.data = storedBlock(before) + storedBlock("dropped") + DamagedBlock;
    item.central.compressedSize = static_cast<std::uint32_t>(item.data.size());
    const auto stream = openItem(item);

    EXPECT_EQ(before, readBlock(*stream, 8192));
    EXPECT_EQ(11808, stream->available());
    EXPECT_EQ("", readBlock(*stream, 8192));
    EXPECT_EQ(0, stream->available());
    EXPECT_EQ("", readBlock(*stream, 8192));
    EXPECT_EQ(-1, stream->read());
}

TEST_F(ZipStreamTest, DamageRightAfterABlockDropsThatBlock)
{
    // inflate looks at the next block's type while it fills the last byte of this one.
    ZipItem item = deflatedItem("a", textBytes(20000, 1));
    item.data = storedBlock(textBytes(8192, 1)) + DamagedBlock;
    item.central.compressedSize = static_cast<std::uint32_t>(item.data.size());
    const auto stream = openItem(item);

    EXPECT_EQ("", readBlock(*stream, 8192));
    EXPECT_EQ(0, stream->available());
}

TEST_F(ZipStreamTest, DamageIsFoundWhereTheCallerReads)
{
    ZipItem item = deflatedItem("a", textBytes(20000, 1));
    item.data = storedBlock("0123456789") + DamagedBlock;
    item.central.compressedSize = static_cast<std::uint32_t>(item.data.size());
    const auto stream = openItem(item);

    EXPECT_EQ("012345678", readBlock(*stream, 9));
    EXPECT_EQ("", readBlock(*stream, 1));
}

TEST_F(ZipStreamTest, DataWithAZlibHeaderIsDamaged)
{
    ZipItem item = deflatedItem("a", "content");
    item.data = "\x78\x9c" + std::string(item.data);
    item.central.compressedSize += 2;
    const auto stream = openItem(item);

    EXPECT_EQ("", readAll(*stream));
    EXPECT_EQ(0, stream->available());
}

TEST_F(ZipStreamTest, TruncatedDataYieldsWholeBlocksAndDropsTheLast)
{
    const std::string content = noiseBytes(20000, 4);
    ZipItem item = deflatedItem("a", content, 0);
    item.central.compressedSize = 17000;
    const auto stream = openItem(item);

    EXPECT_EQ(content.substr(0, 8192), readBlock(*stream, 8192));
    EXPECT_EQ(content.substr(8192, 8192), readBlock(*stream, 8192));
    EXPECT_EQ(3616, stream->available());
    EXPECT_EQ("", readBlock(*stream, 8192)); // 611 bytes would be there
    EXPECT_EQ(0, stream->available());
    EXPECT_EQ("", readBlock(*stream, 1));
}

TEST_F(ZipStreamTest, SmallerBlocksGetMoreOfTruncatedData)
{
    const std::string content = noiseBytes(20000, 4);
    ZipItem item = deflatedItem("a", content, 0);
    item.central.compressedSize = 17000; // of which 5 are the block's head

    EXPECT_EQ(content.substr(0, 16995), readAll(*openItem(item), 1));
}

TEST_F(ZipStreamTest, OneCompressedByteTooFewIsTruncatedData)
{
    ZipItem item = deflatedItem("a", textBytes(20000, 1));
    item.central.compressedSize -= 1;

    EXPECT_EQ(textBytes(20000, 1).substr(0, 16384), readAll(*openItem(item)));
}

TEST_F(ZipStreamTest, AFileThatEndsInsideTheDataIsTruncatedData)
{
    const std::string content = noiseBytes(20000, 4);
    writeFile(path, rawDeflate(content, 0).substr(0, 17000));
    ZipEntry entry;
    entry.compressedSize = entry.uncompressedSize = 20005;
    entry.method = 8;
    const std::unique_ptr<InputStream> stream(ZipFile(path.c_str()).getInputStream(&entry));

    EXPECT_EQ(content.substr(0, 16384), readAll(*stream));
    EXPECT_EQ(0, stream->available());
}

TEST_F(ZipStreamTest, AFileThatEndsBeforeTheDataGivesNothing)
{
    writeFile(path, "short");
    ZipEntry entry;
    entry.compressedSize = entry.uncompressedSize = 10;
    entry.method = 8;
    entry.dataOffset = 1000;
    const std::unique_ptr<InputStream> stream(ZipFile(path.c_str()).getInputStream(&entry));

    EXPECT_EQ("", readAll(*stream));
    EXPECT_EQ(0, stream->available());
}

TEST_F(ZipStreamTest, ABlockThatTheLastCompressedByteFillsIsNotDropped)
{
    const std::string content = noiseBytes(8192, 4);
    ZipItem item = deflatedItem("a", content);
    item.data = storedBlock(content); // no end mark follows
    item.central.compressedSize = static_cast<std::uint32_t>(item.data.size());
    const auto stream = openItem(item);

    EXPECT_EQ(content, readBlock(*stream, 8192));
    EXPECT_EQ(0, stream->available());
    EXPECT_EQ("", readBlock(*stream, 8192));
}

// An intact entry arrives whole: inflate may take in the last compressed byte while output still
// waits for room.

class IntactEntryTest : public ZipStreamTest {
protected:
    /// Makes one archive of `contents` and compares each stream's bytes with zlib's own answer.
    void expectAllWhole(const std::vector<std::string>& contents, int level)
    {
        ZipArchive archive;
        for (const std::string& content : contents)
            archive.items.push_back(deflatedItem("a", content, level));
        writeFile(path, zipBytes(archive));
        const ZipFile file(path.c_str());
        ASSERT_EQ(contents.size(), file.entries().size());

        for (std::size_t i = 0; i < contents.size(); ++i) {
            const std::unique_ptr<InputStream> stream(file.getInputStream(&file.entries()[i]));
            const std::string expected = rawInflate(archive.items[i].data, contents[i].size());

            ASSERT_TRUE(readAll(*stream) == expected) << contents[i].size() << " bytes";
            ASSERT_EQ(0, stream->available()) << contents[i].size() << " bytes";
        }
    }

    /// Contents of 300 bytes below to 300 above 1 to 3 blocks: every size close to the block,
    /// and further away every fifth, since a match has up to 258 bytes.
    static std::vector<std::string> aroundBlocks(std::string (*bytesOf)(std::size_t, std::uint32_t))
    {
        std::vector<std::string> contents;
        for (std::size_t blocks = 1; blocks <= 3; ++blocks) {
            const std::size_t middle = blocks * WriterBlock;
            for (std::size_t size = middle - 300; size <= middle + 300;
                 size += size + 20 < middle || size >= middle + 20 ? 5 : 1)
                contents.push_back(bytesOf(size, static_cast<std::uint32_t>(size)));
        }
        return contents;
    }
};

TEST_F(IntactEntryTest, CompressibleDataOfSizesAroundWholeBlocksArrivesWhole)
{
    expectAllWhole(aroundBlocks(textBytes), 6);
}

TEST_F(IntactEntryTest, IncompressibleDataOfSizesAroundWholeBlocksArrivesWhole)
{
    expectAllWhole(aroundBlocks(noiseBytes), 6);
}

TEST_F(IntactEntryTest, DataInStoredBlocksOfSizesAroundWholeBlocksArrivesWhole)
{
    expectAllWhole(aroundBlocks(noiseBytes), 0);
}

TEST_F(IntactEntryTest, OneRepeatedByteOfSizesAroundWholeBlocksArrivesWhole)
{
    // The last match of up to 258 bytes crosses the end of a block; no input is left after it.
    std::vector<std::string> contents;
    for (std::size_t size = 7800; size <= 8800; ++size)
        contents.emplace_back(size, 'r');
    for (std::size_t size = 16384 - 300; size <= 16384 + 300; ++size)
        contents.emplace_back(size, 'r');

    expectAllWhole(contents, 9);
}

TEST_F(IntactEntryTest, SmallDataOfEverySizeArrivesWhole)
{
    std::vector<std::string> contents;
    for (std::size_t size = 1; size <= 600; ++size)
        contents.push_back(textBytes(size, static_cast<std::uint32_t>(size)));

    expectAllWhole(contents, 6);
}

TEST_F(IntactEntryTest, CompressedDataOfSizesAroundTheReadAheadArrivesWhole)
{
    std::vector<std::string> contents;
    for (std::size_t size = 4000; size <= 4200; ++size)
        contents.push_back(noiseBytes(size, static_cast<std::uint32_t>(size)));

    expectAllWhole(contents, 6);
}

TEST_F(IntactEntryTest, AnEndMarkInAPieceOfItsOwnIsNoExhaustedInput)
{
    // 8192 bytes fill the caller's block; the two bytes of the end mark come with the next call.
    const std::string content = textBytes(8192, 1);
    ZipItem item = deflatedItem("a", content);
    item.data = storedBlock(content) + "\x03" + std::string(1, '\0');
    item.central.compressedSize = static_cast<std::uint32_t>(item.data.size());
    const auto stream = openItem(item);

    EXPECT_EQ(content, readAll(*stream));
    EXPECT_EQ(0, stream->available());
}

// More bytes than recorded.

using ZipStreamDeathTest = ZipStreamTest;

/// What the C library prints when the assertion of the deflated stream fails.
std::string assertionMessage()
{
    return std::string(program_invocation_short_name) +
           ": zip_file:432: virtual int X__DeflatedInputStream::read(char*, int): "
           "Assertion `available_ >= (unsigned) result' failed.\n";
}

TEST_F(ZipStreamDeathTest, AnEntryThatInflatesToMoreThanItsSizeEndsTheProgram)
{
    ZipItem item = deflatedItem("a", "content");
    item.central.uncompressedSize = 6;
    const auto stream = openItem(item);

    EXPECT_EXIT((void)readBlock(*stream, 8192), testing::KilledBySignal(SIGABRT),
                testing::Eq(assertionMessage()));
}

TEST_F(ZipStreamDeathTest, TheProgramEndsInTheBlockWithTheSurplus)
{
    const std::string content = textBytes(20000, 1);
    ZipItem item = deflatedItem("a", content);
    item.central.uncompressedSize = 16384;
    const auto stream = openItem(item);

    EXPECT_EQ(content.substr(0, 8192), readBlock(*stream, 8192));
    EXPECT_EQ(content.substr(8192, 8192), readBlock(*stream, 8192));
    EXPECT_EQ(0, stream->available());
    EXPECT_EXIT((void)stream->read(), testing::KilledBySignal(SIGABRT),
                testing::Eq(assertionMessage()));
}

TEST_F(ZipStreamTest, SurplusThatIsNotReadEndsNothing)
{
    ZipItem item = deflatedItem("a", "content");
    item.central.uncompressedSize = 4;
    const auto stream = openItem(item);

    EXPECT_EQ("cont", readBlock(*stream, 4));
    EXPECT_EQ(0, stream->available());
}

TEST_F(ZipStreamTest, SurplusInATruncatedBlockIsDroppedWithIt)
{
    ZipItem item = deflatedItem("a", "content");
    item.data = storedBlock("content");
    item.central.compressedSize = static_cast<std::uint32_t>(item.data.size());
    item.central.uncompressedSize = 1;

    EXPECT_EQ("", readAll(*openItem(item)));
}

// A block of no bytes or fewer counts the room that the call before has left.

TEST_F(ZipStreamTest, ADeflatedStreamAskedForNothingAfterAFullBlockGivesNothing)
{
    const auto stream = openItem(deflatedItem("a", "content"));
    char buffer[4];

    EXPECT_EQ(0, stream->read(buffer, 0));
    EXPECT_EQ(4, stream->read(buffer, 4));
    EXPECT_EQ(0, stream->read(buffer, 0));
    EXPECT_EQ(3, stream->available());
}

TEST_F(ZipStreamDeathTest, ADeflatedStreamAskedForNothingAfterAPartialBlockEndsTheProgram)
{
    const auto stream = openItem(deflatedItem("a", "content"));
    char buffer[8];
    ASSERT_EQ(7, stream->read(buffer, 8));

    EXPECT_EXIT((void)stream->read(buffer, 0), testing::KilledBySignal(SIGABRT),
                testing::Eq(assertionMessage()));
}

TEST_F(ZipStreamDeathTest, ADeflatedStreamAskedForLessThanNothingEndsTheProgram)
{
    const auto stream = openItem(deflatedItem("a", "content"));
    char buffer[1];

    EXPECT_EXIT((void)stream->read(buffer, -1), testing::KilledBySignal(SIGABRT),
                testing::Eq(assertionMessage()));
}

TEST_F(ZipStreamTest, LessThanNothingIsTakenAsANumberOf32Bits)
{
    ZipItem item = deflatedItem("a", "content");
    item.central.uncompressedSize = 0xFFFFFFFFU;
    const auto stream = openItem(item);
    char buffer[8] = {};

    EXPECT_EQ(-5, stream->read(buffer, -5));
    EXPECT_EQ(4, stream->available());
}

TEST_F(ZipStreamTest, NothingIsWrittenByABlockOfLessThanNothing)
{
    ZipItem item = deflatedItem("a", "content");
    item.central.uncompressedSize = 0xFFFFFFFFU;
    const auto stream = openItem(item);
    char buffer[2] = {'x', 'y'};

    (void)stream->read(buffer + 1, -1);

    EXPECT_EQ("xy", std::string(buffer, 2));
}

TEST_F(ZipStreamTest, ExhaustedInputGivesNothingForBlocksOfAnyLength)
{
    ZipItem item = deflatedItem("a", "content");
    item.central.compressedSize = 3;
    const auto stream = openItem(item);
    char buffer[8];
    ASSERT_EQ(0, stream->read(buffer, 8));

    EXPECT_EQ(0, stream->read(buffer, 0));
    EXPECT_EQ(0, stream->read(buffer, -7));
    EXPECT_EQ(0, stream->read(buffer, 1));
}

} // namespace
