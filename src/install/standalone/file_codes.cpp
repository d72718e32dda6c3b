#include "file_codes.h"

#include <cerrno>
#include <iterator>

std::string fileErrorText(unsigned code)
{
    static const char* const texts[] = {
        "Ok",
        "Cannot open file for reading",
        "Cannot open file for writing",
        "Cannot create file",
        "Cannot read file",
        "Cannot write file",
        "Cannot write file (out of space)",
        "Access denied",
        "Cannot close file",
        "Cannot rename file",
        "Cannot delete file",
        "Cannot create directory",
        "Cannot remove directory",
        "Cannot change file permissions",
    };
    return code < std::size(texts) ? texts[code] : "Unknown error";
}

int writeErrorCode(int error)
{
    if (error == EACCES)
        return AccessDenied;
    if (error == ENOSPC)
        return OutOfSpace;
    return CannotWrite;
}
