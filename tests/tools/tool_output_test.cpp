#include "tool_output.h"

#include <gtest/gtest.h>

#include <cerrno>

namespace {

TEST(ToolOutput, MessagesBeginWithTheToolsName)
{
    toolName = "tool";
    testing::internal::CaptureStderr();

    complain("first");
    complainOf("a\nb", ENOENT);

    EXPECT_EQ(testing::internal::GetCapturedStderr(),
              "tool: first\ntool: a\\nb: No such file or directory\n");
}

TEST(ToolOutput, JsonKeepsTheOrderOfItsMembers)
{
    Json list = Json::array();
    list.push_back(true);
    list.push_back(nullptr);
    testing::internal::CaptureStdout();

    printJson({{"z", 1}, {"a", list}});

    EXPECT_EQ(testing::internal::GetCapturedStdout(),
              "{\n  \"z\": 1,\n  \"a\": [\n    true,\n    null\n  ]\n}\n");
}

TEST(ToolOutput, AStatusStaysWhenAllOutputIsWritten)
{
    EXPECT_EQ(finishOutput(1, 2, "tool"), 1);
}

} // namespace
