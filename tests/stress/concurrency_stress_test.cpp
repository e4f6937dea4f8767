// The plug-in under load from every side at once: host threads filter and
// copy events at full speed and set client properties, rebuilds included,
// while bring-up, store retries and queued cache writes run on the queues and
// instances are released with their work still queued. Every colour an event
// comes back with must be that of one whole database (or the override), and
// every instance must be gone once the queues are empty. Run it under
// ThreadSanitizer and AddressSanitizer: scripts/sanitize.sh runs the full size.
//
// VANTISH_STRESS_SCALE sizes the run: 1 is the full run (about 100 000
// filtered events, 72 rebuilds, 48 instance lifetimes); the default, 0.04,
// keeps the ordinary test run to about a second.
#include "common/TestSupport.h"
#include "stress/Host.h"

#include <VantishPlatform/DeviceState.h>
#include <VantishPlatform/DispatchControl.h>
#include <VantishPlatform/HIDHost.h>
#include <VantishPlatform/Paths.h>

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <thread>

namespace {

constexpr double kDefaultScale = 0.04;

double scaleFromEnvironment()
{
    const char* text = std::getenv("VANTISH_STRESS_SCALE");
    const double scale = text ? std::strtod(text, nullptr) : kDefaultScale;
    return scale > 0.0 ? scale : kDefaultScale;
}

CFDataRef orientationData(uint32_t orientation)
{
    const uint8_t bytes[4] = {uint8_t(orientation), uint8_t(orientation >> 8), uint8_t(orientation >> 16),
                              uint8_t(orientation >> 24)};
    return CFDataCreate(nullptr, bytes, 4);
}

// Each sensor's registry entry: its orientation and its calibration blob.
void publishSensor(unsigned index)
{
    const io_registry_entry_t entry = VPRegistryCreateEntry(stress::Host::registryID(index), 0);
    CFDataRef orientation = orientationData(index + 1);
    CFDataRef blob = unit::calibrationBlob(uint8_t(index + 1)).createData();
    VPRegistrySetProperty(entry, CFSTR("IOHIDOrientationType"), orientation);
    VPRegistrySetProperty(entry, CFSTR("alsCalibration"), blob);
    CFRelease(orientation);
    CFRelease(blob);
}

// Lets held store retries run, as their five seconds would pass, until stopped.
class RetryClock {
public:
    RetryClock()
        : thread_([this] {
              while (!stop_) {
                  VPDispatchFireDelayed();
                  std::this_thread::sleep_for(std::chrono::milliseconds(1));
              }
          })
    {
    }
    ~RetryClock()
    {
        stop_ = true;
        thread_.join();
    }

private:
    std::atomic<bool> stop_{false};
    std::thread thread_;
};

// Runs held and queued work until none is left: a retry may schedule another.
void settleQueues()
{
    do {
        VPDispatchFireDelayed();
        VPDispatchDrain();
    } while (VPDispatchPendingDelayed() > 0);
}

size_t linesStartingWith(vt::LogCapture& log, const std::string& start)
{
    size_t n = 0;
    for (const auto& line : log.lines())
        n += line.message.rfind(start, 0) == 0;
    return n;
}

CFUUIDRef vantishFactory()
{
    return CFUUIDGetConstantUUIDWithBytes(nullptr, 0xD1, 0x14, 0x8F, 0xE3, 0x60, 0xF3, 0x4B, 0x3B, 0x85, 0x05, 0xE2,
                                          0x8C, 0x1E, 0x66, 0xEB, 0xC8);
}

class ConcurrencyStress : public ::testing::Test {
protected:
    void SetUp() override
    {
        unit::preferMemoryTemporaryFolder();
        system_ = std::make_unique<vt::TempDir>();
        state_ = std::make_unique<vt::TempDir>();
        storeFolder_ = std::make_unique<vt::TempDir>();
        VPSetPathRoot("/System/Library/HIDPlugins", system_->str());
        VPSetPathRoot("/var/mobile", state_->str());
        unit::writeReferences(system_->path() / "Vantish.plugin");
        unit::writeFile(storeFolder_->path() / "XwCM", unit::xwclRecord());
        VPRegistryReset();
        VPTessarySetAnswer(CFSTR("ProductName"), CFSTR("Dravik OS"));
        VPDispatchSetDelayMode(VPDelayMode::Manual);
    }

    void TearDown() override
    {
        settleQueues();
        VPDispatchSetDelayMode(VPDelayMode::Real);
        VPQVTSetStoreDirectory("");
        VPTessaryReset();
        VPRegistryReset();
        VPClearPathRoots();
    }

    std::unique_ptr<vt::TempDir> system_, state_, storeFolder_;
};

} // namespace

TEST_F(ConcurrencyStress, EveryColourComesFromOneWholeDatabase)
{
    const double scale = scaleFromEnvironment();
    const stress::Plan plan = stress::Plan::scaled(scale);
    stress::StoreSwitch store(storeFolder_->str());
    std::vector<std::unique_ptr<stress::Host>> hosts;
    for (unsigned h = 0; h < plan.hosts; ++h) {
        publishSensor(h);
        hosts.push_back(std::make_unique<stress::Host>(h, plan, store));
    }

    vt::LogCapture log(VPLogLevel::Info);
    const auto start = std::chrono::steady_clock::now();
    {
        RetryClock clock;
        std::vector<std::thread> threads;
        for (auto& host : hosts)
            threads.emplace_back([&host] { host->run(); });
        for (auto& thread : threads)
            thread.join();
    }
    settleQueues();
    const double seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();

    stress::Tally all;
    for (const auto& host : hosts)
        all.add(host->tally());
    for (const auto& fault : all.faults)
        ADD_FAILURE() << fault;
    EXPECT_EQ(all.faultCount, 0u);
    EXPECT_EQ(VPPlugInInstanceCount(vantishFactory()), 0) << "an instance outlived its queued work, or leaked";

    EXPECT_EQ(all.events, plan.events());
    EXPECT_EQ(all.rebuilds, plan.rebuilds());
    EXPECT_EQ(all.lifetimes, plan.lifetimes());
    EXPECT_GT(all.releasedWithWorkQueued, 0u) << "no instance was released with its work still queued";
    EXPECT_GT(all.fromDefault, 0u) << "no colour from the registry calibration's database";
    EXPECT_GT(all.fromSecond, 0u) << "no colour from the factory calibration's database";
    EXPECT_EQ(linesStartingWith(log, "Failed to create small DB"), 0u) << "cache writes got in each other's way";
    if (scale >= 1.0) {
        EXPECT_GE(all.events, 100000u);
        EXPECT_GE(all.rebuilds, 50u);
        EXPECT_GE(all.lifetimes, 20u);
    }

    const size_t retries = linesStartingWith(log, "Retrieving QVT calibration data failed");
    const size_t cacheWrites = log.count("Small DB has been created\n");
    const size_t skippedWrites = log.count("A newer database has been published; this one's cache is not written.\n");
    const size_t failedRebuilds = log.count("Failed to rebuild databases.");
    std::printf("stress (scale %g): %u filtered events and %u copies (colours: %u bzlight, %u bzlight-02, "
                "%u overridden, %u none; largest deviation %.2g), %u rebuilds (%zu failed for an empty store), "
                "%u lifetimes (%u released with work queued), %zu store retries, %zu cache writes, "
                "%zu queued writes skipped for a newer database, %.1f s\n",
                scale, all.events, all.copies, all.fromDefault, all.fromSecond, all.overridden, all.withoutColour,
                all.largestDeviation, all.rebuilds, failedRebuilds, all.lifetimes, all.releasedWithWorkQueued, retries,
                cacheWrites, skippedWrites, seconds);
    RecordProperty("events", int(all.events));
    RecordProperty("rebuilds", int(all.rebuilds));
    RecordProperty("lifetimes", int(all.lifetimes));
    RecordProperty("seconds", std::to_string(seconds));
}
