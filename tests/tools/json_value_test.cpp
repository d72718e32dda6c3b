#include "json_value.h"

#include <gtest/gtest.h>

#include <cstdint>

namespace {

TEST(JsonValue, MembersKeepTheirOrder)
{
    Json object = {{"b", 1}, {"a", "text"}};
    object["c"]["d"] = true;
    object["b"] = -2;

    EXPECT_EQ(object.dump(), R"({"b":-2,"a":"text","c":{"d":true}})");
}

TEST(JsonValue, ListsHoldEveryKindOfValue)
{
    Json list = Json::array();
    list.push_back(nullptr);
    list.push_back(UINT64_MAX);
    list.push_back(INT64_MIN);
    list.push_back({{"one", Json::array()}});

    EXPECT_EQ(list.dump(), R"([null,18446744073709551615,-9223372036854775808,{"one":[]}])");
}

TEST(JsonValue, ControlCharactersAndQuotesAreEscaped)
{
    EXPECT_EQ(Json("a\"\n\x1b\\").dump(), R"("a\"\n\u001b\\")");
}

TEST(JsonValue, WhatWasWrittenIsReadBack)
{
    const std::string text = R"({"b":[null,true,"x",-1,18446744073709551615],"a":{}})";
    Json value;

    ASSERT_TRUE(Json::parse(text, value));

    EXPECT_EQ(value.dump(), text);
    EXPECT_EQ(value["b"].list()->size(), 5u);
    EXPECT_TRUE(value["b"].list()->at(2) == "x");
    EXPECT_TRUE(value["none"].isNull());
}

TEST(JsonValue, WhatIsNoJsonIsNotRead)
{
    Json value = "before";

    for (const char* const text : {"", "{", "{\"a\":}", "[1] x"})
        EXPECT_FALSE(Json::parse(text, value)) << text;

    EXPECT_TRUE(value == "before");
}

TEST(JsonValue, AValueOfAnotherKindHasNoMembersAndNoText)
{
    const Json value = 1;

    EXPECT_TRUE(value["a"].isNull());
    EXPECT_EQ(value.text(), nullptr);
    EXPECT_EQ(value.list(), nullptr);
    EXPECT_EQ(value.boolean(), nullptr);
    EXPECT_FALSE(value == "1");
}

} // namespace
