// Events copied by clients: colour from the last filtered sample, the
// chromaticity override, and the VD6287 path through the whole filter.
#include "PlugInState.h"
#include "common/TestSupport.h"

#include <VantishPlatform/DispatchControl.h>

#include <gtest/gtest.h>

using namespace alstest;
using namespace vt;

namespace {

class CopyEvent : public ::testing::Test {
protected:
    void SetUp() override
    {
        parts(*plugin).unit().numberOfChannels = 4;
        parts(*plugin).unit().dbChannelCount = 4;
        setLastXYZ(*plugin, 1, 2, 3);
    }
    size_t linesContaining(const std::string& part)
    {
        size_t n = 0;
        for (const auto& line : log.lines())
            n += line.message.find(part) != std::string::npos;
        return n;
    }

    vt::LogCapture log;
    PlugIn plugin;
};

TEST_F(CopyEvent, ColourSpaceZeroGetsTheLastResult)
{
    parts(*plugin).databases().setReady(true);
    auto event = createALSEvent(nullptr);
    EXPECT_EQ(plugin->filterCopyEvent(event.get()), event.get());
    EXPECT_EQ(colourSpaceOf(event.get()), 1);
    EXPECT_EQ(eventXYZ(event.get()), (std::array<double, 3>{1.0, 2.0, 3.0}));
    EXPECT_TRUE(
        log.contains(OS_LOG_TYPE_INFO, "Copy event with color = [1.000000, 2.000000, 3.000000], color space = 1"));
}

TEST_F(CopyEvent, AColourAlreadyThereIsKept)
{
    parts(*plugin).databases().setReady(true);
    auto event = createALSEvent(nullptr);
    IOHIDEventSetDoubleValue(event.get(), kIOHIDEventFieldAmbientLightColorComponent0, 7.5);
    IOHIDEventSetDoubleValue(event.get(), kIOHIDEventFieldAmbientLightColorComponent1, 8.5);
    IOHIDEventSetDoubleValue(event.get(), kIOHIDEventFieldAmbientLightColorComponent2, 9.5);
    IOHIDEventSetIntegerValue(event.get(), kIOHIDEventFieldAmbientLightColorSpace, 2);
    plugin->filterCopyEvent(event.get());
    EXPECT_EQ(colourSpaceOf(event.get()), 2);
    EXPECT_EQ(eventXYZ(event.get()), (std::array<double, 3>{7.5, 8.5, 9.5}));
    EXPECT_TRUE(log.contains("Copy event with color = [7.500000, 8.500000, 9.500000], color space = 2"));
}

TEST_F(CopyEvent, ChromaticityOverrideAppliesToCopies)
{
    parts(*plugin).databases().setReady(true);
    overrideChromaticity(*plugin, 0.3127, 0.3290, 100.0);
    auto event = createALSEvent(nullptr);
    plugin->filterCopyEvent(event.get());
    const auto xyz = eventXYZ(event.get());
    EXPECT_NEAR(xyz[0], 95.05, 0.01);
    EXPECT_DOUBLE_EQ(xyz[1], 100.0);
    EXPECT_NEAR(xyz[2], 108.9, 0.01);
    EXPECT_EQ(colourSpaceOf(event.get()), 1);
    EXPECT_DOUBLE_EQ(IOHIDEventGetDoubleValue(event.get(), kIOHIDEventFieldAmbientLightSensorIlluminance), 100.0);
    // The line reports the override's colour and the colour space found first.
    EXPECT_EQ(linesContaining("Copy event with color = [95.04"), 1u);
    EXPECT_EQ(linesContaining("], color space = 1"), 1u);
    EXPECT_EQ(lastXYZOf(*plugin), (std::array<float, 3>{1.0f, 2.0f, 3.0f}));

    // A y of 0 leaves the override out.
    overrideChromaticity(*plugin, 0.3127, 0.0, 100.0);
    auto plain = createALSEvent(nullptr);
    plugin->filterCopyEvent(plain.get());
    EXPECT_EQ(eventXYZ(plain.get()), (std::array<double, 3>{1.0, 2.0, 3.0}));
}

TEST_F(CopyEvent, NothingChangesWithoutADatabaseOrForOtherEvents)
{
    overrideChromaticity(*plugin, 0.3127, 0.3290, 100.0);
    auto event = createALSEvent(nullptr);
    plugin->filterCopyEvent(event.get());
    EXPECT_EQ(colourSpaceOf(event.get()), 0);
    EXPECT_EQ(eventXYZ(event.get()), (std::array<double, 3>{}));

    parts(*plugin).databases().setReady(true);
    const Event other = createEvent(kIOHIDEventTypeVendorDefined, nullptr);
    EXPECT_EQ(plugin->filterCopyEvent(other.get()), other.get());
    EXPECT_EQ(colourSpaceOf(other.get()), 0);
    EXPECT_EQ(linesContaining("Copy event"), 0u);

    EXPECT_EQ(plugin->filterCopyEvent(nullptr), nullptr);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "Event is null"));
}

TEST_F(CopyEvent, VD6287CopiesGoThroughTheWholeFilter)
{
    parts(*plugin).databases().publish(linearDatabase(4), true);
    parts(*plugin).unit().sensorType = eALSSensorTypeVD6287;

    Record record;
    record.sampleChannelCount(4).lux(50.0f).channels({20, 30, 40, 50, 0, 0}).xyzInRecord(1).xyzResult({-1, -1, -1});
    auto event = createALSEvent(&record);
    EXPECT_EQ(plugin->filterCopyEvent(event.get()), event.get());

    // The filter wrote its result into the record, not the copy path into the event.
    const auto result = xyzResultOf(event.get());
    EXPECT_NE(result, (std::array<float, 3>{-1, -1, -1}));
    EXPECT_EQ(lastXYZOf(*plugin), result);
    EXPECT_EQ(colourSpaceOf(event.get()), 0);
    EXPECT_EQ(linesContaining("Copy event with color"), 0u);
    // One sample line, marked as a copy.
    EXPECT_EQ(linesContaining("copyEvent=1"), 1u);
    EXPECT_EQ(linesContaining("copyEvent=0"), 0u);
}

} // namespace
