#include "file_reading.h"
#include "scoped.h"
#include "test_files.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <string>
#include <vector>

namespace {

class ReadLineTest : public testing::Test {
protected:
    /// The lines of a file of this content.
    std::vector<std::string> linesOf(const std::string& content)
    {
        writeFile(dir / "file", content);
        const ScopedFile file(std::fopen((dir / "file").c_str(), "r"));
        std::vector<std::string> lines;
        std::string line;
        while (readLine(file.get(), line))
            lines.push_back(line);
        return lines;
    }

    TempDir dir;
};

using Lines = std::vector<std::string>;

TEST_F(ReadLineTest, LinesComeWithoutTheirNewlines)
{
    EXPECT_EQ((Lines{"a", "", " b "}), linesOf("a\n\n b \n"));
}

TEST_F(ReadLineTest, ALastLineWithoutANewlineCounts)
{
    EXPECT_EQ((Lines{"a", "b"}), linesOf("a\nb"));
}

TEST_F(ReadLineTest, AnEmptyFileHasNoLines)
{
    EXPECT_EQ(Lines{}, linesOf(""));
    EXPECT_EQ(Lines{""}, linesOf("\n"));
}

TEST_F(ReadLineTest, NulAndCarriageReturnAreOrdinaryBytes)
{
    EXPECT_EQ((Lines{std::string("a\0b\r", 4), "\xFF"}), linesOf(std::string("a\0b\r\n\xFF", 6)));
}

TEST_F(ReadLineTest, ALineMayBeOfAnyLength)
{
    const std::string line(100000, 'x');

    EXPECT_EQ((Lines{line, line}), linesOf(line + "\n" + line));
}

TEST_F(ReadLineTest, AFailedReadGivesNoLine)
{
    const ScopedFile file(
        std::fopen(dir.path().c_str(), "r")); // a directory can be opened, but not read
    ASSERT_NE(nullptr, file);
    std::string line = "kept from before";

    EXPECT_FALSE(readLine(file.get(), line));
    EXPECT_NE(0, std::ferror(file.get()));
    EXPECT_EQ("", line);
}

} // namespace
