/* trawlprobe FACT PATH: prints a fact about the machine, or about the file system that holds PATH.
 * The scanners, which are shell scripts, ask it for what a shell cannot find out. */
#include "zorfs.h"
#include "zorhw.h"

#include <stdio.h>

int main(int argc, char** argv)
{
    if (argc != 3) {
        (void)fputs("Usage: trawlprobe FACT PATH\n", stderr);
        return 2;
    }

    char text[256];
    if (zorHardwareFact(argv[1], text, sizeof text) != 0 &&
        zorFileSystemFact(argv[1], argv[2], text, sizeof text) != 0) {
        (void)fprintf(stderr, "trawlprobe: does not know %s\n", argv[1]);
        return 1;
    }
    return puts(text) < 0;
}
