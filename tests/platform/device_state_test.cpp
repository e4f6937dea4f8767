#include "CFOwned.h"
#include "common/TestSupport.h"

#include <QVT/QVT.h>
#include <Tessary/Tessary.h>
#include <VantishPlatform/DeviceState.h>
#include <mach/mach_time.h>
#include <sys/sysctl.h>

#include <gtest/gtest.h>

#include <cerrno>
#include <cstring>
#include <fstream>
#include <iterator>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

namespace {

using vt::own;

std::string bootArgs()
{
    char buffer[1024] = {};
    size_t length = sizeof buffer;
    if (sysctlbyname("kern.bootargs", buffer, &length, nullptr, 0) != 0)
        return "<failed>";
    EXPECT_EQ(length, std::strlen(buffer) + 1);
    return buffer;
}

class Sysctl : public ::testing::Test {
protected:
    void TearDown() override
    {
        VPSetBootArgs(std::nullopt);
        VPSetSysctlFailure(0);
    }
};

TEST_F(Sysctl, BootArgsOverrideThenKernelCommandLine)
{
    VPSetBootArgs("debug=0x14 als_default_calibration=0");
    EXPECT_EQ(bootArgs(), "debug=0x14 als_default_calibration=0");
    VPSetBootArgs("");
    EXPECT_EQ(bootArgs(), "");

    VPSetBootArgs(std::nullopt);
    std::ifstream in("/proc/cmdline");
    std::string cmdline((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
    ASSERT_FALSE(cmdline.empty());
    ASSERT_EQ(cmdline.back(), '\n');
    cmdline.pop_back();
    EXPECT_EQ(bootArgs(), cmdline);
}

TEST_F(Sysctl, LengthQueryAndTooSmallBuffer)
{
    VPSetBootArgs("abcdef");
    size_t length = 0;
    ASSERT_EQ(sysctlbyname("kern.bootargs", nullptr, &length, nullptr, 0), 0);
    EXPECT_EQ(length, 7u);

    // No room for the NUL: nothing is copied, the needed length is reported.
    char buffer[8];
    std::memset(buffer, '#', sizeof buffer);
    length = 6;
    errno = 0;
    EXPECT_EQ(sysctlbyname("kern.bootargs", buffer, &length, nullptr, 0), -1);
    EXPECT_EQ(errno, ENOMEM);
    EXPECT_EQ(length, 7u);
    EXPECT_EQ(std::string(buffer, 8), "########");

    length = 7;
    ASSERT_EQ(sysctlbyname("kern.bootargs", buffer, &length, nullptr, 0), 0);
    EXPECT_STREQ(buffer, "abcdef");
    EXPECT_EQ(length, 7u);
}

TEST_F(Sysctl, ErrorsAndForcedFailure)
{
    char buffer[64];
    size_t length = sizeof buffer;
    errno = 0;
    EXPECT_EQ(sysctlbyname("kern.version", buffer, &length, nullptr, 0), -1);
    EXPECT_EQ(errno, ENOENT);

    char value[] = "x";
    EXPECT_EQ(sysctlbyname("kern.bootargs", nullptr, nullptr, value, sizeof value), -1);
    EXPECT_EQ(errno, EPERM);

    VPSetSysctlFailure(EIO);
    length = sizeof buffer;
    EXPECT_EQ(sysctlbyname("kern.bootargs", buffer, &length, nullptr, 0), -1);
    EXPECT_EQ(errno, EIO);
    VPSetSysctlFailure(0);
    EXPECT_NE(bootArgs(), "<failed>");
}

TEST(MachTime, NanosecondTicksAndSettableTimebase)
{
    mach_timebase_info_data_t info{};
    ASSERT_EQ(mach_timebase_info(&info), 0);
    EXPECT_EQ(info.numer, 1u);
    EXPECT_EQ(info.denom, 1u);

    VPSetTimebase(125, 3);
    ASSERT_EQ(mach_timebase_info(&info), 0);
    EXPECT_EQ(info.numer, 125u);
    EXPECT_EQ(info.denom, 3u);
    VPSetTimebase(125, 0); // never a zero divisor
    ASSERT_EQ(mach_timebase_info(&info), 0);
    EXPECT_EQ(info.numer, 1u);
    EXPECT_EQ(info.denom, 1u);
    EXPECT_NE(mach_timebase_info(nullptr), 0);

    uint64_t before = mach_absolute_time();
    std::this_thread::sleep_for(std::chrono::milliseconds(2));
    uint64_t elapsed = mach_absolute_time() - before;
    EXPECT_GE(elapsed, 2000000u);
    EXPECT_LT(elapsed, 2000000000u);
}

class QVTStore : public ::testing::Test {
protected:
    void SetUp() override
    {
        VPQVTSetStoreDirectory(dir.str());
        VPQVTResetReadCount();
    }
    void TearDown() override
    {
        VPQVTSetStoreDirectory("");
        VPQVTSetFailure("XwCA", 0);
        QVTLogSetHandler(nullptr);
    }
    void write(const std::string& name, const std::string& bytes)
    {
        std::ofstream(dir.path() / name, std::ios::binary) << bytes;
    }
    // The record's bytes, "<none>" or "<error domain code>".
    std::string read(CFStringRef key)
    {
        CFErrorRef error = nullptr;
        auto data = own(QVTSealingMapCopyLocalDataForClass(key, nullptr, &error));
        if (error) {
            auto owned = own(error);
            EXPECT_EQ(data.get(), nullptr);
            bool qvtDomain = CFEqual(CFErrorGetDomain(error), CFSTR("QVTErrorDomain"));
            return "<error " + std::string(qvtDomain ? "QVTErrorDomain " : "other ") +
                   std::to_string(CFErrorGetCode(error)) + ">";
        }
        if (!data)
            return "<none>";
        return std::string(reinterpret_cast<const char*>(CFDataGetBytePtr(data.get())),
                           size_t(CFDataGetLength(data.get())));
    }

    vt::TempDir dir;
};

TEST_F(QVTStore, ReadsTheFileOfTheClass)
{
    std::string record("\x01\x00\x02\xff", 4);
    record += std::string(9958, 'r');
    write("XwCA", record);
    EXPECT_EQ(read(CFSTR("XwCA")), record);
    EXPECT_EQ(read(CFSTR("XwCl")), "<none>");
    EXPECT_EQ(read(CFSTR("../XwCA")), "<none>");
    EXPECT_EQ(VPQVTReadCount(), 3u);
    // No error pointer: absent data only.
    EXPECT_EQ(QVTSealingMapCopyLocalDataForClass(CFSTR("XwCl"), nullptr, nullptr), nullptr);

    VPQVTSetStoreDirectory(""); // no store, no data
    EXPECT_EQ(read(CFSTR("XwCA")), "<none>");
    EXPECT_EQ(VPQVTReadCount(), 5u);
}

TEST_F(QVTStore, UnreadableRecordAndInjectedFailureGiveErrors)
{
    std::filesystem::create_directory(dir.path() / "XwCM"); // exists, cannot be read as a file
    EXPECT_EQ(read(CFSTR("XwCM")), "<error QVTErrorDomain " + std::to_string(EISDIR) + ">");

    write("XwCA", "abc");
    VPQVTSetFailure("XwCA", 42);
    EXPECT_EQ(read(CFSTR("XwCA")), "<error QVTErrorDomain 42>");
    EXPECT_EQ(read(CFSTR("XwCA")), "<error QVTErrorDomain 42>");
    VPQVTSetFailure("XwCA", 0);
    EXPECT_EQ(read(CFSTR("XwCA")), "abc");
    EXPECT_EQ(VPQVTReadCount(), 4u);
    VPQVTResetReadCount();
    EXPECT_EQ(VPQVTReadCount(), 0u);
}

std::mutex handlerMutex;
std::vector<std::string> handlerLines;

TEST_F(QVTStore, HandlerHearsWhichFileIsRead)
{
    QVTLogSetHandler([](int, const char* line) {
        std::lock_guard lock(handlerMutex);
        handlerLines.push_back(line);
    });
    write("XwCA", "abc");
    read(CFSTR("XwCA"));
    std::lock_guard lock(handlerMutex);
    ASSERT_FALSE(handlerLines.empty());
    EXPECT_NE(handlerLines.back().find((dir.path() / "XwCA").string()), std::string::npos);
}

class Tessary : public ::testing::Test {
protected:
    void TearDown() override { VPTessaryReset(); }
};

TEST_F(Tessary, AnswersAndProductTypeAreKeptUntilReset)
{
    EXPECT_EQ(QyCopyAnswer(CFSTR("ProductName"), nullptr), nullptr);
    {
        auto name = vt::string("Model 7");
        VPTessarySetAnswer(CFSTR("ProductName"), name.get());
    } // the store keeps its own reference
    auto copy = own(QyCopyAnswer(vt::string("ProductName").get(), nullptr));
    ASSERT_NE(copy.get(), nullptr);
    EXPECT_TRUE(CFEqual(copy.get(), CFSTR("Model 7")));
    CFIndex held = CFGetRetainCount(copy.get());
    auto second = own(QyCopyAnswer(CFSTR("ProductName"), nullptr));
    EXPECT_EQ(CFGetRetainCount(copy.get()), held + 1);

    VPTessarySetAnswer(CFSTR("DeviceColor"), vt::number(2).get());
    VPTessarySetAnswer(CFSTR("ProductName"), nullptr);
    EXPECT_EQ(QyCopyAnswer(CFSTR("ProductName"), nullptr), nullptr);
    EXPECT_TRUE(CFEqual(own(QyCopyAnswer(CFSTR("DeviceColor"), nullptr)).get(), vt::number(2).get()));
    EXPECT_TRUE(CFEqual(copy.get(), CFSTR("Model 7"))); // still ours after removal

    EXPECT_EQ(QyGetProductType(), 0);
    VPTessarySetProductType(62);
    EXPECT_EQ(QyGetProductType(), 62);
    VPTessaryReset();
    EXPECT_EQ(QyGetProductType(), 0);
    EXPECT_EQ(QyCopyAnswer(CFSTR("DeviceColor"), nullptr), nullptr);
}

} // namespace
