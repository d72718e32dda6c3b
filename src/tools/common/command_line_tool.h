// The command line of a companion tool, by CLI11: usage and help in one form, and one exit status
// for every wrong command line.
//
// CLI11's header takes seconds to compile: only command_line_tool.cpp includes it.
//
//     const auto app = makeCommandLine("spb", "Packs and lists SPBs.");
//     CLI::App* pack = addCommand(*app, "pack", "pack a tree into an SPB", "Packs ...");
//     addOption(pack, "-o", output, "the SPB", {.required = true, .argument = "FILE"});
//     addOption(pack, "DIR", tree, "the tree to pack", {.required = true});
//     return runTool(*app, {{pack, [&] { return packTree(tree, output); }, ToolTrouble}}, argc,
//     argv);
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace CLI {
class App;
}

/// A command line without commands yet; `name` begins the tool's messages, `epilog` ends its help.
std::shared_ptr<CLI::App> makeCommandLine(const std::string& name, const std::string& description,
                                          const std::string& epilog = "");

/// Adds the subcommand `name`: `summary` is its line in the help of the tool, `description` the
/// text of its own help.
CLI::App* addCommand(CLI::App& app, const std::string& name, const std::string& summary,
                     const std::string& description);

/// What an option takes.
struct OptionRules {
    bool required = false;
    const char* argument = nullptr;        ///< the name of its argument in the help
    std::vector<std::string> choices = {}; ///< the values that it may have; empty: any
    std::function<std::string(const std::string&)> objection = {}; ///< empty for a good value
};

/// Adds an option that has no argument.
void addFlag(CLI::App* command, const std::string& names, bool& value, const std::string& text);

/// Adds an option with one argument, or an argument by itself where the name has no dash.
void addOption(CLI::App* command, const std::string& names, std::string& value,
               const std::string& text, const OptionRules& rules = {});

/// The same with several: of an option, one each time that it is given.
void addOption(CLI::App* command, const std::string& names, std::vector<std::string>& values,
               const std::string& text, const OptionRules& rules = {});

/// Adds an option whose argument is a number from 0 to `most`.
void addNumber(CLI::App* command, const std::string& names, int& value, const std::string& text,
               int most, const char* argument);

/// Lets `command` take any arguments: what begins with the first unknown one is remaining().
void allowMore(CLI::App* command);
[[nodiscard]] std::vector<std::string> remaining(const CLI::App* command);

/// Parses the command line into the variables of the options of `app`. Options "-h", "--help" and
/// "--version" are there by themselves.
///
/// Returns nothing when there is work to do; else the exit status: ToolOk (0) after help or version
/// on standard output, ToolTrouble (2) after usage and message on standard error.
[[nodiscard]] std::optional<int> parseCommandLine(CLI::App& app, int argc, const char* const* argv);

/// A command, what runs it, and its exit status when its output cannot be written.
struct ToolCommand {
    CLI::App* command;
    std::function<int()> run;
    int trouble;
};

/// parseCommandLine(), then the command that it names. Returns the exit status of the tool.
[[nodiscard]] int runTool(CLI::App& app, const std::vector<ToolCommand>& commands, int argc,
                          const char* const* argv);
