// The descriptors that the caller passed on.
#pragma once

/// Opens descriptors 0 to 2 on /dev/null where the caller closed them, so that no file of ours is
/// taken for standard output; and keeps commands that are run from inheriting any other, such as a
/// lock that a program started by them would hold forever.
void secureDescriptors();
