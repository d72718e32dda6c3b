/* Facts about a file system: the toolkit's library libzorfs.so. */
#pragma once

#include <stddef.h>

/** Writes the fact `name` ("fs_size_kb" or "fs_free_kb") of the file system that holds `path` into
 * `text`, which has room for `size` bytes. Returns 0, or -1 when there is no such fact or the
 * system does not say. */
int zorFileSystemFact(const char* name, const char* path, char* text, size_t size);
