// The sample units of data/devices: their stored records are what the codec
// makes of their JSON forms, and each unit comes up through the real bundle
// with its own calibration, builds its per-chip database, finds it again on
// the next start and estimates the colour of light its model sensor sees.
#include "PlugInColour.h"
#include "common/TestSupport.h"
#include "host/emulator/Bundle.h"
#include "host/emulator/DeviceDescription.h"
#include "host/emulator/Unit.h"
#include "host/recordcodec/RecordCodec.h"
#include "spectra/CieIlluminants.h"
#include "spectra/Colorimetry.h"
#include "spectra/SensorModel.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

namespace {

namespace fs = std::filesystem;

struct SampleUnit {
    const char* folder;
    std::vector<const char*> records; // binaries beside their "<name>.json" sources (a .bin suffix dropped)
    const char* sensor;               // model sensor file in data/sensors
    const char* recognised;           // log line showing the calibration was read
    CFIndex recordLength;             // "ALSCalibrationData" for the driver; 0 when none is pushed
    bool colorCalibration;            // "ALSColorCalibration" as well
};

const std::vector<SampleUnit>& sampleUnits()
{
    static const std::vector<SampleUnit> units = {
        {"xwca-t2", {"store/XwCA"}, "colour5.csv", "XwCA version = v1.8\n", 193, false},
        {"xwcl-14", {"store/XwCl"}, "colour5.csv", "XwCl version = v3.2\n", 193, false},
        {"xwcl-35", {"store/XwCl"}, "rgbc4.csv", "XwCl version = v2.4\n", 145, false},
        {"xwcl-62", {"store/XwCA"}, "colour6.csv", "XwCl version = v4.0\n", 220, false},
        {"vd6287-v1",
         {"store/XwCl"},
         "colour5.csv",
         "QVT calibration data converted from v1 to v3. New size = 10348\n",
         776,
         true},
        {"vd6287-v3", {"store/XwCM"}, "colour5.csv", "XwCl calibration version = v3.1\n", 776, true},
        {"sysconfig-r0",
         {"registry/alsCalibration.bin"},
         "rgbc4.csv",
         "Found calibration for orientation = 1, senzorType = 2, chipType = 0 \n",
         145,
         false},
        {"sysconfig-r1",
         {"registry/alsCalibration.bin"},
         "rgbc4.csv",
         "Found calibration for orientation = 1, senzorType = 2, chipType = 0 \n",
         0,
         false},
        {"sysconfig-aux",
         {"registry/alsCalibration.bin", "registry/alsAuxCalibration.bin"},
         "rgbc4.csv",
         "ALS auxiliary calibration found \n",
         145,
         false},
        {"sysconfig-vd6286",
         {"registry/alsCalibration.bin"},
         "colour5.csv",
         "Found calibration for orientation = 1, senzorType = 7, chipType = 3 \n",
         193,
         false},
    };
    return units;
}

fs::path dataDir() { return fs::path(vt::sourceDir()) / "data"; }

std::vector<uint8_t> readBytes(const fs::path& path)
{
    std::ifstream in(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

fs::path jsonSourceOf(const fs::path& binary)
{
    fs::path json = binary;
    if (json.extension() == ".bin")
        json.replace_extension();
    return json.string() + ".json";
}

CFIndex dataLength(CFTypeRef value)
{
    if (!value || CFGetTypeID(value) != CFDataGetTypeID())
        return 0;
    return CFDataGetLength(static_cast<CFDataRef>(value));
}

uint16_t u16At(CFDataRef data, CFIndex offset)
{
    UInt8 bytes[2] = {};
    CFDataGetBytes(data, CFRangeMake(offset, 2), bytes);
    return uint16_t(bytes[0] | bytes[1] << 8);
}

// Counts of the unit's sensor under `light`, the largest about 2000.
std::vector<double> countsUnder(const spectra::SensorModel& sensor, const spectra::Spectrum& light)
{
    std::vector<double> counts = spectra::channelResponses(sensor, light);
    const double largest = *std::max_element(counts.begin(), counts.end());
    for (double& c : counts)
        c *= 2000.0 / largest;
    return counts;
}

double colourError(const spectra::Xyz& got, const spectra::Spectrum& light)
{
    return spectra::deltaUvPrime(spectra::uvPrime(spectra::chromaticity(got)),
                                 spectra::uvPrime(spectra::chromaticity(spectra::tristimulus(light))));
}

TEST(SampleUnits, StoredRecordsAreTheCodecEncodingOfTheirJson)
{
    for (const SampleUnit& unit : sampleUnits()) {
        for (const char* record : unit.records) {
            const fs::path binary = dataDir() / "devices" / unit.folder / record;
            SCOPED_TRACE(binary.string());
            std::ifstream in(jsonSourceOf(binary));
            ASSERT_TRUE(in) << "no JSON source";
            const recordcodec::Json source = recordcodec::Json::parse(in);
            const auto encoded = recordcodec::encode(source);
            ASSERT_TRUE(encoded) << encoded.error;
            EXPECT_TRUE(*encoded.value == readBytes(binary)) << "the stored bytes are not the encoded JSON";
        }
    }
}

class SampleUnitBringUp : public testing::TestWithParam<SampleUnit> {};

TEST_P(SampleUnitBringUp, CalibratesCachesAndColours)
{
    const SampleUnit& u = GetParam();
    vt::DeviceRoots roots;
    const host::Bundle bundle(vt::bundleDir());
    host::Unit unit(host::loadDeviceDescription(dataDir() / "devices" / u.folder / "device.json"));
    const spectra::SensorModel sensor = spectra::loadSensorModel(dataDir() / "sensors" / u.sensor);

    {
        vt::LogCapture log;
        host::PlugInSession session(bundle, unit);
        ASSERT_EQ(session.match(), 1000);
        session.open();
        session.waitForQueuedWork();

        EXPECT_TRUE(log.contains(u.recognised));
        EXPECT_TRUE(log.contains("Small DB has been created\n"));
        EXPECT_FALSE(log.contains("Matching cached DB found"));

        CFTypeRef record = unit.copyDriverProperty("ALSCalibrationData");
        EXPECT_EQ(dataLength(record), u.recordLength);
        // Every pushed record of the channel layouts carries the selected entry's iTime (100).
        if (record) {
            if (u.recordLength != 776) {
                EXPECT_EQ(u16At(static_cast<CFDataRef>(record), 14), 100);
            }
            CFRelease(record);
        }
        CFTypeRef colour = unit.copyDriverProperty("ALSColorCalibration");
        EXPECT_EQ(dataLength(colour) == 28163, u.colorCalibration);
        if (colour)
            CFRelease(colour);
        EXPECT_EQ(unit.copyDriverProperty("crgb"), nullptr); // no fallback to the default

        // Daylight and incandescent light as the model sensor sees them. Both are
        // reference sources, so a unit whose stored spectra are its sensor's
        // (channel order, scale, infrared tail) finds them almost exactly.
        for (const spectra::Spectrum& light : {spectra::cieD65(), spectra::cieA()}) {
            const auto xyz = vt::plugInColour(session, countsUnder(sensor, light), 300.0);
            ASSERT_TRUE(xyz) << "the event was not coloured";
            EXPECT_NEAR(xyz->Y, 300.0, 0.01);
            EXPECT_LT(colourError(*xyz, light), 0.002);
        }
    }

    vt::LogCapture log;
    host::PlugInSession session(bundle, unit);
    ASSERT_EQ(session.match(), 1000);
    session.open();
    session.waitForQueuedWork();
    EXPECT_TRUE(log.contains("Matching cached DB found"));
    EXPECT_FALSE(log.contains("Small DB has been created\n"));
    EXPECT_TRUE(vt::plugInColour(session, countsUnder(sensor, spectra::cieD65()), 300.0));
}

INSTANTIATE_TEST_SUITE_P(DataDevices, SampleUnitBringUp, testing::ValuesIn(sampleUnits()),
                         [](const testing::TestParamInfo<SampleUnit>& info) {
                             std::string name = info.param.folder;
                             std::replace(name.begin(), name.end(), '-', '_');
                             return name;
                         });

} // namespace
