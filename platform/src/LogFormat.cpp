// Walks a log format one conversion at a time. Each standard conversion is
// rebuilt without its annotation, its '*' width and precision resolved, and
// handed to snprintf with an argument read by its promoted type; "%@" prints
// the object's description. Output is never truncated.
#include "LogFormat.h"

#include "PlatformText.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <cwchar>

namespace vp {
namespace {

// One conversion as written in the format, minus any "{...}" annotation.
struct Conversion {
    std::string flags;
    bool hasWidth = false;
    int width = 0;
    bool hasPrecision = false;
    int precision = 0;
    std::string length; // "", "hh", "h", "l", "ll", "z", "j", "t" or "L"
    char type = 0;

    // The conversion for snprintf with the length modifier that matches the
    // argument actually read (a stray modifier would make snprintf read
    // another type).
    std::string spec(const std::string& lengthUsed, char as) const { return specWith(flags, lengthUsed, as); }

    // As text: only the '-' flag means something for %s.
    std::string textSpec() const { return specWith(flags.find('-') != std::string::npos ? "-" : "", "", 's'); }

private:
    std::string specWith(const std::string& flagsUsed, const std::string& lengthUsed, char as) const
    {
        std::string s = "%" + flagsUsed;
        if (hasWidth)
            s += std::to_string(width); // a negative width from '*' reads as the '-' flag
        if (hasPrecision)
            s += "." + std::to_string(precision);
        return s + lengthUsed + as;
    }
};

template <class T>
void appendFormatted(std::string& out, const std::string& spec, T value)
{
    int size = std::snprintf(nullptr, 0, spec.c_str(), value);
    if (size <= 0)
        return;
    size_t start = out.size();
    out.resize(start + size_t(size) + 1);
    std::snprintf(out.data() + start, size_t(size) + 1, spec.c_str(), value);
    out.resize(start + size_t(size));
}

class Walker {
public:
    Walker(const char* format, va_list* args) : p_(format), args_(args) {}

    std::string run()
    {
        while (*p_) {
            const char* percent = std::strchr(p_, '%');
            if (!percent) {
                out_ += p_;
                break;
            }
            out_.append(p_, percent);
            p_ = percent;
            conversion();
        }
        return std::move(out_);
    }

private:
    // p_ is at a '%'. Reads the conversion and prints it; text that is not a
    // known conversion is copied as it stands and consumes no argument.
    void conversion()
    {
        const char* start = p_++;
        Conversion c;
        if (*p_ == '{') {
            const char* close = std::strchr(p_, '}');
            if (!close)
                return copyFrom(start);
            p_ = close + 1;
        }
        while (*p_ && std::strchr("-+ #0'", *p_))
            c.flags += *p_++;
        readNumber(c.hasWidth, c.width);
        if (*p_ == '.') {
            ++p_;
            readNumber(c.hasPrecision, c.precision);
            if (!c.hasPrecision) // "%.f": precision 0
                c.hasPrecision = true;
            else if (c.precision < 0) // a negative precision from '*' counts as none
                c.hasPrecision = false;
        }
        readLength(c.length);
        c.type = *p_;
        if (!c.type)
            return copyFrom(start);
        ++p_;
        if (!print(c))
            copyFrom(start);
    }

    // Widths and precisions are capped far beyond any sensible field, so that a
    // wild argument cannot make a message gigabytes long.
    static constexpr int kLargestField = 100000;

    void readNumber(bool& has, int& value)
    {
        if (*p_ == '*') {
            ++p_;
            has = true;
            value = std::clamp(va_arg(*args_, int), -kLargestField, kLargestField);
            return;
        }
        has = false;
        value = 0;
        while (*p_ >= '0' && *p_ <= '9') {
            has = true;
            value = std::min(value * 10 + (*p_ - '0'), kLargestField);
            ++p_;
        }
    }

    void readLength(std::string& length)
    {
        if ((p_[0] == 'h' && p_[1] == 'h') || (p_[0] == 'l' && p_[1] == 'l')) {
            length.assign(p_, 2);
            p_ += 2;
        } else if (*p_ && std::strchr("hlzjtL", *p_)) {
            length.assign(p_, 1);
            ++p_;
        }
    }

    void copyFrom(const char* start) { out_.append(start, p_); }

    // Prints one conversion; false when the conversion is not known.
    bool print(const Conversion& c)
    {
        switch (c.type) {
        case '%':
            out_ += '%';
            return true;
        case 'd':
        case 'i':
            printSigned(c);
            return true;
        case 'u':
        case 'o':
        case 'x':
        case 'X':
            printUnsigned(c);
            return true;
        case 'f':
        case 'F':
        case 'e':
        case 'E':
        case 'g':
        case 'G':
        case 'a':
        case 'A':
            if (c.length == "L")
                appendFormatted(out_, c.spec("L", c.type), va_arg(*args_, long double));
            else // floats arrive promoted to double
                appendFormatted(out_, c.spec("", c.type), va_arg(*args_, double));
            return true;
        case 'c':
            if (c.length == "l")
                appendFormatted(out_, c.spec("l", 'c'), va_arg(*args_, wint_t));
            else
                appendFormatted(out_, c.spec("", 'c'), va_arg(*args_, int));
            return true;
        case 's':
            printString(c);
            return true;
        case 'p':
            appendFormatted(out_, c.spec("", 'p'), va_arg(*args_, void*));
            return true;
        case 'n': // never written through: the argument is skipped
            (void) va_arg(*args_, void*);
            return true;
        case '@':
            printObject(c);
            return true;
        default:
            return false;
        }
    }

    // hh, h and no modifier arrive promoted to int (snprintf narrows them
    // again); L on an integer means long long.
    void printSigned(const Conversion& c)
    {
        const std::string& n = c.length;
        if (n == "l")
            appendFormatted(out_, c.spec("l", c.type), va_arg(*args_, long));
        else if (n == "ll" || n == "L")
            appendFormatted(out_, c.spec("ll", c.type), va_arg(*args_, long long));
        else if (n == "z")
            appendFormatted(out_, c.spec("z", c.type), va_arg(*args_, size_t));
        else if (n == "j")
            appendFormatted(out_, c.spec("j", c.type), va_arg(*args_, intmax_t));
        else if (n == "t")
            appendFormatted(out_, c.spec("t", c.type), va_arg(*args_, ptrdiff_t));
        else
            appendFormatted(out_, c.spec(n, c.type), va_arg(*args_, int));
    }

    void printUnsigned(const Conversion& c)
    {
        const std::string& n = c.length;
        if (n == "l")
            appendFormatted(out_, c.spec("l", c.type), va_arg(*args_, unsigned long));
        else if (n == "ll" || n == "L")
            appendFormatted(out_, c.spec("ll", c.type), va_arg(*args_, unsigned long long));
        else if (n == "z")
            appendFormatted(out_, c.spec("z", c.type), va_arg(*args_, size_t));
        else if (n == "j")
            appendFormatted(out_, c.spec("j", c.type), va_arg(*args_, uintmax_t));
        else if (n == "t")
            appendFormatted(out_, c.spec("t", c.type), va_arg(*args_, ptrdiff_t));
        else
            appendFormatted(out_, c.spec(n, c.type), va_arg(*args_, unsigned int));
    }

    void printString(const Conversion& c)
    {
        if (c.length == "l") {
            if (const wchar_t* text = va_arg(*args_, const wchar_t*))
                return appendFormatted(out_, c.spec("l", 's'), text);
        } else if (const char* text = va_arg(*args_, const char*)) {
            return appendFormatted(out_, c.spec("", 's'), text);
        }
        appendFormatted(out_, c.textSpec(), "(null)");
    }

    void printObject(const Conversion& c)
    {
        std::string text = descriptionOf(va_arg(*args_, CFTypeRef));
        appendFormatted(out_, c.textSpec(), text.c_str());
    }

    const char* p_;
    va_list* args_;
    std::string out_;
};

} // namespace

std::string formatLogMessage(const char* format, va_list args)
{
    va_list walk;
    va_copy(walk, args);
    std::string message = Walker(format, &walk).run();
    va_end(walk);
    return message;
}

} // namespace vp
