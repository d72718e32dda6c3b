#include "commands.h"

#include "interruption.h"
#include "paths.h"
#include "settings.h"
#include "shell_command.h"

#include <cstdlib>
#include <deque>
#include <iostream>

namespace {

constexpr const char* OutputSuppression = " >/dev/null 2>&1";
constexpr const char* LibraryPathName = "LD_LIBRARY_PATH";

} // namespace

int runCommand(const std::string& program, const std::string& /*directory*/,
               const std::string& arguments)
{
    std::string command = quotedIfBlank(program);
    if (!arguments.empty())
        command += " " + arguments;
    if (!debugMode)
        command += OutputSuppression;

    // In debug mode the command's own output follows what was printed before it.
    std::cout.flush();
    logstream->flush();
    const int status = runShell(command);
    noteStatusOfCommand(status);
    *logstream << "Exec '" << command << "' returned " << status << '\n';
    return status;
}

std::string quotedIfBlank(const std::string& text)
{
    return text.find(' ') == std::string::npos ? text : "\"" + text + "\"";
}

void setLibraryPath(const std::string& home)
{
    std::string setting = std::string(LibraryPathName) + "=" + joinPath(home, spbBinDir);
    const char* const old = std::getenv(LibraryPathName);
    if (old != nullptr)
        setting += std::string(":") + old;

    if (debugMode)
        *logstream << "Setting '" << LibraryPathName << "' to '" << setting << "'\n";

    // The environment keeps a pointer to the text, so the text is never freed.
    static auto& texts = *new std::deque<std::string>;
    const int result = putenv(texts.emplace_back(setting).data());
    if (result != 0)
        *logstream << "Setting up the '" << LibraryPathName
                   << "' variable has failed. Error = " << result << '\n';
}
