// zorctl: looks at, checks, plans and repairs installations of the ZOR toolkit.

#include "build_stamp.h"
#include "exit_status.h"
#include "settings.h"
#include "status.h"
#include "verify.h"

#include <CLI/CLI.hpp>
#include <clocale>
#include <iostream>
#include <ostream>
#include <string>

namespace {

constexpr const char* ExitTable =
    "Exit status: 0 as asked, 1 differences or damage, 2 could not check or wrong usage,\n"
    "3 no installation; of \"run\" also 65 package, 75 lock, 77 signature.";

/// The installer's library reports on its log stream; here, reports are our own.
std::ostream silence(nullptr);

/// Adds the subcommand "status", which puts its result into `status`.
void addStatus(CLI::App& app, int& status)
{
    CLI::App* const command =
        app.add_subcommand("status", "Show what is installed and whether it is intact");
    static StatusOptions options;
    static bool json = false;
    command->add_option("--format", options.format, "text (the default), json or shell")
        ->check(CLI::IsMember({"text", "json", "shell"}));
    command->add_flag("--json", json, "the same as --format json");
    command->add_flag("--all-users", options.allUsers, "also the installations of all users");
    command->add_option("--type", options.type, "only the shared (global) or per-user (local) ones")
        ->check(CLI::IsMember({"global", "local"}));
    command->add_option("--exploiter", options.exploiter, "only installations that it uses");
    command->callback([&status] {
        if (json)
            options.format = "json";
        status = showStatusReport(options);
    });
}

/// Adds the subcommand "verify".
void addVerify(CLI::App& app, int& status)
{
    CLI::App* const command =
        app.add_subcommand("verify", "Compare the installation with its package or its index");
    static VerifyOptions options;
    command->add_option("SPB", options.spb, "the package; without it, the index is compared with");
    command->add_flag("--json", options.json, "print JSON");
    command->add_option("--type", options.type, "the shared (global) or your own (local) one")
        ->check(CLI::IsMember({"global", "local"}));
    command->add_flag("--no-foreign", options.noForeign, "leave out files that nobody installed");
    command->add_flag("--no-customised", options.noCustomised, "leave out changed settings");
    command->add_flag("--strict", options.strict, "end with 1 for these two as well");
    command->callback([&status] { status = verifyInstallation(options); });
}

} // namespace

int main(int argc, char** argv)
{
    (void)std::setlocale(LC_ALL, "C"); // the start-up locale; cannot fail
    logstream = &silence;
    completeLayoutNames();

    CLI::App app("Looks at, checks, plans and repairs installations of the ZOR toolkit.", "zorctl");
    app.footer(ExitTable);
    app.set_version_flag("--version", std::string("zorctl ") + zorBuildStamp);
    app.require_subcommand(1);
    int status = ExitAsAsked;
    addStatus(app, status);
    addVerify(app, status);

    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError& error) {
        return app.exit(error) == 0 ? ExitAsAsked : ExitCouldNotCheck;
    }
    std::cout.flush();
    return std::cout ? status : ExitCouldNotCheck;
}
