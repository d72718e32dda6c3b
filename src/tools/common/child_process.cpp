#include "child_process.h"

#include "file_codes.h"
#include "file_writing.h"
#include "paths.h"
#include "scoped.h"

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <ctime>
#include <string_view>

#include <fcntl.h>
#include <linux/limits.h>
#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

volatile sig_atomic_t childToSignal = 0;

void passOn(int number)
{
    const int saved = errno;
    if (childToSignal > 0)
        (void)kill(static_cast<pid_t>(childToSignal), number);
    errno = saved;
}

/// While this exists, we wait for our child whatever happens: INT and QUIT of a terminal reach it
/// as well, TERM and HUP are passed on.
class PatientSignals {
public:
    PatientSignals()
    {
        for (const int number : Numbers) {
            struct sigaction action = {};
            action.sa_handler = passOn;
            if (number == SIGINT || number == SIGQUIT)
                action.sa_handler = [](int) {}; // not ignored: the child would inherit that
            (void)sigaction(number, nullptr, &old_[number]);
            if (old_[number].sa_handler != SIG_IGN)
                (void)sigaction(number, &action, nullptr);
        }
    }
    PatientSignals(const PatientSignals&) = delete;
    PatientSignals& operator=(const PatientSignals&) = delete;
    ~PatientSignals()
    {
        for (const int number : Numbers)
            (void)sigaction(number, &old_[number], nullptr);
    }

private:
    static constexpr int Numbers[] = {SIGINT, SIGQUIT, SIGTERM, SIGHUP};
    struct sigaction old_[NSIG] = {};
};

bool isExecutable(const std::string& path)
{
    return access(path.c_str(), X_OK) == 0;
}

void useAs(int descriptor, int target)
{
    if (descriptor >= 0 && dup2(descriptor, target) < 0)
        _exit(127);
}

[[noreturn]] void becomeProgram(const std::vector<std::string>& arguments, const ChildSetup& setup)
{
    const int input = setup.input >= 0 ? setup.input : open("/dev/null", O_RDONLY | O_CLOEXEC);
    useAs(input, STDIN_FILENO);
    useAs(setup.output, STDOUT_FILENO);
    useAs(setup.error, STDERR_FILENO);
    if (setup.kept >= 0)
        (void)fcntl(setup.kept, F_SETFD, 0);
    (void)std::signal(SIGPIPE, SIG_DFL);
    std::vector<char*> pointers;
    pointers.reserve(arguments.size() + 1);
    for (const std::string& argument : arguments)
        pointers.push_back(const_cast<char*>(argument.c_str())); // execv() does not write there
    pointers.push_back(nullptr);
    execv(pointers[0], pointers.data());
    _exit(127);
}

pid_t startProgram(const std::vector<std::string>& arguments, const ChildSetup& setup)
{
    const pid_t child = fork();
    if (child == 0)
        becomeProgram(arguments, setup);
    if (child > 0)
        childToSignal = child;
    return child;
}

/// Waits for `child`; returns its status.
int waitFor(pid_t child)
{
    int status = 0;
    while (waitpid(child, &status, 0) < 0) {
        if (errno == EINTR)
            continue;
        status = -1;
        break;
    }
    childToSignal = 0;
    return status;
}

/// Passes on what comes out of `pipe` within `patienceMs`; false if nothing did.
bool forward(int pipe, int first, int second, int patienceMs = 100)
{
    pollfd waiting = {pipe, POLLIN, 0};
    if (poll(&waiting, 1, patienceMs) < 1 || (waiting.revents & POLLIN) == 0) {
        if ((waiting.revents & POLLHUP) != 0 && patienceMs > 0) {
            const timespec moment = {0, 1'000'000};
            (void)nanosleep(&moment, nullptr); // the program is about to end
        }
        return false;
    }
    char block[16384];
    const ssize_t count = read(pipe, block, sizeof block);
    if (count <= 0)
        return false;
    // A reader that has gone or a full disk stops neither the program nor the other copy.
    (void)writeAll(first, block, static_cast<std::size_t>(count));
    (void)writeAll(second, block, static_cast<std::size_t>(count));
    return true;
}

} // namespace

std::string findProgram(const std::string& name)
{
    char own[PATH_MAX];
    const ssize_t length = readlink("/proc/self/exe", own, sizeof own);
    if (length > 0 && length < static_cast<ssize_t>(sizeof own)) {
        std::string path(own, static_cast<std::size_t>(length));
        path = joinPath(path.substr(0, path.rfind('/')), name);
        if (isExecutable(path))
            return path;
    }
    const char* const list = std::getenv("PATH");
    std::string_view rest = list != nullptr ? list : "/usr/sbin:/usr/bin:/sbin:/bin";
    while (!rest.empty()) {
        const std::size_t colon = rest.find(':');
        std::string path = joinPath(std::string(rest.substr(0, colon)), name);
        if (path.front() == '/' && isExecutable(path))
            return path;
        rest = colon == std::string_view::npos ? std::string_view() : rest.substr(colon + 1);
    }
    return {};
}

int runProgram(const std::vector<std::string>& arguments, const ChildSetup& setup)
{
    const PatientSignals signals;
    const pid_t child = startProgram(arguments, setup);
    return child < 0 ? -1 : waitFor(child);
}

int runProgramTwofold(const std::vector<std::string>& arguments, ChildSetup setup, int first,
                      int second)
{
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0)
        return -1;
    const ScopedFd readEnd(ends[0]);
    ScopedFd writeEnd(ends[1]);
    setup.output = writeEnd.get();
    const PatientSignals signals;
    const pid_t child = startProgram(arguments, setup);
    writeEnd = ScopedFd(-1);
    if (child < 0)
        return -1;

    // Not until the end of the pipe: a daemon that the program left may keep it open for ever.
    siginfo_t ended = {};
    while (ended.si_pid == 0) {
        forward(readEnd.get(), first, second);
        if (waitid(P_PID, static_cast<id_t>(child), &ended, WEXITED | WNOHANG | WNOWAIT) != 0 &&
            errno != EINTR)
            break;
    }
    while (forward(readEnd.get(), first, second, 0)) {
    }
    return waitFor(child);
}
