// Internal invariants: what the code itself guarantees (a lock held where a
// function requires it, arrays sized to their counts, indices in range).
// Checked in Debug, sanitizer and fuzzing builds (VANTISH_ASSERTIONS), compiled
// out otherwise. Never for input from outside: bad input gets a log line and
// its documented fallback, not an assertion.
#pragma once

namespace vantish {

// Prints the failed condition and where it is, then aborts.
[[noreturn]] void assertionFailed(const char* condition, const char* file, int line, const char* function);

} // namespace vantish

#if defined(VANTISH_ASSERTIONS)
#define VANTISH_ASSERT(condition) \
    ((condition) ? (void) 0 : ::vantish::assertionFailed(#condition, __FILE__, __LINE__, __func__))
#else
// The condition is not evaluated, but it still has to compile.
#define VANTISH_ASSERT(condition) ((void) sizeof(!(condition)))
#endif
