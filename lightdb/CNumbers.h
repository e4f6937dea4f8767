// Number text that reads and writes the same under any process locale: the
// database files always carry '.' as the decimal separator, whatever
// LC_NUMERIC the host process runs with.
#pragma once

#include <cstddef>

namespace ldbm {

// atof as in the "C" locale: the leading number of `text`, 0 when there is none.
double parseDecimal(const char* text);
// atoi: the leading decimal integer of `text`, 0 when there is none; values
// outside int wrap as a 32-bit store would.
int parseInteger(const char* text);
// snprintf as in the "C" locale.
int formatC(char* buffer, size_t size, const char* format, ...) __attribute__((format(printf, 3, 4)));

} // namespace ldbm
