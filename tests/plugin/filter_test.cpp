// The event filter on events built as the driver sends them, against the
// linear database.
#include "PlugInState.h"

#include "common/TestSupport.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <functional>
#include <limits>
#include <string>

using namespace alstest;
using namespace vt;

namespace {

std::string format(const char* fmt, auto... args)
{
    char text[512];
    std::snprintf(text, sizeof text, fmt, args...);
    return text;
}

#define EXPECT_XYZ_NEAR(actual, x, y, z)                     \
    do {                                                     \
        const auto a_ = (actual);                            \
        EXPECT_NEAR(a_[0], (x), 1e-3 * (1.0 + std::abs(x))); \
        EXPECT_NEAR(a_[1], (y), 1e-3 * (1.0 + std::abs(y))); \
        EXPECT_NEAR(a_[2], (z), 1e-3 * (1.0 + std::abs(z))); \
    } while (0)

class Filter : public ::testing::Test {
protected:
    void SetUp() override
    {
        parts(*plugin).unit().numberOfChannels = 4;
        parts(*plugin).unit().dbChannelCount = 4;
        parts(*plugin).unit().sensorType = 1;
        parts(*plugin).databases().publish(linearDatabase(4), true);
    }

    void useSixChannelSensor()
    {
        parts(*plugin).unit().numberOfChannels = 6;
        parts(*plugin).unit().dbChannelCount = 5;
        parts(*plugin).unit().sensorType = 3;
        parts(*plugin).databases().publish(linearDatabase(5), true);
    }

    Event filter(const Record& record)
    {
        Event event = createALSEvent(&record);
        EXPECT_EQ(plugin->filter(event.get(), false), event.get());
        return event;
    }

    PlugIn plugin;
};

Record fourChannels(std::array<float, 6> c, float lux) { return Record().sampleChannelCount(4).channels(c).lux(lux); }

} // namespace

// ---- Chromaticity override ----------------------------------------------------------------

TEST_F(Filter, ChromaticityOverrideWritesLevelIlluminanceAndColourWithOrWithoutDatabase)
{
    overrideChromaticity(*plugin, 0.3127, 0.3290, 100.0);
    setLastXYZ(*plugin, 1, 2, 3);
    for (bool ready : {false, true}) {
        parts(*plugin).databases().setReady(ready);
        Event event = filter(fourChannels({10, 20, 30, 40, 0, 0}, 500));
        EXPECT_DOUBLE_EQ(IOHIDEventGetFloatValue(event.get(), kIOHIDEventFieldAmbientLightSensorLevel), 100.0);
        EXPECT_DOUBLE_EQ(IOHIDEventGetDoubleValue(event.get(), kIOHIDEventFieldAmbientLightSensorIlluminance), 100.0);
        EXPECT_XYZ_NEAR(eventXYZ(event.get()), 95.05, 100.0, 108.9);
        EXPECT_EQ(colourSpaceOf(event.get()), 1);
        EXPECT_EQ(lastXYZOf(*plugin), (std::array<float, 3>{1, 2, 3}));
    }
}

TEST_F(Filter, ChromaticityOverrideWithoutLuminanceUsesTheEventsIlluminance)
{
    overrideChromaticity(*plugin, 0.3127, 0.3290, -1.0);
    Event event = createALSEvent(nullptr);
    IOHIDEventSetFloatValue(event.get(), kIOHIDEventFieldAmbientLightSensorLevel, 7.0);
    IOHIDEventSetDoubleValue(event.get(), kIOHIDEventFieldAmbientLightSensorIlluminance, 250.0);
    plugin->filter(event.get(), false);
    EXPECT_DOUBLE_EQ(IOHIDEventGetFloatValue(event.get(), kIOHIDEventFieldAmbientLightSensorLevel), 7.0);
    EXPECT_XYZ_NEAR(eventXYZ(event.get()), 95.05 * 2.5, 250.0, 108.9 * 2.5);
    EXPECT_EQ(colourSpaceOf(event.get()), 1);
}

// ---- Spikes -----------------------------------------------------------------------------------

TEST_F(Filter, SpikeBelowTheLuxLimitZeroesLevelAndColourAndLogs)
{
    parts(*plugin).unit().channelRatioMitigation = 1;
    parts(*plugin).unit().mitigationType = 3;
    setLastXYZ(*plugin, 1, 2, 3);
    vt::LogCapture log;

    Record record = fourChannels({0, 10, 10, 10, 10, 0}, 5);
    Event event = createALSEvent(&record);
    IOHIDEventSetFloatValue(event.get(), kIOHIDEventFieldAmbientLightSensorLevel, 42.0);
    plugin->filter(event.get(), false);

    EXPECT_EQ(IOHIDEventGetFloatValue(event.get(), kIOHIDEventFieldAmbientLightSensorLevel), 0.0);
    EXPECT_EQ(eventXYZ(event.get()), (std::array<double, 3>{0, 0, 0}));
    EXPECT_EQ(colourSpaceOf(event.get()), 1);
    EXPECT_EQ(lastXYZOf(*plugin), (std::array<float, 3>{0, 0, 0}));
    EXPECT_TRUE(
        log.contains(OS_LOG_TYPE_INFO, "ALS spike detected (type = 3). Lux = 5.000000, Channel ratio = 1.000000"));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG, "ALS spike is detected -> setting zero lux and zero color."));

    // At the low-lux limit the same channels are no spike: (0, 20, 10) scaled to 10 lux.
    event = filter(fourChannels({0, 10, 10, 10, 10, 0}, 10));
    EXPECT_XYZ_NEAR(eventXYZ(event.get()), 0.0, 10.0, 5.0);
    EXPECT_XYZ_NEAR(lastXYZOf(*plugin), 0.0, 10.0, 5.0);
}

TEST_F(Filter, SpikeTestsSeeRawNegativeChannels)
{
    // Five channels, c1 = -60: a spike on the raw values (ratio 1.5), none once clamped.
    parts(*plugin).unit().numberOfChannels = 5;
    parts(*plugin).databases().publish(linearDatabase(5), true);
    parts(*plugin).unit().channelRatioMitigation = 1;
    parts(*plugin).unit().mitigationType = 1;
    Event event = filter(Record().sampleChannelCount(5).channels({100, -60, 10, 10, 10, 0}).lux(5));
    EXPECT_EQ(IOHIDEventGetFloatValue(event.get(), kIOHIDEventFieldAmbientLightSensorLevel), 0.0);
    EXPECT_EQ(lastXYZOf(*plugin), (std::array<float, 3>{0, 0, 0}));
}

// ---- Colour input -------------------------------------------------------------------------------

TEST_F(Filter, ChannelsReachingTheColour)
{
    struct Case {
        const char* what;
        std::function<void()> setUp;
        Record record;
        std::array<double, 3> xyz;
    };
    const Case cases[] = {
        // (10, 0 + 20, 30) scaled to 100 lux; unclamped it would be (5, 15, 30).
        {"negative channels count as zero", [] {}, fourChannels({10, -5, 20, 30, 0, 0}, 100), {50, 100, 150}},
        {"stale database channel count",
         [this] { parts(*plugin).unit().dbChannelCount = 5; },
         fourChannels({10, 20, 30, 40, 0, 0}, 100),
         {20, 100, 80}},
        {"chromaticity override with y = 0 is ignored",
         [this] { overrideChromaticity(*plugin, 0.3127, 0.0, 100.0); },
         fourChannels({10, 20, 30, 40, 0, 0}, 100),
         {20, 100, 80}},
        // (10, 20 + 30, 40 + 50) scaled to 100 lux.
        {"six-channel sensor feeds its last channels",
         [this] { useSixChannelSensor(); },
         Record().sampleChannelCount(6).channels({1000, 10, 20, 30, 40, 50}).lux(100),
         {20, 100, 180}},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.what);
        c.setUp();
        Event event = filter(c.record);
        EXPECT_XYZ_NEAR(eventXYZ(event.get()), c.xyz[0], c.xyz[1], c.xyz[2]);
        EXPECT_EQ(colourSpaceOf(event.get()), 1);
        EXPECT_XYZ_NEAR(lastXYZOf(*plugin), c.xyz[0], c.xyz[1], c.xyz[2]);
        // The record keeps the channels as the driver sent them.
        EXPECT_EQ(recordOf(event.get()), c.record.bytes());
    }
}

TEST_F(Filter, ZeroColourWhenTheFitGivesNoLuminance)
{
    Record record = fourChannels({0, 0, 0, 0, 0, 0}, 100);
    Event event = createALSEvent(&record);
    IOHIDEventSetFloatValue(event.get(), kIOHIDEventFieldAmbientLightSensorLevel, 33.0);
    setLastXYZ(*plugin, 1, 2, 3);
    plugin->filter(event.get(), false);
    EXPECT_EQ(eventXYZ(event.get()), (std::array<double, 3>{0, 0, 0}));
    EXPECT_EQ(colourSpaceOf(event.get()), 1);
    EXPECT_EQ(lastXYZOf(*plugin), (std::array<float, 3>{0, 0, 0}));
    EXPECT_EQ(IOHIDEventGetFloatValue(event.get(), kIOHIDEventFieldAmbientLightSensorLevel), 33.0);
}

TEST_F(Filter, SampleDetailsAreLoggedExceptForSensorType8)
{
    vt::LogCapture log;
    Record record = fourChannels({0, -3, 0, 0, 0, 7}, 100)
                        .status(5)
                        .orientation(2)
                        .integrationTime(100)
                        .reportInterval(50)
                        .gain(0x48000);
    filter(record);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG,
                             "lux=100.000000 status=5 nChannels=4 orientation=2 integrationTime=100 reportInterval=50 "
                             "gain=4.500000 XYZ=[0.000000;0.000000;0.000000] "
                             "Channels=[0.000000;0.000000;0.000000;0.000000;0.000000;7.000000]"));
    log.clear();
    parts(*plugin).unit().sensorType = 8;
    filter(record);
    for (const auto& message : log.messages())
        EXPECT_EQ(message.rfind("lux=", 0), std::string::npos) << message;
}

// ---- RGBC override -------------------------------------------------------------------------------

TEST_F(Filter, RGBCOverrideReplacesChannelsInColourRecordAndRawFields)
{
    struct Case {
        bool sixChannels;
        Record record;
        std::array<float, 6> recorded; // the override and the clamped rest
        std::array<double, 3> xyz;
    };
    const Case cases[] = {
        // (100, 500, 400) scaled to 50 lux.
        {false, fourChannels({1, 2, -3, 4, -5, 6}, 50), {100, 200, 300, 400, 0, 6}, {10, 50, 40}},
        // Six channels: the override lands after the skipped channel; (100, 200 + 300, 400 + 500) at 50 lux.
        {true,
         Record().sampleChannelCount(6).channels({-7, 1, 2, 3, 4, 5}).lux(50),
         {0, 100, 200, 300, 400, 500},
         {10, 50, 90}},
    };
    parts(*plugin).overrides().rgbcOverrideActive = 1;
    for (uint32_t i = 0; i < 6; ++i)
        parts(*plugin).overrides().rgbcOverride[i] = 100 * (i + 1);
    for (const Case& c : cases) {
        SCOPED_TRACE(c.sixChannels);
        if (c.sixChannels)
            useSixChannelSensor();
        Event event = filter(c.record);
        EXPECT_EQ(channelsOf(event.get()), c.recorded);
        for (int i = 0; i < 4; ++i)
            EXPECT_EQ(IOHIDEventGetFloatValue(event.get(), kIOHIDEventFieldAmbientLightSensorRawChannel0 + i),
                      100.0 * (i + 1));
        EXPECT_XYZ_NEAR(eventXYZ(event.get()), c.xyz[0], c.xyz[1], c.xyz[2]);
    }
}

// ---- Colour into the record ---------------------------------------------------------------------

TEST_F(Filter, XYZInRecordWritesTheResultAndComparesWithTheSensor)
{
    useSixChannelSensor();
    vt::LogCapture log;
    Record record = Record()
                        .sampleChannelCount(6)
                        .channels({1000, 10, 20, 30, 40, 50})
                        .lux(100)
                        .timestamp(777)
                        .xyzInRecord(1)
                        .xyzSensor({20.05f, 99.0f, 170.0f});
    Event event = filter(record);

    EXPECT_EQ(colourSpaceOf(event.get()), 0);
    EXPECT_EQ(eventXYZ(event.get()), (std::array<double, 3>{0, 0, 0}));
    const auto result = xyzResultOf(event.get());
    EXPECT_XYZ_NEAR(result, 20.0, 100.0, 180.0);
    EXPECT_EQ(lastXYZOf(*plugin), result);

    const double x = result[0], y = result[1], z = result[2];
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG, format("[ColorCalc] ts=777 XYZAP=[%f %f %f] XYZAOP=[%f %f %f]", x, y, z,
                                                       double(20.05f), 99.0, 170.0)));
    const char* diff = "[ColorCalc] diff(XYZAP[%d], XYZAOP[%d]) = diff(%f, %f) = %f treshholdValue(0.50%%) = %f "
                       "isBelowTreshhold = %s";
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG,
                             format(diff, 0, 0, x, double(20.05f), std::abs(x - double(20.05f)), x * 0.005, "YES")));
    EXPECT_TRUE(
        log.contains(OS_LOG_TYPE_DEBUG, format(diff, 2, 2, z, 170.0, std::abs(z - 170.0), z * 0.005, "!!NO!!")));
    // Y is the lux by construction; it is not compared.
    for (const auto& message : log.messages())
        EXPECT_EQ(message.rfind("[ColorCalc] diff(XYZAP[1]", 0), std::string::npos);
}

// ---- Channel layouts that cannot be served --------------------------------------------------------

TEST_F(Filter, UnknownSensorChannelCountGivesZeroColourEveryTime)
{
    for (uint32_t channels : {3u, 7u}) {
        parts(*plugin).unit().numberOfChannels = channels;
        setLastXYZ(*plugin, 1, 2, 3);
        vt::LogCapture log;
        Event event = filter(fourChannels({10, 20, 30, 40, 0, 0}, 100));
        EXPECT_EQ(eventXYZ(event.get()), (std::array<double, 3>{0, 0, 0}));
        EXPECT_EQ(colourSpaceOf(event.get()), 1);
        EXPECT_EQ(lastXYZOf(*plugin), (std::array<float, 3>{0, 0, 0}));
        Event inRecord = filter(fourChannels({10, 20, 30, 40, 0, 0}, 100).xyzInRecord(1).xyzResult({5, 6, 7}));
        EXPECT_EQ(xyzResultOf(inRecord.get()), (std::array<float, 3>{0, 0, 0}));
        EXPECT_EQ(log.count("Unknown number of channels (" + std::to_string(channels) + ") \n"), 2u);
    }
}

TEST_F(Filter, DatabaseWithMoreChannelsThanTheSensorGivesZeroColour)
{
    struct Case {
        uint32_t sensorChannels, dbChannels;
    };
    for (auto [sensorChannels, dbChannels] : {Case{4, 5}, Case{6, 7}, Case{5, 9}}) {
        parts(*plugin).unit().numberOfChannels = sensorChannels;
        parts(*plugin).databases().publish(linearDatabase(dbChannels), true);
        parts(*plugin).overrides().rgbcOverrideActive = 1;
        setLastXYZ(*plugin, 1, 2, 3);
        vt::LogCapture log;
        Event event = filter(Record().sampleChannelCount(uint8_t(sensorChannels)).channels({1, 2, 3, 4, 5, 6}).lux(9));
        EXPECT_EQ(eventXYZ(event.get()), (std::array<double, 3>{0, 0, 0}));
        EXPECT_EQ(colourSpaceOf(event.get()), 1);
        EXPECT_EQ(lastXYZOf(*plugin), (std::array<float, 3>{0, 0, 0}));
        // Nothing was overridden: the record is as the driver sent it.
        EXPECT_EQ(channelsOf(event.get()), (std::array<float, 6>{1, 2, 3, 4, 5, 6}));
        EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, format("Unsupported database channel count (%u) for %u sensor "
                                                           "channels \n",
                                                           dbChannels, sensorChannels)));
    }
}

// ---- Events passed unchanged ------------------------------------------------------------------------

TEST_F(Filter, EventsWithoutRecordOrDatabasePassUnchanged)
{
    setLastXYZ(*plugin, 1, 2, 3);
    Event bare = createALSEvent(nullptr);
    plugin->filter(bare.get(), false);
    EXPECT_EQ(colourSpaceOf(bare.get()), 0);

    parts(*plugin).databases().setReady(false);
    Event notReady = filter(fourChannels({10, 20, 30, 40, 0, 0}, 100));
    EXPECT_EQ(colourSpaceOf(notReady.get()), 0);
    EXPECT_EQ(lastXYZOf(*plugin), (std::array<float, 3>{1, 2, 3}));

    // Other event types and no event at all.
    const Event other = createEvent(kIOHIDEventTypeVendorDefined, nullptr);
    EXPECT_EQ(plugin->filter(other.get(), false), other.get());
    EXPECT_EQ(colourSpaceOf(other.get()), 0);
    EXPECT_EQ(plugin->filter(nullptr, false), nullptr);
}

TEST_F(Filter, ShortRecordPassesUnchangedAndIsLoggedSparingly)
{
    setLastXYZ(*plugin, 1, 2, 3);
    vt::LogCapture log(VPLogLevel::Error);
    // One byte short of xyzSensor's end, the last field the filter reads.
    const Record truncated = Record(131).sampleChannelCount(4).channels({10, 20, 30, 40, 0, 0}).lux(100);
    Event event = filter(truncated);
    EXPECT_EQ(colourSpaceOf(event.get()), 0);
    EXPECT_EQ(recordOf(event.get()), truncated.bytes());
    EXPECT_EQ(lastXYZOf(*plugin), (std::array<float, 3>{1, 2, 3}));

    for (int i = 1; i < 1001; ++i)
        filter(truncated);
    const auto messages = log.messages();
    ASSERT_EQ(messages.size(), 2u);
    EXPECT_EQ(messages[0], "Sample record of 131 bytes is shorter than 132 bytes, event passed unchanged (1 so far)\n");
    EXPECT_EQ(messages[1],
              "Sample record of 131 bytes is shorter than 132 bytes, event passed unchanged (1001 so far)\n");
}

TEST_F(Filter, RecordsWithoutTheFilteredLuxFieldsGetColour)
{
    // filteredLux and filteredLuxValid (bytes 132 to 136) are only logged.
    for (const size_t length : {size_t(132), size_t(136)}) {
        const Record record = Record(length).sampleChannelCount(4).channels({10, 20, 30, 40, 0, 0}).lux(100);
        Event event = filter(record);
        EXPECT_EQ(colourSpaceOf(event.get()), 1) << length;
        EXPECT_XYZ_NEAR(eventXYZ(event.get()), 20.0, 100.0, 80.0);

        Event inRecord = filter(Record(record).xyzInRecord(1));
        EXPECT_EQ(recordOf(inRecord.get()).size(), length);
        EXPECT_XYZ_NEAR(xyzResultOf(inRecord.get()), 20.0, 100.0, 80.0);
    }
}

TEST_F(Filter, LuxThatIsNotFiniteGivesZeroColour)
{
    const float nan = std::numeric_limits<float>::quiet_NaN(), inf = std::numeric_limits<float>::infinity();
    vt::LogCapture log(VPLogLevel::Error);
    setLastXYZ(*plugin, 1, 2, 3);
    for (float lux : {nan, inf, -inf}) {
        Event event = filter(fourChannels({10, 20, 30, 40, 0, 0}, lux));
        EXPECT_EQ(colourSpaceOf(event.get()), 1);
        EXPECT_EQ(eventXYZ(event.get()), (std::array<double, 3>{0, 0, 0}));
        EXPECT_EQ(lastXYZOf(*plugin), (std::array<float, 3>{0, 0, 0}));
        Event inRecord = filter(fourChannels({10, 20, 30, 40, 0, 0}, lux).xyzInRecord(1));
        EXPECT_EQ(xyzResultOf(inRecord.get()), (std::array<float, 3>{0, 0, 0}));
    }
    // Logged like short records: the first, then every thousandth.
    for (int i = 0; i < 995; ++i)
        filter(fourChannels({10, 20, 30, 40, 0, 0}, nan));
    const auto messages = log.messages();
    ASSERT_EQ(messages.size(), 2u);
    EXPECT_EQ(messages[0], "Sample lux nan is not a finite number, colour set to zero (1 so far)\n");
    EXPECT_EQ(messages[1], "Sample lux nan is not a finite number, colour set to zero (1001 so far)\n");

    // A denormal lux is a number: the colour is scaled to it.
    const float tiny = std::numeric_limits<float>::denorm_min();
    Event event = filter(fourChannels({10, 20, 30, 40, 0, 0}, tiny));
    EXPECT_EQ(eventXYZ(event.get())[1], double(tiny));
}

TEST_F(Filter, LongRecordIsReadAndWrittenOnlyWithinItsFields)
{
    Record longRecord = Record(200).fillFrom(137, 0xAB);
    longRecord.sampleChannelCount(4).channels({10, 20, 30, 40, 0, 0}).lux(100).xyzInRecord(1);
    Event event = filter(longRecord);
    const auto bytes = recordOf(event.get());
    ASSERT_EQ(bytes.size(), 200u);
    EXPECT_XYZ_NEAR(xyzResultOf(event.get()), 20.0, 100.0, 80.0);
    for (size_t i = 137; i < bytes.size(); ++i)
        ASSERT_EQ(bytes[i], 0xAB) << i;
}
