#include "exit_status.h"
#include "scoped.h"
#include "shown_text.h"
#include "ssh_signature.h"
#include "subcommands.h"
#include "temporary_file.h"
#include "tool_output.h"

#include <cerrno>
#include <iostream>

#include <fcntl.h>

namespace {

std::string signatureOf(const std::string& file, const std::string& named)
{
    return named.empty() ? file + ".sig" : named;
}

int trouble(const std::string& path, int error)
{
    complainOf(path, error);
    return ToolTrouble;
}

} // namespace

int signCommand(const SignOptions& options)
{
    const ScopedFd file(open(options.file.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
    if (!file.isOpen())
        return trouble(options.file, errno);
    const std::string output = signatureOf(options.file, options.output);
    TemporaryFile signature;
    int error = signature.create(output);
    if (error != 0)
        return trouble(output, error);
    if (!signFile(file.get(), options.key, signature.fd()))
        return ToolTrouble;
    error = signature.commit();
    return error == 0 ? static_cast<int>(ToolOk) : trouble(output, error);
}

int verifyCommand(const SignatureOptions& options)
{
    const ScopedFd file(open(options.file.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
    if (!file.isOpen())
        return trouble(options.file, errno);
    const std::string signature = signatureOf(options.file, options.signature);
    const ScopedFd nowhere(open("/dev/null", O_WRONLY | O_CLOEXEC));
    std::string principal;
    const int code =
        verifySignature(file.get(), signature, options.signers, nowhere.get(), principal);
    if (code == SignatureUnknown)
        return ToolTrouble;
    if (options.json)
        printJson({{"file", shown(options.file)},
                   {"signature", shown(signature)},
                   {"good", code == SignatureGood},
                   {"principal", code == SignatureGood ? Json(shown(principal)) : Json()}});
    else if (code == SignatureGood)
        std::cout << shown(options.file) << ": signed by " << shown(principal) << '\n';
    else
        std::cout << shown(options.file) << ": no good signature of an allowed signer\n";
    return code == SignatureGood ? ToolOk : ToolDiffers;
}
