#include "header_details.h"
#include "test_files.h"
#include "zip_builder.h"

#include <gtest/gtest.h>

#include <cerrno>

#include <fcntl.h>

namespace {

/// What readHeaderDetails() makes of some bytes.
struct Reading {
    int code = 0;
    std::vector<HeaderDetails> details;
    std::vector<std::string> lines; ///< of the findings
};

Reading readingOf(const std::string& bytes)
{
    const TempDir dir;
    writeFile(dir / "archive", bytes);
    const ScopedFd file(open((dir / "archive").c_str(), O_RDONLY | O_CLOEXEC));
    Findings findings;
    Reading reading;
    reading.code = readHeaderDetails(file.get(), findings, reading.details);
    for (const Finding& finding : findings.kept())
        reading.lines.push_back(finding.line());
    return reading;
}

using Lines = std::vector<std::string>;

constexpr const char* NotUsed = "; the central directory is not used, only the local headers are";

TEST(HeaderDetails, ASoundArchiveHasNoFindings)
{
    const Reading reading = readingOf(zipBytes({{storedItem("a", "1"), storedItem("b", "2")}}));

    EXPECT_EQ(reading.code, 0);
    EXPECT_EQ(reading.details.size(), 2U);
    EXPECT_EQ(reading.lines, Lines());
}

TEST(HeaderDetails, TheFlagsAreThoseOfTheCentralDirectory)
{
    ZipArchive archive = {{storedItem("a", "1")}};
    archive.items[0].central.flags = 1;

    const Reading reading = readingOf(zipBytes(archive));

    ASSERT_EQ(reading.details.size(), 1U);
    EXPECT_EQ(reading.details[0].flags, 1U);
}

TEST(HeaderDetails, ANameThatDiffersIsKept)
{
    ZipArchive archive = {{storedItem("a", "1")}};
    archive.items[0].central.name = "b";

    const Reading reading = readingOf(zipBytes(archive));

    ASSERT_EQ(reading.details.size(), 1U);
    EXPECT_EQ(reading.details[0].centralName, "b");
    EXPECT_EQ(reading.details[0].wholeName, std::nullopt);
}

TEST(HeaderDetails, ANameWithANulIsKeptWhole)
{
    const std::string name("a\0b", 3);

    const Reading reading = readingOf(zipBytes({{storedItem(name, "1")}}));

    ASSERT_EQ(reading.details.size(), 1U);
    EXPECT_EQ(reading.details[0].wholeName, name);
}

TEST(HeaderDetails, AnArchiveCommentHidesTheCentralDirectory)
{
    ZipArchive archive = {{storedItem("a", "1")}};
    archive.end.comment = "hello";

    const Reading reading = readingOf(zipBytes(archive));

    EXPECT_EQ(reading.details.size(), 1U); // of the local headers
    EXPECT_EQ(
        reading.lines,
        Lines{std::string("surprises: archive-comment: the archive has a comment") + NotUsed});
}

TEST(HeaderDetails, MethodsThatDifferLeaveTheLocalHeaders)
{
    ZipArchive archive = {{storedItem("a", "1")}};
    archive.items[0].central.method = 8;

    const Reading reading = readingOf(zipBytes(archive));

    EXPECT_EQ(reading.lines,
              Lines{std::string("surprises: method-differs: a: its local header says method 0, the "
                                "central directory 8") +
                    NotUsed});
}

TEST(HeaderDetails, EntriesThatAreNotCountedAreReported)
{
    ZipArchive archive = {{storedItem("a", "1"), storedItem("b", "2")}};
    archive.end.entriesOnDisk = archive.end.totalEntries = 1;

    const Reading reading = readingOf(zipBytes(archive));

    EXPECT_EQ(reading.details.size(), 1U);
    EXPECT_EQ(reading.lines,
              Lines{"surprises: entries-not-counted: the end record counts 1 entries; the "
                    "installer does not see those after them"});
}

TEST(HeaderDetails, ASizeBehindTheDataNeedsACentralDirectory)
{
    ZipArchive archive = {{storedItem("a", "1")}};
    archive.items[0].local.flags = 8;
    archive.items[0].local.crc = 0;
    archive.items[0].local.compressedSize = archive.items[0].local.uncompressedSize = 0;
    archive.end.comment = "hello";

    const Reading reading = readingOf(zipBytes(archive));

    EXPECT_EQ(reading.details.size(), 0U);
    ASSERT_EQ(reading.lines.size(), 2U);
    EXPECT_EQ(reading.lines[1], "fails: unknown-size: a: its size follows its data, and no usable "
                                "central directory states it");
}

TEST(HeaderDetails, WhatIsNoArchiveHasNoDetails)
{
    const Reading reading = readingOf("no archive");

    EXPECT_EQ(reading.code, 0);
    EXPECT_EQ(reading.details.size(), 0U);
    ASSERT_EQ(reading.lines.size(), 2U);
    EXPECT_EQ(reading.lines[1], "fails: unreadable: the installer finds no package: at byte 0, the "
                                "file ends before a central directory");
}

TEST(HeaderDetails, AMillionEntriesAreTooMany)
{
    std::string bytes;
    const std::string header = headerBytes(storedItem("", "").local);
    bytes.reserve(header.size() * 1000001);
    for (int i = 0; i < 1000001; ++i)
        bytes += header;

    EXPECT_EQ(readingOf(bytes).code, EFBIG);
}

} // namespace
