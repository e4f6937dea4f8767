// Client property values: a sequence of setPropertyForClient calls, each with
// a key the plug-in knows (or any other) and a CF value tree of any shape,
// then an event through filter and the copy-event path, which apply what the
// properties set. "RebuildVelderDB" reruns calibration on the caller's
// thread; here it finds no factory record and no registry blob, so it fails
// fast, as on a unit without calibration.
//
// Input: byte 0 = database channels (0..7, the length an RGBC array must
// have), byte 1 = bit 0: the service asks for configuration-supplied
// calibration on a rebuild; then calls until the input ends, each a key byte
// (0 "RGBCOverride", 1 "ChromaticityOverride", 2 "ColorAlgoLambda",
// 3 "ChannelRatioMitigationType", 4 "RebuildVelderDB", 5 a key read as a
// length-prefixed string, 6 no key, others repeat the first five) and a value:
//   0 null          1 true, 2 false
//   3..8 a number of 1, 2, 4, 8 bytes (integer) or 4, 8 bytes (floating)
//   9 a string (length byte, bytes)   10 data (length byte, bytes)
//   11 an array (count byte, then that many values), 12 a dictionary (count
//   byte, then key and value for each), nested at most 4 deep.
#include "common/FuzzSupport.h"

#include "common/ALSEvents.h"
#include "support/CFOwned.h"

#include <VantishPlatform/HIDHost.h>

#include <array>
#include <string>

namespace {

constexpr int kMaxDepth = 4;
constexpr int kMaxCalls = 32;
template <typename T>
CFNumberRef number(fz::Input& in, CFNumberType type)
{
    const T value = in.take<T>();
    return CFNumberCreate(kCFAllocatorDefault, type, &value);
}

CFStringRef string(fz::Input& in)
{
    const auto bytes = in.takeBytes(in.take<uint8_t>());
    const std::string text(bytes.begin(), bytes.end());
    // Strings are made from C strings: they end at the first zero byte.
    return CFStringCreateWithCString(kCFAllocatorDefault, text.c_str(), kCFStringEncodingUTF8);
}

CFTypeRef value(fz::Input& in, int depth);

CFTypeRef array(fz::Input& in, int depth)
{
    CFMutableArrayRef array = CFArrayCreateMutable(kCFAllocatorDefault, 0, &kCFTypeArrayCallBacks);
    for (unsigned n = in.take<uint8_t>(); n > 0 && in.size() > 0; --n)
        if (CFTypeRef element = value(in, depth + 1)) {
            CFArrayAppendValue(array, element);
            CFRelease(element);
        }
    return array;
}

CFTypeRef dictionary(fz::Input& in, int depth)
{
    CFMutableDictionaryRef dict = CFDictionaryCreateMutable(kCFAllocatorDefault, 0, &kCFTypeDictionaryKeyCallBacks,
                                                            &kCFTypeDictionaryValueCallBacks);
    for (unsigned n = in.take<uint8_t>(); n > 0 && in.size() > 0; --n) {
        CFOwned<CFTypeRef> key(string(in));
        CFOwned<CFTypeRef> element(value(in, depth + 1));
        if (key && element)
            CFDictionarySetValue(dict, key.get(), element.get());
    }
    return dict;
}

// A new value (or null) read from the input.
CFTypeRef value(fz::Input& in, int depth)
{
    const uint8_t tag = in.take<uint8_t>();
    switch (tag % 13) {
    case 1:
        return CFRetain(kCFBooleanTrue);
    case 2:
        return CFRetain(kCFBooleanFalse);
    case 3:
        return number<int8_t>(in, kCFNumberSInt8Type);
    case 4:
        return number<int16_t>(in, kCFNumberSInt16Type);
    case 5:
        return number<int32_t>(in, kCFNumberSInt32Type);
    case 6:
        return number<int64_t>(in, kCFNumberSInt64Type);
    case 7:
        return number<float>(in, kCFNumberFloat32Type);
    case 8:
        return number<double>(in, kCFNumberFloat64Type);
    case 9:
        return string(in);
    case 10:
        return fz::createData(in.takeBytes(in.take<uint8_t>()));
    case 11:
        return depth < kMaxDepth ? array(in, depth) : nullptr;
    case 12:
        return depth < kMaxDepth ? dictionary(in, depth) : nullptr;
    default:
        return nullptr;
    }
}

CFStringRef key(fz::Input& in)
{
    static const std::array<CFStringRef, 5> known = {CFSTR("RGBCOverride"), CFSTR("ChromaticityOverride"),
                                                     CFSTR("ColorAlgoLambda"), CFSTR("ChannelRatioMitigationType"),
                                                     CFSTR("RebuildVelderDB")};
    const uint8_t choice = in.take<uint8_t>();
    if (choice == 5)
        return string(in);
    if (choice == 6)
        return nullptr;
    return static_cast<CFStringRef>(CFRetain(known[choice % known.size()]));
}

// An ALS event with a plain sample record of four lit channels.
vt::Event createEvent()
{
    const vt::Record record = vt::Record().channels({120.0f, 200.0f, 90.0f, 400.0f, 50.0f, 10.0f}).lux(150.0f);
    return vt::createALSEvent(&record, 1000);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    fz::Workspace::get().clear();
    fz::Input in(data, size);
    const uint8_t dbChannels = in.take<uint8_t>() % 8;
    const uint8_t serviceFlags = in.take<uint8_t>();

    IOHIDServiceRef service = VPServiceCreate(0);
    if (serviceFlags & 1)
        VPServicePublishProperty(service, CFSTR("SysConfigCalibration"), kCFBooleanTrue);
    {
        vt::PlugIn plugin(vt::PlugIn::AtRelease::RunQueuedWorkFirst);
        parts(*plugin).service() = service;
        parts(*plugin).unit().numberOfChannels = dbChannels;
        parts(*plugin).unit().dbChannelCount = dbChannels;
        parts(*plugin).databases().publish(fz::smallDatabase(dbChannels), true);

        for (int call = 0; call < kMaxCalls && in.size() > 0; ++call) {
            CFOwned<CFStringRef> k(key(in));
            CFOwned<CFTypeRef> v(value(in, 0));
            VantishPlugIn::setPropertyForClient(&*plugin, k.get(), v.get(), nullptr);
        }

        const vt::Event event = createEvent();
        VantishPlugIn::filter(&*plugin, event.get());
        const vt::Event copy = createEvent();
        VantishPlugIn::filterCopyEvent(&*plugin, copy.get());
    }
    CFRelease(service);
    return 0;
}
