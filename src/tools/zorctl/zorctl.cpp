// zorctl: looks at, checks, plans and repairs installations of the ZOR toolkit.

#include "command_line_tool.h"
#include "descriptors.h"
#include "doctor.h"
#include "exit_status.h"
#include "plan.h"
#include "run.h"
#include "settings.h"
#include "status.h"
#include "verify.h"

#include <clocale>
#include <csignal>
#include <ostream>
#include <string>
#include <string_view>
#include <vector>

namespace {

constexpr const char* ExitTable =
    "Exit status: 0 as asked, 1 differences or damage, 2 could not check or wrong usage, "
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
std::vector<std::string> installerArguments(const CLI::App* command)
{
    std::vector<std::string> arguments = remaining(command);
    arguments.insert(arguments.end(), afterDashes.begin(), afterDashes.end());
    return arguments;
}

/// The options of all commands.
struct Options {
    StatusOptions status;
    bool statusJson = false;
    VerifyOptions verify;
    PlanOptions plan;
    RunOptions run;
    DoctorOptions doctor;
};

void addJson(CLI::App* command, bool& json)
{
    addFlag(command, "--json", json, "print JSON");
}

void addType(CLI::App* command, std::string& type, const char* text)
{
    addOption(command, "--type", type, text,
              {.argument = "global|local", .choices = {"global", "local"}});
}

ToolCommand addStatus(CLI::App& app, StatusOptions& options, bool& json)
{
    CLI::App* const command =
        addCommand(app, "status", "show what is installed and whether it is intact",
                   "Shows what is installed, for whom, and whether it is intact.");
    addOption(command, "--format", options.format,
              "text (the default), JSON, or assignments for eval",
              {.argument = "text|json|shell", .choices = {"text", "json", "shell"}});
    addFlag(command, "--json", json, "the same as --format json");
    addFlag(command, "--all-users", options.allUsers, "also the installations of all users");
    addType(command, options.type, "only the shared (global) or per-user (local) ones");
    addOption(command, "--exploiter", options.exploiter, "only installations that it uses",
              {.argument = "ID"});
    return {command,
            [&options, &json] {
                if (json)
                    options.format = "json";
                return showStatusReport(options);
            },
            ToolTrouble};
}

ToolCommand addVerify(CLI::App& app, VerifyOptions& options)
{
    CLI::App* const command =
        addCommand(app, "verify", "compare the installation with its package or its index",
                   "Compares the installation with its package or, without one, with its index.");
    addOption(command, "SPB", options.spb, "the package; without it, the index is compared with");
    addJson(command, options.json);
    addType(command, options.type, "the shared (global) or your own (local) one");
    addFlag(command, "--no-foreign", options.noForeign, "leave out files that nobody installed");
    addFlag(command, "--no-customised", options.noCustomised, "leave out changed settings");
    addFlag(command, "--strict", options.strict, "end with 1 for these two as well");
    return {command, [&options] { return verifyInstallation(options); }, ToolTrouble};
}

ToolCommand addPlan(CLI::App& app, PlanOptions& options)
{
    CLI::App* const command =
        addCommand(app, "plan", "report what a run of wzorinst would do, without doing it",
                   "Reports what a run of wzorinst would do, without doing it. After the options: "
                   "i|r EXPLOITER and the options of wzorinst.");
    addJson(command, options.json);
    addFlag(command, "--files", options.files, "name all files");
    addNumber(command, "--unchanged-exit", options.unchangedExit,
              "the exit status if nothing would change", 255, "N");
    allowMore(command);
    return {command,
            [command, &options] {
                options.arguments = installerArguments(command);
                return planRun(options);
            },
            ToolTrouble};
}

ToolCommand addRun(CLI::App& app, RunOptions& options)
{
    CLI::App* const command =
        addCommand(app, "run", "run wzorinst under a lock, with a log, on a checked package",
                   "Runs wzorinst under a lock, with a log, on a package that was checked. Behind "
                   "the options: -- i|r EXPLOITER and the options of wzorinst.");
    addOption(command, "--signers", options.signers,
              "ask for a signature by one of these (see ssh-keygen(1), ALLOWED SIGNERS)",
              {.argument = "FILE"});
    addOption(command, "--signature", options.signature, "the signature, if not SPB.sig",
              {.argument = "FILE"});
    addOption(command, "--log-dir", options.logDirectory, "the directory of the log",
              {.argument = "DIR"});
    addNumber(command, "--wait", options.wait, "how many seconds to wait for the lock", 1'000'000,
              "SECONDS");
    allowMore(command);
    return {command,
            [command, &options] {
                options.arguments = installerArguments(command);
                return runInstaller(options);
            },
            ToolTrouble};
}

ToolCommand addDoctor(CLI::App& app, DoctorOptions& options)
{
    CLI::App* const command =
        addCommand(app, "doctor", "report what an interrupted run left, and put it right",
                   "Reports what an interrupted run left, and what to do. Changes nothing without "
                   "--apply.");
    addFlag(command, "--apply", options.apply, "do what is to be done");
    addJson(command, options.json);
    addType(command, options.type, "the shared (global) or your own (local) one");
    addOption(command, "--home", options.home,
              "where a first installation was interrupted, if not in the usual place",
              {.argument = "DIR"});
    return {command, [&options] { return examine(options); }, ToolTrouble};
}

} // namespace

int main(int argc, char** argv)
{
    (void)std::setlocale(LC_ALL, "C"); // the start-up locale; cannot fail
    logstream = &silence;
    completeLayoutNames();
    openStandardDescriptors();
    (void)std::signal(SIGCHLD, SIG_DFL); // if ignored, no child can be waited for
    (void)std::signal(SIGPIPE, SIG_IGN); // writes fail instead; programs we start get theirs back

    const auto app = makeCommandLine(
        "zorctl", "Looks at, checks, plans and repairs installations of the ZOR toolkit.",
        ExitTable);
    Options options;
    return runTool(*app,
                   {
                       addStatus(*app, options.status, options.statusJson),
                       addVerify(*app, options.verify),
                       addPlan(*app, options.plan),
                       addRun(*app, options.run),
                       addDoctor(*app, options.doctor),
                   },
                   cutAfterDashes(argc, argv), argv);
}
