#include "test_files.h"
#include "zip_builder.h"
#include "zip_file.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include <unistd.h>

namespace {

using Names = std::vector<std::string>;

constexpr std::uint64_t TwoGiB = 0x80000000U;

/// Three items that the directory lists backwards, so that the order of the entries shows
/// whether the directory was read or the file scanned.
ZipArchive reversedDirectory()
{
    return {{storedItem("one", "1"), storedItem("two", "22"), storedItem("three", "333")},
            std::vector<std::size_t>{2, 1, 0}};
}

const Names FromDirectory = {"three", "two", "one"};
const Names FromScan = {"one", "two", "three"};

class ZipDirectoryTest : public testing::Test {
protected:
    /// Reads the directory of a file of these bytes into `entries`.
    int codeOf(const std::string& bytes)
    {
        writeFile(path, bytes);
        return ZipFile::readDirectory(path.c_str(), entries);
    }

    /// The names of the entries of the archive, which must be readable.
    Names namesOf(const ZipArchive& archive)
    {
        EXPECT_EQ(0, codeOf(zipBytes(archive)));
        return names();
    }

    Names names()
    {
        Names result;
        for (const ZipEntry& entry : entries)
            result.push_back(entry.name);
        return result;
    }

    /// Expects "bin/a", stored, and "bin/b", deflated, whose data begins at `secondOffset`.
    void expectBothEntries(std::uint32_t secondOffset)
    {
        ASSERT_EQ(2U, entries.size());
        EXPECT_EQ("bin/a", entries[0].name);
        EXPECT_EQ(0U, entries[0].method);
        EXPECT_EQ(0x352441C2U, entries[0].crc32);
        EXPECT_EQ(3U, entries[0].compressedSize);
        EXPECT_EQ(3U, entries[0].uncompressedSize);
        EXPECT_EQ(35U, entries[0].dataOffset);
        EXPECT_EQ("bin/b", entries[1].name);
        EXPECT_EQ(8U, entries[1].method);
        EXPECT_EQ(0x89ABCDEFU, entries[1].crc32);
        EXPECT_EQ(5U, entries[1].compressedSize);
        EXPECT_EQ(0xFEDCBA98U, entries[1].uncompressedSize);
        EXPECT_EQ(secondOffset, entries[1].dataOffset);
    }

    TempDir dir;
    std::string path = dir / "package.spb";
    std::vector<ZipEntry> entries = {ZipEntry()}; // so that an empty list was emptied
};

// The central directory.

TEST_F(ZipDirectoryTest, EntriesComeInTheOrderOfTheCentralDirectory)
{
    EXPECT_EQ(FromDirectory, namesOf(reversedDirectory()));
}

TEST_F(ZipDirectoryTest, AnEntryHoldsWhatItsHeadersSay)
{
    ZipArchive archive = {{storedItem("bin/a", "abc"), deflatedItem("bin/b", "")}};
    archive.items[1].data = "12345";
    archive.items[1].central.crc = 0x89ABCDEFU;
    archive.items[1].central.compressedSize = 5;
    archive.items[1].central.uncompressedSize = 0xFEDCBA98U;

    ASSERT_EQ(0, codeOf(zipBytes(archive)));

    expectBothEntries(73U);
}

TEST_F(ZipDirectoryTest, TheNameIsThatOfTheLocalHeader)
{
    ZipArchive archive = reversedDirectory();
    archive.items[0].central.name = "another name";

    EXPECT_EQ(FromDirectory, namesOf(archive));
}

TEST_F(ZipDirectoryTest, SizesAndCrcOfTheLocalHeaderAreIgnored)
{
    ZipArchive archive = reversedDirectory();
    archive.items[0].local.crc = 1;
    archive.items[0].local.compressedSize = 2000;
    archive.items[0].local.uncompressedSize = 3000;

    ASSERT_EQ(FromDirectory, namesOf(archive));

    EXPECT_EQ(0x83DCEFB7U, entries[2].crc32);
    EXPECT_EQ(1U, entries[2].compressedSize);
    EXPECT_EQ(1U, entries[2].uncompressedSize);
}

TEST_F(ZipDirectoryTest, ExtraFieldsOfDifferentLengthsAreSkipped)
{
    ZipArchive archive = reversedDirectory();
    archive.items[0].local.extra = std::string(9, 'x');
    archive.items[0].central.extra = std::string(300, 'y');
    archive.items[1].central.extra = "z";

    ASSERT_EQ(FromDirectory, namesOf(archive));

    EXPECT_EQ(42U, entries[2].dataOffset);
}

TEST_F(ZipDirectoryTest, ExtraFieldsOfTheGreatestLengthAreSkipped)
{
    ZipArchive archive = reversedDirectory();
    archive.items[0].local.extra = std::string(65535, 'x');
    archive.items[0].central.extra = std::string(65535, 'y');

    ASSERT_EQ(FromDirectory, namesOf(archive));

    EXPECT_EQ(65568U, entries[2].dataOffset);
}

TEST_F(ZipDirectoryTest, ANameIsCutAtItsFirstNul)
{
    ZipArchive archive = reversedDirectory();
    archive.items[1].local.name = std::string("two\0tail\0end", 12);

    EXPECT_EQ(FromDirectory, namesOf(archive));
}

TEST_F(ZipDirectoryTest, AnEmptyNameIsAName)
{
    ZipArchive archive = reversedDirectory();
    archive.items[1].local.name = archive.items[1].central.name = "";

    EXPECT_EQ((Names{"three", "", "one"}), namesOf(archive));
}

TEST_F(ZipDirectoryTest, EntriesOfOneNameAreAllKept)
{
    const ZipArchive archive = {{storedItem("same", "1"), storedItem("same", "22")}};

    ASSERT_EQ((Names{"same", "same"}), namesOf(archive));

    EXPECT_EQ(1U, entries[0].compressedSize);
    EXPECT_EQ(2U, entries[1].compressedSize);
}

TEST_F(ZipDirectoryTest, AnEntryOfAnUnknownMethodIsListed)
{
    ZipArchive archive = reversedDirectory();
    archive.items[1].local.method = archive.items[1].central.method = 12;

    ASSERT_EQ(FromDirectory, namesOf(archive));

    EXPECT_EQ(12U, entries[1].method);
}

TEST_F(ZipDirectoryTest, ANameOf2048BytesIsAccepted)
{
    const std::string name(2048, 'n');
    const ZipArchive archive = {{storedItem(name, "1"), storedItem("b", "2")},
                                std::vector<std::size_t>{1, 0}};

    EXPECT_EQ((Names{"b", name}), namesOf(archive));
}

TEST_F(ZipDirectoryTest, AFileCommentOnTheLastCentralHeaderDoesNoHarm)
{
    ZipArchive archive = reversedDirectory();
    archive.items[0].central.comment = "listed last"; // the directory is listed backwards

    EXPECT_EQ(FromDirectory, namesOf(archive));
}

TEST_F(ZipDirectoryTest, TheLocalSignatureIsIgnored)
{
    ZipArchive archive = reversedDirectory();
    archive.items[1].local.signature = "ZZZZ";

    EXPECT_EQ(FromDirectory, namesOf(archive));
}

TEST_F(ZipDirectoryTest, DiskNumbersAreIgnored)
{
    ZipArchive archive = reversedDirectory();
    archive.end.thisDisk = 3;
    archive.end.directoryDisk = 7;

    EXPECT_EQ(FromDirectory, namesOf(archive));
}

TEST_F(ZipDirectoryTest, OnlyAsManyHeadersAreReadAsTheEndRecordCounts)
{
    ZipArchive archive = reversedDirectory();
    archive.end.entriesOnDisk = archive.end.totalEntries = 2;

    EXPECT_EQ((Names{"three", "two"}), namesOf(archive));
}

TEST_F(ZipDirectoryTest, SizesThatFollowTheDataDoNotMatterToTheCentralDirectory)
{
    ZipArchive archive = reversedDirectory();
    archive.items[1].local.flags = 8;
    archive.items[1].local.crc = 0;
    archive.items[1].local.compressedSize = archive.items[1].local.uncompressedSize = 0;

    ASSERT_EQ(FromDirectory, namesOf(archive));

    EXPECT_EQ(2U, entries[1].compressedSize);
    EXPECT_EQ(2U, entries[1].uncompressedSize);
}

TEST_F(ZipDirectoryTest, SixtyFiveThousandEntriesAreRead)
{
    ZipArchive archive;
    for (int i = 0; i < 65535; ++i)
        archive.items.push_back(storedItem(std::to_string(i), "x"));
    archive.items[65534].central.comment = "the scan would read this one as well";

    ASSERT_EQ(0, codeOf(zipBytes(archive)));

    ASSERT_EQ(65535U, entries.size());
    EXPECT_EQ("0", entries[0].name);
    EXPECT_EQ(31U, entries[0].dataOffset);
    EXPECT_EQ("65534", entries[65534].name);
    EXPECT_EQ(0x8CDC1683U, entries[65534].crc32);
}

TEST_F(ZipDirectoryTest, HeadersOfEveryLengthAtEveryPlaceAreRead)
{
    ZipArchive archive;
    Names expected;
    for (std::size_t i = 0; i < 1500; ++i) {
        expected.emplace_back(i * 7 % 2049, static_cast<char>('a' + i % 26));
        archive.items.push_back(storedItem(expected.back(), std::string(i % 61 + 1, '.')));
        archive.items.back().local.extra = std::string(i % 13, 'l');
        archive.items.back().central.extra = std::string(i % 17, 'c');
    }

    EXPECT_EQ(expected, namesOf(archive));

    archive.end.comment = "now by the scan";
    EXPECT_EQ(expected, namesOf(archive));
}

// What sends the reader to the scan.

TEST_F(ZipDirectoryTest, AnArchiveCommentLeadsToTheScan)
{
    ZipArchive archive = reversedDirectory();
    for (const std::size_t length : {1U, 22U, 65535U}) {
        archive.end.comment = std::string(length, 'c');

        EXPECT_EQ(FromScan, namesOf(archive)) << length;
    }
}

TEST_F(ZipDirectoryTest, AWrongEndSignatureLeadsToTheScan)
{
    ZipArchive archive = reversedDirectory();
    archive.end.signature = "PK\x05\x07";

    EXPECT_EQ(FromScan, namesOf(archive));
}

TEST_F(ZipDirectoryTest, CountsThatDifferLeadToTheScan)
{
    ZipArchive archive = reversedDirectory();
    archive.end.entriesOnDisk = 2;

    EXPECT_EQ(FromScan, namesOf(archive));
}

TEST_F(ZipDirectoryTest, ACountThatIsTooGreatLeadsToTheScan)
{
    ZipArchive archive = reversedDirectory();
    archive.end.entriesOnDisk = archive.end.totalEntries = 4;

    EXPECT_EQ(FromScan, namesOf(archive));
}

TEST_F(ZipDirectoryTest, ACountOfZeroLeadsToTheScan)
{
    ZipArchive archive = reversedDirectory();
    archive.end.entriesOnDisk = archive.end.totalEntries = 0;

    EXPECT_EQ(FromScan, namesOf(archive));
}

TEST_F(ZipDirectoryTest, AWrongDirectoryOffsetLeadsToTheScan)
{
    ZipArchive archive = reversedDirectory();
    for (const std::uint32_t offset : {0U, 1U, 150000U, 0x7FFFFFFFU, 0x80000000U, 0xFFFFFFFFU}) {
        archive.end.directoryOffset = offset;

        EXPECT_EQ(FromScan, namesOf(archive)) << offset;
    }
}

TEST_F(ZipDirectoryTest, AWrongCentralSignatureLeadsToTheScan)
{
    ZipArchive archive = reversedDirectory();
    archive.items[0].central.signature = "PK\x01\x03";

    EXPECT_EQ(FromScan, namesOf(archive));
}

TEST_F(ZipDirectoryTest, AFileCommentBeforeTheLastCentralHeaderLeadsToTheScan)
{
    ZipArchive archive = reversedDirectory();
    archive.items[1].central.comment = "c";

    EXPECT_EQ(FromScan, namesOf(archive));
}

TEST_F(ZipDirectoryTest, ACentralNameOfMoreThan2048BytesLeadsToTheScan)
{
    ZipArchive archive = reversedDirectory();
    archive.items[1].central.name = std::string(2049, 'n');

    EXPECT_EQ(FromScan, namesOf(archive));
}

TEST_F(ZipDirectoryTest, ALocalNameBehindTheEndOfTheFileLeadsToTheScan)
{
    ZipArchive archive = {{storedItem("a", std::string(70000, 'x'))}};
    const auto size = static_cast<std::uint32_t>(zipBytes(archive).size());
    // The end record as a part of the local header: the number of its first bytes is the method,
    // the upper half of the directory's offset the length of a name.
    archive.items[0].central.localOffset = size - 30;
    archive.items[0].central.method = 0x4b50;

    EXPECT_EQ(Names{"a"}, namesOf(archive));
}

TEST_F(ZipDirectoryTest, ALocalNameOfMoreThan2048BytesLeadsToTheScanWhichEndsThere)
{
    ZipArchive archive = reversedDirectory();
    archive.items[1].local.name = std::string(2049, 'n');

    EXPECT_EQ(4, codeOf(zipBytes(archive)));
    EXPECT_TRUE(entries.empty());
}

TEST_F(ZipDirectoryTest, AMethodThatDiffersLeadsToTheScan)
{
    ZipArchive archive = reversedDirectory();
    archive.items[1].local.method = 8;

    ASSERT_EQ(FromScan, namesOf(archive));

    EXPECT_EQ(8U, entries[1].method);
}

TEST_F(ZipDirectoryTest, AWrongLocalOffsetLeadsToTheScan)
{
    ZipArchive archive = reversedDirectory();
    for (const std::uint32_t offset : {150000U, 0x7FFFFFFFU, 0x80000000U, 0xFFFFFFFFU}) {
        archive.items[1].central.localOffset = offset;

        EXPECT_EQ(FromScan, namesOf(archive)) << offset;
    }
}

TEST_F(ZipDirectoryTest, ALocalHeaderCutShortLeadsToTheScan)
{
    ZipArchive archive = reversedDirectory();
    const auto size = static_cast<std::uint32_t>(zipBytes(archive).size());
    archive.items[1].central.localOffset = size - 29;

    EXPECT_EQ(FromScan, namesOf(archive));
}

TEST_F(ZipDirectoryTest, ALocalNameCutShortLeadsToTheScan)
{
    // The last 30 bytes of the file taken as a local header: its method is the "PK" of the end
    // record, its name length the upper half of the directory's offset, which is 1 here.
    ZipArchive archive = {{storedItem("one", "1"), storedItem("two", std::string(70000, '2'))},
                          std::vector<std::size_t>{1, 0}};
    const auto size = static_cast<std::uint32_t>(zipBytes(archive).size());
    archive.items[0].central.localOffset = size - 30;
    archive.items[0].central.method = 'P' | 'K' << 8;

    EXPECT_EQ((Names{"one", "two"}), namesOf(archive));
}

TEST_F(ZipDirectoryTest, BytesBeforeTheArchiveBreakDirectoryAndScan)
{
    EXPECT_EQ(3, codeOf(std::string("#!") + zipBytes(reversedDirectory())));
    EXPECT_TRUE(entries.empty());
}

// The scan.

TEST_F(ZipDirectoryTest, TheScanTakesEverythingFromTheLocalHeader)
{
    ZipArchive archive = {{storedItem("bin/a", "abc"), deflatedItem("bin/b", "")}};
    archive.items[0].central.crc = archive.items[0].central.compressedSize = 77;
    archive.items[1].data = "12345";
    archive.items[1].local.crc = 0x89ABCDEFU;
    archive.items[1].local.compressedSize = 5;
    archive.items[1].local.uncompressedSize = 0xFEDCBA98U;
    archive.items[1].local.extra = "extra";
    archive.end.comment = "c";

    ASSERT_EQ(0, codeOf(zipBytes(archive)));

    expectBothEntries(78U);
}

TEST_F(ZipDirectoryTest, TheScanCutsANameAtItsFirstNul)
{
    ZipArchive archive = reversedDirectory();
    archive.items[1].local.name = std::string("two\0tail", 8);
    archive.end.comment = "c";

    EXPECT_EQ(FromScan, namesOf(archive));
}

TEST_F(ZipDirectoryTest, TheScanAcceptsANameOf2048Bytes)
{
    const std::string name(2048, 'n');
    ZipArchive archive = {{storedItem(name, "1"), storedItem("b", "2")}};
    archive.end.comment = "c";

    EXPECT_EQ((Names{name, "b"}), namesOf(archive));
}

TEST_F(ZipDirectoryTest, TheScanKeepsEntriesOfOneName)
{
    ZipArchive archive = {{storedItem("same", "1"), storedItem("same", "22")}};
    archive.end.comment = "c";

    EXPECT_EQ((Names{"same", "same"}), namesOf(archive));
}

TEST_F(ZipDirectoryTest, TheScanTrustsSizesThatTheHeaderCarriesDespiteItsFlag)
{
    ZipArchive archive = reversedDirectory();
    archive.items[1].local.flags = 8;
    archive.end.comment = "c";

    EXPECT_EQ(FromScan, namesOf(archive));
}

TEST_F(ZipDirectoryTest, TheScanGoesOnWhenOnlyOneOfCrcAndSizesIsKnown)
{
    ZipArchive archive = reversedDirectory();
    LocalHeader& header = archive.items[1].local;
    archive.items[1].data.clear();
    archive.end.comment = "c";
    header.flags = 8;
    header.compressedSize = 0;

    header.crc = 1;
    header.uncompressedSize = 0;
    EXPECT_EQ(FromScan, namesOf(archive));

    header.crc = 0;
    header.uncompressedSize = 1;
    EXPECT_EQ(FromScan, namesOf(archive));
}

TEST_F(ZipDirectoryTest, TheScanListsAnEmptyFileWithoutTheFlag)
{
    ZipArchive archive = {{storedItem("one", ""), storedItem("two", "2")}};
    archive.items[0].local.flags = 0xFFF7; // all but the one that says that sizes follow
    archive.end.comment = "c";

    EXPECT_EQ((Names{"one", "two"}), namesOf(archive));
}

TEST_F(ZipDirectoryTest, TheScanSeesMoreEntriesThanTheEndRecordCanCount)
{
    ZipArchive archive;
    for (int i = 0; i < 65537; ++i)
        archive.items.push_back(storedItem(std::to_string(i), "x"));

    ASSERT_EQ(0, codeOf(zipBytes(archive)));
    EXPECT_EQ(1U, entries.size()); // 65537 in 16 bits

    archive.end.comment = "c";
    ASSERT_EQ(0, codeOf(zipBytes(archive)));
    EXPECT_EQ(65537U, entries.size());
}

TEST_F(ZipDirectoryTest, TheScanOfAFileThatBeginsWithACentralHeaderFindsNothingAndSucceeds)
{
    entries.resize(2);

    EXPECT_EQ(0, codeOf(headerBytes(CentralHeader())));
    EXPECT_TRUE(entries.empty());
}

// Codes.

TEST_F(ZipDirectoryTest, WithoutAPathTheCodeIs1)
{
    EXPECT_EQ(1, ZipFile::readDirectory(nullptr, entries));
    EXPECT_TRUE(entries.empty());
}

TEST_F(ZipDirectoryTest, WithoutAFileTheCodeIs1)
{
    EXPECT_EQ(1, ZipFile::readDirectory((dir / "missing").c_str(), entries));
    EXPECT_TRUE(entries.empty());
}

TEST_F(ZipDirectoryTest, AnEmptyFileGives2)
{
    EXPECT_EQ(2, codeOf(""));
    EXPECT_TRUE(entries.empty());
}

TEST_F(ZipDirectoryTest, AFileShorterThanAnEndRecordGives2)
{
    EXPECT_EQ(2, codeOf("PK\x05\x06 and no more"));
    EXPECT_TRUE(entries.empty());
}

TEST_F(ZipDirectoryTest, AnEmptyArchiveGives2)
{
    EXPECT_EQ(2, codeOf(zipBytes(ZipArchive())));
    EXPECT_TRUE(entries.empty());
}

TEST_F(ZipDirectoryTest, ADirectoryInsteadOfAFileGives2)
{
    EXPECT_EQ(2, ZipFile::readDirectory(dir.path().c_str(), entries));
    EXPECT_TRUE(entries.empty());
}

TEST_F(ZipDirectoryTest, LocalHeadersWithoutADirectoryGive2)
{
    EXPECT_EQ(2, codeOf(localBytes(reversedDirectory())));
    EXPECT_TRUE(entries.empty());
}

TEST_F(ZipDirectoryTest, AnArchiveThatEndsInsideAnEntryGives2)
{
    EXPECT_EQ(2, codeOf(zipBytes(reversedDirectory()).substr(0, 60)));
    EXPECT_TRUE(entries.empty());
}

TEST_F(ZipDirectoryTest, ACentralHeaderCutShorterThanALocalOneGives2)
{
    EXPECT_EQ(2, codeOf(headerBytes(CentralHeader()).substr(0, 29)));
}

TEST_F(ZipDirectoryTest, AnUnknownRecordGives3)
{
    ZipArchive archive = reversedDirectory();
    archive.end.comment = "c";
    for (const std::string signature : {"PK\x03\x03", "PK\x04\x04", "PK\x05\x06", "PK\x01\x04",
                                        "PK\x03\x02", "KP\x03\x04", "PP\x03\x04"}) {
        archive.items[1].local.signature = signature;

        EXPECT_EQ(3, codeOf(zipBytes(archive))) << signature;
        EXPECT_TRUE(entries.empty());
    }
}

TEST_F(ZipDirectoryTest, AnEmptyArchiveWithALongCommentGives3)
{
    ZipArchive archive;
    archive.end.comment = "12345678";

    EXPECT_EQ(3, codeOf(zipBytes(archive)));
}

TEST_F(ZipDirectoryTest, ANameOf2049BytesGives4)
{
    ZipArchive archive = {{storedItem("a", "1"), storedItem(std::string(2049, 'n'), "1")}};
    archive.end.comment = "c";

    EXPECT_EQ(4, codeOf(zipBytes(archive)));
    EXPECT_TRUE(entries.empty());
}

TEST_F(ZipDirectoryTest, ANameThatTheFileCutsShortGives5)
{
    ZipArchive archive = reversedDirectory();
    archive.items.back() = storedItem("whole", "");
    archive.items.back().local.nameLength = 6;

    EXPECT_EQ(5, codeOf(localBytes(archive)));
    EXPECT_TRUE(entries.empty());
}

TEST_F(ZipDirectoryTest, SizesThatFollowTheDataGive8)
{
    ZipArchive archive = reversedDirectory();
    archive.items[2].local.flags = 8;
    archive.items[2].local.crc = 0;
    archive.items[2].local.compressedSize = archive.items[2].local.uncompressedSize = 0;
    archive.end.comment = "c";

    EXPECT_EQ(8, codeOf(zipBytes(archive)));
    EXPECT_TRUE(entries.empty());
}

TEST_F(ZipDirectoryTest, TheNameIsReadBeforeTheSizesAreChecked)
{
    LocalHeader header;
    header.flags = 8;
    header.nameLength = 1;

    EXPECT_EQ(5, codeOf(headerBytes(header)));
}

// 2^31 and beyond.

TEST_F(ZipDirectoryTest, SizesOf2ToThe31AndMoreAreKept)
{
    ZipArchive archive = reversedDirectory();
    archive.items[0].central.compressedSize = 0x80000000U;
    archive.items[0].central.uncompressedSize = 0xFFFFFFFFU;

    ASSERT_EQ(FromDirectory, namesOf(archive));

    EXPECT_EQ(0x80000000U, entries[2].compressedSize);
    EXPECT_EQ(0xFFFFFFFFU, entries[2].uncompressedSize);
}

TEST_F(ZipDirectoryTest, TheScanCannotSkipDataOf2ToThe31OrMore)
{
    ZipArchive archive = reversedDirectory();
    archive.end.comment = "c";
    for (const std::uint32_t size : {0x80000000U, 0xFFFFFF00U, 0xFFFFFFFFU}) {
        archive.items[0].local.compressedSize = size;

        EXPECT_EQ(7, codeOf(zipBytes(archive))) << size;
        EXPECT_TRUE(entries.empty());
    }
}

TEST_F(ZipDirectoryTest, TheScanSkipsDataThatEndsJustBelow2ToThe31)
{
    LocalHeader header;
    header.name = "a";

    header.compressedSize = 0x7FFFFFFFU - 31;
    EXPECT_EQ(2, codeOf(headerBytes(header))); // nothing there

    header.compressedSize = 0x80000000U - 31;
    EXPECT_EQ(7, codeOf(headerBytes(header)));
}

/// A first entry that reaches to `second`, where another local header begins.
class FarHeaderTest : public ZipDirectoryTest {
protected:
    int codeOfFar(std::uint64_t offset, const std::string& second)
    {
        LocalHeader first;
        first.name = "a";
        first.compressedSize = static_cast<std::uint32_t>(offset) - 31;
        writeSparseFile(path, {{0, headerBytes(first)}, {offset, second}});
        return ZipFile::readDirectory(path.c_str(), entries);
    }

    LocalHeader far;
};

TEST_F(FarHeaderTest, AnExtraFieldThatEndsAt2ToThe31Gives6)
{
    far.name = "b";
    far.extra = std::string(100, 'x');

    EXPECT_EQ(6, codeOfFar(TwoGiB - 131, headerBytes(far)));
    EXPECT_TRUE(entries.empty());
}

TEST_F(FarHeaderTest, AnExtraFieldThatEndsBelow2ToThe31IsSkipped)
{
    far.name = "b";
    far.extra = std::string(100, 'x');

    EXPECT_EQ(0, codeOfFar(TwoGiB - 200, headerBytes(far) + headerBytes(CentralHeader())));

    EXPECT_EQ((Names{"a", "b"}), names());
    EXPECT_EQ(0x7FFFFFFFU - 68, entries[1].dataOffset);
}

TEST_F(FarHeaderTest, WithoutAnExtraFieldItIsTheDataThatCannotBeSkipped)
{
    far.name = "b";
    far.compressedSize = 1;

    EXPECT_EQ(7, codeOfFar(TwoGiB - 31, headerBytes(far) + "x"));
}

TEST_F(FarHeaderTest, AnEmptyEntryThatEndsAt2ToThe31NeedsNoSeek)
{
    far.name = "b";

    EXPECT_EQ(0, codeOfFar(TwoGiB - 31, headerBytes(far) + headerBytes(CentralHeader())));

    EXPECT_EQ((Names{"a", "b"}), names());
    EXPECT_EQ(0x80000000U, entries[1].dataOffset);
}

TEST_F(ZipDirectoryTest, ALocalHeaderJustBelow2ToThe31IsFoundThroughTheDirectory)
{
    const ZipItem item = storedItem("far", "data of far");
    CentralHeader central = item.central;
    central.localOffset = 0x7FFFFF00U;
    EndRecord end;
    end.entriesOnDisk = end.totalEntries = 1;
    end.directoryOffset = 10;
    writeSparseFile(path, {{10, headerBytes(central)},
                           {0x7FFFFF00U, headerBytes(item.local) + item.data},
                           {0x7FFFFFE0U, recordBytes(end)}});

    ASSERT_EQ(0, ZipFile::readDirectory(path.c_str(), entries));

    ASSERT_EQ((Names{"far"}), names());
    EXPECT_EQ(0x7FFFFF21U, entries[0].dataOffset);
}

TEST_F(ZipDirectoryTest, AnEndRecordBeyond2ToThe31LeadsToTheScan)
{
    ZipArchive archive = reversedDirectory();
    const std::string head = localBytes(archive);
    EndRecord end;
    end.entriesOnDisk = end.totalEntries = 1;
    end.directoryOffset = static_cast<std::uint32_t>(head.size());
    writeSparseFile(
        path, {{0, head + headerBytes(archive.items[0].central)}, {TwoGiB, recordBytes(end)}});

    ASSERT_EQ(0, ZipFile::readDirectory(path.c_str(), entries));

    EXPECT_EQ(FromScan, names());
}

// The archive as an object.

TEST_F(ZipDirectoryTest, AZipFileHoldsTheEntriesOfItsArchive)
{
    writeFile(path, zipBytes(reversedDirectory()));

    const ZipFile archive(path.c_str());

    ASSERT_EQ(3U, archive.entries().size());
    EXPECT_EQ("three", archive.entries()[0].name);
    EXPECT_EQ("one", archive.entries()[2].name);
}

TEST_F(ZipDirectoryTest, AZipFileOfAMissingArchiveIsEmpty)
{
    EXPECT_TRUE(ZipFile((dir / "missing").c_str()).entries().empty());
    EXPECT_TRUE(ZipFile(nullptr).entries().empty());
}

TEST_F(ZipDirectoryTest, AZipFileOfADamagedArchiveIsEmpty)
{
    writeFile(path, localBytes(reversedDirectory()));

    EXPECT_TRUE(ZipFile(path.c_str()).entries().empty());
}

TEST_F(ZipDirectoryTest, AZipFileKeepsNoFileOpen)
{
    writeFile(path, zipBytes(reversedDirectory()));
    const int before = dup(0);
    close(before);

    const ZipFile archive(path.c_str());

    const int after = dup(0); // the lowest free descriptor
    close(after);
    EXPECT_EQ(before, after);
}

TEST_F(ZipDirectoryTest, FindEntryGivesTheFirstOfItsName)
{
    ZipArchive archive = {{storedItem("a", "1"), storedItem("same", "22"), //
                           storedItem(std::string("same\0tail", 9), "333")}};
    writeFile(path, zipBytes(archive));
    const ZipFile file(path.c_str());

    const ZipEntry* const found = file.findEntry("same");

    ASSERT_NE(nullptr, found);
    EXPECT_EQ(&file.entries()[1], found);
    EXPECT_EQ(2U, found->compressedSize);
}

TEST_F(ZipDirectoryTest, FindEntryComparesEveryByte)
{
    writeFile(path, zipBytes({{storedItem("bin/Tool", "1")}}));
    const ZipFile file(path.c_str());

    for (const char* const name :
         {"bin/tool", "bin/Too", "bin/Tool2", "/bin/Tool", "./bin/Tool", "bin//Tool", "Tool", ""})
        EXPECT_EQ(nullptr, file.findEntry(name)) << name;
    EXPECT_EQ(nullptr, file.findEntry(std::string("bin/Tool\0", 9)));
    EXPECT_NE(nullptr, file.findEntry("bin/Tool"));
}

TEST_F(ZipDirectoryTest, ValidateGivesTheCodeOfTheDirectory)
{
    writeFile(path, zipBytes(reversedDirectory()));
    EXPECT_EQ(0, ZipFile::validate(path.c_str()));

    writeFile(path, localBytes(reversedDirectory()));
    EXPECT_EQ(2, ZipFile::validate(path.c_str()));

    EXPECT_EQ(1, ZipFile::validate((dir / "missing").c_str()));
    EXPECT_EQ(1, ZipFile::validate(nullptr));
}

} // namespace
