// The command line of a companion tool, by CLI11: usage and help in one form, and one exit status
// for every wrong command line.
//
//     CLI::App app("Packs and lists SPBs.", "spb");
//     CLI::App* pack = addCommand(app, "pack", "pack a tree into an SPB", "Packs ...");
//     pack->add_option("DIR", tree, "the tree to pack")->required();
//     pack->add_option("-o", output, "the SPB")->required()->type_name("FILE");
//     if (const std::optional<int> status = parseCommandLine(app, argc, argv))
//         return *status;
//     if (pack->parsed()) ...
#pragma once

#include <CLI/CLI.hpp>
#include <optional>
#include <string>

/// Adds the subcommand `name`: `summary` is its line in the help of the tool, `description` the
/// text of its own help.
CLI::App* addCommand(CLI::App& app, const std::string& name, const std::string& summary,
                     const std::string& description);

/// Parses the command line into the variables of the options of `app`, whose name becomes that of
/// the tool's messages. Options "-h", "--help" and "--version" are there by themselves.
///
/// Returns nothing when there is work to do; else the exit status: ToolOk (0) after help or version
/// on standard output, ToolTrouble (2) after usage and message on standard error.
[[nodiscard]] std::optional<int> parseCommandLine(CLI::App& app, int argc, const char* const* argv);
