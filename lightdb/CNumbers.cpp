#include "lightdb/CNumbers.h"

#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <locale.h>

namespace ldbm {
namespace {

locale_t cLocale()
{
    static const locale_t c = newlocale(LC_ALL_MASK, "C", locale_t(0));
    return c;
}

} // namespace

double parseDecimal(const char* text) { return strtod_l(text, nullptr, cLocale()); }

int parseInteger(const char* text) { return int(strtoll(text, nullptr, 10)); }

int formatC(char* buffer, size_t size, const char* format, ...)
{
    // uselocale changes only the calling thread's locale.
    locale_t previous = uselocale(cLocale());
    va_list args;
    va_start(args, format);
    int length = vsnprintf(buffer, size, format, args);
    va_end(args);
    uselocale(previous);
    return length;
}

} // namespace ldbm
