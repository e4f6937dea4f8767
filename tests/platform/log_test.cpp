#include "CFOwned.h"
#include "common/TestSupport.h"

#include <VantishPlatform/LogControl.h>
#include <os/log.h>

#include <gtest/gtest.h>

#include <climits>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <thread>
#include <vector>

namespace {

// The message text one emit produces.
template <class... Args>
std::string formatted(const char* format, Args... args)
{
    vt::LogCapture capture;
    _os_log_emit(OS_LOG_DEFAULT, OS_LOG_TYPE_DEFAULT, format, args...);
    const auto& lines = capture.lines();
    return lines.size() == 1 ? lines[0].message : "<" + std::to_string(lines.size()) + " lines>";
}

template <class... Args>
std::string printed(const char* format, Args... args)
{
    char buffer[512];
    std::snprintf(buffer, sizeof buffer, format, args...);
    return buffer;
}

TEST(LogFormat, PrivacyAnnotationsAreDroppedAndObjectsPrintTheirDescription)
{
    EXPECT_EQ(formatted("matched %{public}s on %{private}d", "als,ct720", 3), "matched als,ct720 on 3");
    EXPECT_EQ(formatted("%{public, private}-6s|", "ab"), "ab    |");
    EXPECT_EQ(formatted("%{public}@", CFSTR("XwCA")), "XwCA");
    auto error = vt::own(CFErrorCreate(nullptr, CFSTR("QVTErrorDomain"), 42, nullptr));
    EXPECT_EQ(formatted("QVTDataCopy for key %@ failed with error %@", CFSTR("XwCM"), error.get()),
              "QVTDataCopy for key XwCM failed with error " + vt::describe(error.get()));
    EXPECT_EQ(formatted("value %@.", nullptr), "value (null).");
    EXPECT_EQ(formatted("[%8@][%-6@]", CFSTR("abc"), CFSTR("de")), "[     abc][de    ]");
}

// Each conversion reads its argument with the right type: a wrong one would
// shift every later argument.
TEST(LogFormat, StandardConversionsMatchPrintf)
{
    EXPECT_EQ(formatted("%hhu %hhd %hu %hd", 300, 200, 70000, 40000),
              printed("%hhu %hhd %hu %hd", 300, 200, 70000, 40000));
    EXPECT_EQ(formatted("%ld|%lu|%lld|%llx", LONG_MIN, ULONG_MAX, LLONG_MIN, 0x1234567890abcdefULL),
              printed("%ld|%lu|%lld|%llx", LONG_MIN, ULONG_MAX, LLONG_MIN, 0x1234567890abcdefULL));
    EXPECT_EQ(formatted("%zu %zd %jd %td", SIZE_MAX, size_t(7), INTMAX_MIN, ptrdiff_t(-9)),
              printed("%zu %zd %jd %td", SIZE_MAX, size_t(7), INTMAX_MIN, ptrdiff_t(-9)));
    EXPECT_EQ(formatted("%.3f %5.1e %g %a %Lf", 1.23456f, 12345.678, 0.0001, 1.5, 2.25L),
              printed("%.3f %5.1e %g %a %Lf", 1.23456f, 12345.678, 0.0001, 1.5, 2.25L));
    EXPECT_EQ(formatted("%x %X %o %#x %+d % d %05d %-5d|", 255, 255, 8, 255, 5, 5, -42, 7),
              printed("%x %X %o %#x %+d % d %05d %-5d|", 255, 255, 8, 255, 5, 5, -42, 7));
    EXPECT_EQ(formatted("%c%c %5s %.2s %%", 'o', 'k', "ab", "xyz"), "ok    ab xy %");
    EXPECT_EQ(formatted("%*d|%-*d|%.*f|%*d", 5, 42, 4, 1, 2, 3.14159, -4, 9), "   42|1   |3.14|9   ");
    int dummy = 0;
    EXPECT_EQ(formatted("%p", &dummy), printed("%p", &dummy));
}

TEST(LogFormat, OddFormatsStayReadable)
{
    EXPECT_EQ(formatted("%s", static_cast<const char*>(nullptr)), "(null)");
    int written = -1;
    EXPECT_EQ(formatted("a%nb %d", &written, 5), "ab 5");
    EXPECT_EQ(written, -1);
    EXPECT_EQ(formatted("%k and %d", 4), "%k and 4");
    EXPECT_EQ(formatted("100%"), "100%");
    EXPECT_EQ(formatted("%{public"), "%{public");
    EXPECT_EQ(formatted("tab\there\n"), "tab\there\n");
}

TEST(LogFormat, LongMessagesAreNotTruncated)
{
    std::string big(20000, 'x');
    big += "end";
    EXPECT_EQ(formatted("<%s>", big.c_str()), "<" + big + ">");
    EXPECT_EQ(formatted("%5000d", 1).size(), 5000u);
    // A wild width is capped rather than allocated.
    EXPECT_EQ(formatted("%*d", 1000000000, 1).size(), 100000u);
}

TEST(LogLevels, EachLevelEnablesItsTypesAndThoseAbove)
{
    const os_log_type_t types[] = {OS_LOG_TYPE_DEBUG, OS_LOG_TYPE_INFO, OS_LOG_TYPE_DEFAULT, OS_LOG_TYPE_ERROR,
                                   OS_LOG_TYPE_FAULT};
    const struct {
        VPLogLevel level;
        bool enabled[5]; // debug, info, default, error, fault
    } cases[] = {{VPLogLevel::Debug, {true, true, true, true, true}},
                 {VPLogLevel::Info, {false, true, true, true, true}},
                 {VPLogLevel::Default, {false, false, true, true, true}},
                 {VPLogLevel::Error, {false, false, false, true, true}},
                 {VPLogLevel::Off, {false, false, false, false, false}}};
    const VPLogLevel previous = VPLogGetLevel();
    for (const auto& c : cases) {
        VPLogSetLevel(c.level);
        for (size_t t = 0; t < 5; ++t)
            EXPECT_EQ(os_log_type_enabled(OS_LOG_DEFAULT, types[t]), c.enabled[t]) << int(c.level) << " " << t;
    }
    VPLogSetLevel(previous);
}

TEST(LogLevels, DisabledMessagesAreNotEmitted)
{
    vt::LogCapture capture(VPLogLevel::Default);
    int evaluated = 0;
    os_log_debug(OS_LOG_DEFAULT, "debug %d", ++evaluated);
    os_log_info(OS_LOG_DEFAULT, "info %d", ++evaluated);
    os_log_error(OS_LOG_DEFAULT, "error %d", ++evaluated);
    EXPECT_EQ(evaluated, 1);
    EXPECT_EQ(capture.messages(), std::vector<std::string>{"error 1"});
}

TEST(LogLevelsDeathTest, EnvironmentSetsTheStartingLevel)
{
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    const struct {
        const char* value;
        VPLogLevel level;
    } cases[] = {{"debug", VPLogLevel::Debug},
                 {"info", VPLogLevel::Info},
                 {"error", VPLogLevel::Error},
                 {"off", VPLogLevel::Off},
                 {"nonsense", VPLogLevel::Default}};
    for (const auto& c : cases) {
        setenv("VANTISH_LOG", c.value, 1);
        EXPECT_EXIT(std::exit(VPLogGetLevel() == c.level ? 0 : 1), ::testing::ExitedWithCode(0), "") << c.value;
    }
    unsetenv("VANTISH_LOG");
}

TEST(LogCapture, KeepsExactTextTypeAndHandle)
{
    os_log_t log = os_log_create("com.example.vantish", "calibration");
    ASSERT_NE(log, nullptr);
    vt::LogCapture capture;
    os_log_info(log, "Getting QVT calibration...\n");
    os_log_error(nullptr, "no handle");
    const auto& lines = capture.lines();
    ASSERT_EQ(lines.size(), 2u);
    EXPECT_EQ(lines[0].type, OS_LOG_TYPE_INFO);
    EXPECT_EQ(lines[0].subsystem, "com.example.vantish");
    EXPECT_EQ(lines[0].category, "calibration");
    EXPECT_EQ(lines[0].message, "Getting QVT calibration...\n");
    EXPECT_EQ(lines[1].type, OS_LOG_TYPE_ERROR);
    EXPECT_EQ(lines[1].subsystem, "");
    EXPECT_EQ(lines[1].message, "no handle");
}

TEST(LogCapture, RestartDropsEarlierLinesAndStopEndsCapture)
{
    VPLogStartCapture();
    os_log(OS_LOG_DEFAULT, "before");
    VPLogStartCapture();
    os_log(OS_LOG_DEFAULT, "after");
    VPLogStopCapture();
    os_log(OS_LOG_DEFAULT, "stopped");
    auto lines = VPLogTakeCaptured();
    ASSERT_EQ(lines.size(), 1u);
    EXPECT_EQ(lines[0].message, "after");
    EXPECT_TRUE(VPLogTakeCaptured().empty());
}

TEST(LogCapture, ConcurrentLinesStayWhole)
{
    vt::LogCapture capture;
    os_log_t log = os_log_create("com.example.vantish", "threads");
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back([log, t] {
            for (int i = 0; i < 200; ++i)
                os_log(log, "thread %d line %d with %s", t, i, "some text");
        });
    for (auto& thread : threads)
        thread.join();
    const auto& lines = capture.lines();
    ASSERT_EQ(lines.size(), 800u);
    for (const auto& line : lines)
        EXPECT_NE(line.message.find(" with some text"), std::string::npos);
}

TEST(LogEcho, OneLinePerMessageOnStderr)
{
    os_log_t log = os_log_create("com.example.vantish", "default");
    VPLogSetEcho(true);
    ::testing::internal::CaptureStderr();
    os_log_error(log, "Failed to parse ALS calibration data.");
    os_log(log, "Parsed big DB\n");
    os_log(log, "two\n\n");
    os_log(OS_LOG_DEFAULT, "plain");
    std::string err = ::testing::internal::GetCapturedStderr();
    VPLogSetEcho(std::getenv("VANTISH_TEST_LOG") != nullptr);
    EXPECT_EQ(err, "com.example.vantish:default error: Failed to parse ALS calibration data.\n"
                   "com.example.vantish:default default: Parsed big DB\n"
                   "com.example.vantish:default default: two\n\n"
                   "default: plain\n");
}

// Handles are kept per subsystem and category: a host that creates and
// releases plug-in instances for as long as it runs must not grow with them
// (fuzzing found one allocation kept per instance).
TEST(LogHandles, SameSubsystemAndCategoryGiveTheSameHandle)
{
    const os_log_t first = os_log_create("org.example.reuse", "default");
    ASSERT_NE(first, nullptr);
    for (int i = 0; i < 1000; ++i)
        ASSERT_EQ(os_log_create("org.example.reuse", "default"), first);
    EXPECT_NE(os_log_create("org.example.reuse", "calibration"), first);
    EXPECT_NE(os_log_create("org.example.other", "default"), first);
}

TEST(LogHandles, CreationCanBeMadeToFail)
{
    VPLogSetCreateFails(true);
    EXPECT_EQ(os_log_create("com.example.vantish", "default"), nullptr);
    VPLogSetCreateFails(false);
    EXPECT_NE(os_log_create("com.example.vantish", "default"), nullptr);
}

} // namespace
