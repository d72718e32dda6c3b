#include "tool_output.h"

#include "shown_text.h"

#include <cerrno>
#include <cstring>
#include <iostream>

#include <fcntl.h>
#include <unistd.h>

std::string toolName;

void complain(std::string_view message)
{
    std::string line = toolName;
    line.append(": ").append(message).append("\n");
    std::cerr << line << std::flush;
}

void complainOf(std::string_view path, int error)
{
    complain(shown(path) + ": " + std::strerror(error));
}

void printJson(const Json& value)
{
    std::cout << value.dump(2) << '\n';
}

int finishOutput(int status, int trouble, std::string_view what)
{
    std::cout.flush();
    if (std::cout.good())
        return status;
    // The stream has not kept what the system answered: it answers once more.
    const int error = write(STDOUT_FILENO, "\n", 1) < 0 ? errno : EIO;
    if (error != EPIPE)
        complainOf(what, error);
    return trouble;
}
