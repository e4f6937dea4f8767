#include "CFOwned.h"

#include <IOKit/hid/IOHIDEvent.h>

#include <gtest/gtest.h>

#include <cstring>
#include <limits>

using vt::own;

namespace {

vt::Owned<IOHIDEventRef> alsEvent() { return own(IOHIDEventCreate(nullptr, kIOHIDEventTypeAmbientLightSensor, 42, 0)); }

vt::Owned<IOHIDEventRef> vendorEvent(const uint8_t* bytes, CFIndex length)
{
    return own(IOHIDEventCreateVendorDefinedEvent(nullptr, 42, 0xFF00, 0x4, 1, bytes, length, 0));
}

} // namespace

TEST(HIDEvent, FieldsHoldOneNumberEach)
{
    auto event = alsEvent();
    EXPECT_EQ(IOHIDEventGetType(event.get()), uint32_t(kIOHIDEventTypeAmbientLightSensor));
    EXPECT_EQ(IOHIDEventGetTimeStamp(event.get()), 42u);
    EXPECT_EQ(IOHIDEventGetDoubleValue(event.get(), kIOHIDEventFieldAmbientLightColorComponent0), 0.0);

    IOHIDEventSetDoubleValue(event.get(), kIOHIDEventFieldAmbientLightSensorIlluminance, 123.456789);
    EXPECT_EQ(IOHIDEventGetDoubleValue(event.get(), kIOHIDEventFieldAmbientLightSensorIlluminance), 123.456789);
    EXPECT_EQ(IOHIDEventGetIntegerValue(event.get(), kIOHIDEventFieldAmbientLightSensorIlluminance), 123);
    IOHIDEventSetFloatValue(event.get(), kIOHIDEventFieldAmbientLightSensorLevel, -2.9);
    EXPECT_EQ(IOHIDEventGetIntegerValue(event.get(), kIOHIDEventFieldAmbientLightSensorLevel), -2);
    IOHIDEventSetFloatValue(event.get(), kIOHIDEventFieldAmbientLightSensorLevel, 1e300);
    EXPECT_EQ(IOHIDEventGetIntegerValue(event.get(), kIOHIDEventFieldAmbientLightSensorLevel),
              std::numeric_limits<CFIndex>::max());

    IOHIDEventSetIntegerValue(event.get(), kIOHIDEventFieldAmbientLightColorSpace, 1);
    EXPECT_EQ(IOHIDEventGetFloatValue(event.get(), kIOHIDEventFieldAmbientLightColorSpace), 1.0);
    EXPECT_EQ(vt::describe(event.get()), "<IOHIDEvent type=12 timeStamp=42 fields=3 data=0 bytes children=0>");
}

TEST(HIDEvent, VendorDataIsCopiedAndWritableInPlace)
{
    uint8_t record[137];
    for (size_t i = 0; i < sizeof record; ++i)
        record[i] = uint8_t(i);
    auto event = vendorEvent(record, sizeof record);
    record[0] = 0xFF; // the event holds its own copy

    EXPECT_EQ(IOHIDEventGetIntegerValue(event.get(), kIOHIDEventFieldVendorDefinedDataLength), 137);
    EXPECT_EQ(IOHIDEventGetIntegerValue(event.get(), kIOHIDEventFieldVendorDefinedUsagePage), 0xFF00);
    uint8_t* bytes = IOHIDEventGetDataValue(event.get(), kIOHIDEventFieldVendorDefinedData);
    ASSERT_NE(bytes, nullptr);
    EXPECT_EQ(bytes[0], 0);
    EXPECT_EQ(bytes[136], 136);

    bytes[5] = 0xAA;
    EXPECT_EQ(IOHIDEventGetDataValue(event.get(), kIOHIDEventFieldVendorDefinedData)[5], 0xAA);

    // The length cannot be made to claim more than the event holds.
    IOHIDEventSetIntegerValue(event.get(), kIOHIDEventFieldVendorDefinedDataLength, 1000);
    EXPECT_EQ(IOHIDEventGetIntegerValue(event.get(), kIOHIDEventFieldVendorDefinedDataLength), 137);

    EXPECT_EQ(IOHIDEventGetDataValue(event.get(), kIOHIDEventFieldVendorDefinedUsage), nullptr);
    EXPECT_EQ(IOHIDEventGetDataValue(alsEvent().get(), kIOHIDEventFieldVendorDefinedData), nullptr);
    EXPECT_EQ(IOHIDEventGetDataValue(vendorEvent(nullptr, 0).get(), kIOHIDEventFieldVendorDefinedData), nullptr);
    EXPECT_EQ(IOHIDEventCreateVendorDefinedEvent(nullptr, 0, 0, 0, 0, nullptr, 4, 0), nullptr);
}

TEST(HIDEvent, ChildrenAreRetainedAndBorrowed)
{
    auto parent = alsEvent();
    EXPECT_EQ(IOHIDEventGetChildren(parent.get()), nullptr);

    uint8_t byte = 7;
    auto child = vendorEvent(&byte, 1);
    IOHIDEventAppendEvent(parent.get(), child.get(), 0);
    EXPECT_EQ(CFGetRetainCount(child.get()), 2);
    CFArrayRef children = IOHIDEventGetChildren(parent.get());
    ASSERT_NE(children, nullptr);
    ASSERT_EQ(CFArrayGetCount(children), 1);
    EXPECT_EQ(CFArrayGetValueAtIndex(children, 0), child.get());
    EXPECT_EQ(CFGetRetainCount(children), 1);

    parent.reset();
    EXPECT_EQ(CFGetRetainCount(child.get()), 1);
}

TEST(HIDEvent, CopyIsDeep)
{
    uint8_t record[] = {1, 2, 3, 4};
    auto original = alsEvent();
    IOHIDEventSetDoubleValue(original.get(), kIOHIDEventFieldAmbientLightColorComponent1, 100.0);
    auto child = vendorEvent(record, 4);
    IOHIDEventAppendEvent(original.get(), child.get(), 0);

    auto copy = own(IOHIDEventCreateCopy(nullptr, original.get()));
    EXPECT_EQ(IOHIDEventGetTimeStamp(copy.get()), 42u);
    EXPECT_EQ(IOHIDEventGetDoubleValue(copy.get(), kIOHIDEventFieldAmbientLightColorComponent1), 100.0);
    auto copiedChild =
        static_cast<IOHIDEventRef>(const_cast<void*>(CFArrayGetValueAtIndex(IOHIDEventGetChildren(copy.get()), 0)));
    ASSERT_NE(copiedChild, child.get());

    IOHIDEventGetDataValue(copiedChild, kIOHIDEventFieldVendorDefinedData)[0] = 9;
    IOHIDEventSetDoubleValue(copy.get(), kIOHIDEventFieldAmbientLightColorComponent1, 5.0);
    EXPECT_EQ(IOHIDEventGetDataValue(child.get(), kIOHIDEventFieldVendorDefinedData)[0], 1);
    EXPECT_EQ(IOHIDEventGetDoubleValue(original.get(), kIOHIDEventFieldAmbientLightColorComponent1), 100.0);
    EXPECT_EQ(IOHIDEventGetIntegerValue(copiedChild, kIOHIDEventFieldVendorDefinedDataLength), 4);
}

TEST(HIDEventDeathTest, AnEventCannotContainItself)
{
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    auto parent = alsEvent();
    auto child = alsEvent();
    IOHIDEventAppendEvent(parent.get(), child.get(), 0);
    EXPECT_DEATH(IOHIDEventAppendEvent(child.get(), parent.get(), 0), "contains the parent");
    EXPECT_DEATH(IOHIDEventAppendEvent(parent.get(), parent.get(), 0), "contains the parent");
}
