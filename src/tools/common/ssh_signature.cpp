#include "ssh_signature.h"

#include "scoped.h"
#include "tool_output.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <vector>

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

extern char** environ;

namespace {

constexpr const char* Program = "ssh-keygen";

/// Descriptors that become the standard ones of a program; -1 for /dev/null.
struct Descriptors {
    int input = -1;
    int output = -1;
    bool silent = false; ///< its messages are not shown
};

/// Runs ssh-keygen. Returns its exit status; -1, with a message, when it cannot be run.
int runKeygen(std::vector<std::string> arguments, const Descriptors& descriptors)
{
    std::vector<char*> words = {const_cast<char*>(Program)};
    for (std::string& argument : arguments)
        words.push_back(argument.data());
    words.push_back(nullptr);

    posix_spawn_file_actions_t actions;
    (void)posix_spawn_file_actions_init(&actions);
    const auto connect = [&](int from, int to) {
        if (from >= 0)
            (void)posix_spawn_file_actions_adddup2(&actions, from, to);
        else
            (void)posix_spawn_file_actions_addopen(&actions, to, "/dev/null", O_RDWR, 0);
    };
    connect(descriptors.input, STDIN_FILENO);
    connect(descriptors.output, STDOUT_FILENO);
    if (descriptors.silent)
        connect(-1, STDERR_FILENO);
    pid_t child = 0;
    const int error = posix_spawnp(&child, Program, &actions, nullptr, words.data(), environ);
    (void)posix_spawn_file_actions_destroy(&actions);
    if (error != 0) {
        complainOf(Program, error);
        return -1;
    }
    int status = 0;
    while (waitpid(child, &status, 0) < 0) {
        if (errno != EINTR)
            return -1;
    }
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

/// Everything that can be read from `fd`, up to a limit that no list of principals reaches.
std::string readAll(int fd)
{
    std::string text;
    std::array<char, 4096> piece = {};
    ssize_t count = 0;
    while (text.size() < std::size_t{1} << 20 && (count = read(fd, piece.data(), piece.size())) > 0)
        text.append(piece.data(), static_cast<std::size_t>(count));
    return text;
}

/// The names that `allowedSigners` has for the key of the signature, one a line.
int findPrincipals(const std::string& signature, const std::string& allowedSigners,
                   std::string& principals)
{
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0)
        return -1;
    const ScopedFd reading(ends[0]);
    ScopedFd writing(ends[1]);
    const int status = runKeygen({"-Y", "find-principals", "-s", signature, "-f", allowedSigners},
                                 {-1, writing.get(), true});
    writing = ScopedFd(-1);
    principals = readAll(reading.get());
    return status;
}

bool canBeRead(const std::string& path)
{
    const ScopedFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
    if (!file.isOpen())
        complainOf(path, errno);
    return file.isOpen();
}

} // namespace

int verifySignature(int fd, const std::string& signature, const std::string& allowedSigners,
                    std::string& principal)
{
    if (!canBeRead(signature) || !canBeRead(allowedSigners))
        return SignatureUnknown;
    std::string principals;
    const int found = findPrincipals(signature, allowedSigners, principals);
    if (found < 0)
        return SignatureUnknown;
    for (std::size_t at = 0; found == 0 && at < principals.size();) {
        const std::size_t end = std::min(principals.find('\n', at), principals.size());
        const std::string name = principals.substr(at, end - at);
        at = end + 1;
        if (lseek(fd, 0, SEEK_SET) != 0)
            return SignatureUnknown;
        const int status = runKeygen({"-Y", "verify", "-f", allowedSigners, "-I", name, "-n",
                                      SignatureNamespace, "-s", signature},
                                     {fd, -1, true});
        if (status < 0)
            return SignatureUnknown;
        if (status == 0) {
            principal = name;
            return SignatureGood;
        }
    }
    return SignatureBad;
}

bool signFile(int fd, const std::string& key, int output)
{
    return lseek(fd, 0, SEEK_SET) == 0 &&
           runKeygen({"-Y", "sign", "-f", key, "-n", SignatureNamespace}, {fd, output, false}) == 0;
}
