// A factory-store record of any length and content, end to end: the plug-in
// is opened on a service, its bring-up reads the record from the store
// (loadQVTCalibration), recognises and parses it, sets the driver record,
// and builds the per-chip database from the workspace's reference database
// and the record's channel spectra (writing the cache).
//
// Input: byte 0 = the store class (bits 0-1: 0 "XwCA", 1 "XwCl", 2 "XwCM")
// and what happens around the load (bit 2: the unit runs Dravik OS; bit 3:
// load again, now from the cache; bit 4: a client asks for "RebuildVelderDB";
// bit 5: the service configures a lambda); byte 1 = the record's size (0: as
// given, 1 XwCA T2, 2 XwCl one entry, 3 XwCl two entries, 4 VD6287 v1,
// 5 VD6287 v3); byte 2 = the service's "NumberOfChannels"; byte 3 = its
// "ALSSensorType"; the rest is the record.
#include "common/FuzzSupport.h"

#include "formats/VD6287Layout.h"
#include "formats/XwCAT2Layout.h"
#include "formats/XwClLayout.h"
#include "support/CFOwned.h"

#include <Tessary/Tessary.h>
#include <VantishPlatform/DeviceState.h>
#include <VantishPlatform/HIDHost.h>

#include <array>
#include <vector>

namespace {

constexpr std::array<const char*, 4> kClasses = {"XwCA", "XwCl", "XwCM", "XwCA"};
constexpr std::array<size_t, 6> kSizes = {0,
                                          stored::xwca::kSize,
                                          stored::xwcl::kOneEntrySize,
                                          stored::xwcl::kTwoEntrySize,
                                          stored::vd6287::kV1Size,
                                          stored::vd6287::kV3Size};

enum Flags : uint8_t {
    kDravikOS = 1 << 2,
    kLoadAgain = 1 << 3,
    kClientRebuild = 1 << 4,
    kServiceLambda = 1 << 5,
};

void publishInt(IOHIDServiceRef service, CFStringRef key, int32_t value)
{
    CFOwned<CFNumberRef> number(CFNumberCreate(kCFAllocatorDefault, kCFNumberSInt32Type, &value));
    VPServicePublishProperty(service, key, number.get());
}

std::vector<uint8_t> record(std::span<const uint8_t> payload, uint8_t sizeChoice)
{
    std::vector<uint8_t> bytes(payload.begin(), payload.end());
    if (const size_t size = kSizes[sizeChoice % kSizes.size()]; size != 0)
        bytes.resize(size, 0);
    return bytes;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    const fz::Workspace& workspace = fz::Workspace::get();
    workspace.clear();
    VPSetBootArgs(std::string());

    fz::Input input(data, size);
    const uint8_t flags = input.take<uint8_t>();
    const uint8_t sizeChoice = input.take<uint8_t>();
    const uint8_t channels = input.take<uint8_t>();
    const uint8_t sensorType = input.take<uint8_t>();
    fz::writeFile(workspace.store / kClasses[flags & 3], record(input.rest(), sizeChoice));

    if (flags & kDravikOS) {
        CFOwned<CFStringRef> name(CFStringCreateWithCString(nullptr, "Dravik OS", kCFStringEncodingUTF8));
        VPTessarySetAnswer(CFSTR("ProductName"), name.get());
    }
    IOHIDServiceRef service = VPServiceCreate(0);
    publishInt(service, CFSTR("NumberOfChannels"), channels);
    publishInt(service, CFSTR("ALSSensorType"), sensorType);
    publishInt(service, CFSTR("chip_id"), int32_t(fz::kChipId));
    if (flags & kServiceLambda) {
        const float lambda = 0.01f;
        CFOwned<CFNumberRef> number(CFNumberCreate(kCFAllocatorDefault, kCFNumberFloat32Type, &lambda));
        VPServicePublishProperty(service, CFSTR("color-algo-lambda"), number.get());
    }

    {
        vt::PlugIn plugin(vt::PlugIn::AtRelease::RunQueuedWorkFirst);
        plugin->open(service, 0);
        vt::runQueuedWork();
        if (flags & kLoadAgain)
            parts(*plugin).calibration().loadQVTCalibration(false);
        if (flags & kClientRebuild)
            plugin->setPropertyForClient(CFSTR("RebuildVelderDB"), kCFBooleanTrue, nullptr);
    }
    CFRelease(service);
    VPTessaryReset();
    return 0;
}
