// The registry blob format on its own: fixed-point conversions at their
// limits, and the entry walk and layout checks over hostile blobs.
#include "SysConfigFixture.h"

#include "sysconfig/FixedPoint.h"
#include "sysconfig/SysConfigFormat.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

using namespace sctest;
using namespace sysconfig;

namespace {

std::span<const uint8_t> span(const Bytes& b) { return {b.vector().data(), b.size()}; }

TEST(FixedPoint, TruncatesTowardsZero)
{
    EXPECT_EQ(toQ2_14(1.0f), 0x4000);
    EXPECT_EQ(toQ2_14(0.99999f), 16383);             // 16383.84 down
    EXPECT_EQ(toQ2_14(-0.99999f), uint16_t(-16383)); // -16383.84 up, not down to -16384
    EXPECT_EQ(toQ8_8(1.5f), 384);
    EXPECT_EQ(toQ8_8(1.501f), 384);
    EXPECT_EQ(toQ8_8(-0.5f), 0xFF80);
    EXPECT_EQ(toQ16_16(1.0f), 65536);
    EXPECT_EQ(toQ16_16(-0.25f), -16384);
    EXPECT_EQ(toQ16_16(-0.0000001f), 0);
}

TEST(FixedPoint, SixteenBitFormsKeepTheLowHalf)
{
    EXPECT_EQ(toQ2_14(3.0f), 0xC000); // 49152 fits the unsigned field
    EXPECT_EQ(toQ2_14(4.0f), 0);      // 65536 wraps
    EXPECT_EQ(toQ8_8(65.535f), 16776);
}

TEST(FixedPoint, SaturatesAtTheInt32Limits)
{
    constexpr int32_t max = std::numeric_limits<int32_t>::max();
    constexpr int32_t min = std::numeric_limits<int32_t>::min();
    EXPECT_EQ(toQ16_16(32768.0f), max); // exactly 2^31 would wrap to the minimum
    EXPECT_EQ(toQ16_16(-32768.0f), min);
    EXPECT_EQ(toQ16_16(1e9f), max);
    EXPECT_EQ(toQ16_16(-1e9f), min);
    EXPECT_EQ(toQ16_16(std::numeric_limits<float>::infinity()), max);
    EXPECT_EQ(toQ16_16(std::nanf("")), 0);
    EXPECT_EQ(toQ2_14(1e9f), 0xFFFF);  // low half of 0x7FFFFFFF
    EXPECT_EQ(toQ2_14(-1e9f), 0x0000); // low half of 0x80000000
}

// Small entries: a subheader and a few bytes of body.
Bytes smallEntry(uint8_t orientation, uint16_t entrySize, size_t written = 0)
{
    Bytes e(written ? written : std::max<size_t>(entrySize, 8));
    e.u8(0, 9).u8(2, orientation).u8(3, 1).u16(4, entrySize);
    return e;
}

TEST(EntryWalk, RejectsSizesThatCannotAdvance)
{
    for (uint16_t size : {0, 1, 7}) {
        vt::LogCapture log;
        const Bytes b = blob({smallEntry(1, size, 8), smallEntry(2, 8)});
        EXPECT_FALSE(findCalibrationEntry(span(b), 2, 2, "alsCalibration")) << size;
        EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "alsCalibration entry 0 at offset 8: entry size " +
                                                        std::to_string(size) + " is smaller than its subheader.\n"));
    }
}

TEST(EntryWalk, RejectsASubheaderPastTheEnd)
{
    vt::LogCapture log;
    Bytes b = blob({smallEntry(1, 12)}, 0, 1, std::nullopt, 2);
    b.resize(b.size() + 5); // a partial second subheader
    EXPECT_FALSE(findCalibrationEntry(span(b), 2, 2, "alsAuxCalibration"));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR,
                             "alsAuxCalibration entry 1 at offset 20: subheader runs past the end of the data (25 "
                             "bytes).\n"));
}

TEST(EntryWalk, RejectsAnEntryBodyPastTheEnd)
{
    vt::LogCapture log;
    // The matching entry says 40 bytes, the blob holds 16 of them.
    const Bytes b = blob({smallEntry(1, 40, 16)});
    EXPECT_FALSE(findCalibrationEntry(span(b), 1, 1, "alsCalibration"));
    EXPECT_TRUE(log.contains(
        OS_LOG_TYPE_ERROR, "alsCalibration entry 0 at offset 8: 40 bytes run past the end of the data (24 bytes).\n"));
    // An entry skipped on the way is checked just the same.
    const Bytes two = blob({smallEntry(1, 400, 16), smallEntry(2, 8)});
    EXPECT_FALSE(findCalibrationEntry(span(two), 2, 2, "alsCalibration"));
}

TEST(GenericLayout, RejectsAnEntryTooShortForItsSpectrumBlock)
{
    vt::LogCapture log;
    GenericEntry entry;
    Bytes e = entry.bytes();
    e.resize(112 + 3235);
    EXPECT_FALSE(genericEntryLayout(span(e), 0));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "Calibration entry of 3347 bytes is too short for its channel blocks "
                                                "and spectrum block (3348 bytes).\n"));
    // Revision 1 needs four bytes more than revision 0.
    e.resize(112 + 3236);
    EXPECT_TRUE(genericEntryLayout(span(e), 0));
    EXPECT_FALSE(genericEntryLayout(span(e), 1));
}

} // namespace
