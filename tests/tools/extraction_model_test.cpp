#include "extraction_model.h"

#include <gtest/gtest.h>

#include <string>

namespace {

TEST(ExtractionModel, AFileNeedsItsDirectory)
{
    ExtractionModel model;

    EXPECT_EQ(model.writeFile("bin/a"), "missing-directory");
    EXPECT_EQ(model.makeDirectories("config/"), "");
    EXPECT_EQ(model.writeFile("config/a"), "");
    EXPECT_TRUE(model.hasFile("config/a"));
}

TEST(ExtractionModel, WhatWasMissingIsThereFromThenOn)
{
    ExtractionModel model;

    EXPECT_EQ(model.writeFile("bin/a"), "missing-directory");
    EXPECT_EQ(model.writeFile("bin/b"), "");
}

TEST(ExtractionModel, AFileIsNoDirectory)
{
    ExtractionModel model;
    (void)model.makeDirectories("bin/");
    (void)model.writeFile("bin/a");

    EXPECT_EQ(model.makeDirectories("bin/a/b/"), "not-a-directory");
    EXPECT_EQ(model.writeFile("bin/a/b"), "not-a-directory");
}

TEST(ExtractionModel, AFileThatIsReplacedBecomesItsBackup)
{
    ExtractionModel model;
    (void)model.makeDirectories("bin/");
    (void)model.writeFile("bin/a");

    EXPECT_EQ(model.writeFile("bin/a"), "duplicate");
    EXPECT_TRUE(model.hasFile("bin/a"));
    EXPECT_TRUE(model.hasFile("bin/a.bak"));
}

TEST(ExtractionModel, ADirectoryAtTheBackupsPlaceBlocksIt)
{
    ExtractionModel model;
    (void)model.makeDirectories("bin/a.bak/");
    (void)model.writeFile("bin/a");

    EXPECT_EQ(model.writeFile("bin/a"), "backup-blocked");
}

TEST(ExtractionModel, ADirectoryThatIsReplacedMovesWithWhatIsInIt)
{
    ExtractionModel model;
    (void)model.makeDirectories("bin/a/b/");
    (void)model.writeFile("bin/a/b/c");

    EXPECT_EQ(model.writeFile("bin/a"), "replaces-directory");
    EXPECT_TRUE(model.hasFile("bin/a"));
    EXPECT_TRUE(model.hasFile("bin/a.bak/b/c"));
    EXPECT_FALSE(model.hasFile("bin/a/b/c"));
}

TEST(ExtractionModel, AFileCannotBeWrittenOverADot)
{
    ExtractionModel model;
    (void)model.makeDirectories("bin/");

    EXPECT_EQ(model.writeFile("bin/."), "dot-name");
    EXPECT_EQ(model.writeFile("bin/.."), "dot-name");
}

TEST(ExtractionModel, AComponentHas255BytesAtMost)
{
    ExtractionModel model;
    (void)model.makeDirectories("bin/");
    const std::string longest(255, 'a');

    EXPECT_EQ(model.writeFile("bin/" + longest), "");
    EXPECT_EQ(model.writeFile("bin/" + longest), "name-too-long"); // that of its backup
    EXPECT_EQ(model.writeFile("bin/" + longest + "a"), "name-too-long");
    EXPECT_EQ(model.makeDirectories("bin/" + longest + "a/"), "name-too-long");
}

TEST(ExtractionModel, WhatLeadsOutOfTheTargetIsNotFollowed)
{
    ExtractionModel model;

    EXPECT_EQ(model.makeDirectories("../bin/"), "");
    EXPECT_EQ(model.writeFile("../bin/a"), "");
    EXPECT_FALSE(model.hasFile("bin/a"));
}

TEST(ExtractionModel, AModelThatIsFullTakesNoMore)
{
    ExtractionModel model;
    (void)model.makeDirectories("bin/");
    for (std::size_t i = 1; i < ExtractionModel::MostNodes; ++i)
        (void)model.writeFile("bin/" + std::to_string(i));
    ASSERT_TRUE(model.isFull());

    (void)model.writeFile("bin/more");

    EXPECT_FALSE(model.hasFile("bin/more"));
}

} // namespace
