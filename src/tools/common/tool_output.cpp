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
    errno = 0;
    std::cout.flush();
    const int error = errno;
    if (std::cout.good())
        return status;
    if (error != EPIPE)
        complainOf(what, error == 0 ? EIO : error);
    return trouble;
}
