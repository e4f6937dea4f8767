// Device descriptions: typed property values and errors that say where.
#include "host/DeviceDescription.h"
#include "host/Unit.h"
#include "support/TestSupport.h"

#include <VantishPlatform/DeviceState.h>
#include <VantishPlatform/HIDHost.h>
#include <Tessary/Tessary.h>

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
}

TEST(DeviceDescription, ErrorsNameTheFileAndTheField)
{
    EXPECT_NE(errorOf(json::array()).find("unit.json: top level"), std::string::npos);
    EXPECT_NE(errorOf({{"service", {{"properties", {{"chip_id", {{"data", "abc"}}}}}}}})
                  .find("service.properties.chip_id: odd number"),
              std::string::npos);
    EXPECT_NE(errorOf({{"registry", json::array({{{"parent", 1}}})}}).find("registry[0]"), std::string::npos);
    EXPECT_NE(errorOf({{"service", {{"properties", {{"x", nullptr}}}}}}).find("service.properties.x"),
              std::string::npos);
    EXPECT_NE(errorOf({{"service", {{"properties", {{"x", {{"dataFile", "nope.bin"}}}}}}}}).find("cannot read"),
              std::string::npos);
}

TEST(DeviceDescription, AUnitAppearsOnThePlatform)
{
    json j = {{"service", {{"registryID", 20}, {"properties", {{"NumberOfChannels", 5}}}}},
              {"registry", json::array({{{"id", 20}, {"parent", 10}}, {{"id", 10}, {"properties", {{"IOHIDOrientationType", {{"data", "03000000"}}}}}}})},
              {"deviceInfo", {{"ProductName", "Dravik OS"}, {"productType", 7}}}};
    host::Unit unit(host::parseDeviceDescription(j, "/tmp/unit.json"));

    EXPECT_TRUE(IOHIDServiceConformsTo(unit.service(), 0xFF00, 0x0004));
    EXPECT_NE(IOHIDServiceGetProperty(unit.service(), CFSTR("NumberOfChannels")), nullptr);
    io_service_t entry = IOServiceGetMatchingService(kIOMainPortDefault, IORegistryEntryIDMatching(20));
    ASSERT_NE(entry, 0u);
    CFTypeRef orientation = IORegistryEntrySearchCFProperty(entry, kIOServicePlane, CFSTR("IOHIDOrientationType"),
                                                            nullptr, kIORegistryIterateRecursively | kIORegistryIterateParents);
    ASSERT_NE(orientation, nullptr); // found on the parent
    CFRelease(orientation);
    IOObjectRelease(entry);
    EXPECT_EQ(QyGetProductType(), 7);
    CFTypeRef product = QyCopyAnswer(CFSTR("ProductName"), nullptr);
    EXPECT_TRUE(CFEqual(product, CFSTR("Dravik OS")));
    CFRelease(product);
}

TEST(DeviceDescription, ShippedSampleDevicesLoad)
{
    for (const auto& entry : std::filesystem::recursive_directory_iterator(vt::sourceDir() + "/data/devices")) {
        if (entry.path().filename() == "device.json") {
            EXPECT_NO_THROW(host::loadDeviceDescription(entry.path())) << entry.path();
        }
    }
}

} // namespace
