// spb: makes, lists, checks, compares, unpacks and signs SPBs, the packages that wzorinst installs.
#include "command_line_tool.h"
#include "descriptors.h"
#include "exit_status.h"
#include "findings.h"
#include "settings.h"
#include "subcommands.h"

#include <csignal>
#include <ostream>

namespace {

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
    SignatureOptions verify;
};

void addFile(CLI::App* command, std::string& file)
{
    addOption(command, "FILE", file, "the SPB", {.required = true});
}

void addJson(CLI::App* command, bool& json)
{
    addFlag(command, "--json", json, "print JSON");
}

void addAccept(CLI::App* command, std::vector<std::string>& codes)
{
    addOption(command, "--accept", codes, "ignore findings of this code; may be given again",
              {.argument = "CODE", .objection = [](const std::string& code) {
                   return kindOf(code) ? std::string() : "there is no code " + code;
               }});
}

ToolCommand addPack(CLI::App& app, PackOptions& options)
{
    CLI::App* const command = addCommand(
        app, "pack", "pack a tree into an SPB",
        "Packs the package directories (bin, properties, config, install) of DIR into an "
        "SPB. The same tree gives the same bytes. Refuses, with exit status 1, what the "
        "installer could not install; prints what \"check\" finds otherwise.");
    addOption(command, "-o", options.output, "the SPB; - for standard output",
              {.required = true, .argument = "FILE"});
    addFlag(command, "--stored", options.stored, "do not compress");
    addAccept(command, options.accepted);
    addOption(command, "DIR", options.tree, "the tree to pack", {.required = true});
    return {command, [&] { return packCommand(options); }, ToolDiffers};
}

ToolCommand addList(CLI::App& app, FileOptions& options)
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

ToolCommand addCheck(CLI::App& app, CheckOptions& options)
{
    CLI::App* const command = addCommand(
        app, "check", "report what would make an installation fail or surprise",
        "Reports what would make an installation of an SPB fail or surprise: one finding "
        "a line, with its kind and a code. Exit status 0 when there is none, 1 when the "
        "package would install, 2 when it would not, is damaged or cannot be read.");
    addAccept(command, options.accepted);
    addJson(command, options.json);
    addOption(command, "FILE", options.files, "the SPBs", {.required = true});
    return {command, [&] { return checkCommand(options); }, ToolTrouble};
}

ToolCommand addInfo(CLI::App& app, FileOptions& options)
{
    CLI::App* const command =
        addCommand(app, "info", "show sizes, digests and properties of an SPB",
                   "Shows the size and SHA-256 of an SPB and of each file in it, and which "
                   "properties an upgrade of its installation will add or blank.");
    addJson(command, options.json);
    addFile(command, options.file);
    return {command, [&] { return infoCommand(options); }, ToolTrouble};
}

ToolCommand addDiff(CLI::App& app, DiffOptions& options)
{
    CLI::App* const command = addCommand(
        app, "diff", "compare two SPBs",
        "Reports the files that were added, removed or changed between two SPBs, changed "
        "modes, and of property files the changed keys. Exit status 0 when there is no "
        "difference, 1 when there are some, 2 when an SPB cannot be read.");
    addJson(command, options.json);
    addOption(command, "FROM", options.from, "the older SPB", {.required = true});
    addOption(command, "TO", options.to, "the newer SPB", {.required = true});
    return {command, [&] { return diffCommand(options); }, ToolTrouble};
}

ToolCommand addExtract(CLI::App& app, ExtractOptions& options)
{
    CLI::App* const command = addCommand(
        app, "extract", "unpack an SPB into a directory",
        "Unpacks what the installer would install of an SPB into DIR, and writes nothing "
        "outside of it. No file is replaced. Exit status 1 when something could not be "
        "unpacked as it was packed.");
    addOption(command, "-d", options.directory, "where to; made when it is missing",
              {.required = true, .argument = "DIR"});
    addFile(command, options.file);
    return {command, [&] { return extractCommand(options); }, ToolTrouble};
}

ToolCommand addSbom(CLI::App& app, FileOptions& options)
{
    CLI::App* const command =
        addCommand(app, "sbom", "print a bill of materials (CycloneDX)",
                   "Prints a bill of materials of an SPB: CycloneDX in JSON, with the SHA-256 of "
                   "each file. The same SPB gives the same bytes.");
    addFile(command, options.file);
    return {command, [&] { return sbomCommand(options); }, ToolTrouble};
}

ToolCommand addSign(CLI::App& app, SignOptions& options)
{
    CLI::App* const command = addCommand(
        app, "sign", "sign an SPB with an SSH key",
        "Writes a detached signature, made by ssh-keygen -Y in the namespace \"spb\", to "
        "FILE.sig.");
    addOption(command, "-k", options.key, "the private key, or the public one of an agent's",
              {.required = true, .argument = "KEY"});
    addOption(command, "-o", options.output, "the signature; - for standard output",
              {.argument = "FILE"});
    addFile(command, options.file);
    return {command, [&] { return signCommand(options); }, ToolTrouble};
}

ToolCommand addVerify(CLI::App& app, SignatureOptions& options)
{
    CLI::App* const command =
        addCommand(app, "verify", "verify the signature of an SPB",
                   "Verifies the detached signature FILE.sig. Exit status 0 when an allowed signer "
                   "made it, 1 when not, 2 when that could not be found out.");
    addOption(command, "-s", options.signers, "who may sign, as in ssh-keygen(1)",
              {.required = true, .argument = "ALLOWED_SIGNERS"});
    addOption(command, "-i", options.signature, "the signature", {.argument = "SIGNATURE"});
    addJson(command, options.json);
    addFile(command, options.file);
    return {command, [&] { return verifyCommand(options); }, ToolTrouble};
}

} // namespace

int main(int argc, char** argv)
{
    openStandardDescriptors();
    (void)std::signal(SIGCHLD, SIG_DFL); // if ignored, no child can be waited for
    (void)std::signal(SIGPIPE, SIG_IGN); // a reader that went away is an error of writing
    static std::ostream silence(nullptr);
    logstream = &silence; // the installer's library reports here

    const auto app = makeCommandLine(
        "spb", "Makes, lists, checks, compares, unpacks and signs SPBs, the packages that wzorinst "
               "installs.");
    Options options;
    return runTool(*app,
                   {
                       addPack(*app, options.pack),
                       addList(*app, options.list),
                       addCheck(*app, options.check),
                       addInfo(*app, options.info),
                       addDiff(*app, options.diff),
                       addExtract(*app, options.extract),
                       addSbom(*app, options.sbom),
                       addSign(*app, options.sign),
                       addVerify(*app, options.verify),
                   },
                   argc, argv);
}
