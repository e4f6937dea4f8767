#include "support/Assert.h"

#include <cstdio>
#include <cstdlib>

namespace vantish {

void assertionFailed(const char* condition, const char* file, int line, const char* function)
{
    std::fprintf(stderr, "%s:%d: %s: internal invariant failed: %s\n", file, line, function, condition);
    std::abort();
}

} // namespace vantish
