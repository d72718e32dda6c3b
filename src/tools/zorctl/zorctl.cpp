// zorctl: looks at, checks, plans and repairs installations of the ZOR toolkit.

#include "build_stamp.h"
#include "doctor.h"
#include "exit_status.h"
#include "plan.h"
#include "run.h"
#include "settings.h"
#include "status.h"
#include "verify.h"

#include <CLI/CLI.hpp>
#include <clocale>
#include <csignal>
#include <iostream>
#include <ostream>
#include <string>
#include <string_view>
#include <vector>

namespace {

constexpr const char* ExitTable =
    "Exit status: 0 as asked, 1 differences or damage, 2 could not check or wrong usage,\n"
    "3 no installation; of \"run\" also 65 package, 75 lock, 77 signature.";

/// The installer's library reports on its log stream; here, reports are our own.
std::ostream silence(nullptr);

/// What follows the first "--" of the command line of "plan" or "run": the installer's alone.
std::vector<std::string> afterDashes;

/// Cuts that off the command line; returns how many arguments are left.
int cutAfterDashes(int argc, char** argv)
{
    const std::string_view command = argc > 1 ? argv[1] : "";
    if (command != "plan" && command != "run")
        return argc;
    for (int at = 2; at < argc; ++at) {
        if (std::string_view(argv[at]) == "--") {
            afterDashes.assign(argv + at + 1, argv + argc);
            return at;
        }
    }
    return argc;
}

/// The command line of the installer: what `command` did not know, and what follows "--".
std::vector<std::string> installerArguments(const CLI::App& command)
{
    std::vector<std::string> arguments = command.remaining();
    arguments.insert(arguments.end(), afterDashes.begin(), afterDashes.end());
    return arguments;
}

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

/// Adds the subcommand "plan".
void addPlan(CLI::App& app, int& status)
{
    CLI::App* const command =
        app.add_subcommand("plan", "Tell what a run of wzorinst would do, without doing it");
    static PlanOptions options;
    command->add_flag("--json", options.json, "print JSON");
    command->add_flag("--files", options.files, "name all files");
    command
        ->add_option("--unchanged-exit", options.unchangedExit,
                     "the exit status if nothing would change")
        ->check(CLI::Range(0, 255));
    command->footer("Behind the options: i|r EXPLOITER and the options of wzorinst.");
    command->prefix_command();
    command->callback([command, &status] {
        options.arguments = installerArguments(*command);
        status = planRun(options);
    });
}

/// Adds the subcommand "run".
void addRun(CLI::App& app, int& status)
{
    CLI::App* const command = app.add_subcommand(
        "run", "Run wzorinst under a lock, with a log, on a package that was checked");
    static RunOptions options;
    command->add_option("--signers", options.signers,
                        "ask for a signature by one of these (see ssh-keygen(1), ALLOWED SIGNERS)");
    command->add_option("--signature", options.signature, "the signature, if not SPB.sig");
    command->add_option("--log-dir", options.logDirectory, "the directory of the log");
    command->add_option("--wait", options.wait, "how many seconds to wait for the lock")
        ->check(CLI::Range(0L, 1'000'000L));
    command->footer("Behind the options: -- i|r EXPLOITER and the options of wzorinst.");
    command->prefix_command();
    command->callback([command, &status] {
        options.arguments = installerArguments(*command);
        status = runInstaller(options);
    });
}

/// Adds the subcommand "doctor".
void addDoctor(CLI::App& app, int& status)
{
    CLI::App* const command =
        app.add_subcommand("doctor", "Tell what an interrupted run left, and put it right");
    static DoctorOptions options;
    command->add_flag("--apply", options.apply, "do what is to be done");
    command->add_flag("--json", options.json, "print JSON");
    command->add_option("--type", options.type, "the shared (global) or your own (local) one")
        ->check(CLI::IsMember({"global", "local"}));
    command->add_option("--home", options.home,
                        "where a first installation was interrupted, if not in the usual place");
    command->callback([&status] { status = examine(options); });
}

} // namespace

int main(int argc, char** argv)
{
    (void)std::setlocale(LC_ALL, "C"); // the start-up locale; cannot fail
    logstream = &silence;
    completeLayoutNames();
    (void)std::signal(SIGPIPE, SIG_IGN); // writes fail instead; programs we start get theirs back

    CLI::App app("Looks at, checks, plans and repairs installations of the ZOR toolkit.", "zorctl");
    app.footer(ExitTable);
    app.set_version_flag("--version", "zorctl " + zorBuildStamp);
    app.require_subcommand(1);
    int status = ExitAsAsked;
    addStatus(app, status);
    addVerify(app, status);
    addPlan(app, status);
    addRun(app, status);
    addDoctor(app, status);

    try {
        app.parse(cutAfterDashes(argc, argv), argv);
    } catch (const CLI::ParseError& error) {
        return app.exit(error) == 0 ? ExitAsAsked : ExitCouldNotCheck;
    }
    std::cout.flush();
    return std::cout ? status : ExitCouldNotCheck;
}
