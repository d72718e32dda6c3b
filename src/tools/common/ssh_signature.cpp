#include "ssh_signature.h"

#include "child_process.h"
#include "scoped.h"
#include "tool_output.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <vector>

#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

constexpr const char* Program = "ssh-keygen";
constexpr int CannotExecute = 127; // of a child that could not become the program

/// Runs ssh-keygen. Returns its exit status; -1, with a message, when it cannot be run.
int runKeygen(std::vector<std::string> arguments, const ChildSetup& setup)
{
    const std::string program = findProgram(Program);
    if (program.empty()) {
        complainOf(Program, ENOENT);
        return -1;
    }
    arguments.insert(arguments.begin(), program);
    const int status = runProgram(arguments, setup);
    if (status >= 0 && WIFEXITED(status) && WEXITSTATUS(status) != CannotExecute)
        return WEXITSTATUS(status);
    complain(program + " could not be run");
    return -1;
}

/// Everything that a pipe holds whose other end is closed.
std::string readAll(int fd)
{
    std::string text;
    std::array<char, 4096> piece = {};
    ssize_t count = 0;
    while ((count = read(fd, piece.data(), piece.size())) > 0)
        text.append(piece.data(), static_cast<std::size_t>(count));
    return text;
}

/// The names that `allowedSigners` has for the key of the signature, one a line.
int findPrincipals(const std::string& signature, const std::string& allowedSigners, int messages,
                   std::string& principals)
{
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0)
        return -1;
    const ScopedFd reading(ends[0]);
    ScopedFd writing(ends[1]);
    // The names fit the pipe, or the last ones are cut off.
    (void)fcntl(writing.get(), F_SETFL, O_NONBLOCK);
    const int status = runKeygen({"-Y", "find-principals", "-s", signature, "-f", allowedSigners},
                                 {-1, writing.get(), messages, -1});
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
                    int messages, std::string& principal)
{
    if (!canBeRead(signature) || !canBeRead(allowedSigners))
        return SignatureUnknown;
    std::string principals;
    const int found = findPrincipals(signature, allowedSigners, messages, principals);
    if (found < 0)
        return SignatureUnknown;
    for (std::size_t at = 0; found == 0 && at < principals.size();) {
        const std::size_t end = std::min(principals.find('\n', at), principals.size());
        const std::string name = principals.substr(at, end - at);
        at = end + 1;
        if (name.starts_with('!')) // whom a pattern after it leaves out
            continue;
        if (lseek(fd, 0, SEEK_SET) != 0)
            return SignatureUnknown;
        const int status = runKeygen({"-Y", "verify", "-f", allowedSigners, "-I", name, "-n",
                                      SignatureNamespace, "-s", signature},
                                     {fd, messages, messages, -1});
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
           runKeygen({"-Y", "sign", "-f", key, "-n", SignatureNamespace}, {fd, output, -1, -1}) ==
               0;
}
