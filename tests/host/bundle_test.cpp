// Loading the plug-in bundle through its registration, as the event system does.
#include "common/TestSupport.h"
#include "host/emulator/Bundle.h"

#include <gtest/gtest.h>

#include <fstream>

namespace {

void write(const std::filesystem::path& path, const std::string& text) { std::ofstream(path) << text; }

TEST(Bundle, LoadsTheBuiltBundleAndHandsOutFilters)
{
    host::Bundle bundle(vt::bundleDir());
    EXPECT_EQ(bundle.factoryName(), "VantishPlugInFactory");
    host::FilterInterface filter = bundle.createFilter();
    ASSERT_NE(filter, nullptr);
    ASSERT_NE((*filter)->match, nullptr);
    // The interface query took a reference and the factory's own was given back.
    EXPECT_EQ((*filter)->AddRef(filter), 2u);
    EXPECT_EQ((*filter)->Release(filter), 1u);
    EXPECT_EQ((*filter)->Release(filter), 0u);
}

TEST(Bundle, RejectsBrokenRegistrations)
{
    vt::TempDir dir;
    EXPECT_THROW(host::Bundle(dir.str()), std::runtime_error); // no Info.json

    write(dir.path() / "Info.json", "{ not json");
    EXPECT_THROW(host::Bundle(dir.str()), std::runtime_error);

    write(dir.path() / "Info.json", R"({"CFBundleExecutable": "Vantish.so",
        "CFPlugInFactories": {"D1148FE3-60F3-4B3B-8505-E28C1E66EBC8": "VantishPlugInFactory"},
        "CFPlugInTypes": {"00000000-0000-0000-C000-000000000046": ["D1148FE3-60F3-4B3B-8505-E28C1E66EBC8"]}})");
    try {
        host::Bundle bundle(dir.str());
        FAIL() << "a bundle without a service-filter factory loaded";
    } catch (const std::runtime_error& e) {
        EXPECT_NE(std::string(e.what()).find("service-filter"), std::string::npos) << e.what();
    }

    // Keys that cannot be UUIDs at all (not ASCII) are passed over like any other.
    write(dir.path() / "Info.json", R"({"CFBundleExecutable": "Vantish.so",
        "CFPlugInFactories": {"\u00e9": "VantishPlugInFactory"},
        "CFPlugInTypes": {"\u00e9": ["D1148FE3-60F3-4B3B-8505-E28C1E66EBC8"],
                          "6B0340D3-5798-4064-AA17-9204C7B06FFD": ["\u00e9"]}})");
    EXPECT_THROW(host::Bundle(dir.str()), std::runtime_error);

    write(dir.path() / "Info.json", R"({"CFBundleExecutable": "missing.so",
        "CFPlugInFactories": {"D1148FE3-60F3-4B3B-8505-E28C1E66EBC8": "VantishPlugInFactory"},
        "CFPlugInTypes": {"6B0340D3-5798-4064-AA17-9204C7B06FFD": ["d1148fe3-60f3-4b3b-8505-e28c1e66ebc8"]}})");
    EXPECT_THROW(host::Bundle(dir.str()), std::runtime_error);
}

} // namespace
