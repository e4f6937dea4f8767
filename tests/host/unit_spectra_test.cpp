// A unit's channel spectra as its calibration stores them: found where the
// plug-in looks, decoded by the codec, in the channel order the driver reports.
#include "PlugInColour.h"
#include "common/TestSupport.h"
#include "host/emulator/Bundle.h"
#include "host/emulator/Unit.h"
#include "host/inputs/SyntheticReading.h"
#include "host/inputs/UnitSpectra.h"
#include "host/recordcodec/RecordCodec.h"
#include "spectra/Colorimetry.h"
#include "spectra/SensorModel.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <fstream>

namespace {

namespace fs = std::filesystem;

fs::path devices() { return fs::path(vt::sourceDir()) / "data" / "devices"; }

host::DeviceDescription unit(const std::string& name)
{
    return host::loadDeviceDescription(devices() / name / "device.json");
}

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
        double worst = 0; // relative to the stored peak
        for (size_t c = 0; c < s.channelCount(); ++c)
            for (size_t i = 0; i < size_t(spectra::kSamples); ++i)
                worst = std::max(worst, std::abs(s.channels[c][i] - factor * sensor.channels[c][i]) / storedPeak);
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

// The chromaticities the plug-in on `description` gives for readings (x = y
// = 0 where it gives no colour).
std::vector<spectra::Xy> plugInChromaticities(const host::DeviceDescription& description,
                                              const std::vector<host::SensorReading>& readings)
{
    vt::DeviceRoots roots;
    const host::Bundle bundle(vt::bundleDir());
    host::Unit unit(description);
    host::PlugInSession session(bundle, unit);
    EXPECT_EQ(session.match(), 1000);
    session.open();
    session.waitForQueuedWork();

    std::vector<spectra::Xy> out;
    for (const host::SensorReading& reading : readings) {
        const auto xyz = vt::plugInColour(session, reading.channels, reading.lux);
        out.push_back(xyz ? spectra::chromaticity(*xyz) : spectra::Xy{0, 0});
    }
    return out;
}

// XwCl chip types 1 and 2 fold stored channel 0 into the last column (twice
// the last stored channel, or that plus stored channel 0) and the driver
// reports the columns: a reference source read through those spectra comes
// back from the real plug-in at its own chromaticity.
TEST(UnitSpectra, XwClChipTypesMapTheColumnsAsThePlugInFoldsThem)
{
    for (const char* name : {"xwcl-62", "xwcl-14"}) {
        const host::DeviceDescription original = unit(name);
        const std::string storeClass = std::string(name) == "xwcl-62" ? "XwCA" : "XwCl";
        std::ifstream in(*original.factoryStore / (storeClass + ".json"));
        recordcodec::Json record = recordcodec::Json::parse(in);
        const host::UnitSpectra plain = host::loadUnitSpectra(original);
        const size_t n = plain.channelCount();
        const size_t skip = n == 6 ? 1 : 0; // the 6-channel record keeps channel 0 out of the fit

        for (int chipType : {1, 2}) {
            SCOPED_TRACE(std::string(name) + " chip type " + std::to_string(chipType));
            record["fields"]["header"]["chipType"] = chipType;
            const auto bytes = recordcodec::encode(record);
            ASSERT_TRUE(bytes) << bytes.error;
            vt::TempDir store;
            std::ofstream(store.path() / storeClass, std::ios::binary)
                .write(reinterpret_cast<const char*>(bytes.value->data()), std::streamsize(bytes.value->size()));
            host::DeviceDescription changed = original;
            changed.factoryStore = store.path();

            const host::UnitSpectra mapped = host::loadUnitSpectra(changed);
            ASSERT_EQ(mapped.channelCount(), n);
            // Stored channel k of the record at one sample (chip type 0 maps nothing,
            // so plain's channel k is stored channel k).
            const size_t probe = size_t(spectra::sampleAtOrBelow(550));
            auto stored = [&](size_t k) {
                return record["fields"]["entries"][0]["channels"][k]["spectrum"][probe].get<double>();
            };
            for (size_t c = 0; c < skip; ++c)
                EXPECT_EQ(mapped.channels[c][probe], stored(c));
            for (size_t c = skip; c + 1 < n; ++c)
                EXPECT_EQ(mapped.channels[c][probe], stored(c + 1 - skip)) << c;
            EXPECT_EQ(mapped.channels[n - 1][probe], chipType == 1 ? 2 * stored(5) : stored(5) + stored(0));
            EXPECT_EQ(plain.channels[n - 1][probe], stored(n - 1));

            // Broadband reference sources: the fit of this sensor blurs line spectra
            // with the clear channel folded in, whatever the mapping.
            const std::vector<const spectra::Source*> lights = {spectra::findSource("daylight-5000K"),
                                                                spectra::findSource("planck-2856K")};
            std::vector<host::SensorReading> readings;
            for (const spectra::Source* light : lights)
                readings.push_back(host::synthesiseReading(mapped, light->spectrum, 300));
            const std::vector<spectra::Xy> estimates = plugInChromaticities(changed, readings);
            for (size_t i = 0; i < lights.size(); ++i) {
                const spectra::Xy truth = spectra::chromaticity(spectra::tristimulus(lights[i]->spectrum));
                EXPECT_LT(spectra::deltaUvPrime(spectra::uvPrime(estimates[i]), spectra::uvPrime(truth)), 0.001)
                    << lights[i]->name;
            }
        }
    }
}

TEST(UnitSpectra, UnitsWithoutStoredSpectraSayWhy)
{
    auto expectWhy = [](const host::DeviceDescription& d, const std::string& why) {
        try {
            host::loadUnitSpectra(d);
            ADD_FAILURE() << "loaded; expected an error naming " << why;
        } catch (const host::UnitSpectraError& e) {
            EXPECT_NE(std::string(e.what()).find(why), std::string::npos) << e.what();
        }
    };
    const host::DeviceDescription basic = unit("basic-rgbc");
    expectWhy(basic, basic.file.string());
    expectWhy(basic, "default calibration");

    host::DeviceDescription forced = unit("xwca-t2");
    forced.bootArgs = "debug=1 als_default_calibration=1";
    expectWhy(forced, "boot arguments");

    vt::TempDir dir;
    host::DeviceDescription empty = unit("xwca-t2");
    empty.factoryStore = dir.path();
    expectWhy(empty, "holds no record of class XwCA or XwCl");
    // A record of a size no layout has names the file.
    std::ofstream(dir.path() / "XwCA") << "far too short";
    expectWhy(empty, (dir.path() / "XwCA").string());

    // Registry calibration asked for, but the entry for the orientation is missing.
    host::DeviceDescription turned = unit("sysconfig-r1");
    for (auto& entry : turned.registry)
        if (entry.properties.contains("IOHIDOrientationType"))
            entry.properties["IOHIDOrientationType"] = {{"data", "07 00 00 00"}};
    expectWhy(turned, "no entry for orientation 7");
}

} // namespace
