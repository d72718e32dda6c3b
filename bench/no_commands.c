// Stands in for system(): the installer without the cost of its external commands.
//
// SELinux is not there, everything else succeeds.
#include <string.h>

int __wrap_system(const char* command);

int __wrap_system(const char* command)
{
    static const char Probe[] = "/usr/sbin/selinuxenabled";
    return strncmp(command, Probe, sizeof Probe - 1) == 0 ? 127 << 8 : 0;
}
