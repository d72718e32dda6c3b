#include "file_reading.h"

bool readLine(std::FILE* file, std::string& line)
{
    line.clear();
    int c = getc_unlocked(file);
    if (c == EOF)
        return false;
    for (; c != EOF && c != '\n'; c = getc_unlocked(file))
        line += static_cast<char>(c);
    return std::ferror(file) == 0;
}
