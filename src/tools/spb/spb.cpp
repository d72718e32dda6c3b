// spb: makes, lists, checks, compares, unpacks and signs SPBs, the packages that wzorinst installs.
#include "command_line_tool.h"
#include "subcommands.h"
#include "exit_status.h"
#include "findings.h"
#include "settings.h"
#include "tool_output.h"

#include <csignal>
#include <functional>
#include <ostream>

namespace {

/// A command, what runs it, and its exit status when its output cannot be written.
struct Command {
    CLI::App* parsed;
    std::function<int()> run;
    int trouble;
};

/// The options of all commands.
struct Options {
    PackOptions pack;
    FileOptions list;
    CheckOptions check;
    FileOptions info;
    DiffOptions diff;
    ExtractOptions extract;
    FileOptions sbom;
    SignOptions sign;
    VerifyOptions verify;
};

void addFile(CLI::App* command, std::string& file)
{
    command->add_option("FILE", file, "the SPB")->required();
}

void addJson(CLI::App* command, bool& json)
{
    command->add_flag("--json", json, "print JSON");
}

void addAccept(CLI::App* command, std::vector<std::string>& codes)
{
    command->add_option("--accept", codes, "ignore findings of this code; may be given again")
        ->type_name("CODE")
        ->take_all()
        ->expected(1)
        ->check(CLI::Validator(
            [](const std::string& code) {
                return kindOf(code) ? std::string() : "there is no code " + code;
            },
            ""));
}

Command addPack(CLI::App& app, PackOptions& options)
{
    CLI::App* const command = addCommand(
        app, "pack", "pack a tree into an SPB",
        "Packs the package directories (bin, properties, config, install) of DIR into an "
        "SPB. The same tree gives the same bytes. Refuses, with exit status 1, what the "
        "installer could not install; prints what \"check\" finds otherwise.");
    command->add_option("-o", options.output, "the SPB; - for standard output")
        ->required()
        ->type_name("FILE");
    command->add_flag("--stored", options.stored, "do not compress");
    addAccept(command, options.accepted);
    command->add_option("DIR", options.tree, "the tree to pack")->required();
    return {command, [&] { return packCommand(options); }, ToolDiffers};
}

Command addList(CLI::App& app, FileOptions& options)
{
    CLI::App* const command = addCommand(
        app, "list", "list an SPB as the installer sees it",
        "Lists the entries of an SPB as the installer sees them: the mode and place that "
        "each has once the installation is complete, its size and its name. Entries that "
        "the installer passes over are marked. Exit status 1 when the installer would "
        "find no package in FILE.");
    addJson(command, options.json);
    addFile(command, options.file);
    return {command, [&] { return listCommand(options); }, ToolDiffers};
}

Command addCheck(CLI::App& app, CheckOptions& options)
{
    CLI::App* const command = addCommand(
        app, "check", "report what would make an installation fail or surprise",
        "Reports what would make an installation of an SPB fail or surprise: one finding "
        "a line, with its kind and a code. Exit status 0 when there is none, 1 when the "
        "package would install, 2 when it would not, is damaged or cannot be read.");
    addAccept(command, options.accepted);
    addJson(command, options.json);
    command->add_option("FILE", options.files, "the SPBs")->required();
    return {command, [&] { return checkCommand(options); }, ToolTrouble};
}

Command addInfo(CLI::App& app, FileOptions& options)
{
    CLI::App* const command =
        addCommand(app, "info", "show sizes, digests and properties of an SPB",
                   "Shows the size and SHA-256 of an SPB and of each file in it, and which "
                   "properties an upgrade of its installation will add or blank.");
    addJson(command, options.json);
    addFile(command, options.file);
    return {command, [&] { return infoCommand(options); }, ToolTrouble};
}

Command addDiff(CLI::App& app, DiffOptions& options)
{
    CLI::App* const command = addCommand(
        app, "diff", "compare two SPBs",
        "Reports the files that were added, removed or changed between two SPBs, changed "
        "modes, and of property files the changed keys. Exit status 0 when there is no "
        "difference, 1 when there are some, 2 when an SPB cannot be read.");
    addJson(command, options.json);
    command->add_option("FROM", options.from, "the older SPB")->required();
    command->add_option("TO", options.to, "the newer SPB")->required();
    return {command, [&] { return diffCommand(options); }, ToolTrouble};
}

Command addExtract(CLI::App& app, ExtractOptions& options)
{
    CLI::App* const command = addCommand(
        app, "extract", "unpack an SPB into a directory",
        "Unpacks what the installer would install of an SPB into DIR, and writes nothing "
        "outside of it. No file is replaced. Exit status 1 when something could not be "
        "unpacked as it was packed.");
    command->add_option("-d", options.directory, "where to; made when it is missing")
        ->required()
        ->type_name("DIR");
    addFile(command, options.file);
    return {command, [&] { return extractCommand(options); }, ToolTrouble};
}

Command addSbom(CLI::App& app, FileOptions& options)
{
    CLI::App* const command =
        addCommand(app, "sbom", "print a bill of materials (CycloneDX)",
                   "Prints a bill of materials of an SPB: CycloneDX in JSON, with the SHA-256 of "
                   "each file. The same SPB gives the same bytes.");
    addFile(command, options.file);
    return {command, [&] { return sbomCommand(options); }, ToolTrouble};
}

Command addSign(CLI::App& app, SignOptions& options)
{
    CLI::App* const command = addCommand(
        app, "sign", "sign an SPB with an SSH key",
        "Writes a detached signature, made by ssh-keygen -Y in the namespace \"spb\", to "
        "FILE.sig.");
    command->add_option("-k", options.key, "the private key, or the public one of an agent's")
        ->required()
        ->type_name("KEY");
    command->add_option("-o", options.output, "the signature; - for standard output")
        ->type_name("FILE");
    addFile(command, options.file);
    return {command, [&] { return signCommand(options); }, ToolTrouble};
}

Command addVerify(CLI::App& app, VerifyOptions& options)
{
    CLI::App* const command =
        addCommand(app, "verify", "verify the signature of an SPB",
                   "Verifies the detached signature FILE.sig. Exit status 0 when an allowed signer "
                   "made it, 1 when not, 2 when that could not be found out.");
    command->add_option("-s", options.signers, "who may sign, as in ssh-keygen(1)")
        ->required()
        ->type_name("ALLOWED_SIGNERS");
    command->add_option("-i", options.signature, "the signature")->type_name("SIGNATURE");
    addJson(command, options.json);
    addFile(command, options.file);
    return {command, [&] { return verifyCommand(options); }, ToolTrouble};
}

} // namespace

int main(int argc, char** argv)
{
    (void)std::signal(SIGPIPE, SIG_IGN); // a reader that went away is an error of writing
    static std::ostream silence(nullptr);
    logstream = &silence; // the installer's library reports here

    CLI::App app(
        "Makes, lists, checks, compares, unpacks and signs SPBs, the packages that wzorinst "
        "installs.",
        "spb");
    Options options;
    const Command commands[] = {
        addPack(app, options.pack), addList(app, options.list), addCheck(app, options.check),
        addInfo(app, options.info), addDiff(app, options.diff), addExtract(app, options.extract),
        addSbom(app, options.sbom), addSign(app, options.sign), addVerify(app, options.verify),
    };
    if (const std::optional<int> status = parseCommandLine(app, argc, argv))
        return *status;
    for (const Command& command : commands) {
        if (command.parsed->parsed())
            return finishOutput(command.run(), command.trouble, command.parsed->get_name());
    }
    return ToolTrouble;
}
