#include "zorfs.h"

#include <stdio.h>
#include <string.h>
#include <sys/statvfs.h>

int zorFileSystemFact(const char* name, const char* path, char* text, size_t size)
{
    struct statvfs status;
    if (statvfs(path, &status) != 0)
        return -1;

    unsigned long long blocks = 0;
    if (strcmp(name, "fs_size_kb") == 0)
        blocks = status.f_blocks;
    else if (strcmp(name, "fs_free_kb") == 0)
        blocks = status.f_bavail;
    else
        return -1;
    (void)snprintf(text, size, "%llu", blocks * status.f_frsize / 1024);
    return 0;
}
