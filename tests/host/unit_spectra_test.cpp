// A unit's channel spectra as its calibration stores them: found where the
// plug-in looks, decoded by the codec, in the channel order the driver reports.
#include "host/UnitSpectra.h"
#include "spectra/SensorModel.h"
#include "support/TestSupport.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <fstream>

namespace {

namespace fs = std::filesystem;

fs::path devices() { return fs::path(vt::sourceDir()) / "data" / "devices"; }

host::DeviceDescription unit(const std::string& name) { return host::loadDeviceDescription(devices() / name / "device.json"); }

struct Expected {
    const char* unit;
    const char* sensor; // the model sensor its calibration was made from
    spectra::ReferenceSet set;
    const char* origin;
};

// Every stored spectrum is its sensor channel times one factor per unit, so
// the ratio stored / model is the same for every channel and sample: a wrong
// entry, channel order or sample layout breaks it.
TEST(UnitSpectra, SampleUnitsGiveTheirSensorsChannelsInOrder)
{
    const Expected units[] = {
        {"xwca-t2", "colour5.csv", spectra::ReferenceSet::Default, "class XwCA"},
        {"xwcl-14", "colour5.csv", spectra::ReferenceSet::Dense02, "class XwCl"},
        {"xwcl-35", "rgbc4.csv", spectra::ReferenceSet::Default, "class XwCl"},
        {"xwcl-62", "colour6.csv", spectra::ReferenceSet::Dense02, "class XwCA"},
        {"vd6287-v1", "colour5.csv", spectra::ReferenceSet::Default, "class XwCl"},
        {"vd6287-v3", "colour5.csv", spectra::ReferenceSet::Default, "class XwCM"},
        {"sysconfig-r0", "rgbc4.csv", spectra::ReferenceSet::Default, "orientation 1"},
        {"sysconfig-r1", "rgbc4.csv", spectra::ReferenceSet::Default, "orientation 1"},
        {"sysconfig-vd6286", "colour5.csv", spectra::ReferenceSet::Default, "orientation 1"},
    };
    for (const Expected& e : units) {
        SCOPED_TRACE(e.unit);
        const host::UnitSpectra s = host::loadUnitSpectra(unit(e.unit));
        const spectra::SensorModel sensor =
            spectra::loadSensorModel(fs::path(vt::sourceDir()) / "data" / "sensors" / e.sensor);
        ASSERT_EQ(s.channelCount(), sensor.channelCount());
        ASSERT_EQ(s.luxCoefficients.size(), s.channelCount());
        EXPECT_EQ(s.referenceSet, e.set);
        EXPECT_NE(s.origin.find(e.origin), std::string::npos) << s.origin;

        double storedPeak = 0;
        for (const auto& channel : s.channels)
            storedPeak = std::max(storedPeak, *std::max_element(channel.begin(), channel.end()));
        const double factor = storedPeak / sensor.peak();
        double worst = 0;
        for (size_t c = 0; c < s.channelCount(); ++c)
            for (size_t i = 0; i < size_t(spectra::kSamples); ++i)
                worst = std::max(worst, std::abs(s.channels[c][i] - factor * sensor.channels[c][i]) / (factor * sensor.peak()));
        EXPECT_LT(worst, 2e-3) << "stored spectra are not the model sensor's channels in order";
        EXPECT_GT(*std::max_element(s.luxCoefficients.begin(), s.luxCoefficients.end()), 0.0);
    }
}

TEST(UnitSpectra, AuxiliaryBlobScalesOnlyTheInfraredTail)
{
    const host::UnitSpectra plain = host::loadUnitSpectra(unit("sysconfig-r1"));
    const host::UnitSpectra compensated = host::loadUnitSpectra(unit("sysconfig-aux"));
    EXPECT_NE(compensated.origin.find("alsAuxCalibration"), std::string::npos);
    ASSERT_EQ(compensated.channelCount(), 4u);
    // Both units store the same model sensor: equal up to the tail, where the
    // plug-in's compensation rescales every channel.
    bool tailDiffers = false;
    for (size_t c = 0; c < 4; ++c) {
        for (int i = 0; i < spectra::kNirTailStart; ++i)
            EXPECT_NEAR(compensated.channels[c][size_t(i)], plain.channels[c][size_t(i)], 1.0) << c << " " << i;
        for (int i = spectra::kNirTailStart; i < spectra::kSamples; ++i)
            tailDiffers |= std::abs(compensated.channels[c][size_t(i)] - plain.channels[c][size_t(i)]) > 1.0;
    }
    EXPECT_TRUE(tailDiffers);
}

TEST(UnitSpectra, UnitsWithoutStoredSpectraSayWhy)
{
    auto messageOf = [](const host::DeviceDescription& d) {
        try {
            host::loadUnitSpectra(d);
        } catch (const host::UnitSpectraError& e) {
            return std::string(e.what());
        }
        return std::string("no error");
    };
    const host::DeviceDescription basic = unit("basic-rgbc");
    std::string message = messageOf(basic);
    EXPECT_NE(message.find(basic.file.string()), std::string::npos) << message;
    EXPECT_NE(message.find("default calibration"), std::string::npos) << message;

    host::DeviceDescription forced = unit("xwca-t2");
    forced.bootArgs = "debug=1 als_default_calibration=1";
    EXPECT_NE(messageOf(forced).find("boot arguments"), std::string::npos) << messageOf(forced);

    // A store holding no class the plug-in reads.
    vt::TempDir dir;
    host::DeviceDescription empty = unit("xwca-t2");
    empty.factoryStore = dir.path();
    EXPECT_NE(messageOf(empty).find("holds no record of class XwCA or XwCl"), std::string::npos)
        << messageOf(empty);

    // A record of a size no layout has names the file.
    std::ofstream(dir.path() / "XwCA") << "far too short";
    message = messageOf(empty);
    EXPECT_NE(message.find((dir.path() / "XwCA").string()), std::string::npos) << message;

    // Registry calibration asked for, but the entry for the orientation is missing.
    host::DeviceDescription turned = unit("sysconfig-r1");
    for (auto& entry : turned.registry)
        if (entry.properties.contains("IOHIDOrientationType"))
            entry.properties["IOHIDOrientationType"] = {{"data", "07 00 00 00"}};
    EXPECT_NE(messageOf(turned).find("no entry for orientation 7"), std::string::npos) << messageOf(turned);
}

} // namespace
