// Matching services and reading the configuration at open.
#include "common/PlugInHolder.h"
#include "common/TestSupport.h"

#include <VantishPlatform/DeviceState.h>
#include <VantishPlatform/DispatchControl.h>
#include <VantishPlatform/HIDHost.h>

#include <gtest/gtest.h>

namespace {

CFTypeRef number(int64_t v) { return CFNumberCreate(nullptr, kCFNumberSInt64Type, &v); }
CFTypeRef real(double v) { return CFNumberCreate(nullptr, kCFNumberFloat64Type, &v); }
CFTypeRef data(std::initializer_list<uint8_t> bytes)
{
    std::vector<uint8_t> v(bytes);
    return CFDataCreate(nullptr, v.data(), CFIndex(v.size()));
}
CFTypeRef string(const char* s) { return CFStringCreateWithCString(nullptr, s, kCFStringEncodingUTF8); }
CFTypeRef array(std::initializer_list<CFTypeRef> values)
{
    CFMutableArrayRef a = CFArrayCreateMutable(nullptr, 0, &kCFTypeArrayCallBacks);
    for (CFTypeRef v : values) {
        CFArrayAppendValue(a, v);
        CFRelease(v);
    }
    return a;
}

class ServiceTest : public ::testing::Test {
protected:
    void SetUp() override
    {
        VPRegistryReset();
        VPTessaryReset();
        VPSetBootArgs("als_default_calibration=1"); // keep bring-up away from the factory store
        parent = VPRegistryCreateEntry(0x100, 0);
        entry = VPRegistryCreateEntry(0x101, parent);
        service = VPServiceCreate(0x101);
        VPServiceAddUsage(service, 0xFF00, 0x0004);
    }
    void TearDown() override
    {
        VPDispatchDrain();
        plugin.release();
        CFRelease(service);
        VPSetBootArgs(std::nullopt);
        VPRegistryReset();
    }
    // Publishes a property (on the fixture's service unless told), taking ownership of the value.
    void publishOwned(const char* key, CFTypeRef value, IOHIDServiceRef on = nullptr)
    {
        CFStringRef k = static_cast<CFStringRef>(string(key));
        VPServicePublishProperty(on ? on : service, k, value);
        CFRelease(k);
        CFRelease(value);
    }
    void deviceTree(io_registry_entry_t on, const char* key, CFTypeRef value)
    {
        CFStringRef k = static_cast<CFStringRef>(string(key));
        VPRegistrySetProperty(on, k, value);
        CFRelease(k);
        CFRelease(value);
    }

    io_registry_entry_t parent = 0, entry = 0;
    IOHIDServiceRef service = nullptr;
    vt::PlugIn plugin;
    vt::DeviceRoots roots;
};

using Match = ServiceTest;

TEST_F(Match, NameArrayIsWalkedPastNonStrings)
{
    vt::LogCapture log;
    publishOwned("IONameMatch", array({string("als,other"), number(3), string("als,tcs3490")}));
    EXPECT_EQ(plugin->match(service, 0), 1000);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "Matched on: als,tcs3490\n"));
}

TEST_F(Match, UnmatchedNamesFallThroughToTheDriverClass)
{
    publishOwned("IONameMatch", array({string("als,other"), string("als,ct7")}));
    EXPECT_EQ(plugin->match(service, 0), 0);
    publishOwned("IOClass", string("TavroSPUVD6287"));
    vt::LogCapture log;
    EXPECT_EQ(plugin->match(service, 0), 1000);
    EXPECT_TRUE(log.contains("Matched on: TavroSPUVD6287\n"));
}

TEST_F(Match, SingleNameOrClass)
{
    publishOwned("IONameMatch", string("als,ct711"));
    EXPECT_EQ(plugin->match(service, 0), 1000);
    publishOwned("IONameMatch", array({}));
    publishOwned("IOClass", string("TavroSPUCT999"));
    EXPECT_EQ(plugin->match(service, 0), 0);
    publishOwned("IOClass", number(709));
    EXPECT_EQ(plugin->match(service, 0), 0);
}

TEST_F(Match, NonConformingServiceIsDeclinedSilently)
{
    IOHIDServiceRef other = VPServiceCreate(0x102);
    VPServiceAddUsage(other, 0xFF00, 0x0005);
    publishOwned("IONameMatch", string("als,ct709"), other);
    vt::LogCapture log;
    EXPECT_EQ(plugin->match(other, 0), 0);
    EXPECT_TRUE(log.lines().empty());
    CFRelease(other);
}

using Open = ServiceTest;

TEST_F(Open, ReadsEveryConfigurationKey)
{
    deviceTree(parent, "IOHIDOrientationType", data({3, 0, 0, 0}));
    deviceTree(parent, "color-algo-override", data({5, 0, 0, 0}));
    deviceTree(entry, "color-algo-lambda", data({25, 0, 0, 0}));
    publishOwned("IONameMatched", string("als,ct720"));
    publishOwned("NumberOfChannels", number(6));
    publishOwned("ChannelRatioMitigation", number(3));
    publishOwned("chip_id", number(0x1234));
    // The bring-up that open queues may run before the checks below; the
    // default calibration of a six-channel type sets the same channel counts.
    publishOwned("ALSSensorType", number(3));
    VPTessarySetAnswer(CFSTR("ProductName"), CFSTR("Dravik OS"));
    VPTessarySetAnswer(CFSTR("DeviceColor"), CFSTR("2"));

    vt::LogCapture log;
    plugin->open(service, 0);
    EXPECT_EQ(parts(*plugin).unit().orientation, 3u);
    EXPECT_EQ(parts(*plugin).unit().colorAlgoOverride, 5);
    EXPECT_FLOAT_EQ(parts(*plugin).fit().lambda, 0.25f);
    EXPECT_EQ(parts(*plugin).fit().lambdaConfigured, 1);
    EXPECT_EQ(parts(*plugin).unit().numberOfChannels, 6u);
    EXPECT_EQ(parts(*plugin).unit().dbChannelCount, 5u);
    EXPECT_EQ(parts(*plugin).unit().mitigationType, 3u);
    EXPECT_EQ(parts(*plugin).unit().channelRatioMitigation, 1);
    EXPECT_EQ(parts(*plugin).unit().chipId, 0x1234u);
    EXPECT_EQ(parts(*plugin).unit().sensorType, 3u);
    EXPECT_EQ(parts(*plugin).unit().isDravikOS, 1);
    EXPECT_EQ(parts(*plugin).unit().deviceColor, 2u);
    EXPECT_EQ(parts(*plugin).service(), service);

    for (const char* line :
         {"IONameMatched=als,ct720 \n", "DeviceColor is 2", "Color algo override version = 5 from EDT\n",
          "Setting color algo lambda = 0.250000 from EDT\n", "Use channel ratio mitigation - YES, type = 3\n",
          "ChipID is 0x1234\n", "Found sensor type = 3\n"})
        EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, line)) << line;
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "Plugin is opening on Dravik OS."));
}

TEST_F(Open, AbsentAndMistypedValuesKeepTheDefaults)
{
    deviceTree(parent, "IOHIDOrientationType", string("3"));
    deviceTree(parent, "color-algo-override", data({5, 0, 0}));
    deviceTree(entry, "color-algo-lambda", data({0, 0, 0, 0}));
    publishOwned("NumberOfChannels", string("4"));
    publishOwned("ChannelRatioMitigation", number(0));
    VPTessarySetAnswer(CFSTR("DeviceColor"), CFSTR("3"));

    vt::LogCapture log;
    plugin->open(service, 0);
    EXPECT_EQ(parts(*plugin).unit().orientation, 1u);
    EXPECT_EQ(parts(*plugin).unit().colorAlgoOverride, 0);
    EXPECT_EQ(parts(*plugin).fit().lambdaConfigured, 0);
    EXPECT_EQ(parts(*plugin).unit().numberOfChannels, 0u);
    EXPECT_EQ(parts(*plugin).unit().channelRatioMitigation, 0);
    EXPECT_EQ(parts(*plugin).unit().deviceColor, 0u);
    EXPECT_EQ(parts(*plugin).unit().isDravikOS, 0);
    EXPECT_TRUE(log.contains("Unknown IONameMatched\n"));
    EXPECT_TRUE(log.contains("DeviceColor is 0"));
    EXPECT_TRUE(log.contains("Use channel ratio mitigation - NO, type = 0\n"));
}

TEST_F(Open, ServiceLambdaWinsEvenWhenZero)
{
    deviceTree(entry, "color-algo-lambda", data({25, 0, 0, 0}));
    publishOwned("color-algo-lambda", real(0.0));
    publishOwned("NumberOfChannels", number(4));
    plugin->open(service, 0);
    EXPECT_EQ(parts(*plugin).fit().lambda, 0.0f);
    EXPECT_EQ(parts(*plugin).fit().lambdaConfigured, 1);
    EXPECT_EQ(parts(*plugin).unit().dbChannelCount, 4u);
}

TEST_F(Open, WithoutRegistryIdTheDeviceTreeIsNotRead)
{
    IOHIDServiceRef bare = VPServiceCreate(0);
    deviceTree(parent, "IOHIDOrientationType", data({3, 0, 0, 0}));
    plugin->open(bare, 0);
    EXPECT_EQ(parts(*plugin).unit().orientation, 1u);
    EXPECT_EQ(parts(*plugin).registryEntry(), 0u);
    VPDispatchDrain();
    CFRelease(bare);
}

TEST_F(Open, RegistryHandleIsReleasedWithTheInstance)
{
    vt::PlugIn other;
    other->open(service, 0);
    VPDispatchDrain();
    EXPECT_EQ(VPRegistryOutstandingReferences(entry), 1);
    // A second open finds the same entry again: the instance still holds one reference.
    other->open(service, 0);
    VPDispatchDrain();
    EXPECT_EQ(VPRegistryOutstandingReferences(entry), 1);
    EXPECT_EQ(other.parts().registryEntry(), entry);
    other.release();
    EXPECT_EQ(VPRegistryOutstandingReferences(entry), 0);
}

TEST_F(Open, CalibrationPropertiesChooseTheBringUp)
{
    struct Case {
        CFBooleanRef sysConfig, spectrumToProcess;
        const char* line;
    };
    for (const Case& c :
         {Case{nullptr, nullptr, "Getting QVT calibration...\n"},
          Case{kCFBooleanTrue, nullptr, "Use sysconfig calibration to calibrate sensor\n"},
          Case{kCFBooleanFalse, kCFBooleanTrue, "Don't use sysconfig calibration to calibrate sensor\n"}}) {
        SCOPED_TRACE(c.line);
        VPServicePublishProperty(service, CFSTR("SysConfigCalibration"), c.sysConfig);
        VPServicePublishProperty(service, CFSTR("ALSCalibrationSpectrumToProcess"), c.spectrumToProcess);
        vt::PlugIn fresh;
        vt::LogCapture log(VPLogLevel::Info);
        fresh->open(service, 0);
        VPDispatchDrain();
        EXPECT_TRUE(log.contains(c.line));
        EXPECT_EQ(log.count("Getting QVT calibration...\n"), c.sysConfig ? 0u : 1u);
    }
}

} // namespace
