#include "text.h"

#include <gtest/gtest.h>

#include <string>

namespace {

std::string trimmed(std::string text)
{
    trim(text);
    return text;
}

std::string trimmedRight(std::string text)
{
    trimRight(text);
    return text;
}

TEST(TrimTest, CutsBlanksTabsNewlinesAndCarriageReturnsAtBothEnds)
{
    EXPECT_EQ("a", trimmed(" \t\n\ra\r\n\t "));
    EXPECT_EQ("a", trimmed("a"));
    EXPECT_EQ("a b", trimmed("  a b"));
    EXPECT_EQ("a b", trimmed("a b  "));
}

TEST(TrimTest, KeepsOtherWhiteSpace)
{
    EXPECT_EQ("\va\f", trimmed(" \va\f "));
    EXPECT_EQ("\xA0", trimmed(" \xA0 "));
    EXPECT_EQ(std::string("\0a\0", 3), trimmed(std::string(" \0a\0 ", 5)));
}

TEST(TrimTest, LeavesATextOfBlanksAsItIs)
{
    EXPECT_EQ(" ", trimmed(" "));
    EXPECT_EQ(" \t\r\n", trimmed(" \t\r\n"));
    EXPECT_EQ("", trimmed(""));
}

TEST(TrimRightTest, CutsAtTheEndOnly)
{
    EXPECT_EQ(" a", trimmedRight(" a \t\r\n"));
    EXPECT_EQ(" a", trimmedRight(" a"));
    EXPECT_EQ("a\v", trimmedRight("a\v "));
}

TEST(TrimRightTest, EmptiesATextOfBlanks)
{
    EXPECT_EQ("", trimmedRight(" \t\r\n"));
    EXPECT_EQ("", trimmedRight(""));
}

TEST(NameListTest, EachNameGetsTwoSeparators)
{
    std::string list;
    appendToNameList(list, "bin/a");
    appendToNameList(list, "bin/b");

    EXPECT_EQ("|bin/a||bin/b|", list);
}

TEST(NameListTest, FindsWholeNamesOnly)
{
    EXPECT_TRUE(nameListContains("|a||b|", "a"));
    EXPECT_TRUE(nameListContains("|a||b|", "b"));
    EXPECT_FALSE(nameListContains("|ab|", "b"));
    EXPECT_FALSE(nameListContains("|ab|", "a"));
    EXPECT_FALSE(nameListContains("|a|", "A"));
    EXPECT_FALSE(nameListContains("a", "a"));
}

TEST(NameListTest, AnEmptyListHoldsNothing)
{
    EXPECT_FALSE(nameListContains("", "a"));
    EXPECT_FALSE(nameListContains("", ""));
}

TEST(NameListTest, AnEmptyNameIsFoundBetweenTwoNames)
{
    EXPECT_FALSE(nameListContains("|a|", ""));
    EXPECT_TRUE(nameListContains("|a||b|", ""));
}

TEST(NameListTest, ANameThatHoldsTheSeparatorMatchesAcrossNames)
{
    EXPECT_TRUE(nameListContains("|a||b|", "a||b"));
}

TEST(LineTest, TheKeyIsTheTrimmedTextBeforeTheFirstEqualsSign)
{
    EXPECT_EQ("a", keyOfLine("a=1"));
    EXPECT_EQ("a b", keyOfLine(" a b\t= c = d"));
    EXPECT_EQ("#a", keyOfLine("#a=1"));
    EXPECT_EQ("", keyOfLine("=1"));
}

TEST(LineTest, WithoutAnEqualsSignTheWholeTrimmedLineIsTheKey)
{
    EXPECT_EQ("a b", keyOfLine("  a b\r"));
    EXPECT_EQ("", keyOfLine(""));
}

TEST(LineTest, AKeyOfBlanksIsNotTrimmed)
{
    EXPECT_EQ("  ", keyOfLine("  =1"));
    EXPECT_EQ("  ", keyOfLine("  "));
}

TEST(LineTest, TheTextAfterTheFirstEqualsSignIsUnchanged)
{
    EXPECT_EQ(" b = c ", textAfterEquals("a= b = c "));
    EXPECT_EQ("", textAfterEquals("a="));
    EXPECT_EQ("", textAfterEquals("a"));
    EXPECT_EQ("", textAfterEquals(""));
}

TEST(ReplaceEachTest, EveryOccurrenceIsReplacedAndCounted)
{
    std::string text = "$(a)/x/$(a)$(a)";

    EXPECT_EQ(3, replaceEach(text, "$(a)", "long text"));
    EXPECT_EQ("long text/x/long textlong text", text);
}

TEST(ReplaceEachTest, WithoutAnOccurrenceNothingChanges)
{
    std::string text = "$(b) $(A)";

    EXPECT_EQ(0, replaceEach(text, "$(a)", "x"));
    EXPECT_EQ("$(b) $(A)", text);
}

TEST(ReplaceEachTest, TheReplacementMayBeEmpty)
{
    std::string text = "aXbX";

    EXPECT_EQ(2, replaceEach(text, "X", ""));
    EXPECT_EQ("ab", text);
}

TEST(ReplaceEachTest, WhatAReplacementFormsWithItsNeighboursIsReplacedToo)
{
    std::string text = "aab";

    EXPECT_EQ(2, replaceEach(text, "ab", "b")); // a[ab] gives ab, which gives b
    EXPECT_EQ("b", text);
}

} // namespace
