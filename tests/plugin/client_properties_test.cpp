// Properties clients set on the ALS service: overrides, tuning values and the
// database rebuild.
#include "sysconfig/SysConfigFixture.h"

#include <VantishPlatform/DeviceState.h>

#include <gtest/gtest.h>

#include <limits>
#include <string>

using namespace sctest;

namespace {

CFNumberRef number(double v) { return CFNumberCreate(nullptr, kCFNumberFloat64Type, &v); }
CFNumberRef integer(int v) { return CFNumberCreate(nullptr, kCFNumberIntType, &v); }
CFStringRef string(const char* s) { return CFStringCreateWithCString(nullptr, s, kCFStringEncodingUTF8); }

// An array owning nothing but what it retains; takes the values' references.
CFArrayRef array(std::initializer_list<CFTypeRef> values)
{
    CFMutableArrayRef a = CFArrayCreateMutable(nullptr, 0, &kCFTypeArrayCallBacks);
    for (CFTypeRef v : values) {
        CFArrayAppendValue(a, v);
        CFRelease(v);
    }
    return a;
}

class ClientProperties : public SysConfigTest {
protected:
    // Sets a property as a client would; takes the value's reference.
    void set(const char* key, CFTypeRef value)
    {
        CFStringRef k = string(key);
        plugin_->setPropertyForClient(k, value, nullptr);
        CFRelease(k);
        if (value)
            CFRelease(value);
    }
    std::array<uint32_t, 6> rgbc() const
    {
        std::array<uint32_t, 6> out{};
        for (size_t i = 0; i < 6; ++i)
            out[i] = parts(*plugin_).overrides().rgbcOverride[i].load();
        return out;
    }
};

TEST_F(ClientProperties, RGBCOverrideOffAndOnKeepsTheValues)
{
    vt::LogCapture log;
    set("RGBCOverride", array({integer(10), integer(20), integer(30), integer(40)}));
    EXPECT_EQ(parts(*plugin_).overrides().rgbcOverrideActive.load(), 1);
    EXPECT_EQ(rgbc(), (std::array<uint32_t, 6>{10, 20, 30, 40, 0, 0}));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG, "Override ch[0]: 10"));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG, "Override ch[3]: 40"));

    set("RGBCOverride", integer(0));
    EXPECT_EQ(parts(*plugin_).overrides().rgbcOverrideActive.load(), 0);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG, "RGBC override turned off"));
    set("RGBCOverride", integer(1));
    EXPECT_EQ(parts(*plugin_).overrides().rgbcOverrideActive.load(), 1);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG, "RGBC override turned on"));
    EXPECT_EQ(rgbc(), (std::array<uint32_t, 6>{10, 20, 30, 40, 0, 0}));
}

TEST_F(ClientProperties, RGBCArraysTakeOnlyNumbersAndTheDatabasesChannelCount)
{
    vt::LogCapture log;
    parts(*plugin_).unit().dbChannelCount = 5;
    set("RGBCOverride", array({integer(1), integer(2), integer(3), integer(4)}));
    set("RGBCOverride", string("1,2,3,4,5"));
    EXPECT_EQ(parts(*plugin_).overrides().rgbcOverrideActive.load(), 0);
    EXPECT_EQ(rgbc(), (std::array<uint32_t, 6>{}));
    EXPECT_TRUE(log.lines().empty());

    parts(*plugin_).unit().dbChannelCount = 4;
    set("RGBCOverride", array({integer(1), integer(2), integer(3), integer(4)}));
    set("RGBCOverride", array({integer(11), string("x"), CFRetain(kCFBooleanTrue), integer(44)}));
    EXPECT_EQ(rgbc(), (std::array<uint32_t, 6>{11, 2, 3, 44, 0, 0}));

    // The length that counts is that of the database the filter feeds.
    auto five = std::make_shared<SpectralDatabase>();
    five->allocate(3, 5);
    parts(*plugin_).databases().publish(five, true);
    set("RGBCOverride", array({integer(7), integer(7), integer(7), integer(7)}));
    EXPECT_EQ(rgbc(), (std::array<uint32_t, 6>{11, 2, 3, 44, 0, 0}));
    set("RGBCOverride", array({integer(5), integer(6), integer(7), integer(8), integer(9)}));
    EXPECT_EQ(rgbc(), (std::array<uint32_t, 6>{5, 6, 7, 8, 9, 0}));
    parts(*plugin_).databases().publish(nullptr, false);

    // Never stored past six values.
    parts(*plugin_).unit().dbChannelCount = 8;
    set("RGBCOverride",
        array({integer(1), integer(2), integer(3), integer(4), integer(5), integer(6), integer(7), integer(8)}));
    EXPECT_EQ(rgbc(), (std::array<uint32_t, 6>{1, 2, 3, 4, 5, 6}));
    EXPECT_TRUE(log.contains("Override ch[5]: 6"));
    EXPECT_FALSE(log.contains("Override ch[6]: 7"));
}

TEST_F(ClientProperties, ChromaticityWithTwoOrThreeValues)
{
    vt::LogCapture log;
    parts(*plugin_).overrides().overrideLuminance = 50.0;
    set("ChromaticityOverride", array({number(0.3127), number(0.3290)}));
    EXPECT_EQ(parts(*plugin_).overrides().chromaticityOverrideActive.load(), 1);
    EXPECT_DOUBLE_EQ(parts(*plugin_).overrides().overrideX.load(), 0.3127);
    EXPECT_DOUBLE_EQ(parts(*plugin_).overrides().overrideY.load(), 0.3290);
    EXPECT_DOUBLE_EQ(parts(*plugin_).overrides().overrideLuminance.load(), -1.0);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG, "Override x: 0.31"));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG, "Override y: 0.33"));

    set("ChromaticityOverride", array({number(0.45), number(0.41), number(120.0)}));
    EXPECT_DOUBLE_EQ(parts(*plugin_).overrides().overrideX.load(), 0.45);
    EXPECT_DOUBLE_EQ(parts(*plugin_).overrides().overrideLuminance.load(), 120.0);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG, "Override Y: 120.00"));

    set("ChromaticityOverride", integer(0));
    EXPECT_EQ(parts(*plugin_).overrides().chromaticityOverrideActive.load(), 0);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEBUG, "Chromaticity (xyY) override turned off"));
    EXPECT_DOUBLE_EQ(parts(*plugin_).overrides().overrideY.load(), 0.41);
}

TEST_F(ClientProperties, ChromaticityRefusesValuesThatAreNotFinite)
{
    const double nan = std::numeric_limits<double>::quiet_NaN(), inf = std::numeric_limits<double>::infinity();
    vt::LogCapture log(VPLogLevel::Error);
    for (int component = 0; component < 3; ++component) {
        for (double bad : {nan, inf, -inf}) {
            std::array<double, 3> xyY{0.3127, 0.3290, 100.0};
            xyY[size_t(component)] = bad;
            set("ChromaticityOverride", array({number(xyY[0]), number(xyY[1]), number(xyY[2])}));
            EXPECT_EQ(parts(*plugin_).overrides().chromaticityOverrideActive.load(), 0);
            EXPECT_DOUBLE_EQ(parts(*plugin_).overrides().overrideY.load(), 0.0);
            EXPECT_TRUE(log.contains("Chromaticity override refused: component " + std::to_string(component) +
                                     " is not a finite number"));
        }
    }
    // Tiny values are numbers like any other.
    const double denormal = std::numeric_limits<double>::denorm_min();
    set("ChromaticityOverride", array({number(denormal), number(0.3290), number(denormal)}));
    EXPECT_EQ(parts(*plugin_).overrides().chromaticityOverrideActive.load(), 1);
    EXPECT_EQ(parts(*plugin_).overrides().overrideX.load(), denormal);
}

TEST_F(ClientProperties, ChromaticityIgnoresShortArraysAndNonNumbers)
{
    set("ChromaticityOverride", array({number(0.3)}));
    EXPECT_EQ(parts(*plugin_).overrides().chromaticityOverrideActive.load(), 0);

    parts(*plugin_).overrides().overrideX = 0.2;
    parts(*plugin_).overrides().overrideLuminance = 7.0;
    set("ChromaticityOverride", array({string("x"), number(0.3), string("Y"), number(9.0)}));
    EXPECT_EQ(parts(*plugin_).overrides().chromaticityOverrideActive.load(), 1);
    EXPECT_DOUBLE_EQ(parts(*plugin_).overrides().overrideX.load(), 0.2);
    EXPECT_DOUBLE_EQ(parts(*plugin_).overrides().overrideY.load(), 0.3);
    EXPECT_DOUBLE_EQ(parts(*plugin_).overrides().overrideLuminance.load(), 7.0);
}

TEST_F(ClientProperties, TuningValuesAndUnknownKeys)
{
    vt::LogCapture log;
    set("ColorAlgoLambda", number(0.05));
    EXPECT_FLOAT_EQ(parts(*plugin_).fit().lambda.load(), 0.05f);
    EXPECT_EQ(parts(*plugin_).fit().lambdaConfigured.load(), 0); // a client lambda does not switch on normalisation
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "Setting lambda 0.050000."));
    set("ColorAlgoLambda", string("0.5"));
    EXPECT_FLOAT_EQ(parts(*plugin_).fit().lambda.load(), 0.05f);

    set("ChannelRatioMitigationType", integer(3));
    EXPECT_EQ(parts(*plugin_).unit().mitigationType.load(), 3u);
    EXPECT_EQ(parts(*plugin_).unit().channelRatioMitigation.load(), 0);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "Setting channel ratio mitigation type 3."));

    log.clear();
    set("SomethingElse", integer(1));
    plugin_->setPropertyForClient(nullptr, kCFBooleanTrue, nullptr);
    EXPECT_TRUE(log.lines().empty());
}

// ---- Rebuild -------------------------------------------------------------------------------

TEST_F(ClientProperties, RebuildRunsOnTheCallersThread)
{
    struct Case {
        CFBooleanRef sysConfig, spectrumToProcess;
        const char* line;
        bool withValue; // any value, or none, asks for the rebuild
    };
    for (const Case& c :
         {Case{kCFBooleanTrue, nullptr, "Use sysconfig calibration to calibrate sensor\n", true},
          Case{kCFBooleanFalse, kCFBooleanTrue, "Don't use sysconfig calibration to calibrate sensor\n", false}}) {
        SCOPED_TRACE(c.line);
        std::filesystem::remove(cacheFile());
        parts(*plugin_).databases().setReady(false);
        vt::LogCapture log;
        VPServicePublishProperty(service_, CFSTR("SysConfigCalibration"), c.sysConfig);
        VPServicePublishProperty(service_, CFSTR("ALSCalibrationSpectrumToProcess"), c.spectrumToProcess);
        publish("alsCalibration", blob({GenericEntry{}.bytes()}));
        set("RebuildVelderDB", c.withValue ? integer(1) : nullptr);
        // Done before the call returned: nothing was queued for the cache.
        EXPECT_TRUE(std::filesystem::exists(cacheFile()));
        EXPECT_TRUE(parts(*plugin_).databases().isReady());
        EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, "Rebuild databases."));
        EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, c.line));
        EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, "Databases were rebuilt successfully."));
        EXPECT_EQ(VPServiceReceivedCount(service_, CFSTR("ALSCalibrationData")), 0u); // no push on rebuild
    }
}

TEST_F(ClientProperties, FailedRebuilds)
{
    vt::TempDir emptyStore;
    VPQVTSetStoreDirectory(emptyStore.str());
    // Configuration calibration without a blob, then neither property: the
    // factory store, which has nothing.
    for (CFBooleanRef sysConfig : {kCFBooleanTrue, CFBooleanRef(nullptr)}) {
        vt::LogCapture log;
        VPServicePublishProperty(service_, CFSTR("SysConfigCalibration"), sysConfig);
        set("RebuildVelderDB", integer(1));
        EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "Failed to rebuild databases."));
        EXPECT_FALSE(log.contains("Databases were rebuilt successfully."));
    }
    VPQVTSetStoreDirectory("");
    EXPECT_FALSE(parts(*plugin_).databases().isReady());
}

} // namespace
