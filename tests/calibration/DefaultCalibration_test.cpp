#include "CalibrationFixture.h"

namespace {

using ct::Bytes;

class DefaultCalibrationTest : public ct::CalibrationTest {};

// Header written by every default record.
Bytes defaultHeader(size_t length)
{
    Bytes b(length);
    b.u8(0, 1).u32(1, 3).u32(5, 0).u8(9, 1).u16(10, unsigned(length));
    b.u16(12, 0x4000).u16(14, 250).u16(16, 100).u16(18, 99);
    return b;
}

Bytes fourChannel(unsigned gain0, unsigned gain12, unsigned nGains, int32_t lux3)
{
    Bytes b = defaultHeader(145);
    b.u8(20, gain0).u8(21, gain12).u8(22, gain12).u8(23, 4).u8(24, nGains);
    b.i32(25 + 12, lux3);
    for (unsigned c = 0; c < 4; ++c)
        for (unsigned g = 0; g < nGains; ++g)
            b.u16(49 + 24 * c + 6 + 2 * g, 0x8000);
    return b;
}

// 5- and 6-channel defaults: blocks of `blockSize` with gainScale at `gainAt`.
Bytes wideRecord(size_t length, unsigned channels, float lux, size_t blocks, size_t blockSize, size_t gainAt)
{
    Bytes b = defaultHeader(length);
    b.u16(20, 62).u8(22, 8).u8(23, 9).u8(24, 9).u8(25, 8).u8(26, channels).u8(27, 9);
    for (unsigned c = 1; c < channels; ++c)
        b.f32(28 + 4 * c, lux);
    for (unsigned c = 0; c < channels; ++c)
        for (unsigned g = 0; g < 9; ++g)
            b.u16(blocks + blockSize * c + gainAt + 2 * g, 0x8000);
    return b;
}

TEST_F(DefaultCalibrationTest, FourChannelRecordFollowsTypeAndDeviceColour)
{
    struct Case {
        eALSSensorType type;
        uint32_t colour;
        Bytes want;
    };
    const Case cases[] = {
        {eALSSensorType4ChannelA, 0, fourChannel(8, 8, 8, 11658)},
        {eALSSensorType4ChannelA, 2, fourChannel(6, 8, 8, 15040)},
        {eALSSensorType4ChannelB, 2, fourChannel(8, 9, 9, 15040)},
        {eALSSensorType4ChannelB, 1, fourChannel(8, 9, 9, 11658)},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(testing::Message() << "type " << c.type << " colour " << c.colour);
        parts(*plugin).unit().deviceColor = c.colour;
        parts(*plugin).unit().numberOfChannels = 0;
        EXPECT_TRUE(parts(*plugin).calibration().calibrateSensorWithDefaultCalibration(c.type));
        EXPECT_BYTES_EQ(received("ALSCalibrationData"), c.want.vec());
        EXPECT_EQ(parts(*plugin).unit().numberOfChannels.load(), 4u);
    }
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG, "luxCoeff[3]=15040/65536"));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "Calibrate sensor with default calibration data. Sensor type = 2"));
}

TEST_F(DefaultCalibrationTest, WideRecordsForFiveAndSixChannelTypes)
{
    const Bytes five = wideRecord(193, 5, 0.0086f, 68, 25, 7), six = wideRecord(220, 6, 0.086f, 76, 24, 6);
    for (eALSSensorType type : {eALSSensorType5ChannelA, eALSSensorType5ChannelB, eALSSensorType5ChannelC,
                                eALSSensorType6ChannelA, eALSSensorType6ChannelB}) {
        SCOPED_TRACE(type);
        const bool sixChannels = type == eALSSensorType6ChannelA || type == eALSSensorType6ChannelB;
        parts(*plugin).unit().chipType = 2;
        EXPECT_TRUE(parts(*plugin).calibration().calibrateSensorWithDefaultCalibration(type));
        EXPECT_BYTES_EQ(received("ALSCalibrationData"), (sixChannels ? six : five).vec());
        EXPECT_EQ(parts(*plugin).unit().chipType.load(), 0u);
        EXPECT_EQ(parts(*plugin).unit().numberOfChannels.load(), sixChannels ? 6u : 5u);
        EXPECT_EQ(parts(*plugin).unit().dbChannelCount.load(), 5u);
    }
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG, "luxCoeff[4]=0.008600"));
    EXPECT_EQ(log.count("luxCoeff[5]=0.086000"), 2u);
}

TEST_F(DefaultCalibrationTest, TypesWithoutDefaultSetNothing)
{
    for (uint32_t type : {0u, 8u, 9u}) {
        EXPECT_FALSE(parts(*plugin).calibration().calibrateSensorWithDefaultCalibration(eALSSensorType(type)));
        EXPECT_TRUE(received("ALSCalibrationData").empty());
    }
    EXPECT_EQ(parts(*plugin).unit().numberOfChannels.load(), 0u);
}

TEST_F(DefaultCalibrationTest, NoServiceOrRefusalReportsFailure)
{
    parts(*plugin).service() = nullptr;
    EXPECT_FALSE(parts(*plugin).calibration().calibrateSensorWithDefaultCalibration(eALSSensorType5ChannelA));
    EXPECT_FALSE(log.contains("Failed to set ALS calibration data."));

    parts(*plugin).service() = service;
    VPServiceRefuseProperty(service, CFSTR("ALSCalibrationData"), true);
    EXPECT_FALSE(parts(*plugin).calibration().calibrateSensorWithDefaultCalibration(eALSSensorType6ChannelA));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "Failed to set ALS calibration data."));
    EXPECT_EQ(parts(*plugin).unit().numberOfChannels.load(), 6u); // the fields stay set
}

} // namespace
