#include "command_line_tool.h"

#include "exit_status.h"
#include "shown_text.h"
#include "tool_output.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <iostream>
#include <sstream>
#include <vector>

namespace {

constexpr std::size_t LineWidth = 80;
constexpr std::size_t HelpColumn = 22; // where what an option does begins

std::string dashedName(const CLI::Option& option)
{
    return option.get_snames().empty() ? "--" + option.get_lnames().front()
                                       : "-" + option.get_snames().front();
}

/// The option and its argument: "-o FILE", "--json", "DIR".
std::string synopsisOf(const CLI::Option& option)
{
    if (option.get_positional())
        return option.get_name(true);
    const bool takesValue = option.get_items_expected_max() > 0;
    return dashedName(option) + (takesValue ? " " + option.get_type_name() : "");
}

std::string usageWord(const CLI::Option& option)
{
    std::string word = synopsisOf(option);
    if (option.get_positional() && option.get_items_expected_max() > 1)
        word += " [" + word + " ...]";
    return option.get_required() ? word : "[" + word + "]";
}

std::string fullName(const CLI::App* app)
{
    const CLI::App* const parent = app->get_parent();
    return parent == nullptr ? app->get_name() : fullName(parent) + " " + app->get_name();
}

std::vector<const CLI::Option*> optionsOf(const CLI::App* app, bool positional)
{
    return app->get_options(
        [&](const CLI::Option* option) { return option->get_positional() == positional; });
}

std::string usageOf(const CLI::App* app)
{
    std::string text = "usage: " + fullName(app);
    if (!app->get_subcommands([](const CLI::App*) { return true; }).empty())
        return text + " [-h] COMMAND ...\n";
    for (const bool positional : {false, true}) {
        for (const CLI::Option* option : optionsOf(app, positional))
            text += " " + usageWord(*option);
    }
    return text + (app->get_prefix_command() ? " ARGUMENT ...\n" : "\n");
}

/// `text` in lines of at most LineWidth, each indented by `indent` but the first, which begins at
/// `column`.
std::string wrapped(const std::string& text, std::size_t column, std::size_t indent)
{
    std::istringstream words(text);
    std::string result;
    std::string word;
    bool first = true;
    while (words >> word) {
        if (!first && column + 1 + word.size() > LineWidth) {
            result += "\n" + std::string(indent, ' ');
            column = indent;
        } else if (!first) {
            result += ' ';
            ++column;
        }
        result += word;
        column += word.size();
        first = false;
    }
    return result + "\n";
}

std::string helpLine(const std::string& indent, const std::string& what, const std::string& text)
{
    std::string line = indent + what;
    if (line.size() + 2 > HelpColumn)
        line += "\n" + std::string(HelpColumn, ' ');
    else
        line.resize(HelpColumn, ' ');
    return line + wrapped(text, HelpColumn, HelpColumn);
}

/// Both names of an option: "-h, --help".
std::string namesOf(const CLI::Option& option)
{
    std::string names = synopsisOf(option);
    if (!option.get_positional() && !option.get_snames().empty() && !option.get_lnames().empty())
        names += ", --" + option.get_lnames().front();
    return names;
}

std::string helpOf(const CLI::App* app, const std::string& /*name*/, CLI::AppFormatMode /*mode*/)
{
    std::string text = usageOf(app) + "\n" + wrapped(app->get_description(), 0, 0);

    const auto arguments = optionsOf(app, true);
    if (!arguments.empty())
        text += "\narguments:\n";
    for (const CLI::Option* option : arguments)
        text += helpLine("  ", namesOf(*option), option->get_description());

    const auto commands = app->get_subcommands([](const CLI::App*) { return true; });
    if (!commands.empty())
        text += "\ncommands:\n";
    for (const CLI::App* command : commands)
        text += helpLine("    ", command->get_name(), command->get_footer());

    text += "\noptions:\n";
    for (const CLI::Option* option : optionsOf(app, false))
        text += helpLine("  ", namesOf(*option), option->get_description());
    if (app->get_parent() == nullptr && !app->get_footer().empty())
        text += "\n" + wrapped(app->get_footer(), 0, 0);
    return text;
}

/// The command that the parser had reached.
const CLI::App* reachedCommand(const CLI::App* app)
{
    const auto parsed = app->get_subcommands();
    return parsed.empty() ? app : reachedCommand(parsed.back());
}

int wrongUsage(const CLI::App* command, const std::string& message)
{
    std::cerr << usageOf(command) << fullName(command) << ": error: " << shown(message) << '\n';
    return ToolTrouble;
}

void applyRules(CLI::Option* option, const OptionRules& rules)
{
    option->required(rules.required);
    if (rules.argument != nullptr)
        option->type_name(rules.argument);
    if (!rules.choices.empty())
        option->check(CLI::IsMember(rules.choices).description(""));
    if (rules.objection)
        option->check(CLI::Validator(
            [objection = rules.objection](std::string& value) { return objection(value); }, ""));
}

} // namespace

std::shared_ptr<CLI::App> makeCommandLine(const std::string& name, const std::string& description,
                                          const std::string& epilog)
{
    auto app = std::make_shared<CLI::App>(description, name);
    app->footer(epilog);
    return app;
}

CLI::App* addCommand(CLI::App& app, const std::string& name, const std::string& summary,
                     const std::string& description)
{
    CLI::App* const command = app.add_subcommand(name, description);
    command->footer(summary); // helpOf() shows it in the list of commands and nowhere else
    command->set_help_flag("-h,--help", "show this help and end");
    return command;
}

void addFlag(CLI::App* command, const std::string& names, bool& value, const std::string& text)
{
    command->add_flag(names, value, text);
}

void addOption(CLI::App* command, const std::string& names, std::string& value,
               const std::string& text, const OptionRules& rules)
{
    applyRules(command->add_option(names, value, text), rules);
}

void addOption(CLI::App* command, const std::string& names, std::vector<std::string>& values,
               const std::string& text, const OptionRules& rules)
{
    CLI::Option* const option = command->add_option(names, values, text);
    if (!option->get_positional())
        option->take_all()->expected(1);
    applyRules(option, rules);
}

void addNumber(CLI::App* command, const std::string& names, int& value, const std::string& text,
               int most, const char* argument)
{
    CLI::Option* const option = command->add_option(names, value, text);
    option->check(CLI::Range(0, most).description(""))->type_name(argument);
}

void allowMore(CLI::App* command)
{
    command->prefix_command();
}

std::vector<std::string> remaining(const CLI::App* command)
{
    return command->remaining();
}

std::optional<int> parseCommandLine(CLI::App& app, int argc, const char* const* argv)
{
    toolName = app.get_name();
    app.set_help_flag("-h,--help", "show this help and end");
    app.set_version_flag("--version", toolName + " " TOOL_VERSION, "show the version and end");
    app.require_subcommand(0, 1); // none is reported below: so an unknown one is named
    app.formatter_fn(helpOf);
    for (CLI::App* command : app.get_subcommands([](CLI::App*) { return true; }))
        command->formatter_fn(helpOf);

    try {
        app.parse(argc, argv);
        if (app.get_subcommands().empty())
            return wrongUsage(&app, "a command is required");
        return std::nullopt;
    } catch (const CLI::Success& asked) { // help or version
        return finishOutput(app.exit(asked), ToolTrouble, "help");
    } catch (const CLI::ParseError& error) {
        return wrongUsage(reachedCommand(&app), error.what());
    }
}

int runTool(CLI::App& app, const std::vector<ToolCommand>& commands, int argc,
            const char* const* argv)
{
    if (const std::optional<int> status = parseCommandLine(app, argc, argv))
        return *status;
    for (const ToolCommand& one : commands) {
        if (one.command->parsed())
            return finishOutput(one.run(), one.trouble, one.command->get_name());
    }
    return ToolTrouble;
}
