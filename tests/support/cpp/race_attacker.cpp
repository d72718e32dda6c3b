// An attacker in a race with a run of the installer: changes names under its nose until SIGTERM.
//
//     race_attacker exchange A B [A B]...   exchanges each A with its B, over and over
//     race_attacker exchange-opened A B     the same, once somebody has opened the directory A
//     race_attacker move A B TARGET         once somebody has opened the directory A, moves it to B
//                                           and makes a symbolic link A to TARGET
//     race_attacker plant TARGET PATH...    makes symbolic links PATH to TARGET when PATH is free
//     race_attacker hold PATH...            opens each PATH for writing as soon as it can, and
//                                           writes "stolen" to it when SIGTERM comes
//
// It prints "ready" once it is about to begin, and ends with status 0 after SIGTERM.
#include <csignal>
#include <cstdio>
#include <cstring>
#include <string>
#include <string_view>
#include <vector>

#include <fcntl.h>
#include <poll.h>
#include <sys/inotify.h>
#include <unistd.h>

namespace {

volatile std::sig_atomic_t isOver = 0;

void end(int /*signal*/)
{
    isOver = 1;
}

/// Lets SIGTERM end the loops below.
void endOnRequest()
{
    struct sigaction action = {};
    action.sa_handler = end;
    (void)sigaction(SIGTERM, &action, nullptr); // cannot fail with a valid signal
}

/// Holds SIGTERM back but for the waits that take `previous()`, so that none of them misses it.
class HeldBack {
public:
    HeldBack()
    {
        sigset_t held;
        sigemptyset(&held);
        sigaddset(&held, SIGTERM);
        (void)sigprocmask(SIG_BLOCK, &held, &previous_); // cannot fail with a valid set
    }
    HeldBack(const HeldBack&) = delete;
    HeldBack& operator=(const HeldBack&) = delete;
    ~HeldBack() { (void)sigprocmask(SIG_SETMASK, &previous_, nullptr); } // as above

    const sigset_t* previous() const { return &previous_; }

private:
    sigset_t previous_ = {};
};

void waitForTheEnd()
{
    const HeldBack held;
    while (isOver == 0)
        (void)sigsuspend(held.previous());
}

void sayReady()
{
    (void)std::puts("ready");
    (void)std::fflush(stdout);
}

/// Waits until somebody opens the directory `path`; false if that can no longer happen.
bool waitForOpening(const char* path)
{
    const int watch = inotify_init1(IN_CLOEXEC);
    if (watch < 0 || inotify_add_watch(watch, path, IN_OPEN | IN_DELETE) < 0)
        return false;
    sayReady();
    const HeldBack held;
    pollfd event = {watch, POLLIN, 0};
    return isOver == 0 && ppoll(&event, 1, nullptr, held.previous()) == 1;
}

void exchange(const std::vector<const char*>& names)
{
    while (isOver == 0) {
        for (std::size_t i = 0; i + 1 < names.size(); i += 2)
            (void)renameat2(AT_FDCWD, names[i], AT_FDCWD, names[i + 1], RENAME_EXCHANGE);
    }
}

void move(const std::vector<const char*>& names)
{
    if (waitForOpening(names[0]) && std::rename(names[0], names[1]) == 0) [[maybe_unused]]
        const int linked = symlink(names[2], names[0]);
}

void plant(const std::vector<const char*>& names)
{
    while (isOver == 0) {
        for (std::size_t i = 1; i < names.size(); ++i)
            [[maybe_unused]] const int linked = symlink(names[0], names[i]); // when it is free
    }
}

/// One file that hold() tries to open.
struct Held {
    std::string path;
    int directory; ///< where it exists, the name is all that is left to look up each time; else -1
    int file = -1;

    explicit Held(const char* name)
        : path(name),
          directory(open(path.substr(0, path.rfind('/')).c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC))
    {
    }

    void tryToOpen()
    {
        const std::size_t name = directory < 0 ? 0 : path.rfind('/') + 1;
        if (file < 0)
            file = openat(directory < 0 ? AT_FDCWD : directory, path.c_str() + name,
                          O_WRONLY | O_CLOEXEC);
    }
};

void hold(const std::vector<const char*>& names)
{
    std::vector<Held> files(names.begin(), names.end());
    while (isOver == 0) {
        for (Held& held : files)
            held.tryToOpen();
    }
    for (const Held& held : files) {
        if (held.file >= 0 && write(held.file, "stolen", std::strlen("stolen")) < 0)
            std::perror(held.path.c_str());
    }
}

int usage()
{
    (void)std::fputs("usage: race_attacker exchange|exchange-opened|move|plant|hold PATH...\n",
                     stderr);
    return 2;
}

} // namespace

int main(int argc, char** argv)
{
    if (argc < 3)
        return usage();
    const std::string_view mode = argv[1];
    const std::vector<const char*> names(argv + 2, argv + argc);

    endOnRequest();
    if (mode == "exchange-opened" || mode == "move") {
        if (mode == "move" && names.size() == 3)
            move(names);
        else if (names.size() == 2 && waitForOpening(names[0]))
            exchange(names);
    } else {
        sayReady();
        if (mode == "exchange")
            exchange(names);
        else if (mode == "plant")
            plant(names);
        else if (mode == "hold")
            hold(names);
        else
            return usage();
    }
    waitForTheEnd();
    return 0;
}
