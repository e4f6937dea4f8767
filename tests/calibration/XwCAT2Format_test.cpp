#include "CalibrationFixture.h"

#include "formats/XwCAT2Layout.h"

namespace {

using ct::Bytes;
using ct::XwCAShape;
namespace v = ct::xwca;

class XwCAT2FormatTest : public ct::CalibrationTest {
protected:
    void SetUp() override
    {
        CalibrationTest::SetUp();
        parts(*plugin).unit().chipId = 0x1A2B3C4D;
    }
    bool load(const XwCAShape& shape)
    {
        writeStore("XwCA", ct::makeXwCA(shape).vec());
        return parts(*plugin).calibration().loadQVTCalibration(false);
    }
};

Bytes expectedRecord(const XwCAShape& s, unsigned gain, unsigned iTime, unsigned fudge)
{
    Bytes b(193);
    b.u8(0, 1).u32(1, 2).u32(5, 0).u8(9, 1).u16(10, 193);
    b.u16(12, fudge).u16(14, iTime).u16(16, 100).u16(18, 99).u16(20, 62);
    b.u8(22, gain).u8(23, gain).u8(24, gain).u8(25, gain).u8(26, s.nChannels).u8(27, s.nGains);
    for (unsigned c = 0; c < s.nChannels; ++c) {
        b.f32(28 + 4 * c, float(v::lux(c) / 2147483648.0)).f32(48 + 4 * c, float(v::cct(c) / 16384.0));
        const size_t at = 68 + 25 * c;
        b.u8(at, v::darkCounts(c)).i16(at + 1, v::offsetCounts(c)).u16(at + 3, v::paramA(c)).i16(at + 5, v::paramB(c));
        for (unsigned g = 0; g < 4; ++g)
            b.u16(at + 7 + 2 * g, 0x8000);
        for (unsigned g = 0; g < s.nGains; ++g)
            b.u16(at + 7 + 2 * (4 + g), v::gainScale(c, g));
    }
    return b;
}

// Versions above 1.6 take gain and timing from the record (gain index 12 with
// 5 gains is gain 16), 1.6 uses fixed timing, and version 1.7 of the model with
// the timing fault gets corrected timing.
TEST_F(XwCAT2FormatTest, TimingFollowsVersionAndModel)
{
    const uint32_t faulty = stored::xwca::kProductTypeWithTimingFault;
    struct Case {
        uint32_t productType;
        XwCAShape shape;
        unsigned gain, iTime, fudge;
    };
    const Case cases[] = {
        {faulty + 1, {}, 16, 180, 0x4100},
        {faulty + 1, {.major = 1, .minor = 6, .nGains = 3, .gainIndex = 200, .iTime = -7}, 6, 150, 0x4100},
        {faulty, {}, 16, 250, 0x4CCC},
        {faulty, {.minor = 8}, 16, 180, 0x4100},
    };
    const std::string workaround = "WORKAROUND: override iTime (180 -> 250) and fudge (16640 -> 19660)";
    size_t workarounds = 0;
    for (const Case& c : cases) {
        SCOPED_TRACE(testing::Message() << "product " << c.productType << " version 1." << int(c.shape.minor));
        VPTessarySetProductType(c.productType);
        ASSERT_TRUE(load(c.shape));
        EXPECT_BYTES_EQ(received("ALSCalibrationData"), expectedRecord(c.shape, c.gain, c.iTime, c.fudge).vec());
        workarounds += c.iTime == 250;
        EXPECT_EQ(log.count(workaround), workarounds);
    }
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, workaround));
    EXPECT_FLOAT_EQ(parts(*plugin).unit().smallDBVersion.load(), 1.3f);
    EXPECT_EQ(parts(*plugin).unit().numberOfChannels.load(), 5u);
    EXPECT_EQ(parts(*plugin).unit().dbChannelCount.load(), 5u);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "processQVTCalibrationXwCAT2: gain = 16, iTime = 180"));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT,
                             "processQVTCalibrationXwCAT2: luxCoeff[0]=0.007812, "
                             "cctCoeff[0]=-3.000000, offsetCounts[0]=-50/255 darkCounts[0] = -112"));
}

TEST_F(XwCAT2FormatTest, ChipIdIsReadAsHexadecimalText)
{
    parts(*plugin).unit().chipId = 0x4D3C2B1A;
    EXPECT_TRUE(load({}));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "Chip_id is 0x1A2B3C4D"));

    parts(*plugin).unit().chipId = 1;
    parts(*plugin).unit().numberOfChannels = 3;
    EXPECT_FALSE(load({}));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "Chip ID doesn't match - (device chip ID 0x00000001 != calibration "
                                                "chip ID 0x1A2B3C4D and chip_id_reversed 0x4D3C2B1A)"));
    EXPECT_EQ(parts(*plugin).unit().numberOfChannels.load(), 3u);
}

TEST_F(XwCAT2FormatTest, CountsBeyondTheRecordAreRejected)
{
    for (const XwCAShape& shape : {XwCAShape{.nChannels = 6}, XwCAShape{.nGains = 6}, XwCAShape{.nChannels = 0}}) {
        parts(*plugin).unit().numberOfChannels = 3;
        EXPECT_FALSE(load(shape));
        EXPECT_TRUE(received("ALSCalibrationData").empty());
        EXPECT_EQ(parts(*plugin).unit().numberOfChannels.load(), 3u);
    }
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "XwCA calibration with 5 channels and 6 gains does not fit the "
                                                "5-channel record -> calibration will be skipped.\n"));
}

TEST_F(XwCAT2FormatTest, WrongLengthLeavesTheRecordUntouched)
{
    Bytes shortRecord(9961);
    CFDataRef data = shortRecord.data();
    EXPECT_FALSE(parts(*plugin).calibration().processQVTCalibrationXwCAT2(data));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR,
                             "QVT calibration data doesn't match with size of XwCA structure (length = 9961)\n"));
    CFRelease(data);
}

} // namespace
