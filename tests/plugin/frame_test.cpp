// The plug-in object as the host sees it: factory, interface queries,
// reference counting, and the log handles.
#include "common/TestSupport.h"
#include "plugin/TestAccess.h"
#include "support/Log.h"

#include <VantishPlatform/DeviceState.h>
#include <VantishPlatform/DispatchControl.h>
#include <VantishPlatform/LogControl.h>

#include <gtest/gtest.h>

#include <thread>

namespace {

CFUUIDRef factoryUUID()
{
    return CFUUIDGetConstantUUIDWithBytes(kCFAllocatorSystemDefault, 0xD1, 0x14, 0x8F, 0xE3, 0x60, 0xF3, 0x4B, 0x3B,
                                          0x85, 0x05, 0xE2, 0x8C, 0x1E, 0x66, 0xEB, 0xC8);
}

// The table as the host reaches it: through the instance pointer.
IOHIDServiceFilterPlugInInterface* table(VantishPlugIn* plugin)
{
    return *reinterpret_cast<IOHIDServiceFilterPlugInInterface**>(plugin);
}

VantishPlugIn* create()
{
    return static_cast<VantishPlugIn*>(VantishPlugInFactory(kCFAllocatorDefault, kIOHIDServiceFilterPlugInTypeID));
}

TEST(Factory, AcceptsOnlyTheServiceFilterType)
{
    EXPECT_EQ(VantishPlugInFactory(kCFAllocatorDefault, IUnknownUUID), nullptr);
    EXPECT_EQ(VantishPlugInFactory(kCFAllocatorDefault, kIOHIDServiceFilterPlugInInterfaceID), nullptr);

    const long before = VPPlugInInstanceCount(factoryUUID());
    VantishPlugIn* plugin = create();
    ASSERT_NE(plugin, nullptr);
    EXPECT_EQ(VPPlugInInstanceCount(factoryUUID()), before + 1);
    // The instance pointer is its interface pointer: the table comes first.
    EXPECT_EQ(*reinterpret_cast<IOHIDServiceFilterPlugInInterface**>(plugin), &VantishPlugIn::sVantishPlugInFtbl);
    EXPECT_EQ(plugin->Release(), 0u);
    EXPECT_EQ(VPPlugInInstanceCount(factoryUUID()), before);
}

TEST(Factory, TableHasTheEightEntriesAndNothingElse)
{
    const auto& t = VantishPlugIn::sVantishPlugInFtbl;
    EXPECT_EQ(t._reserved, nullptr);
    EXPECT_NE(t.QueryInterface, nullptr);
    EXPECT_NE(t.AddRef, nullptr);
    EXPECT_NE(t.Release, nullptr);
    EXPECT_NE(t.match, nullptr);
    EXPECT_NE(t.filter, nullptr);
    EXPECT_NE(t.filterCopyEvent, nullptr);
    EXPECT_NE(t.open, nullptr);
    EXPECT_NE(t.setPropertyForClient, nullptr);
    for (void* unused : {t.hostOperation8, t.hostOperation9, t.hostOperation10, t.hostOperation11, t.hostOperation13,
                         t.hostOperation14})
        EXPECT_EQ(unused, nullptr);
}

TEST(QueryInterface, AcceptsTheThreeInterfacesAndCountsThem)
{
    VantishPlugIn* plugin = create();
    for (CFUUIDRef iid : {kIOHIDServiceFilterPlugInInterfaceID, kIOHIDServiceFilterPlugInInterfaceID2, IUnknownUUID}) {
        void* out = nullptr;
        const ULONG before = parts(*plugin).refCount();
        EXPECT_EQ(table(plugin)->QueryInterface(plugin, CFUUIDGetUUIDBytes(iid), &out), S_OK);
        EXPECT_EQ(out, plugin);
        EXPECT_EQ(parts(*plugin).refCount(), before + 1);
    }
    EXPECT_EQ(parts(*plugin).refCount(), 4u);
    for (int i = 0; i < 3; ++i)
        plugin->Release();

    void* out = plugin;
    EXPECT_EQ(plugin->QueryInterface(CFUUIDGetUUIDBytes(kIOHIDServiceFilterPlugInTypeID), &out), E_NOINTERFACE);
    EXPECT_EQ(out, nullptr);
    EXPECT_EQ(parts(*plugin).refCount(), 1u);
    EXPECT_EQ(plugin->Release(), 0u);
}

TEST(ReferenceCount, SecondReleaseFreesInstanceAndDatabase)
{
    VantishPlugIn* plugin = create();
    auto db = std::make_shared<SpectralDatabase>();
    db->allocate(10, 4);
    std::weak_ptr<const SpectralDatabase> watch = db;
    parts(*plugin).databases().publish(db, true);
    db.reset();

    EXPECT_EQ(table(plugin)->AddRef(plugin), 2u);
    EXPECT_EQ(table(plugin)->Release(plugin), 1u);
    EXPECT_FALSE(watch.expired());
    EXPECT_EQ(table(plugin)->Release(plugin), 0u);
    EXPECT_TRUE(watch.expired());
}

TEST(ReferenceCount, QueuedWorkKeepsTheInstanceAlive)
{
    VPDispatchSetDelayMode(VPDelayMode::Manual);
    VantishPlugIn* plugin = create();
    std::atomic<uint32_t> seen{0};
    parts(*plugin).calibration().host().dispatchAfterRetained(
        dispatch_time(DISPATCH_TIME_NOW, 5 * int64_t(NSEC_PER_SEC)),
        dispatch_get_global_queue(DISPATCH_QUEUE_PRIORITY_HIGH, 0),
        [plugin, &seen] { seen = parts(*plugin).unit().orientation.load(); });
    parts(*plugin).unit().orientation = 7;
    EXPECT_EQ(plugin->Release(), 1u); // the host lets go; the queued work still holds it
    EXPECT_EQ(VPDispatchFireDelayed(), 1u);
    VPDispatchDrain();
    VPDispatchSetDelayMode(VPDelayMode::Real);
    EXPECT_EQ(seen, 7u); // ran on a live instance, which it then released
}

TEST(ReferenceCount, ConcurrentAddRefReleaseIsExact)
{
    VantishPlugIn* plugin = create();
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back([plugin] {
            for (int i = 0; i < 10000; ++i) {
                plugin->AddRef();
                plugin->Release();
            }
        });
    for (auto& t : threads)
        t.join();
    EXPECT_EQ(parts(*plugin).refCount(), 1u);
    plugin->Release();
}

TEST(LogHandles, EveryConstructionSetsThePluginLog)
{
    VantishPlugIn* first = create();
    pluginLog = nullptr;
    VantishPlugIn* second = create();
    ASSERT_NE(pluginLog.load(), nullptr);
    EXPECT_EQ(vantishLog(), pluginLog.load());
    first->Release();
    second->Release();
    EXPECT_NE(pluginLog.load(), nullptr); // never released with an instance
}

TEST(LogHandles, FallsBackToTheFrameworkLogThenToTheDefault)
{
    vt::LogCapture capture;
    const os_log_t savedPlugin = pluginLog;
    const os_log_t savedDefault = _BRENZEL_LOG_DEFAULT;
    pluginLog = nullptr;
    _BRENZEL_LOG_DEFAULT = nullptr;

    VPLogSetCreateFails(true);
    EXPECT_EQ(vantishLog(), OS_LOG_DEFAULT);
    EXPECT_TRUE(capture.contains(OS_LOG_TYPE_ERROR, "Failed to create Brenzel default log"));
    VPLogSetCreateFails(false);

    _BRENZEL_LOG_DEFAULT = nullptr;
    os_log_t created = vantishLog();
    EXPECT_NE(created, OS_LOG_DEFAULT);
    EXPECT_EQ(_BRENZEL_LOG_DEFAULT.load(), created);

    pluginLog = savedPlugin;
    _BRENZEL_LOG_DEFAULT = savedDefault;
}

TEST(Construction, TimebaseGivesSecondsPerTick)
{
    VPSetTimebase(125, 3);
    VantishPlugIn* plugin = create();
    EXPECT_DOUBLE_EQ(parts(*plugin).machTimeToSeconds(), 125.0 / 3.0 * 1e-9);
    plugin->Release();
    VPSetTimebase(1, 1);
}

} // namespace
