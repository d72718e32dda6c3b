#include "command_line_tool.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

/// A tool with one command, and what its command line gave.
struct Tool {
    std::shared_ptr<CLI::App> app = makeCommandLine("tool", "Does this and that.");
    std::string output;
    std::vector<std::string> files;
    bool json = false;
    CLI::App* make = nullptr;

    Tool()
    {
        make = addCommand(*app, "make", "make things",
                          "Makes things of many words, so many that the "
                          "line of their description has to be broken.");
        addOption(make, "-o", output, "what to make", {.required = true, .argument = "FILE"});
        addFlag(make, "--json", json, "print JSON");
        addOption(make, "FILE", files, "what to make it of", {.required = true});
    }
};

/// Exit status, standard output and standard error of a command line; -1 when there is work to do.
struct Outcome {
    int status;
    std::string output;
    std::string error;
};

Outcome run(Tool& tool, std::vector<const char*> arguments)
{
    arguments.insert(arguments.begin(), "/usr/bin/tool");
    testing::internal::CaptureStdout();
    testing::internal::CaptureStderr();
    const int status =
        parseCommandLine(*tool.app, static_cast<int>(arguments.size()), arguments.data())
            .value_or(-1);
    return {status, testing::internal::GetCapturedStdout(), testing::internal::GetCapturedStderr()};
}

constexpr const char* Usage = "usage: tool make [-h] -o FILE [--json] FILE [FILE ...]\n";

TEST(CommandLineTool, ARightCommandLineGivesWorkToDo)
{
    Tool tool;

    const Outcome outcome = run(tool, {"make", "a", "-o", "-", "b", "--json"});

    EXPECT_EQ(outcome.status, -1);
    EXPECT_EQ(outcome.output + outcome.error, "");
    EXPECT_EQ(tool.output, "-");
    EXPECT_EQ(tool.files, (std::vector<std::string>{"a", "b"}));
    EXPECT_TRUE(tool.json);
}

TEST(CommandLineTool, TheHelpNamesTheCommands)
{
    Tool tool;

    const Outcome outcome = run(tool, {"--help"});

    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.error, "");
    EXPECT_EQ(outcome.output, "usage: tool [-h] COMMAND ...\n"
                              "\n"
                              "Does this and that.\n"
                              "\n"
                              "commands:\n"
                              "    make              make things\n"
                              "\n"
                              "options:\n"
                              "  -h, --help          show this help and end\n"
                              "  --version           show the version and end\n");
}

TEST(CommandLineTool, TheHelpOfACommandNamesItsOptions)
{
    Tool tool;

    const Outcome outcome = run(tool, {"make", "-h"});

    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.error, "");
    EXPECT_EQ(
        outcome.output,
        std::string(Usage) +
            "\n"
            "Makes things of many words, so many that the line of their description has to be\n"
            "broken.\n"
            "\n"
            "arguments:\n"
            "  FILE                what to make it of\n"
            "\n"
            "options:\n"
            "  -h, --help          show this help and end\n"
            "  -o FILE             what to make\n"
            "  --json              print JSON\n");
}

TEST(CommandLineTool, TheVersionIsThatOfTheProject)
{
    Tool tool;

    const Outcome outcome = run(tool, {"--version"});

    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.output, "tool 9.2.30\n");
}

TEST(CommandLineTool, AWrongCommandLineGivesUsageAndStatus2)
{
    const struct {
        std::vector<const char*> arguments;
        std::string error;
    } cases[] = {
        {{}, "usage: tool [-h] COMMAND ...\ntool: error: a command is required\n"},
        {{"bake"},
         "usage: tool [-h] COMMAND ...\n"
         "tool: error: The following argument was not expected: bake\n"},
        {{"make", "a"}, std::string(Usage) + "tool make: error: -o is required\n"},
        {{"make", "a", "-o", "b", "--no\nsuch"},
         std::string(Usage) + "tool make: error: The following argument was not expected: "
                              "--no\\nsuch\n"},
    };
    for (const auto& wrong : cases) {
        Tool tool;

        const Outcome outcome = run(tool, wrong.arguments);

        EXPECT_EQ(outcome.status, 2);
        EXPECT_EQ(outcome.output, "");
        EXPECT_EQ(outcome.error, wrong.error);
    }
}

} // namespace
