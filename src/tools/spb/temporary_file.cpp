#include "temporary_file.h"

#include "file_codes.h"
#include "file_writing.h"

#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <vector>

#include <fcntl.h>
#include <sys/stat.h>

namespace {

constexpr int EndingSignals[] = {SIGINT, SIGTERM, SIGHUP};

/// What a signal deletes; empty when there is nothing.
char doomed[PATH_MAX] = "";

extern "C" void deleteAndEnd(int signal)
{
    if (doomed[0] != '\0')
        (void)unlink(doomed);
    // The handler was reset when this was called, so this ends the program, as it would have
    // without a handler.
    (void)raise(signal);
}

void handleSignals()
{
    struct sigaction action = {};
    action.sa_handler = deleteAndEnd;
    action.sa_flags = static_cast<int>(SA_RESETHAND | SA_NODEFER);
    for (const int signal : EndingSignals) {
        struct sigaction old = {};
        if (sigaction(signal, nullptr, &old) == 0 && old.sa_handler == SIG_DFL) // nohup stays
            (void)sigaction(signal, &action, nullptr);
    }
}

/// Signals wait while it lives: the file and its name in `doomed` come and go together.
class HeldSignals {
public:
    HeldSignals()
    {
        sigset_t held;
        (void)sigemptyset(&held);
        for (const int signal : EndingSignals)
            (void)sigaddset(&held, signal);
        (void)pthread_sigmask(SIG_BLOCK, &held, &previous_);
    }
    HeldSignals(const HeldSignals&) = delete;
    HeldSignals& operator=(const HeldSignals&) = delete;
    ~HeldSignals() { (void)pthread_sigmask(SIG_SETMASK, &previous_, nullptr); }

private:
    sigset_t previous_ = {};
};

int copyToOutput(int file)
{
    std::vector<char> piece(std::size_t{128} * 1024);
    off_t at = 0;
    for (;;) {
        const ssize_t count = pread(file, piece.data(), piece.size(), at);
        if (count < 0)
            return errno;
        if (count == 0)
            return 0;
        errno = 0;
        if (writeAll(STDOUT_FILENO, piece.data(), static_cast<std::size_t>(count)) != FileOk)
            return errno == 0 ? EIO : errno;
        at += count;
    }
}

std::string directoryOf(const std::string& path)
{
    const std::size_t slash = path.rfind('/');
    return slash == std::string::npos ? "" : path.substr(0, slash + 1);
}

} // namespace

TemporaryFile::TemporaryFile() : file_(-1) {}

TemporaryFile::~TemporaryFile()
{
    if (partial_.empty())
        return;
    const HeldSignals held;
    (void)unlink(partial_.c_str());
    doomed[0] = '\0';
}

int TemporaryFile::create(const std::string& path)
{
    path_ = path;
    const char* const temporary = std::getenv("TMPDIR");
    partial_ = path == "-" ? std::string(temporary == nullptr ? "/tmp" : temporary) + "/"
                           : directoryOf(path);
    partial_ += ".spb-XXXXXX";
    if (partial_.size() >= sizeof doomed) {
        partial_.clear();
        return ENAMETOOLONG;
    }
    handleSignals();

    const HeldSignals held;
    file_ = ScopedFd(mkostemp(partial_.data(), O_CLOEXEC));
    if (!file_.isOpen()) {
        const int error = errno;
        partial_.clear();
        return error;
    }
    std::memcpy(doomed, partial_.c_str(), partial_.size() + 1);
    if (path == "-") { // needs no name
        (void)unlink(doomed);
        doomed[0] = '\0';
        partial_.clear();
    }
    return 0;
}

int TemporaryFile::commit()
{
    if (path_ == "-")
        return copyToOutput(file_.get());

    const mode_t mask = umask(0);
    (void)umask(mask);
    if (fchmod(file_.get(), 0666 & ~mask) != 0 || close(file_.release()) != 0)
        return errno;
    const HeldSignals held;
    if (rename(partial_.c_str(), path_.c_str()) != 0)
        return errno;
    doomed[0] = '\0';
    partial_.clear();
    return 0;
}
