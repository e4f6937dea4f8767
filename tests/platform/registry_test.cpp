#include "CFOwned.h"

#include <IOKit/IOKitLib.h>
#include <IOKit/hid/IOHIDService.h>
#include <VantishPlatform/HIDHost.h>

#include <gtest/gtest.h>

#include <atomic>
#include <thread>
#include <vector>

using vt::own;

namespace {

class Registry : public ::testing::Test {
protected:
    void TearDown() override { VPRegistryReset(); }

    // root (A=root, B=root) <- mid (B=mid, C=mid) <- leaf (C=leaf)
    void buildTree()
    {
        root = VPRegistryCreateEntry(100, 0);
        mid = VPRegistryCreateEntry(101, root);
        leaf = VPRegistryCreateEntry(102, mid);
        VPRegistrySetProperty(root, CFSTR("A"), CFSTR("root"));
        VPRegistrySetProperty(root, CFSTR("B"), CFSTR("root"));
        VPRegistrySetProperty(mid, CFSTR("B"), CFSTR("mid"));
        VPRegistrySetProperty(mid, CFSTR("C"), CFSTR("mid"));
        VPRegistrySetProperty(leaf, CFSTR("C"), CFSTR("leaf"));
    }

    std::string search(io_registry_entry_t entry, const char* key, IOOptionBits options)
    {
        CFTypeRef value = IORegistryEntrySearchCFProperty(entry, kIOServicePlane, __CFStringMakeConstantString(key),
                                                          kCFAllocatorDefault, options);
        std::string text = vt::describe(value);
        if (value)
            CFRelease(value);
        return text;
    }

    io_registry_entry_t root = 0, mid = 0, leaf = 0;
};

constexpr IOOptionBits kTowardsParents = kIORegistryIterateRecursively | kIORegistryIterateParents;

} // namespace

TEST_F(Registry, SearchPrefersTheEntryThenTheNearestAncestor)
{
    buildTree();
    EXPECT_EQ(search(leaf, "C", kTowardsParents), "leaf");
    EXPECT_EQ(search(leaf, "B", kTowardsParents), "mid");
    EXPECT_EQ(search(leaf, "A", kTowardsParents), "root");
    EXPECT_EQ(search(leaf, "D", kTowardsParents), "(null)");
    EXPECT_EQ(search(leaf, "B", 0), "(null)");
    EXPECT_EQ(search(leaf, "B", kIORegistryIterateRecursively), "(null)");
    EXPECT_EQ(IORegistryEntrySearchCFProperty(leaf, "IODeviceTree", CFSTR("C"), nullptr, kTowardsParents), nullptr);
    EXPECT_EQ(IORegistryEntryCreateCFProperty(leaf, CFSTR("A"), nullptr, 0), nullptr);

    // The result is the caller's own reference.
    auto data = own(CFDataCreate(nullptr, reinterpret_cast<const UInt8*>("\x01\x00\x00\x00"), 4));
    VPRegistrySetProperty(root, CFSTR("IOHIDOrientationType"), data.get());
    CFTypeRef found =
        IORegistryEntrySearchCFProperty(leaf, kIOServicePlane, CFSTR("IOHIDOrientationType"), nullptr, kTowardsParents);
    EXPECT_EQ(found, data.get());
    EXPECT_EQ(CFGetRetainCount(data.get()), 3);
    CFRelease(found);

    VPRegistrySetProperty(leaf, CFSTR("C"), nullptr);
    EXPECT_EQ(search(leaf, "C", kTowardsParents), "mid");
}

TEST_F(Registry, MatchingTakesReferencesThatReleaseGivesBack)
{
    buildTree();
    CFMutableDictionaryRef matching = IORegistryEntryIDMatching(101);
    int64_t id = 0;
    auto number = static_cast<CFNumberRef>(CFDictionaryGetValue(matching, CFSTR("IORegistryEntryID")));
    ASSERT_TRUE(CFNumberGetValue(number, kCFNumberSInt64Type, &id));
    EXPECT_EQ(id, 101);

    CFRetain(matching);
    io_service_t service = IOServiceGetMatchingService(kIOMainPortDefault, matching);
    EXPECT_EQ(CFGetRetainCount(matching), 1); // the call consumed one reference
    CFRelease(matching);

    ASSERT_EQ(service, mid);
    uint64_t entryID = 0;
    EXPECT_EQ(IORegistryEntryGetRegistryEntryID(service, &entryID), KERN_SUCCESS);
    EXPECT_EQ(entryID, 101u);
    EXPECT_EQ(VPRegistryOutstandingReferences(mid), 1);
    EXPECT_EQ(IOObjectRetain(mid), KERN_SUCCESS);
    EXPECT_EQ(VPRegistryOutstandingReferences(mid), 2);
    EXPECT_EQ(IOObjectRelease(mid), KERN_SUCCESS);
    EXPECT_EQ(IOObjectRelease(mid), KERN_SUCCESS);
    EXPECT_EQ(IOObjectRelease(mid), KERN_INVALID_ARGUMENT);
    EXPECT_EQ(VPRegistryOutstandingReferences(mid), 0);

    EXPECT_EQ(IOServiceGetMatchingService(kIOMainPortDefault, IORegistryEntryIDMatching(999)), IO_OBJECT_NULL);
    EXPECT_EQ(IOObjectRelease(0xDEAD), KERN_INVALID_ARGUMENT);
}

TEST_F(Registry, ResetForgetsEntriesAndNeverReusesHandles)
{
    buildTree();
    EXPECT_EQ(VPRegistryCreateEntry(100, 0), IO_OBJECT_NULL); // the ID is taken
    EXPECT_EQ(VPRegistryCreateEntry(200, 0xDEAD), IO_OBJECT_NULL);
    VPRegistryReset();
    EXPECT_EQ(search(leaf, "C", kTowardsParents), "(null)");
    io_registry_entry_t again = VPRegistryCreateEntry(102, 0);
    EXPECT_NE(again, IO_OBJECT_NULL);
    EXPECT_NE(again, leaf);
}

TEST(HIDService, UsagesPublishedPropertiesAndRegistryID)
{
    auto service = own(VPServiceCreate(0x1234));
    VPServiceAddUsage(service.get(), 0xFF00, 0x0004);
    EXPECT_TRUE(IOHIDServiceConformsTo(service.get(), 0xFF00, 0x0004));
    EXPECT_FALSE(IOHIDServiceConformsTo(service.get(), 0xFF00, 0x0005));

    int64_t id = 0;
    auto registryID = static_cast<CFNumberRef>(IOHIDServiceGetRegistryID(service.get()));
    ASSERT_TRUE(CFNumberGetValue(registryID, kCFNumberSInt64Type, &id));
    EXPECT_EQ(id, 0x1234);
    EXPECT_EQ(IOHIDServiceGetRegistryID(own(VPServiceCreate(0)).get()), nullptr);

    auto sensorType = vt::number(3);
    VPServicePublishProperty(service.get(), CFSTR("ALSSensorType"), sensorType.get());
    EXPECT_EQ(IOHIDServiceGetProperty(service.get(), CFSTR("ALSSensorType")), sensorType.get());
    CFTypeRef copy = IOHIDServiceCopyProperty(service.get(), vt::string("ALSSensorType").get());
    EXPECT_EQ(CFGetRetainCount(sensorType.get()), 3);
    CFRelease(copy);
    VPServicePublishProperty(service.get(), CFSTR("ALSSensorType"), nullptr);
    EXPECT_EQ(IOHIDServiceCopyProperty(service.get(), CFSTR("ALSSensorType")), nullptr);

    EXPECT_EQ(vt::describe(service.get()), "<IOHIDService registryID=4660 usages=(0xff00:0x4)>");
}

TEST(HIDService, DriverRefusesOrRecordsAndObservesSetProperties)
{
    auto service = own(VPServiceCreate(7));
    std::vector<std::string> observed;
    VPServiceSetReceiveObserver(service.get(), [&](CFStringRef key, CFTypeRef value) {
        observed.push_back(vt::describe(key) + "=" + vt::describe(value));
    });

    VPServiceRefuseProperty(service.get(), CFSTR("ALSCalibrationData"), true);
    UInt8 record[] = {0xAB};
    auto data = own(CFDataCreate(nullptr, record, 1));
    EXPECT_FALSE(IOHIDServiceSetProperty(service.get(), CFSTR("ALSCalibrationData"), data.get()));
    EXPECT_EQ(VPServiceReceivedCount(service.get(), CFSTR("ALSCalibrationData")), 0u);
    EXPECT_EQ(VPServiceCopyReceivedProperty(service.get(), CFSTR("ALSCalibrationData")), nullptr);

    VPServiceRefuseProperty(service.get(), CFSTR("ALSCalibrationData"), false);
    EXPECT_TRUE(IOHIDServiceSetProperty(service.get(), CFSTR("ALSCalibrationData"), data.get()));
    EXPECT_TRUE(IOHIDServiceSetProperty(service.get(), CFSTR("crgb"), vt::number(0).get()));
    EXPECT_TRUE(IOHIDServiceSetProperty(service.get(), CFSTR("crgb"), vt::number(1).get()));
    EXPECT_EQ(VPServiceReceivedCount(service.get(), CFSTR("crgb")), 2u);
    auto last = own(VPServiceCopyReceivedProperty(service.get(), CFSTR("crgb")));
    EXPECT_TRUE(CFEqual(last.get(), vt::number(1).get()));
    EXPECT_EQ(observed, (std::vector<std::string>{"ALSCalibrationData=<ab>", "crgb=0", "crgb=1"}));
    // What the plug-in sets is not what the driver publishes.
    EXPECT_EQ(IOHIDServiceGetProperty(service.get(), CFSTR("crgb")), nullptr);
}

TEST(HIDService, SettersOnWorkerThreadsWhileTheHostReads)
{
    auto service = own(VPServiceCreate(7));
    std::atomic<int> observed{0};
    VPServiceSetReceiveObserver(service.get(), [&](CFStringRef, CFTypeRef) { ++observed; });
    std::vector<std::thread> setters;
    for (int t = 0; t < 3; ++t)
        setters.emplace_back([&, t] {
            for (int i = 0; i < 2000; ++i)
                IOHIDServiceSetProperty(service.get(), CFSTR("crgb"), vt::number(t * 10000 + i).get());
        });
    for (int i = 0; i < 2000; ++i)
        if (CFTypeRef value = VPServiceCopyReceivedProperty(service.get(), CFSTR("crgb")))
            CFRelease(value);
    for (auto& thread : setters)
        thread.join();
    EXPECT_EQ(VPServiceReceivedCount(service.get(), CFSTR("crgb")), 6000u);
    EXPECT_EQ(observed.load(), 6000);
}
