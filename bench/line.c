// Starts and prints a line: what a process costs that does nothing.
#include <stdio.h>

int main(void)
{
    (void)puts("Done.");
    return 0;
}
