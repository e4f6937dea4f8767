// A factory store that fails or holds nothing usable, and a driver that
// refuses what the plug-in sets. At bring-up these end in the default
// calibration with colour off; on a rebuild the database in use stays. The
// cache written earlier is never touched.
#include "faults/FaultFixture.h"

#include <VantishPlatform/DeviceState.h>
#include <VantishPlatform/DispatchControl.h>
#include <VantishPlatform/HIDHost.h>

using faults::Source;
using unit::kSecondReference;

namespace {

constexpr int kDefaultRecordSource = 3; // calibration source of the built-in default record
constexpr long kStoreError = 5;

class StoreAndServiceFaults : public faults::FaultTest {
protected:
    // A first lifetime leaves a good cache behind.
    void SetUp() override
    {
        FaultTest::SetUp();
        open(Source::Factory);
        releasePlugIn();
        cache_ = cacheBytes();
        ASSERT_FALSE(cache_.empty());
    }

    void expectDefaultCalibration()
    {
        EXPECT_EQ(logged("Switching off color adaptation support.\n"), 1u);
        EXPECT_EQ(crgb(), 0);
        EXPECT_EQ(receivedRecordSource(), kDefaultRecordSource);
        EXPECT_FALSE(colour());
        EXPECT_TRUE(cacheBytes() == cache_) << "the cache file changed";
    }

    std::vector<uint8_t> cache_;
};

} // namespace

TEST_F(StoreAndServiceFaults, StoreErrors)
{
    VPQVTSetFailure("XwCA", kStoreError);
    VPQVTSetFailure("XwCl", kStoreError);
    open(Source::Factory);
    EXPECT_EQ(loggedStartingWith("QVTDataCopy for key XwCA failed with error"), 1u);
    EXPECT_EQ(loggedStartingWith("QVTDataCopy for key XwCl failed with error"), 1u);
    EXPECT_EQ(logged("Failed to load QVT calibration.\n"), 1u);
    expectDefaultCalibration();
}

TEST_F(StoreAndServiceFaults, EmptyRecord)
{
    unit::writeFile(storeRecord(), {});
    open(Source::Factory);
    EXPECT_EQ(logged("Failed to parse ALS calibration data."), 1u);
    expectDefaultCalibration();
}

// On Dravik OS an empty store is read again every five seconds, twenty times,
// each failure logged once, and then left alone.
TEST_F(StoreAndServiceFaults, EmptyStoreOnDravikOS)
{
    VPTessarySetAnswer(CFSTR("ProductName"), CFSTR("Dravik OS"));
    VPDispatchSetDelayMode(VPDelayMode::Manual);
    vt::TempDir empty;
    VPQVTSetStoreDirectory(empty.str());
    open(Source::Factory);
    while (VPDispatchFireDelayed() > 0)
        VPDispatchDrain();
    for (int attempt = 1; attempt <= 20; ++attempt)
        EXPECT_EQ(logged("Retrieving QVT calibration data failed in attempt number " + std::to_string(attempt) +
                         "/20. Try again in 5 sec.\n"),
                  1u);
    EXPECT_EQ(loggedStartingWith("Retrieving QVT calibration data failed"), 20u);
    expectDefaultCalibration();
}

TEST_F(StoreAndServiceFaults, StoreErrorOnARebuild)
{
    open(Source::Factory);
    const auto database = plugin_->parts().databases().snapshot().db;
    VPQVTSetFailure("XwCA", kStoreError);
    VPQVTSetFailure("XwCl", kStoreError);
    rebuild(Source::Factory);
    EXPECT_EQ(logged("Failed to rebuild databases."), 1u);
    EXPECT_EQ(plugin_->parts().databases().snapshot().db, database);
    EXPECT_TRUE(colourFrom(kSecondReference));
    EXPECT_TRUE(cacheBytes() == cache_) << "the cache file changed";
}

// The factory record is refused, then the default one: each refusal is
// logged; colour is off and no database is built.
TEST_F(StoreAndServiceFaults, DriverRefusesTheRecord)
{
    VPServiceRefuseProperty(service_, CFSTR("ALSCalibrationData"), true);
    VPServiceRefuseProperty(service_, CFSTR("crgb"), true);
    const size_t builds = logged("Parsed big DB\n");
    open(Source::Factory);
    EXPECT_EQ(logged("Failed to set ALS calibration data."), 2u);
    EXPECT_EQ(logged("Switching off color adaptation support.\n"), 1u);
    EXPECT_EQ(logged("Parsed big DB\n"), builds);
    EXPECT_FALSE(colour());
    EXPECT_TRUE(cacheBytes() == cache_) << "the cache file changed";
}

TEST_F(StoreAndServiceFaults, DriverRefusesTheRegistryRecord)
{
    VPServiceRefuseProperty(service_, CFSTR("ALSCalibrationData"), true);
    open(Source::Configuration);
    EXPECT_EQ(logged("Failed to set ALS calibration data."), 1u);
    EXPECT_EQ(plugin_->parts().databases().snapshot().db, nullptr);
    EXPECT_FALSE(colour());
    EXPECT_TRUE(cacheBytes() == cache_) << "the cache file changed";
}
