// Sensor CSV files: the shipped model sensors read back as silicon colour
// sensors with near-infrared leakage, and malformed files are refused with
// the line at fault.
#include "common/TestSupport.h"
#include "spectra/SensorModel.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <fstream>

namespace {

namespace fs = std::filesystem;
using namespace spectra;

fs::path sensorsDir() { return fs::path(vt::sourceDir()) / "data" / "sensors"; }

double at(const Spectrum& s, double nm) { return s[size_t(sampleAtOrBelow(nm))]; }

std::string errorOf(const fs::path& file)
{
    try {
        loadSensorModel(file);
    } catch (const std::runtime_error& e) {
        return e.what();
    }
    return "";
}

TEST(SensorModel, ModelSensorsHaveTheirChannelsAndLeakIntoTheInfrared)
{
    const std::vector<std::pair<const char*, std::vector<std::string>>> models = {
        {"colour5.csv", {"Z", "Y", "X", "C", "IR"}},
        {"colour6.csv", {"C", "V", "B", "G", "O", "R"}},
        {"rgbc4.csv", {"R", "G", "B", "C"}},
    };
    for (const auto& [file, names] : models) {
        SCOPED_TRACE(file);
        const SensorModel sensor = loadSensorModel(sensorsDir() / file);
        EXPECT_EQ(sensor.channelNames, names);
        EXPECT_NEAR(sensor.peak(), 1.0, 1e-6);
        for (const Spectrum& channel : sensor.channels) {
            EXPECT_GE(*std::min_element(channel.begin(), channel.end()), 0.0);
            // Filters leak beyond 700 nm, silicon answers up to its band gap and fades there.
            EXPECT_GT(at(channel, 900.0), 0.01);
            EXPECT_GT(at(channel, 1000.0), at(channel, 1100.0));
            EXPECT_LT(at(channel, 1100.0), 0.1 * at(channel, 900.0) + 0.01);
        }
    }
}

TEST(SensorModel, ResponsesFoldTheLightWithEachChannel)
{
    SensorModel sensor;
    sensor.channelNames = {"flat", "half"};
    Spectrum flat{};
    flat.fill(1.0);
    sensor.channels = {flat, scaled(flat, 0.5)};
    Spectrum light{};
    light[size_t(sampleAtOrBelow(550.0))] = 3.0;
    const std::vector<double> r = channelResponses(sensor, light);
    ASSERT_EQ(r.size(), 2u);
    EXPECT_DOUBLE_EQ(r[0], 3.0 * kStepNm);
    EXPECT_DOUBLE_EQ(r[1], 1.5 * kStepNm);
}

TEST(SensorModel, WrittenFilesReadBack)
{
    const SensorModel original = loadSensorModel(sensorsDir() / "rgbc4.csv");
    vt::TempDir dir;
    std::ofstream(dir.path() / "copy.csv") << sensorModelCsv(original, {"a comment"});
    const SensorModel copy = loadSensorModel(dir.path() / "copy.csv");
    EXPECT_EQ(copy.channelNames, original.channelNames);
    for (size_t c = 0; c < copy.channelCount(); ++c)
        for (size_t s = 0; s < copy.channels[c].size(); ++s)
            ASSERT_NEAR(copy.channels[c][s], original.channels[c][s], 5e-7);
}

TEST(SensorModel, MalformedFilesNameTheLineAtFault)
{
    vt::TempDir dir;
    const std::string good = sensorModelCsv(loadSensorModel(sensorsDir() / "rgbc4.csv"));
    auto withLine = [&](size_t index, const std::string& replacement) {
        std::string text = good;
        size_t start = 0;
        for (size_t i = 0; i < index; ++i)
            start = text.find('\n', start) + 1;
        text.replace(start, text.find('\n', start) - start, replacement);
        return text;
    };
    const std::vector<std::pair<std::string, std::string>> cases = {
        {"wavelength,R,G,B,C\n", ":1: the header"},
        {withLine(3, "304,0.1,0.1,0.1"), ":4: expected 5 values, found 4"},
        {withLine(3, "306,0.1,0.1,0.1,0.1"), ":4: expected wavelength 304 nm"},
        {withLine(3, "304,0.1,x,0.1,0.1"), ":4: channel G"},
        {withLine(3, "304,0.1,nan,0.1,0.1"), ":4: channel G"},
        {good.substr(0, good.rfind("1100,")), "400 rows, expected 401"},
        {good + "1102,0,0,0,0\n", ":403: more than 401 rows"},
        {"# only a comment\n", "no header line"},
    };
    for (const auto& [text, expected] : cases) {
        const fs::path file = dir.path() / "bad.csv";
        std::ofstream(file) << text;
        const std::string error = errorOf(file);
        EXPECT_NE(error.find(expected), std::string::npos) << "got: " << error << "\nexpected: " << expected;
    }
    EXPECT_NE(errorOf(dir.path() / "missing.csv").find("cannot open"), std::string::npos);
}

} // namespace
