// The file descriptors that the process inherited.
#pragma once

/// Opens those of the descriptors 0 to 2 that are closed on /dev/null, so that no other file gets
/// such a number.
void openStandardDescriptors();

/// The same, and sets close-on-exec on all others: a command that is run must not inherit, for
/// example, a lock that a daemon started by it would keep forever.
void secureDescriptors();
