#include "CalibrationFixture.h"

#include <memory>

namespace {

using ct::Bytes;
using ct::XwClShape;
namespace v = ct::xwcl;

class XwClFormatTest : public ct::CalibrationTest {
protected:
    bool load(const XwClShape& shape)
    {
        writeStore("XwCl", ct::makeXwCl(shape).vec());
        return parts(*plugin).calibration().loadQVTCalibration(false);
    }
};

Bytes header(size_t length, uint32_t chipType, unsigned k)
{
    Bytes b(length);
    b.u8(0, 1).u32(1, 2).u32(5, chipType).u8(9, 1).u16(10, unsigned(length));
    b.u16(12, v::fudge(k)).u16(14, v::iTime(k)).u16(16, v::aux1(k)).u16(18, v::aux2(k));
    return b;
}

// A channel block from entry k: 24-byte form (paramB one byte, gains at 6)
// or 25-byte form (paramB sign-extended to 16 bits, gains at 7).
void block(Bytes& b, size_t at, unsigned k, unsigned c, unsigned nGains, bool wide)
{
    b.u8(at, v::darkCounts(k, c)).i16(at + 1, v::offsetCounts(k, c)).u16(at + 3, v::paramA(k, c));
    if (wide)
        b.i16(at + 5, v::paramB(k, c));
    else
        b.i8(at + 5, v::paramB(k, c));
    for (unsigned g = 0; g < nGains; ++g)
        b.u16(at + (wide ? 7 : 6) + 2 * g, v::gainScale(k, c, g));
}

Bytes fiveChannelRecord(const XwClShape& s, unsigned k)
{
    Bytes b = header(193, s.chipType, k);
    b.u16(20, v::aux3(k));
    for (unsigned i = 0; i < 4; ++i)
        b.u8(22 + i, v::gain(k, i));
    b.u8(26, s.nChannels).u8(27, s.nGains);
    for (unsigned c = 0; c < s.nChannels; ++c) {
        b.f32(28 + 4 * c, float(v::lux(k, c) / 65536.0)).f32(48 + 4 * c, float(v::cct(k, c) / 256.0));
        block(b, 68 + 25 * c, k, c, s.nGains, true);
    }
    return b;
}

Bytes fourChannelRecord(const XwClShape& s, unsigned k)
{
    Bytes b = header(145, 0, k);
    for (unsigned i = 0; i < 3; ++i)
        b.u8(20 + i, v::gain(k, i));
    b.u8(23, s.nChannels).u8(24, s.nGains);
    b.i32(41, v::cct(k, 0)).i32(45, v::cct(k, 1));
    for (unsigned c = 0; c < s.nChannels; ++c) {
        b.i32(25 + 4 * c, v::lux(k, c));
        block(b, 49 + 24 * c, k, c, s.nGains, false);
    }
    return b;
}

Bytes sixChannelRecord(const XwClShape& s, unsigned k)
{
    Bytes b = header(220, s.chipType, k);
    b.u16(20, v::aux3(k));
    for (unsigned i = 0; i < 4; ++i)
        b.u8(22 + i, v::gain(k, i));
    b.u8(26, s.nChannels).u8(27, s.nGains);
    const double cctDivisor = s.chipType == 0 ? 65536.0 : 256.0;
    for (unsigned c = 0; c < s.nChannels; ++c) {
        b.f32(28 + 4 * c, float(v::lux(k, c) / 65536.0)).f32(52 + 4 * c, float(v::cct(k, c) / cctDivisor));
        block(b, 76 + 24 * c, k, c, s.nGains, false);
    }
    return b;
}

TEST_F(XwClFormatTest, FiveChannelRecordComesFromTheFirstEntry)
{
    for (uint8_t device : {uint8_t(14), uint8_t(19)}) {
        SCOPED_TRACE(int(device));
        const XwClShape shape{.entries = 2,
                              .deviceID = device,
                              .chipID = 0x11223344,
                              .chipType = 1,
                              .selector = 2,
                              .nChannels = 4,
                              .nGains = 7};
        parts(*plugin).unit().chipId = 0x11223344;
        ASSERT_TRUE(load(shape));
        EXPECT_BYTES_EQ(received("ALSCalibrationData"), fiveChannelRecord(shape, 0).vec());
        EXPECT_FLOAT_EQ(parts(*plugin).unit().smallDBVersion.load(), 1.3f);
        EXPECT_EQ(parts(*plugin).unit().chipType.load(), 1u);
        EXPECT_EQ(parts(*plugin).unit().numberOfChannels.load(), 4u);
        EXPECT_EQ(parts(*plugin).unit().dbChannelCount.load(), 4u);
    }
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG, "Found Kestrow calibration"));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG, "Found Marlit calibration"));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "XwCl version = v2.3\n"));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, "Found calibration for chip with ID = 0x11223344\n"));
    EXPECT_TRUE(
        log.contains(OS_LOG_TYPE_DEBUG,
                     "loadQVTCalibration: luxCoeff[1]=2.000046, cctCoeff[1]=-7.812500, offsetCounts[1]=-301/255"));
}

TEST_F(XwClFormatTest, FourChannelRecordComesFromTheSelectedEntry)
{
    for (uint8_t device : {uint8_t(35), uint8_t(58)}) {
        SCOPED_TRACE(int(device));
        const XwClShape shape{
            .entries = 2, .deviceID = device, .chipType = 2, .selector = 2, .nChannels = 4, .nGains = 8};
        parts(*plugin).unit().chipType = 7;
        ASSERT_TRUE(load(shape));
        EXPECT_BYTES_EQ(received("ALSCalibrationData"), fourChannelRecord(shape, 1).vec());
        EXPECT_EQ(parts(*plugin).unit().algoVersion.load(), 4);
        EXPECT_EQ(parts(*plugin).fit().lambdaConfigured.load(), 1);
        EXPECT_FLOAT_EQ(parts(*plugin).fit().lambda.load(), 0.01f);
        EXPECT_EQ(parts(*plugin).unit().numberOfChannels.load(), 4u);
        EXPECT_EQ(parts(*plugin).unit().dbChannelCount.load(), 4u);
        EXPECT_EQ(parts(*plugin).unit().chipType.load(), 7u); // this layout has no chip type
    }
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG, "luxCoeff[2]=200707/65536, offsetCounts[2]=-312/255"));
}

TEST_F(XwClFormatTest, SixChannelRecordScalesColourTemperatureByChipType)
{
    for (uint8_t chipType : {uint8_t(0), uint8_t(1)}) {
        SCOPED_TRACE(int(chipType));
        const XwClShape shape{
            .entries = 1, .deviceID = 62, .chipType = chipType, .selector = 1, .nChannels = 6, .nGains = 9};
        ASSERT_TRUE(load(shape));
        EXPECT_BYTES_EQ(received("ALSCalibrationData"), sixChannelRecord(shape, 0).vec());
        EXPECT_FLOAT_EQ(parts(*plugin).unit().smallDBVersion.load(), 1.2f);
        EXPECT_EQ(parts(*plugin).unit().chipType.load(), chipType);
        EXPECT_EQ(parts(*plugin).unit().numberOfChannels.load(), 6u);
        EXPECT_EQ(parts(*plugin).unit().dbChannelCount.load(), 5u);
    }
}

// The stored chip ID matches in either byte order (or when both are zero);
// a mismatch clears dbReady and sends nothing.
TEST_F(XwClFormatTest, ChipIdMustMatch)
{
    const XwClShape shape{.deviceID = 14, .chipID = 0x11223344};
    for (uint32_t sensor : {0x11223344u, 0x44332211u}) {
        parts(*plugin).unit().chipId = sensor;
        EXPECT_TRUE(load(shape)) << std::hex << sensor;
    }
    parts(*plugin).unit().chipId = 0;
    EXPECT_TRUE(load({.deviceID = 14, .chipID = 0}));

    const size_t sent = VPServiceReceivedCount(service, CFSTR("ALSCalibrationData"));
    parts(*plugin).databases().publish(std::make_shared<const SpectralDatabase>(), true);
    for (uint32_t sensor : {0u, 0x11223345u}) {
        parts(*plugin).unit().chipId = sensor;
        EXPECT_FALSE(load(shape)) << std::hex << sensor;
    }
    EXPECT_FALSE(parts(*plugin).databases().isReady());
    EXPECT_EQ(VPServiceReceivedCount(service, CFSTR("ALSCalibrationData")), sent);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "ID in QVT calibration (0x11223344) doesn't match with chip ID (0x0) "
                                                "-> calibration will be skipped.\n"));
    EXPECT_FALSE(log.contains("Failed to parse ALS calibration data."));
}

TEST_F(XwClFormatTest, RecordsThatDoNotFitTheirLayoutAreRejected)
{
    const XwClShape rejected[] = {
        {.entries = 1, .deviceID = 62, .selector = 0, .nChannels = 6}, // selector names no entry
        {.entries = 2, .deviceID = 35, .selector = 3, .nChannels = 4}, // past the second entry
        {.entries = 1, .deviceID = 58, .selector = 2, .nChannels = 4}, // one entry only
        {.entries = 1, .deviceID = 35, .selector = 1, .nChannels = 5}, // 4-channel record
        {.entries = 1, .deviceID = 14, .selector = 1, .nChannels = 6}, // 5-channel record
        {.entries = 1, .deviceID = 62, .selector = 1, .nChannels = 7}, // 6-channel record
        {.entries = 1, .deviceID = 62, .selector = 1, .nChannels = 1}, // no channel left for colour
        {.entries = 1, .deviceID = 19, .selector = 1, .nChannels = 0},
        {.entries = 1, .deviceID = 14, .selector = 1, .nChannels = 5, .nGains = 10},
        {.entries = 1, .deviceID = 20, .selector = 1, .nChannels = 5}, // unknown device
    };
    for (const XwClShape& shape : rejected) {
        SCOPED_TRACE(testing::Message() << "device " << int(shape.deviceID) << " selector " << int(shape.selector)
                                        << " channels " << int(shape.nChannels) << " gains " << int(shape.nGains));
        log.clear();
        parts(*plugin).unit().numberOfChannels = 3;
        EXPECT_FALSE(load(shape));
        EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "Failed to parse ALS calibration data."));
        EXPECT_TRUE(received("ALSCalibrationData").empty());
        EXPECT_EQ(parts(*plugin).unit().numberOfChannels.load(), 3u);
    }

    log.clear();
    load({.entries = 1, .deviceID = 14, .selector = 1, .nChannels = 5, .nGains = 10});
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "XwCl calibration with 5 channels and 10 gains does not fit the "
                                                "5-channel record -> calibration will be skipped.\n"));
    load({.entries = 2, .deviceID = 35, .selector = 3, .nChannels = 4});
    EXPECT_TRUE(
        log.contains(OS_LOG_TYPE_ERROR, "XwCl entry selector 3 names no entry of 2 -> calibration will be skipped.\n"));
}

} // namespace
