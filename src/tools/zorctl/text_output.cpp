#include "text_output.h"

#include <cstdlib>

#include <unistd.h>

std::string shellQuoted(std::string_view text)
{
    std::string quoted = "'";
    for (const char c : text) {
        if (c == '\'')
            quoted += "'\\''";
        else
            quoted += c;
    }
    return quoted + "'";
}

bool outputIsColoured()
{
    const char* const refused = std::getenv("NO_COLOR");
    if (refused != nullptr && *refused != '\0')
        return false;
    const char* const terminal = std::getenv("TERM");
    return isatty(STDOUT_FILENO) == 1 && terminal != nullptr &&
           std::string_view(terminal) != "dumb";
}

std::string coloured(std::string_view text, int code)
{
    static const bool wanted = outputIsColoured();
    if (!wanted)
        return std::string(text);
    return "\033[" + std::to_string(code) + "m" + std::string(text) + "\033[0m";
}
