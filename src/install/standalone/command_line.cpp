#include "command_line.h"

#include "build_stamp.h"
#include "safe_path.h"
#include "scoped.h"
#include "settings.h"
#include "text.h"

#include <algorithm>
#include <iostream>
#include <memory>
#include <string_view>
#include <utility>

#include <ext/stdio_filebuf.h>
#include <fcntl.h>

namespace {

constexpr std::string_view OptionsWithArgument = "dfsoc";
constexpr mode_t LogFileMode = 0666;

/// The valid providers of the file-system scanner, as a name list.
std::string providerList()
{
    std::string list;
    for (const char* const name :
         {"provider_standard", "provider_cache", "provider_cache2", "provider_cache3",
          "provider_remote_cache", "provider_remote_cache2"})
        appendToNameList(list, name);
    return list;
}

int invalidOption(const std::string& argument)
{
    std::cerr << "Invalid option: " << argument << '\n';
    return printUsage();
}

/// True for the path of one of the caller's descriptors, which is opened directly: "/dev/stdout",
/// "/dev/fd/63", "/proc/self/fd/1".
bool isDescriptorPath(std::string_view path)
{
    if (path == "/dev/stdout" || path == "/dev/stderr")
        return true;
    const std::size_t end = path.rfind('/') + 1; // of the directory, "/proc/<process>/fd/"
    if (path.empty() || path.find_first_not_of("0123456789", end) != std::string_view::npos)
        return false;
    const std::string_view directory = path.substr(0, end);
    if (directory == "/dev/fd/")
        return true;
    return directory.starts_with("/proc/") && directory.ends_with("/fd/") &&
           std::count(directory.begin(), directory.end(), '/') == 4 &&
           directory.find("/..") == std::string_view::npos;
}

/// Opens the log file at `path`; not open if that fails.
ScopedFd openLog(const std::string& path)
{
    if (isDescriptorPath(path))
        return ScopedFd(
            open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_NOCTTY | O_CLOEXEC, LogFileMode));
    WritableFile file;
    (void)openForWriting(path, Existing::Truncate, LogFileMode, file); // see redirectLog()
    return std::move(file.fd);
}

/// Makes the file at `path` the log stream. If it cannot be opened, everything that follows is
/// lost.
void redirectLog(const char* path)
{
    using Buffer = __gnu_cxx::stdio_filebuf<char>;
    static std::unique_ptr<Buffer> buffer; // lives to the end of the process, which flushes it
    static std::ostream stream(nullptr);

    stream.rdbuf(nullptr); // nothing is printed meanwhile
    ScopedFd file = openLog(path);
    buffer = file.isOpen() ? std::make_unique<Buffer>(file.release(), std::ios::out) : nullptr;
    stream.rdbuf(buffer.get()); // without a buffer, the stream is in its failed state
    logstream = &stream;
}

/// The state of one pass over the options.
class OptionParser {
public:
    OptionParser(int argc, char** argv, CommandLine& commandLine)
        : argc_(argc), argv_(argv), commandLine_(commandLine), providers_(providerList())
    {
    }

    /// Processes every option, from the fourth argument on; returns 0 or 1.
    int run()
    {
        for (at_ = 3; at_ < argc_; ++at_) {
            const int code = takeOption(argv_[at_]);
            if (code != 0)
                return code;
        }
        return 0;
    }

    [[nodiscard]] int installTypeChoices() const { return installTypeChoices_; }

private:
    int takeOption(const std::string& option)
    {
        if (option == "-eeo")
            extended_ = true;
        else if (option == "-norollback")
            norollback = true;
        else if (option.size() != 2 || option[0] != '-')
            return invalidOption(option);
        else if (!(extended_ && takeExtended(option[1])) && !takeSwitch(option[1]))
            return takeOptionWithArgument(option);
        return 0;
    }

    /// The options that "-eeo" unlocks; false for any other letter.
    bool takeExtended(char letter)
    {
        switch (letter) {
        case 'l':
        case 'g':
            localInstall = letter == 'l';
            ++installTypeChoices_;
            return true;
        case 'z':
            ignoreNonFatalErrors = true;
            return true;
        default:
            return false;
        }
    }

    /// The options without an argument; false for any other letter.
    bool takeSwitch(char letter)
    {
        switch (letter) {
        case 'r':
            enterSingleUserMode();
            createSingleUserModeFile = true;
            return true;
        case 'p':
            privateMode = true;
            commandLine_.privateAction = commandLine_.action;
            return true;
        case 'n':
            skipExploiterRegistration = true;
            return true;
        case 'v':
            debugMode = true;
            return true;
        default:
            return false;
        }
    }

    int takeOptionWithArgument(const std::string& option)
    {
        if (OptionsWithArgument.find(option[1]) == std::string_view::npos)
            return invalidOption(option);
        if (at_ + 1 == argc_) {
            std::cerr << "Missing argument for option: " << option << '\n';
            return printUsage();
        }
        return applyOption(option[1], argv_[++at_]);
    }

    int applyOption(char letter, const char* value)
    {
        switch (letter) {
        case 's':
            spbPackage = value;
            *logstream << "SPB file: " << value << '\n';
            return 0;
        case 'd':
            commandLine_.destDir = commandLine_.privatePath = value;
            *logstream << "Target directory: " << value << '\n';
            return 0;
        case 'f':
            return applyProvider(value);
        case 'c':
            new_log_path = value;
            custom_log_path_available = true;
            *logstream << "ZOR custom trace path: " << value << '\n';
            return 0;
        case 'o':
            redirectLog(value);
            break;
        default: // takeOptionWithArgument() accepts no other letter
            break;
        }
        return 0;
    }

    int applyProvider(const char* value)
    {
        // Deliberate: a text search, so a value that contains "|" can match across two names.
        if (!nameListContains(providers_, value)) {
            *logstream << "Invalid provider specified: " << value << '\n';
            return printUsage();
        }
        fileScannerMode = value;
        *logstream << "File scanner mode: " << value << '\n';
        return 0;
    }

    int argc_;
    char** argv_;
    int at_ = 0;
    CommandLine& commandLine_;
    std::string providers_;
    bool extended_ = false;
    int installTypeChoices_ = 0;
};

/// Checks what depends on several options.
int checkOptions(const CommandLine& commandLine, const OptionParser& options)
{
    if (privateMode && commandLine.privatePath.empty()) {
        std::cerr << "For privatePath -d parameter is mandatory\n";
        return 1;
    }
    if (options.installTypeChoices() > 1)
        *logstream << "Warning: install type has been specified multiple times\n";
    if (commandLine.action == 'i' && spbPackage.empty()) {
        *logstream << "Error: an SPB file is required to install or upgrade\n";
        return printUsage();
    }
    return 0;
}

} // namespace

int parseCommandLine(int argc, char** argv, CommandLine& commandLine)
{
    if (argc < 3)
        return printUsage();

    const std::string_view action = argv[1];
    if (action != "i" && action != "r") {
        std::cerr << "Invalid command: " << action << '\n';
        return printUsage();
    }
    commandLine.action = action[0];
    InstallRegistry& request = commandLine.request;
    request.exploiters = argv[2];
    request.version = stampVersion(zorBuildStamp);
    request.buildDate = stampBuildDate(zorBuildStamp);

    if (request.exploiters.find(':') != std::string::npos) {
        std::cerr << "Exploiter name must not contain ':'\n";
        return 1;
    }

    OptionParser options(argc, argv, commandLine);
    const int code = options.run();
    return code != 0 ? code : checkOptions(commandLine, options);
}

int fixDestination(CommandLine& commandLine, const std::string& defaultDir)
{
    std::string& destDir = commandLine.destDir;
    if (destDir.empty())
        destDir = defaultDir;
    if (destDir.empty()) {
        *logstream << "*** Error: no destination directory.\n";
        return printUsage();
    }
    if (destDir.back() == '/')
        destDir.pop_back();
    commandLine.request.homeDirectory = destDir;
    commandLine.request.configRootDirectory = destDir;
    return 0;
}

int printUsage()
{
    std::cout << "Usage: wzorinst i|r|t <exploiterID> [-o <log file>] [-s <spblock_path>] "
                 "[-d <target_dir>] [-f <fs_provider>] [-n] [-r]\n"
                 "\n"
                 "  i                 install/upgrade specified software package block\n"
                 "  r                 remove ZOR for specified exploiter\n"
                 "  t                 display install info\n"
                 "  <exploiterID>     name of exploiter that is installing/removing ZOR\n"
                 "  -s <spblock_path> full path of SPB file (required to install or upgrade)\n"
                 "  -o <log file>     redirect output to a file\n"
                 "  -d <target_dir>   directory where ZOR must be installed\n"
                 "  -f <fs_provider>  default provider for file system scanner\n"
                 "  -n                does not add <exploiterID> to the ZOR install registry\n"
                 "  -r                enable single user mode\n"
                 "  -p                private mode\n"
                 "  -c <target_path>  directory for ZOR trace files\n"
                 "\n";
    return 1;
}
