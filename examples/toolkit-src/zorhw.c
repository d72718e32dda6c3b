#include "zorhw.h"

#include <stdio.h>
#include <string.h>
#include <sys/utsname.h>
#include <unistd.h>

static int writeNumber(long long number, char* text, size_t size)
{
    if (number < 0)
        return -1;
    (void)snprintf(text, size, "%lld", number);
    return 0;
}

static int writeMachine(char* text, size_t size)
{
    struct utsname system;
    if (uname(&system) != 0)
        return -1;
    (void)snprintf(text, size, "%s", system.machine);
    return 0;
}

int zorHardwareFact(const char* name, char* text, size_t size)
{
    const long pageSize = sysconf(_SC_PAGESIZE);

    if (strcmp(name, "machine") == 0)
        return writeMachine(text, size);
    if (strcmp(name, "processors") == 0)
        return writeNumber(sysconf(_SC_NPROCESSORS_ONLN), text, size);
    if (strcmp(name, "memory_kb") == 0)
        return writeNumber((long long)sysconf(_SC_PHYS_PAGES) * (pageSize / 1024), text, size);
    if (strcmp(name, "page_size") == 0)
        return writeNumber(pageSize, text, size);
    return -1;
}
