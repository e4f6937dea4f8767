// Kernel state by name. Only "kern.bootargs" is known: the kernel command line.
#pragma once

#include <cstddef>

extern "C" {
// Copies the value (a NUL-terminated string) into oldp, at most *oldlenp bytes;
// *oldlenp receives the length including the NUL. Returns 0, or -1 with errno
// set (ENOENT for an unknown name, ENOMEM when the buffer is too small, EPERM
// when a new value is given).
int sysctlbyname(const char* name, void* oldp, size_t* oldlenp, void* newp, size_t newlen);
}
