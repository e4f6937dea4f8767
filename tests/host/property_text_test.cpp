// Property values that have no CF form, found by fuzzing: text that is not
// UTF-8 (a bare word after "!set KEY=" in `vantish run` input is taken as it
// stands; the command used to abort on the null value), and arrays holding
// such an element (the array was leaked), and device-information answers,
// which the description check skipped (the unit's service was leaked when
// making the unit failed on one).
#include "host/DeviceDescription.h"
#include "support/TestSupport.h"

#include <gtest/gtest.h>

#include <sys/wait.h>

#include <fstream>
#include <sstream>

namespace {

namespace fs = std::filesystem;

std::string slurp(const fs::path& path)
{
    std::ifstream in(path);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

size_t countOf(const std::string& text, const std::string& part)
{
    size_t n = 0;
    for (size_t at = text.find(part); at != std::string::npos; at = text.find(part, at + 1))
        ++n;
    return n;
}

TEST(PropertyText, TextThatIsNotUTF8HasNoPropertyValue)
{
    EXPECT_THROW(host::createPropertyValue(nlohmann::json("caf\xE9"), ".", "value"), host::DescriptionError);
    EXPECT_THROW(host::createPropertyValue(nlohmann::json::array({1, "\xFF"}), ".", "value"), host::DescriptionError);
    CFTypeRef text = host::createPropertyValue(nlohmann::json("caf\xC3\xA9"), ".", "value");
    ASSERT_NE(text, nullptr);
    EXPECT_EQ(CFGetTypeID(text), CFStringGetTypeID());
    CFRelease(text);
}

TEST(PropertyText, AnArrayWithAnElementThatHasNoCFFormIsRefusedWhole)
{
    // Under the address sanitizer a leaked array fails the test program.
    EXPECT_THROW(host::createPropertyValue(nlohmann::json::parse("[1, [2, null]]"), ".", "value"),
                 host::DescriptionError);
    EXPECT_THROW(host::createPropertyValue(nlohmann::json::parse("[{\"data\": \"0g\"}]"), ".", "value"),
                 host::DescriptionError);
}

TEST(PropertyText, DeviceInformationAnswersAreCheckedWithTheDescription)
{
    const auto description = nlohmann::json::parse(R"({"deviceInfo": {"DeviceColor": "1", "ProductName": null}})");
    try {
        host::parseDeviceDescription(description, "unit/device.json");
        FAIL() << "a null answer was accepted";
    } catch (const host::DescriptionError& e) {
        EXPECT_NE(std::string(e.what()).find("deviceInfo.ProductName"), std::string::npos) << e.what();
    }
}

TEST(PropertyText, RunReportsTheLinesAndGoesOn)
{
    vt::TempDir dir;
    std::ofstream(dir.path() / "events.csv") << "lux,c0,c1,c2,c3\n100,10,20,30,40\n"
                                             << "!set \xFF=1\n!set RGBCOverride=\xFE\n"
                                             << "120,10,20,30,40\n";
    const fs::path device = fs::path(vt::sourceDir()) / "data" / "devices" / "basic-rgbc" / "device.json";
    const std::string command = std::string("'") + VANTISH_COMMAND + "' --state '" + (dir.path() / "state").string() +
                                "' run '" + device.string() + "' --events '" + (dir.path() / "events.csv").string() +
                                "' > '" + (dir.path() / "out.txt").string() + "' 2> '" +
                                (dir.path() / "err.txt").string() + "'";
    const int status = std::system(command.c_str());
    ASSERT_TRUE(WIFEXITED(status));
    EXPECT_EQ(WEXITSTATUS(status), 0);

    const std::string err = slurp(dir.path() / "err.txt");
    EXPECT_EQ(countOf(err, "not UTF-8"), 2u) << err;
    EXPECT_NE(err.find(":3:"), std::string::npos) << err;
    EXPECT_NE(err.find(":4:"), std::string::npos) << err;
    const std::string out = slurp(dir.path() / "out.txt");
    EXPECT_NE(out.find("\n0,"), std::string::npos) << out;
    EXPECT_NE(out.find("\n1,"), std::string::npos) << out;
}

} // namespace
