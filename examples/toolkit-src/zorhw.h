/* Facts about the machine: the toolkit's library libzorhw.so. */
#pragma once

#include <stddef.h>

/** Writes the fact `name` ("machine", "processors", "memory_kb" or "page_size") into `text`, which
 * has room for `size` bytes. Returns 0, or -1 when there is no such fact or the system does not
 * say. */
int zorHardwareFact(const char* name, char* text, size_t size);
