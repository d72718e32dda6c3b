// Runs one command and prints what it cost.
//
//     measure MEGABYTES COMMAND [ARGUMENT]...
//
// Prints one line: wall time in nanoseconds; user and system time in microseconds and peak memory
// in KiB, each of the command and the processes that it waited for; and its wait status. The
// command's output goes to /dev/null.
//
// Small and static on purpose: a process inherits the peak memory of the one that starts it. Before
// the command, a child touches MEGABYTES of memory, so that the command gets pages that the kernel
// holds already. On a virtual machine fresh ones come from its host, which is slow and uneven.
#include <fcntl.h>
#include <spawn.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/mman.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

enum { PageSize = 4096 };

static void touchMemory(size_t size)
{
    const pid_t child = fork();
    if (child == 0) {
        char* const memory =
            mmap(NULL, size, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
        for (size_t at = 0; memory != MAP_FAILED && at < size; at += PageSize)
            memory[at] = 1;
        _exit(0);
    }
    if (child > 0)
        (void)waitpid(child, NULL, 0);
}

static long long nanoseconds(void)
{
    struct timespec now;
    (void)clock_gettime(CLOCK_MONOTONIC, &now);
    return now.tv_sec * 1000000000LL + now.tv_nsec;
}

static long long microseconds(struct timeval time)
{
    return time.tv_sec * 1000000LL + time.tv_usec;
}

int main(int argc, char** argv)
{
    if (argc < 3)
        return 1;
    touchMemory(strtoul(argv[1], NULL, 10) << 20);

    posix_spawn_file_actions_t actions;
    (void)posix_spawn_file_actions_init(&actions);
    (void)posix_spawn_file_actions_addopen(&actions, 1, "/dev/null", O_WRONLY, 0);
    (void)posix_spawn_file_actions_adddup2(&actions, 1, 2);

    extern char** environ;
    pid_t child = 0;
    int status = 0;
    struct rusage usage;
    const long long start = nanoseconds();
    if (posix_spawn(&child, argv[2], &actions, NULL, argv + 2, environ) != 0)
        return 1;
    if (wait4(child, &status, 0, &usage) != child)
        return 1;
    const long long end = nanoseconds();
    (void)printf("%lld %lld %lld %ld %d\n", end - start, microseconds(usage.ru_utime),
                 microseconds(usage.ru_stime), usage.ru_maxrss, status);
    return 0;
}
