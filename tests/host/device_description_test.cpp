// Device descriptions: typed property values and errors that say where.
// Values with no CF form were found by fuzzing: text that is not UTF-8 (the
// command used to abort on the null value), arrays holding such an element
// (the array was leaked) and device-information answers, which the check
// skipped (the unit's service was leaked when making the unit failed on one).
// A value can still fail when the unit is made, after the check: its data
// file may be gone by then.
#include "common/TestSupport.h"
#include "host/emulator/DeviceDescription.h"
#include "host/emulator/Unit.h"

#include <gtest/gtest.h>

#include <fstream>

namespace {

using nlohmann::json;

std::string errorOf(const json& j)
{
    try {
        host::parseDeviceDescription(j, "unit.json");
    } catch (const host::DescriptionError& e) {
        return e.what();
    }
    return "";
}

TEST(DeviceDescription, ValuesMapOntoCFTypes)
{
    vt::TempDir dir;
    std::ofstream(dir.path() / "blob.bin", std::ios::binary) << std::string("\x01\x02\x03", 3);

    CFTypeRef v = host::createPropertyValue(json{{"data", "0a 0B"}}, dir.path(), "x");
    ASSERT_EQ(CFGetTypeID(v), CFDataGetTypeID());
    EXPECT_EQ(CFDataGetLength(static_cast<CFDataRef>(v)), 2);
    EXPECT_EQ(CFDataGetBytePtr(static_cast<CFDataRef>(v))[1], 0x0B);
    CFRelease(v);

    v = host::createPropertyValue(json{{"dataFile", "blob.bin"}}, dir.path(), "x");
    EXPECT_EQ(CFDataGetLength(static_cast<CFDataRef>(v)), 3);
    CFRelease(v);

    v = host::createPropertyValue(json{{"float", 0.25}}, dir.path(), "x");
    EXPECT_TRUE(CFNumberIsFloatType(static_cast<CFNumberRef>(v)));
    CFRelease(v);

    v = host::createPropertyValue(json::array({"als,ct720", 5, true}), dir.path(), "x");
    ASSERT_EQ(CFGetTypeID(v), CFArrayGetTypeID());
    EXPECT_EQ(CFArrayGetCount(static_cast<CFArrayRef>(v)), 3);
    EXPECT_EQ(CFArrayGetValueAtIndex(static_cast<CFArrayRef>(v), 2), kCFBooleanTrue);
    CFRelease(v);

    v = host::createPropertyValue(json("caf\xC3\xA9"), dir.path(), "x");
    ASSERT_NE(v, nullptr);
    EXPECT_EQ(CFGetTypeID(v), CFStringGetTypeID());
    CFRelease(v);
}

TEST(DeviceDescription, ErrorsNameTheFileAndTheField)
{
    const std::pair<json, const char*> cases[] = {
        {json::array(), "unit.json: top level"},
        {{{"service", {{"properties", {{"chip_id", {{"data", "abc"}}}}}}}}, "service.properties.chip_id: odd number"},
        {{{"registry", json::array({{{"parent", 1}}})}}, "registry[0]"},
        {{{"service", {{"properties", {{"x", nullptr}}}}}}, "service.properties.x"},
        {{{"service", {{"properties", {{"x", {{"dataFile", "nope.bin"}}}}}}}}, "cannot read"},
        {{{"deviceInfo", {{"DeviceColor", "1"}, {"ProductName", nullptr}}}}, "deviceInfo.ProductName"},
    };
    for (const auto& [description, where] : cases)
        EXPECT_NE(errorOf(description).find(where), std::string::npos) << where << ": " << errorOf(description);
}

TEST(DeviceDescription, ValuesWithoutACFFormAreRefusedWhole)
{
    // Under the address sanitizer a leaked array fails the test program.
    const json values[] = {json("caf\xE9"), json::array({1, "\xFF"}), json::parse("[1, [2, null]]"),
                           json::parse("[{\"data\": \"0g\"}]")};
    for (size_t i = 0; i < std::size(values); ++i)
        EXPECT_THROW(host::createPropertyValue(values[i], ".", "value"), host::DescriptionError) << i;
}

TEST(DeviceDescription, ADataFileGoneBeforeTheUnitIsMadeIsReported)
{
    // Under the address sanitizer a leaked service fails the test program.
    vt::TempDir dir;
    std::ofstream(dir.path() / "blob.bin", std::ios::binary) << std::string("\x01\x02", 2);
    const host::DeviceDescription d = host::parseDeviceDescription(
        {{"service", {{"properties", {{"x", {{"dataFile", "blob.bin"}}}}}}}}, dir.path() / "unit.json");
    std::filesystem::remove(dir.path() / "blob.bin");
    EXPECT_THROW(host::Unit{d}, host::DescriptionError);
}

} // namespace
