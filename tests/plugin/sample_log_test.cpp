// The per-event log line of VD6287 services, compared character for character.
#include "PlugInState.h"

#include "common/TestSupport.h"

#include <gtest/gtest.h>

using namespace alstest;
using namespace vt;

namespace {

class SampleLog : public ::testing::Test {
protected:
    void SetUp() override
    {
        parts(*plugin).unit().sensorType = eALSSensorTypeVD6287;
        parts(*plugin).machTimeToSeconds() = 1e-9;
    }

    // An event at t = 1234.567890123 s, 123.4567 lux, X Y Z = 30, 40, 30
    // and raw channels 10 to 40.
    Event event(const Record* record)
    {
        Event e = createALSEvent(record, 1234567890123);
        IOHIDEventSetDoubleValue(e.get(), kIOHIDEventFieldAmbientLightSensorIlluminance, 123.4567);
        IOHIDEventSetDoubleValue(e.get(), kIOHIDEventFieldAmbientLightColorComponent0, 30.0);
        IOHIDEventSetDoubleValue(e.get(), kIOHIDEventFieldAmbientLightColorComponent1, 40.0);
        IOHIDEventSetDoubleValue(e.get(), kIOHIDEventFieldAmbientLightColorComponent2, 30.0);
        for (int i = 0; i < 4; ++i)
            IOHIDEventSetFloatValue(e.get(), kIOHIDEventFieldAmbientLightSensorRawChannel0 + i, 10.0 * (i + 1));
        return e;
    }

    std::vector<std::string> logged(IOHIDEventRef e, bool copy)
    {
        vt::LogCapture log;
        plugin->logALSSample(e, copy);
        return log.messages();
    }

    PlugIn plugin;
};

Record fullRecord()
{
    return Record()
        .channels({1, 2, 3, 4, 5.6f, 99})
        .cct(6504.25f)
        .gain(0x48000) // 4.5
        .mode(1)
        .subsamples(3)
        .rawLux(120.5f)
        .nits(250)
        .xTalk({1, 2, 3, 4, 5})
        .status(0x0A)
        .filteredLux(1234.5f)
        .filteredLuxValid(1);
}

const std::string kShortLine = "[ALS] ts=1234.568 lux=123.457 xy=(0.300 0.400) chs=[10 20 30 40 N/A] copyEvent=0";

} // namespace

TEST_F(SampleLog, FullLineWithAndWithoutFilteredLux)
{
    struct Case {
        Record record;
        bool copy;
        std::string line;
    };
    const Case cases[] = {
        {fullRecord(), false,
         "[ALS] ts=1234.568 lux=123.457 filteredLux=1234.500 xy=(0.300 0.400) chs=[1 2 3 4 6] CCT1=6504.250 gain=4x "
         "mode=ASYNC subsamples=3 rawLux=120.500 nits=250 xTalk=[1 2 3 4 5] status=0x0A copyEvent=0"},
        {fullRecord().filteredLuxValid(0).mode(0).gain(-0x48000), true,
         "[ALS] ts=1234.568 lux=123.457 xy=(0.300 0.400) chs=[1 2 3 4 6] CCT1=6504.250 gain=-5x mode=SYNC "
         "subsamples=3 rawLux=120.500 nits=250 xTalk=[1 2 3 4 5] status=0x0A copyEvent=1"},
    };
    for (const Case& c : cases) {
        Event e = event(&c.record);
        EXPECT_EQ(logged(e.get(), c.copy), std::vector<std::string>{c.line});
    }
}

TEST_F(SampleLog, ShortLineWithoutAFullRecord)
{
    for (size_t length : {136u, 138u}) {
        const Record record = Record(length).channels({1, 2, 3, 4, 5, 6});
        Event e = event(&record);
        EXPECT_EQ(logged(e.get(), false), std::vector<std::string>{kShortLine}) << length;
    }
    Event bare = event(nullptr);
    EXPECT_EQ(logged(bare.get(), false), std::vector<std::string>{kShortLine});
}

TEST_F(SampleLog, ZeroColourLogsZeroChromaticity)
{
    Event e = event(nullptr);
    for (auto field : {kIOHIDEventFieldAmbientLightColorComponent0, kIOHIDEventFieldAmbientLightColorComponent1,
                       kIOHIDEventFieldAmbientLightColorComponent2})
        IOHIDEventSetDoubleValue(e.get(), field, 0.0);
    EXPECT_EQ(
        logged(e.get(), false),
        std::vector<std::string>{"[ALS] ts=1234.568 lux=123.457 xy=(0.000 0.000) chs=[10 20 30 40 N/A] copyEvent=0"});
}

TEST_F(SampleLog, OnlyForSensorType8AndALSEventsAtTheDefaultLevel)
{
    const Record record = fullRecord();
    Event e = event(&record);
    parts(*plugin).unit().sensorType = 5;
    EXPECT_TRUE(logged(e.get(), false).empty());
    EXPECT_TRUE(logged(e.get(), true).empty());

    parts(*plugin).unit().sensorType = eALSSensorTypeVD6287;
    EXPECT_TRUE(logged(createEvent(kIOHIDEventTypeVendorDefined, nullptr).get(), false).empty());
    EXPECT_TRUE(logged(nullptr, false).empty());

    vt::LogCapture errorsOnly(VPLogLevel::Error);
    plugin->logALSSample(e.get(), false);
    EXPECT_TRUE(errorsOnly.messages().empty());
}

TEST_F(SampleLog, FilterLogsTheEventAsClientsReceiveIt)
{
    overrideChromaticity(*plugin, 0.3127, 0.3290, 100.0);
    Event e = event(nullptr);
    vt::LogCapture log;
    plugin->filter(e.get(), false);
    EXPECT_EQ(log.messages(), std::vector<std::string>{"[ALS] ts=1234.568 lux=100.000 xy=(0.313 0.329) "
                                                       "chs=[10 20 30 40 N/A] copyEvent=0"});
}
