#include "run.h"

#include "child_process.h"
#include "exit_status.h"
#include "file_codes.h"
#include "file_operations.h"
#include "file_writing.h"
#include "installation_lock.h"
#include "locations.h"
#include "paths.h"
#include "plan.h"
#include "settings.h"
#include "shown_text.h"
#include "simulation.h"
#include "ssh_signature.h"
#include "time_stamps.h"
#include "tool_output.h"
#include "trusted_path.h"

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <iostream>
#include <sstream>

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

constexpr const char* SharedLogDirectory = "/var/log/zorctl";
constexpr const char* LocalLogDirectory = ".local/state/zorctl";
constexpr off_t SmallFileLimit = off_t{1} << 20; // a signature, a list of signers
constexpr off_t PackageLimit = off_t{1} << 31;   // what the installer can read ends there
constexpr int PackageFails = 2;                  // spb check: the package cannot be installed

/// A directory of our own, where nobody else can exchange it, that goes with everything in it when
/// this ends. Its path is empty if it could not be made.
class PrivateDirectory {
public:
    PrivateDirectory()
    {
        const char* const wanted = std::getenv("TMPDIR");
        for (const char* const place : {wanted != nullptr ? wanted : "", "/var/tmp", "/tmp"}) {
            const std::string directory = *place == '/' ? safeDirectory(place) : std::string();
            std::string name = joinPath(directory, "zorctl-XXXXXX");
            if (directory.empty() || mkdtemp(name.data()) == nullptr)
                continue;
            path_ = name;
            return;
        }
    }
    PrivateDirectory(const PrivateDirectory&) = delete;
    PrivateDirectory& operator=(const PrivateDirectory&) = delete;
    ~PrivateDirectory()
    {
        if (path_.empty())
            return;
        for (const char* const name : {"package.spb", "signature", "signers"})
            (void)unlink(joinPath(path_, name).c_str());
        (void)rmdir(path_.c_str());
    }

    [[nodiscard]] const std::string& path() const { return path_; }

private:
    std::string path_;
};

/// Copies the regular file `from`, of at most `limit` bytes, to the new file `to` of mode 0400.
/// Returns 0 or an `errno`.
int copyPrivately(const std::string& from, const std::string& to, off_t limit)
{
    const ScopedFd in(open(from.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
    if (!in.isOpen())
        return errno;
    struct stat status = {};
    if (fstat(in.get(), &status) != 0)
        return errno;
    if (!S_ISREG(status.st_mode))
        return EINVAL;
    ScopedFd out(open(to.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0400));
    if (!out.isOpen())
        return errno;
    static char block[1 << 16];
    off_t size = 0;
    for (;;) {
        const ssize_t count = read(in.get(), block, sizeof block);
        if (count < 0)
            return errno;
        if (count == 0)
            return closeWritten(out) == FileOk ? 0 : EIO;
        size += count;
        if (size > limit)
            return EFBIG;
        if (writeAll(out.get(), block, static_cast<std::size_t>(count)) != FileOk)
            return errno != 0 ? errno : EIO;
    }
}

/// The log of one run: a file of its own, named by the time and what was asked for.
class RunLog {
public:
    /// Opens the log in `directory`, which is created if it is missing.
    bool open(const std::string& directory, const std::string& action, const std::string& exploiter)
    {
        FileTransaction scratch; // never rolled back: the directory is for all logs
        const ScopedUmask mask(077);
        (void)createFullPath(scratch, directory, 0700, nullptr); // the open says so
        std::string name = localTimeStamp() + "-" + action + "-" + exploiter + "-" +
                           std::to_string(getpid()) + ".log";
        for (char& c : name) {
            if (c == '/' || static_cast<unsigned char>(c) < 0x20)
                c = '_';
        }
        path_ = joinPath(directory, name);
        file_ = ScopedFd(::open(
            path_.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_APPEND | O_NOFOLLOW | O_CLOEXEC, 0600));
        return file_.isOpen();
    }

    void line(const std::string& text)
    {
        const std::string whole = localTimeStamp() + " zorctl: " + shown(text) + "\n";
        (void)writeAll(file_.get(), whole.data(), whole.size()); // a full disk stops no run
    }

    [[nodiscard]] int descriptor() const { return file_.get(); }
    [[nodiscard]] const std::string& path() const { return path_; }

private:
    ScopedFd file_{-1};
    std::string path_;
};

/// One guarded run.
class GuardedRun {
public:
    explicit GuardedRun(const RunOptions& options) : options_(options) {}

    int run()
    {
        const PlannedRun asked = parseRun(options_.arguments);
        if (!asked.error.empty())
            return refuse(ToolTrouble,
                          "wzorinst would not accept this command line: " + asked.error);
        installer_ = findProgram("wzorinst");
        if (installer_.empty())
            return refuse(ToolTrouble, "wzorinst is neither next to zorctl nor in PATH");
        if (!log_.open(logDirectory(), std::string(1, asked.commandLine.action),
                       asked.commandLine.request.exploiters))
            return refuse(ToolTrouble, "cannot write a log in " + logDirectory());

        const int locked = lock();
        if (locked != ToolOk)
            return locked;
        const bool installs = asked.commandLine.action == 'i';
        const int checked = installs ? checkPackage() : ToolOk;
        if (checked != ToolOk)
            return checked;
        logPlan(asked);
        return start();
    }

private:
    int refuse(int status, const std::string& reason)
    {
        complain(shown(reason));
        if (log_.descriptor() >= 0)
            log_.line(reason);
        return status;
    }

    std::string logDirectory() const
    {
        if (!options_.logDirectory.empty())
            return options_.logDirectory;
        return isRoot() ? SharedLogDirectory : joinPath(homeDirectory(), LocalLogDirectory);
    }

    int lock()
    {
        const std::string path = lockPath(localInstall);
        switch (takeLock(path, true, options_.wait, lock_)) {
        case LockState::Held:
            log_.line("holding the lock " + path);
            return ToolOk;
        case LockState::Busy:
            return refuse(ToolLocked, "another run holds " + path);
        case LockState::CannotLock:
            break;
        }
        return refuse(ToolLocked, "cannot lock " + path);
    }

    int checkPackage()
    {
        if (private_.path().empty())
            return refuse(ToolTrouble, "cannot create a directory for the package");
        package_ = joinPath(private_.path(), "package.spb");
        const int error = copyPrivately(spbPackage, package_, PackageLimit);
        if (error == ENOSPC || error == EDQUOT || error == EIO)
            return refuse(ToolTrouble, "cannot copy " + spbPackage + ": " + std::strerror(error));
        if (error != 0)
            return refuse(ToolBadPackage, spbPackage + ": " + std::strerror(error));
        const int verified = options_.signers.empty() ? ToolOk : checkSignature();
        return verified == ToolOk ? checkContent() : verified;
    }

    int checkSignature()
    {
        const std::string source =
            options_.signature.empty() ? spbPackage + ".sig" : options_.signature;
        const std::string signature = joinPath(private_.path(), "signature");
        const std::string signers = joinPath(private_.path(), "signers");
        const int failed = copyPrivately(options_.signers, signers, SmallFileLimit);
        if (failed != 0)
            return refuse(ToolTrouble, options_.signers + ": " + std::strerror(failed));
        const int error = copyPrivately(source, signature, SmallFileLimit);
        if (error != 0)
            return refuse(ToolBadSignature, source + ": " + std::strerror(error));
        const ScopedFd content(open(package_.c_str(), O_RDONLY | O_CLOEXEC));
        std::string signer;
        switch (verifySignature(content.get(), signature, signers, log_.descriptor(), signer)) {
        case SignatureGood:
            log_.line("signed by " + signer);
            return ToolOk;
        case SignatureBad:
            return refuse(ToolBadSignature,
                          spbPackage + ": no good signature of a signer in " + options_.signers);
        default:
            return refuse(ToolTrouble, "the signature could not be checked");
        }
    }

    int checkContent()
    {
        const std::string tool = findProgram("spb");
        if (tool.empty())
            return refuse(ToolTrouble, "spb is neither next to zorctl nor in PATH");
        const int status =
            runProgram({tool, "check", package_}, {-1, log_.descriptor(), log_.descriptor(), -1});
        if (status < 0 || !WIFEXITED(status) || WEXITSTATUS(status) > PackageFails)
            return refuse(ToolTrouble, "spb check could not be run");
        if (WEXITSTATUS(status) == PackageFails)
            return refuse(ToolBadPackage, spbPackage + " cannot be installed; see " + log_.path());
        return ToolOk;
    }

    void logPlan(const PlannedRun& asked)
    {
        if (!package_.empty())
            spbPackage = package_;
        std::ostringstream text;
        std::streambuf* const screen = std::cout.rdbuf(text.rdbuf());
        printForecast(forecastRun(asked), true);
        std::cout.rdbuf(screen);
        std::istringstream lines(text.str());
        for (std::string one; std::getline(lines, one);)
            log_.line("plan: " + one);
    }

    /// The command line of the installer, with our copy of the package.
    std::vector<std::string> commandLine() const
    {
        std::vector<std::string> line = {installer_};
        const std::vector<std::string>& asked = options_.arguments;
        for (std::size_t at = 0; at < asked.size(); ++at) {
            line.push_back(asked[at]);
            const bool takesArgument = at >= 2 && asked[at].size() == 2 && asked[at][0] == '-' &&
                                       std::strchr("dfsoc", asked[at][1]) != nullptr;
            if (!takesArgument || at + 1 == asked.size())
                continue;
            ++at;
            line.push_back(asked[at - 1] == "-s" && !package_.empty() ? package_ : asked[at]);
        }
        return line;
    }

    int start()
    {
        log_.line("starting " + installer_);
        // The lock stays with the installer even if we are killed; it passes it on to nobody.
        const int status = runProgramTwofold(commandLine(), {STDIN_FILENO, -1, -1, lock_.get()},
                                             STDOUT_FILENO, log_.descriptor());
        if (status < 0)
            return refuse(ToolTrouble, "cannot start " + installer_);
        if (WIFSIGNALED(status)) {
            log_.line("wzorinst was ended by signal " + std::to_string(WTERMSIG(status)));
            endedBy_ = WTERMSIG(status);
            return ToolDiffers;
        }
        log_.line("wzorinst ended with status " + std::to_string(WEXITSTATUS(status)));
        return WEXITSTATUS(status) == 127 ? ToolTrouble : WEXITSTATUS(status);
    }

public:
    /// The signal that ended the installer; 0 if none did.
    [[nodiscard]] int endedBy() const { return endedBy_; }

private:
    const RunOptions& options_;
    PrivateDirectory private_;
    RunLog log_;
    ScopedFd lock_{-1};
    std::string installer_;
    std::string package_;
    int endedBy_ = 0;
};

} // namespace

int runInstaller(const RunOptions& options)
{
    int signalNumber = 0;
    int status = ToolOk;
    {
        GuardedRun run(options);
        status = run.run();
        signalNumber = run.endedBy();
    } // our copies are gone before we end as the installer did
    if (signalNumber != 0) {
        (void)std::signal(signalNumber, SIG_DFL);
        (void)raise(signalNumber);
    }
    return status;
}
