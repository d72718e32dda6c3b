#include "entry_extraction.h"
#include "package_window.h"
#include "process_limits.h"
#include "sample_bytes.h"
#include "scoped.h"
#include "test_files.h"
#include "whole_entry.h"
#include "zip_builder.h"
#include "zip_file.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <string>
#include <utility>

#include <fcntl.h>
#include <sys/syscall.h>
#include <unistd.h>
#include <zlib.h>

namespace {

#ifdef SYS_sendfile64
constexpr long CopyCall = SYS_sendfile64;
#else
constexpr long CopyCall = SYS_sendfile;
#endif

/// Writes deflate data bit by bit.
class BitWriter {
public:
    /// Appends the lowest `count` bits of `bits`, the lowest first.
    void number(std::uint32_t bits, int count)
    {
        for (int i = 0; i < count; ++i)
            bit(bits >> i & 1U);
    }

    /// Appends a Huffman code, its highest bit first.
    void code(std::uint32_t bits, int count)
    {
        for (int i = count - 1; i >= 0; --i)
            bit(bits >> i & 1U);
    }

    [[nodiscard]] const std::string& data() const { return data_; }

private:
    void bit(std::uint32_t value)
    {
        if (used_ % 8 == 0)
            data_ += '\0';
        data_.back() =
            static_cast<char>(static_cast<unsigned char>(data_.back()) | value << used_ % 8);
        ++used_;
    }

    std::string data_;
    unsigned used_ = 0;
};

/// A block of the fixed code: "a", then the length symbol `length` with a distance of 1, then the
/// end.
std::string fixedBlock(std::uint32_t length)
{
    BitWriter bits;
    bits.number(1, 1); // the last block
    bits.number(1, 2); // of the fixed code
    bits.code(0x30 + 'a', 8);
    bits.code(0xC0 + length - 280, 8);
    bits.code(0, 5); // distance 1
    bits.code(0, 7);
    return bits.data();
}

/// Appends a block of a code of its own: "a" 84 times. It lists `literals` code lengths of literals
/// and lengths, where deflate allows 286, and `distances` of distances, where it allows 30.
void appendBlock(BitWriter& bits, bool last, std::uint32_t literals, std::uint32_t distances)
{
    bits.number(last ? 1 : 0, 1);
    bits.number(2, 2); // of its own code
    bits.number(literals - 257, 5);
    bits.number(distances - 1, 5);
    bits.number(18 - 4, 4);
    // Codes of the code lengths: 18 (a run of zeros) is 0, 0 is 10, 1 is 11.
    for (const std::uint32_t length :
         {0U, 0U, 1U, 2U, 0U, 0U, 0U, 0U, 0U, 0U, 0U, 0U, 0U, 0U, 0U, 0U, 0U, 2U})
        bits.number(length, 3);
    const auto zeros = [&](std::uint32_t count) {
        for (; count >= 11; count -= std::min(count, 138U)) {
            bits.code(0, 1);
            bits.number(std::min(count, 138U) - 11, 7);
        }
        for (; count > 0; --count)
            bits.code(2, 2);
    };
    zeros(97);
    bits.code(3, 2); // "a" is 0
    zeros(158);
    bits.code(3, 2); // the end is 1
    zeros(literals - 257);
    bits.code(3, 2); // distance 1 is 0
    zeros(distances - 1);
    for (int i = 0; i < 84; ++i)
        bits.code(0, 1);
    bits.code(1, 1);
}

/// The block of appendBlock(), after `others` that are as deflate allows.
std::string dynamicBlock(std::uint32_t literals, std::uint32_t distances, int others = 0)
{
    BitWriter bits;
    for (int i = 0; i < others; ++i)
        appendBlock(bits, false, 286, 30);
    appendBlock(bits, true, literals, distances);
    return bits.data();
}

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

    /// The deflated entry that `data` begins with, with size and CRC-32 of `content`.
    static ZipEntry confirmedEntry(const std::string& data, const std::string& content)
    {
        ZipEntry entry = entryOf(8, data.size(), content.size());
        entry.crc32 = static_cast<std::uint32_t>(
            crc32_z(0, reinterpret_cast<const Bytef*>(content.data()), content.size()));
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
        PackageWindow package(ScopedFd(open(source.c_str(), O_RDONLY)));
        return copySoundEntry(package, entry, file);
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

TEST_F(SoundEntryTest, OnlyEntriesOfUpTo16MebibytesAreHeldInMemory)
{
    for (const std::size_t size : {std::size_t{16} << 20, (std::size_t{16} << 20) + 1}) {
        const std::string content(size, 'a');
        const std::string data = rawDeflate(content, 1);
        writeFile(source, data);
        PackageWindow package(ScopedFd(open(source.c_str(), O_RDONLY)));

        EXPECT_EQ(size == 16 << 20,
                  wholeContent(package, confirmedEntry(data, content)) != nullptr);
    }
}

TEST_F(SoundEntryTest, ADeflatedEntryOfManyPiecesArrivesWhole)
{
    // More than one read and more than one piece, the last one full or nearly so. Data that is as
    // long as its content is not inflated in one call.
    for (const std::size_t size : {262143U, 262144U, 262145U, 786432U, 1000000U}) {
        const std::string content = noiseBytes(size, 3);
        const std::string data = rawDeflate(content);
        ASSERT_LE(size, data.size());

        EXPECT_EQ(0, copy(data, entryOf(8, data.size(), size))) << size;

        EXPECT_TRUE(content == readFile(destination)) << size;
        ASSERT_EQ(0, unlink(destination.c_str()));
    }
}

TEST_F(SoundEntryTest, AConfirmedEntryOfAnySizeArrivesWhole)
{
    constexpr std::size_t largest = std::size_t{16} * 1024 * 1024; // inflated in one call
    for (const std::size_t size : {std::size_t{40}, std::size_t{8192}, std::size_t{1000000},
                                   largest - 1, largest, largest + 1, std::size_t{50}}) {
        const std::string content = textBytes(40, 6) + std::string(size - 40, 'x');
        const std::string data = rawDeflate(content);

        EXPECT_EQ(0, copy(data + "what follows", confirmedEntry(data, content))) << size;

        EXPECT_TRUE(content == readFile(destination)) << size;
        ASSERT_EQ(0, unlink(destination.c_str()));
    }
}

TEST_F(SoundEntryTest, AnEntryThatDeflatingMadeLargerArrivesWhole)
{
    const std::string content = noiseBytes(200000, 7);
    const std::string data = rawDeflate(content);
    ASSERT_GT(data.size(), content.size());

    EXPECT_EQ(0, copy(data, confirmedEntry(data, content)));

    EXPECT_TRUE(content == readFile(destination));
}

TEST_F(SoundEntryTest, AnEntryWithAWrongChecksumArrivesWhole)
{
    const std::string content = textBytes(1000, 8);
    const std::string data = rawDeflate(content);
    ZipEntry entry = confirmedEntry(data, content);
    entry.crc32 ^= 1;

    EXPECT_EQ(0, copy(data, entry));

    EXPECT_EQ(content, readFile(destination));
}

TEST_F(SoundEntryTest, AConfirmedEntryThatEndsBeforeItsDataIsSound)
{
    const std::string content = textBytes(1000, 9);
    const std::string data = rawDeflate(content);
    ZipEntry entry = confirmedEntry(data, content);
    entry.compressedSize += 4;

    EXPECT_EQ(0, copy(data + "more", entry));

    EXPECT_EQ(content, readFile(destination));
}

TEST_F(SoundEntryTest, AConfirmedEntryCutByTheEndOfTheArchiveIsNotSound)
{
    const std::string content = textBytes(1000, 10);
    const std::string data = rawDeflate(content);

    EXPECT_EQ(EntryNotSound, copy(data.substr(0, data.size() - 1), confirmedEntry(data, content)));
}

TEST_F(SoundEntryTest, AnEntryThatOnlyTheStreamsZlibRefusesArrivesAsItWasPacked)
{
    const std::string run(259, 'a');
    const std::string text(84, 'a');
    const std::pair<std::string, std::string> entries[] = {
        {fixedBlock(286), run},       {fixedBlock(287), run},        {dynamicBlock(287, 1), text},
        {dynamicBlock(288, 1), text}, {dynamicBlock(286, 31), text}, {dynamicBlock(286, 32), text}};
    for (const auto& [data, content] : entries) {
        const ZipEntry entry = confirmedEntry(data, content);
        ZipEntry otherwise = entry;
        otherwise.crc32 ^= 1;

        EXPECT_EQ(EntryNotSound, copy(data, otherwise));
        EXPECT_EQ(0, copy(data, entry));

        EXPECT_EQ(content, readFile(destination));
        ASSERT_EQ(0, unlink(destination.c_str()));
    }
}

TEST_F(SoundEntryTest, ExtractionTakesTheFastPath)
{
    // Its stream would deliver less, see above.
    const std::string content(259, 'a');
    ZipItem item = deflatedItem("a", content);
    item.data = fixedBlock(286);
    item.local.compressedSize = item.central.compressedSize =
        static_cast<std::uint32_t>(item.data.size());
    writeFile(source, zipBytes({{item}}));
    const ZipFile archive(source.c_str());
    FileTransaction transaction;

    EXPECT_EQ(0, extractFile(transaction, archive, &archive.entries().at(0), destination, 0));

    EXPECT_EQ(content, readFile(destination));
}

TEST_F(SoundEntryTest, AnEntryOfTinyBlocksArrivesWhole)
{
    const std::string data = dynamicBlock(286, 30, 999);
    const std::string content(84000, 'a');

    EXPECT_EQ(0, copy(data, confirmedEntry(data, content)));

    EXPECT_TRUE(content == readFile(destination));
}

TEST_F(SoundEntryTest, AnEntryThatBeginsWithTinyBlocksIsLeftToZlib)
{
    // Only zlib refuses the last block, so the result shows which decompressor ran.
    const std::string few = dynamicBlock(287, 1, 99);
    const std::string many = dynamicBlock(287, 1, 999);
    ASSERT_LT(few.size(), 16384U);
    ASSERT_GT(many.size(), 16384U);

    EXPECT_EQ(0, copy(few, confirmedEntry(few, std::string(8400, 'a'))));
    EXPECT_EQ(EntryNotSound, copy(many, confirmedEntry(many, std::string(84000, 'a'))));
}

TEST_F(SoundEntryTest, TheHandmadeBlocksAreSoundWithinTheirLimits)
{
    for (const auto& [data, content] : {std::pair{fixedBlock(285), std::string(259, 'a')},
                                        std::pair{dynamicBlock(286, 30), std::string(84, 'a')}}) {
        EXPECT_EQ(content, rawInflate(data, content.size()));
    }
}

TEST_F(SoundEntryTest, AStoredEntryArrivesWhole)
{
    const std::string content = noiseBytes(300000, 4);

    EXPECT_EQ(0, copy(content + "what follows", entryOf(0, 300000, 300000)));

    EXPECT_TRUE(content == readFile(destination));
}

TEST_F(SoundEntryTest, AStoredEntryArrivesWholeAlsoWhereTheSystemCopiesLess)
{
    int ends[2] = {-1, -1};
    ASSERT_EQ(0, pipe2(ends, O_NONBLOCK));
    const ScopedFd reader(ends[0]);
    const ScopedFd writer(ends[1]);
    const std::string content = noiseBytes(100000, 9); // more than a pipe takes

    EXPECT_TRUE(passesInChild([&] {
        std::string received(content.size(), '\0');
        ssize_t first = 0;
        beforeSystemCall({CopyCall}, 2, [&] {
            first = read(reader.get(), received.data(), received.size());
            return 0;
        });
        EXPECT_EQ(0, copyTo(writer.get(), content, entryOf(0, content.size(), content.size())));
        const ssize_t second = read(reader.get(), received.data() + first, received.size());

        EXPECT_LT(0, first);
        EXPECT_EQ(100000, first + second);
        EXPECT_TRUE(content == received);
    }));
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

TEST_F(SoundEntryTest, DataOfWhichThePiecesCannotAllBeReadIsNotSound)
{
    const std::string content = noiseBytes(65535, 3);
    std::string data; // of which the last 16 bytes are in a piece of their own
    for (const char last : {'\0', '\0', '\0', '\1'})
        data += std::string(1, last) + std::string("\xFF\xFF\0\0", 4) + content;
    const ZipEntry entry = entryOf(8, data.size(), 4 * content.size());
    ASSERT_EQ(0, copy(data, entry));

    for (const int nth : {1, 2}) {
        EXPECT_TRUE(passesInChild([&] {
            beforeSystemCall({SYS_pread64}, nth, [] { return EIO; });
            EXPECT_EQ(EntryNotSound, copy(data, entry)) << nth;
        }));
    }
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

TEST_F(SoundEntryTest, EntriesAreReadFromTheirPlacesInAnyOrder)
{
    const std::string content = textBytes(1000, 12);
    const std::string data = rawDeflate(content);
    writeFile(source, "before" + data + "between" + data);
    PackageWindow package(ScopedFd(open(source.c_str(), O_RDONLY)));
    ZipEntry first = confirmedEntry(data, content);
    first.dataOffset = 6;
    ZipEntry second = first;
    second.dataOffset = static_cast<std::uint32_t>(6 + data.size() + 7);
    ZipEntry stored = entryOf(0, 7, 7);
    stored.dataOffset = static_cast<std::uint32_t>(6 + data.size());

    for (const ZipEntry& entry : {second, first, stored, second}) {
        const ScopedFd file(open(destination.c_str(), O_WRONLY | O_CREAT, 0600));

        EXPECT_EQ(0, copySoundEntry(package, entry, file.get()));

        EXPECT_EQ(entry.method == 0 ? "between" : content, readFile(destination));
        ASSERT_EQ(0, unlink(destination.c_str()));
    }
}

TEST_F(SoundEntryTest, AFullDiskIsReportedForADeflatedEntry)
{
    const ScopedFd full(open("/dev/full", O_WRONLY));
    const std::string content(1000, 'x');
    const std::string data = rawDeflate(content);

    EXPECT_EQ(6, copyTo(full.get(), data, entryOf(8, data.size(), 1000)));
    EXPECT_EQ(6, copyTo(full.get(), data, confirmedEntry(data, content)));
}

TEST_F(SoundEntryTest, AFullDiskIsLeftToTheStreamForAStoredEntry)
{
    const ScopedFd full(open("/dev/full", O_WRONLY));

    EXPECT_EQ(EntryNotSound, copyTo(full.get(), "text", entryOf(0, 4, 4)));
}

} // namespace
