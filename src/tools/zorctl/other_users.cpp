#include "other_users.h"

#include "file_codes.h"
#include "file_writing.h"
#include "locations.h"
#include "scoped.h"

#include <cerrno>
#include <csignal>
#include <ctime>
#include <string>

#include <fcntl.h>
#include <grp.h>
#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

constexpr int PatienceMs = 5000;
constexpr std::size_t ReportLimit = std::size_t{64} << 20;

Json unknownInstallation(const Account& account)
{
    Installation found;
    found.local = true;
    found.uid = account.uid;
    found.user = account.name;
    found.registryPath = registryPathBelow(account.home);
    found.registryState = found.registryBackupState = "unreadable";
    found.health = Health::Unknown;
    return toJson(found);
}

/// Gives up every right but those of `account`. In a container whose user namespace does not have
/// that user, nobody can be it: this process is then as good as any.
bool becomeUser(const Account& account)
{
    const bool groups = setgroups(0, nullptr) == 0 || errno == EPERM;
    if (setresgid(account.gid, account.gid, account.gid) != 0)
        return errno == EINVAL;
    if (setresuid(account.uid, account.uid, account.uid) != 0)
        return errno == EINVAL;
    return groups;
}

long long nowMs()
{
    timespec now = {};
    (void)clock_gettime(CLOCK_MONOTONIC, &now); // always there
    return static_cast<long long>(now.tv_sec) * 1000 + now.tv_nsec / 1000000;
}

/// Reads until the end of `pipe`; false when that takes too long or is too much.
bool readAll(int pipe, std::string& text)
{
    const long long deadline = nowMs() + PatienceMs;
    for (;;) {
        const long long left = deadline - nowMs();
        pollfd waiting = {pipe, POLLIN, 0};
        if (left <= 0 || poll(&waiting, 1, static_cast<int>(left)) < 1)
            return false;
        char block[16384];
        const ssize_t count = read(pipe, block, sizeof block);
        if (count == 0)
            return true;
        if (count < 0 || text.size() > ReportLimit)
            return false;
        text.append(block, static_cast<std::size_t>(count));
    }
}

[[noreturn]] void surveyInChild(const Account& account, int pipe)
{
    if (!becomeUser(account))
        _exit(1);
    const std::string text = toJson(surveyAccount(account)).dump();
    _exit(writeAll(pipe, text.data(), text.size()) == FileOk ? 0 : 1);
}

Json surveyAs(const Account& account)
{
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0)
        return unknownInstallation(account);
    const ScopedFd readEnd(ends[0]);
    ScopedFd writeEnd(ends[1]);
    const pid_t child = fork();
    if (child == 0)
        surveyInChild(account, writeEnd.get());
    writeEnd = ScopedFd(-1);
    if (child < 0)
        return unknownInstallation(account);

    std::string text;
    const bool whole = readAll(readEnd.get(), text);
    if (!whole)
        (void)kill(child, SIGKILL);
    int status = 0;
    // One that a dead file system holds cannot even be killed: it is left behind.
    const bool ended = waitpid(child, &status, whole ? 0 : WNOHANG) == child;
    Json found;
    const bool good = whole && ended && status == 0 && Json::parse(text, found);
    return good ? found : unknownInstallation(account);
}

} // namespace

Json surveyOther(const Account& account)
{
    return isRoot() && account.uid != 0 ? surveyAs(account) : toJson(surveyAccount(account));
}
