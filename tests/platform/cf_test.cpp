#include "CFOwned.h"

#include <CoreFoundation/CoreFoundation.h>
#include <VantishPlatform/DeviceState.h>

#include <gtest/gtest.h>

#include <cfloat>
#include <cmath>
#include <cstdint>
#include <limits>
#include <string>
#include <thread>
#include <utility>
#include <vector>

using vt::own;

namespace {

CFMutableDictionaryRef newDictionary()
{
    return CFDictionaryCreateMutable(nullptr, 0, &kCFTypeDictionaryKeyCallBacks, &kCFTypeDictionaryValueCallBacks);
}

CFUUIDRef factoryUUID()
{
    return CFUUIDGetConstantUUIDWithBytes(kCFAllocatorSystemDefault, 0xD1, 0x14, 0x8F, 0xE3, 0x60, 0xF3, 0x4B, 0x3B,
                                          0x85, 0x05, 0xE2, 0x8C, 0x1E, 0x66, 0xEB, 0xC8);
}

} // namespace

TEST(CFLifetime, CollectionsRetainTheirValuesAndReleaseThemWhenDestroyed)
{
    auto value = vt::string("held");
    EXPECT_EQ(CFGetRetainCount(value.get()), 1);

    const void* values[] = {value.get(), value.get()};
    CFArrayRef array = CFArrayCreate(nullptr, values, 2, &kCFTypeArrayCallBacks);
    CFMutableDictionaryRef dict = newDictionary();
    CFDictionarySetValue(dict, CFSTR("key"), value.get());
    EXPECT_EQ(CFGetRetainCount(value.get()), 4);

    CFDictionarySetValue(dict, CFSTR("key"), kCFBooleanTrue); // replacing gives the old value back
    EXPECT_EQ(CFGetRetainCount(value.get()), 3);
    CFRelease(array);
    CFRelease(dict);
    EXPECT_EQ(CFGetRetainCount(value.get()), 1);
}

TEST(CFLifetime, ConstantsAreInternedAndImmortal)
{
    std::string built = std::string("IORegistry") + "EntryID";
    CFStringRef constant = CFSTR("IORegistryEntryID");
    EXPECT_EQ(__CFStringMakeConstantString(built.c_str()), constant);

    CFIndex before = CFGetRetainCount(constant);
    CFRelease(constant);
    CFRelease(kCFBooleanTrue);
    EXPECT_EQ(CFGetRetainCount(constant), before);
    EXPECT_TRUE(CFBooleanGetValue(kCFBooleanTrue));
    EXPECT_EQ(CFGetTypeID(kCFBooleanFalse), CFBooleanGetTypeID());
}

TEST(CFLifetimeDeathTest, NullObjectsStopTheProcess)
{
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_DEATH(CFRelease(nullptr), "CFRelease: null object");
    EXPECT_DEATH(CFRetain(nullptr), "CFRetain: null object");
    EXPECT_DEATH(CFStringGetLength(reinterpret_cast<CFStringRef>(kCFBooleanTrue)), "wrong type");
}

TEST(CFLifetime, ConcurrentRetainReleaseAndInterning)
{
    auto shared = vt::string("shared");
    std::vector<CFStringRef> interned(4);
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back([&, t] {
            for (int i = 0; i < 20000; ++i) {
                CFRetain(shared.get());
                const void* values[] = {shared.get()};
                CFRelease(CFArrayCreate(nullptr, values, 1, &kCFTypeArrayCallBacks));
                CFRelease(shared.get());
            }
            std::string text = "interned-" + std::to_string(1000);
            interned[size_t(t)] = __CFStringMakeConstantString(text.c_str());
        });
    for (auto& thread : threads)
        thread.join();
    EXPECT_EQ(CFGetRetainCount(shared.get()), 1);
    for (CFStringRef s : interned)
        EXPECT_EQ(s, interned[0]);
}

TEST(CFEquality, ValueTypesCompareByValue)
{
    EXPECT_TRUE(CFEqual(vt::string("abc").get(), CFSTR("abc")));
    EXPECT_FALSE(CFEqual(vt::string("abc").get(), CFSTR("abd")));

    EXPECT_TRUE(CFEqual(vt::number(3).get(), vt::number(3.0).get()));
    EXPECT_FALSE(CFEqual(vt::number(3).get(), vt::number(3.5).get()));
    int64_t big = std::numeric_limits<int64_t>::max();
    auto bigInt = own(CFNumberCreate(nullptr, kCFNumberSInt64Type, &big));
    auto bigDouble = vt::number(9223372036854775807.0); // rounds to 2^63
    EXPECT_FALSE(CFEqual(bigInt.get(), bigDouble.get()));
    EXPECT_FALSE(CFEqual(vt::number(1).get(), kCFBooleanTrue));

    UInt8 bytes[] = {1, 2, 3};
    auto data = own(CFDataCreate(nullptr, bytes, 3));
    EXPECT_TRUE(CFEqual(data.get(), own(CFDataCreate(nullptr, bytes, 3)).get()));
    EXPECT_FALSE(CFEqual(data.get(), own(CFDataCreate(nullptr, bytes, 2)).get()));

    auto one = vt::number(1);
    const void* a[] = {one.get(), CFSTR("x")};
    auto two = vt::number(1.0);
    const void* b[] = {two.get(), CFSTR("x")};
    const void* reversed[] = {CFSTR("x"), one.get()};
    auto arrayA = own(CFArrayCreate(nullptr, a, 2, &kCFTypeArrayCallBacks));
    EXPECT_TRUE(CFEqual(arrayA.get(), own(CFArrayCreate(nullptr, b, 2, &kCFTypeArrayCallBacks)).get()));
    EXPECT_FALSE(CFEqual(arrayA.get(), own(CFArrayCreate(nullptr, reversed, 2, &kCFTypeArrayCallBacks)).get()));

    // Dictionaries: same pairs in any order.
    auto d1 = own(newDictionary());
    auto d2 = own(newDictionary());
    CFDictionarySetValue(d1.get(), CFSTR("a"), one.get());
    CFDictionarySetValue(d1.get(), CFSTR("b"), kCFBooleanTrue);
    CFDictionarySetValue(d2.get(), CFSTR("b"), kCFBooleanTrue);
    CFDictionarySetValue(d2.get(), vt::string("a").get(), two.get());
    EXPECT_TRUE(CFEqual(d1.get(), d2.get()));
    CFDictionarySetValue(d2.get(), CFSTR("b"), kCFBooleanFalse);
    EXPECT_FALSE(CFEqual(d1.get(), d2.get()));

    auto e1 = own(CFErrorCreate(nullptr, CFSTR("QVT"), 5, nullptr));
    EXPECT_TRUE(CFEqual(e1.get(), own(CFErrorCreate(nullptr, vt::string("QVT").get(), 5, d1.get())).get()));
    EXPECT_FALSE(CFEqual(e1.get(), own(CFErrorCreate(nullptr, CFSTR("QVT"), 6, nullptr)).get()));
}

// Whether the read was exact, and the value it gave.
template <class T>
std::pair<bool, double> readAs(const vt::Owned<CFNumberRef>& number, CFNumberType type)
{
    T value{};
    const bool exact = CFNumberGetValue(number.get(), type, &value);
    return {exact, double(value)};
}

TEST(CFNumber, ConversionsTruncateSaturateAndReportLoss)
{
    using R = std::pair<bool, double>;
    EXPECT_EQ(readAs<int32_t>(vt::number(-3.7), kCFNumberSInt32Type), R(false, -3));
    EXPECT_EQ(readAs<int8_t>(vt::number(300), kCFNumberSInt8Type), R(false, 127));
    EXPECT_EQ(readAs<int32_t>(vt::number(1e10), kCFNumberIntType), R(false, std::numeric_limits<int32_t>::max()));
    EXPECT_EQ(readAs<int64_t>(vt::number(-1e300), kCFNumberSInt64Type), R(false, -0x1p63));
    EXPECT_EQ(readAs<int64_t>(vt::number(std::nan("")), kCFNumberSInt64Type), R(false, 0));
    EXPECT_EQ(readAs<int8_t>(vt::number(-128.0), kCFNumberSInt8Type), R(true, -128));
    EXPECT_FALSE(readAs<float>(vt::number(16777217), kCFNumberFloatType).first);
    EXPECT_EQ(readAs<float>(vt::number(0.1), kCFNumberFloat32Type), R(false, double(0.1f)));
    EXPECT_EQ(readAs<float>(vt::number(0.5), kCFNumberFloat32Type), R(true, 0.5));
    EXPECT_EQ(readAs<float>(vt::number(1e300), kCFNumberFloat32Type), R(false, FLT_MAX));
    EXPECT_EQ(readAs<double>(vt::number(42), kCFNumberDoubleType), R(true, 42));
    EXPECT_EQ(CFNumberGetType(vt::number(42).get()), kCFNumberIntType);
    EXPECT_TRUE(CFNumberIsFloatType(vt::number(1.0).get()));
}

TEST(CFString, EncodingsAndBoundedCopies)
{
    auto text = vt::string("caf\xC3\xA9 \xF0\x9F\x92\xA1"); // an accented letter and an emoji
    EXPECT_EQ(CFStringGetLength(text.get()), 7);            // UTF-16 units
    EXPECT_EQ(CFStringGetCStringPtr(text.get(), kCFStringEncodingASCII), nullptr);
    EXPECT_STREQ(CFStringGetCStringPtr(text.get(), kCFStringEncodingUTF8), "caf\xC3\xA9 \xF0\x9F\x92\xA1");
    EXPECT_EQ(CFStringCreateWithCString(nullptr, "caf\xC3\xA9", kCFStringEncodingASCII), nullptr);
    EXPECT_EQ(CFStringCreateWithCString(nullptr, "\xC0\xAF", kCFStringEncodingUTF8), nullptr); // overlong '/'

    char buffer[6];
    EXPECT_TRUE(CFStringGetCString(CFSTR("12345"), buffer, 6, kCFStringEncodingASCII));
    EXPECT_STREQ(buffer, "12345");
    EXPECT_FALSE(CFStringGetCString(CFSTR("123456"), buffer, 6, kCFStringEncodingASCII));
    EXPECT_STREQ(buffer, "");
}

TEST(CFDescription, ReadableTextForEveryValueType)
{
    EXPECT_EQ(vt::describe(CFSTR("text")), "text");
    EXPECT_EQ(vt::describe(vt::number(-12).get()), "-12");
    float tenth = 0.1f;
    EXPECT_EQ(vt::describe(own(CFNumberCreate(nullptr, kCFNumberFloatType, &tenth)).get()), "0.1");
    EXPECT_EQ(vt::describe(kCFBooleanFalse), "false");
    EXPECT_EQ(vt::describe(nullptr), "(null)");

    UInt8 bytes[70];
    for (int i = 0; i < 70; ++i)
        bytes[i] = UInt8(i);
    EXPECT_EQ(vt::describe(own(CFDataCreate(nullptr, bytes, 5)).get()), "<00010203 04>");
    std::string longData = vt::describe(own(CFDataCreate(nullptr, bytes, 70)).get());
    EXPECT_TRUE(longData.starts_with("<00010203 04050607 ")) << longData;
    EXPECT_TRUE(longData.ends_with("3c3d3e3f ... (70 bytes)>")) << longData;

    auto one = vt::number(1);
    const void* items[] = {one.get(), CFSTR("two")};
    auto array = own(CFArrayCreate(nullptr, items, 2, &kCFTypeArrayCallBacks));
    EXPECT_EQ(vt::describe(array.get()), "(1, two)");
    auto dict = own(newDictionary());
    CFDictionarySetValue(dict.get(), CFSTR("b"), array.get());
    CFDictionarySetValue(dict.get(), CFSTR("a"), kCFBooleanTrue);
    EXPECT_EQ(vt::describe(dict.get()), "{b = (1, two); a = true; }");
    EXPECT_EQ(vt::describe(own(CFErrorCreate(nullptr, CFSTR("QVT"), -3, nullptr)).get()), "Error Domain=QVT Code=-3");
}

TEST(CFDictionary, KeysMatchByValueAndOrderIsKept)
{
    auto dict = own(newDictionary());
    CFDictionarySetValue(dict.get(), CFSTR("first"), vt::number(1).get());
    CFDictionarySetValue(dict.get(), CFSTR("second"), vt::number(2).get());
    CFDictionarySetValue(dict.get(), vt::string("first").get(), vt::number(3).get());
    EXPECT_EQ(CFDictionaryGetCount(dict.get()), 2);

    std::vector<std::string> seen;
    CFDictionaryApplyFunction(
        dict.get(),
        [](const void* key, const void* value, void* context) {
            static_cast<std::vector<std::string>*>(context)->push_back(vt::describe(key) + "=" + vt::describe(value));
        },
        &seen);
    EXPECT_EQ(seen, (std::vector<std::string>{"first=3", "second=2"}));

    CFDictionaryRemoveValue(dict.get(), vt::string("second").get());
    EXPECT_EQ(CFDictionaryGetValue(dict.get(), CFSTR("second")), nullptr);
    EXPECT_EQ(CFDictionaryGetCount(dict.get()), 1);
}

TEST(CFUUID, BytesStringsAndConstants)
{
    CFUUIDRef constant = factoryUUID();
    EXPECT_EQ(constant, factoryUUID());

    auto created = own(CFUUIDCreateFromUUIDBytes(nullptr, CFUUIDGetUUIDBytes(constant)));
    EXPECT_NE(created.get(), constant);
    EXPECT_TRUE(CFEqual(created.get(), constant));
    EXPECT_EQ(CFGetRetainCount(created.get()), 1);

    auto text = own(CFUUIDCreateString(nullptr, constant));
    EXPECT_STREQ(CFStringGetCStringPtr(text.get(), kCFStringEncodingASCII), "D1148FE3-60F3-4B3B-8505-E28C1E66EBC8");
    auto parsed = own(CFUUIDCreateFromString(nullptr, CFSTR("d1148fe3-60f3-4b3b-8505-e28c1e66ebc8")));
    ASSERT_NE(parsed.get(), nullptr);
    EXPECT_TRUE(CFEqual(parsed.get(), constant));

    for (const char* bad : {"D1148FE3-60F3-4B3B-8505-E28C1E66EBC", "D1148FE360F3-4B3B-8505-E28C1E66EBC8-",
                            "D1148FE3-60F3-4B3B-8505-E28C1E66EBCG", ""})
        EXPECT_EQ(CFUUIDCreateFromString(nullptr, vt::string(bad).get()), nullptr) << bad;
}

TEST(CFPlugIn, InstancesAreCountedPerFactoryValue)
{
    auto sameFactory = own(CFUUIDCreateFromUUIDBytes(nullptr, CFUUIDGetUUIDBytes(factoryUUID())));
    long before = VPPlugInInstanceCount(factoryUUID());
    CFPlugInAddInstanceForFactory(factoryUUID());
    CFPlugInAddInstanceForFactory(sameFactory.get());
    EXPECT_EQ(VPPlugInInstanceCount(factoryUUID()), before + 2);
    CFPlugInRemoveInstanceForFactory(sameFactory.get());
    CFPlugInRemoveInstanceForFactory(factoryUUID());
    EXPECT_EQ(VPPlugInInstanceCount(sameFactory.get()), before);
}

TEST(CFPlugInDeathTest, RemovingAnInstanceNeverAddedStops)
{
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    CFUUIDRef unused = CFUUIDGetConstantUUIDWithBytes(nullptr, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16);
    EXPECT_DEATH(CFPlugInRemoveInstanceForFactory(unused), "no live instance");
}
