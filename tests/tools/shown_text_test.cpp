#include "shown_text.h"

#include <gtest/gtest.h>

namespace {

TEST(ShownText, OrdinaryCharactersStayAsTheyAre)
{
    EXPECT_EQ(shown(""), "");
    EXPECT_EQ(shown("bin/a b\\c"), "bin/a b\\c");
    EXPECT_EQ(shown("gr\xc3\xb6\xc3\x9f\x65 \xe2\x82\xac \xf0\x9f\x98\x80"),
              "gr\xc3\xb6\xc3\x9f\x65 \xe2\x82\xac \xf0\x9f\x98\x80");
}

TEST(ShownText, ControlCharactersAreEscaped)
{
    EXPECT_EQ(shown("a\nb\tc\rd"), "a\\nb\\tc\\rd");
    EXPECT_EQ(shown(std::string_view("\0\x1b[m\x7f", 5)), "\\x00\\x1b[m\\x7f");
    EXPECT_EQ(shown("\xc2\x85"), "\\x85"); // a control character of two bytes
}

TEST(ShownText, CharactersThatDoNotShowAreEscaped)
{
    EXPECT_EQ(shown("\xe2\x80\xae"), "\\u202e");         // right-to-left override
    EXPECT_EQ(shown("\xef\xbb\xbf"), "\\ufeff");         // byte order mark
    EXPECT_EQ(shown("\xf3\xa0\x80\x81"), "\\U000e0001"); // a tag
}

TEST(ShownText, BytesOfNoCharacterAreEscapedOneByOne)
{
    EXPECT_EQ(shown("a\xff"), "a\\xff");
    EXPECT_EQ(shown("\xc3"), "\\xc3");                            // cut short
    EXPECT_EQ(shown("\xc3("), "\\xc3(");                          // not continued
    EXPECT_EQ(shown("\xc0\x80"), "\\xc0\\x80");                   // longer than needed
    EXPECT_EQ(shown("\xe0\x80\x80"), "\\xe0\\x80\\x80");          // the same in three bytes
    EXPECT_EQ(shown("\xed\xa0\x80"), "\\xed\\xa0\\x80");          // half of a pair
    EXPECT_EQ(shown("\xf4\x90\x80\x80"), "\\xf4\\x90\\x80\\x80"); // beyond the last character
}

TEST(JsonText, OnlyBytesOfNoCharacterAreEscaped)
{
    EXPECT_EQ(jsonText("a\n\x1b\\\xc3\xb6\xff"), "a\n\x1b\\\xc3\xb6\\xff");
}

} // namespace
