// The registry calibration blobs "alsCalibration" (generic and VD6286
// entries) and "alsAuxCalibration", of any length and content, through
// processSysConfigCalibration: the entry walk, the driver record, and the
// per-chip database built from the entry's spectra against the workspace's
// reference database (with its cache write, in place or queued).
//
// Input: byte 0 = flags (bit 0 asyncCreate, bit 1 pushCalibration, bit 2
// processDatabase, bit 3 an "alsAuxCalibration" blob exists, bit 4 that blob
// is a number rather than data, bit 5 "alsCalibration" is a string rather
// than data, bit 6 calibrate a second time (the cache is then valid), bit 7
// the device tree overrides the algorithm version); byte 1 = orientation;
// byte 2 = numberOfChannels before calibration; bytes 3-4 = length L of
// "alsCalibration" (little-endian); then L bytes of it; the rest is
// "alsAuxCalibration".
#include "common/FuzzSupport.h"

#include "support/CFOwned.h"
#include "sysconfig/SysConfigCalibration.h"

#include <IOKit/IOKitLib.h>
#include <VantishPlatform/HIDHost.h>

namespace {

enum Flags : uint8_t {
    kAsyncCreate = 1 << 0,
    kPushCalibration = 1 << 1,
    kProcessDatabase = 1 << 2,
    kHasAux = 1 << 3,
    kAuxIsNumber = 1 << 4,
    kCalibrationIsString = 1 << 5,
    kCalibrateTwice = 1 << 6,
    kAlgoOverride = 1 << 7,
};

constexpr uint64_t kRegistryID = 0x5C0;

void publish(io_registry_entry_t entry, CFStringRef key, CFTypeRef value)
{
    VPRegistrySetProperty(entry, key, value);
    CFRelease(value);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    const fz::Workspace& workspace = fz::Workspace::get();
    workspace.clear();

    fz::Input input(data, size);
    const uint8_t flags = input.take<uint8_t>();
    const uint8_t orientation = input.take<uint8_t>();
    const uint8_t channels = input.take<uint8_t>();
    const auto calibration = input.takeBytes(input.take<uint16_t>());
    const auto aux = input.rest();

    // The blobs hang on the parent of the service's entry, as on a device.
    VPRegistryReset();
    const io_registry_entry_t parent = VPRegistryCreateEntry(kRegistryID - 1, 0);
    VPRegistryCreateEntry(kRegistryID, parent);
    if (flags & kCalibrationIsString)
        publish(parent, CFSTR("alsCalibration"), CFRetain(CFSTR("not a blob")));
    else
        publish(parent, CFSTR("alsCalibration"), fz::createData(calibration));
    if (flags & kHasAux) {
        const int32_t number = 7;
        if (flags & kAuxIsNumber)
            publish(parent, CFSTR("alsAuxCalibration"), CFNumberCreate(nullptr, kCFNumberSInt32Type, &number));
        else
            publish(parent, CFSTR("alsAuxCalibration"), fz::createData(aux));
    }

    IOHIDServiceRef service = VPServiceCreate(kRegistryID);
    {
        vt::PlugIn plugin(vt::PlugIn::AtRelease::RunQueuedWorkFirst);
        parts(*plugin).service() = service;
        parts(*plugin).registryEntry() =
            IOServiceGetMatchingService(kIOMainPortDefault, IORegistryEntryIDMatching(kRegistryID));
        parts(*plugin).unit().orientation = orientation;
        parts(*plugin).unit().numberOfChannels = channels;
        parts(*plugin).unit().dbChannelCount = channels;
        parts(*plugin).unit().colorAlgoOverride = (flags & kAlgoOverride) ? 5 : 0;

        const bool async = flags & kAsyncCreate;
        const bool push = flags & kPushCalibration;
        const bool database = flags & kProcessDatabase;
        processSysConfigCalibration(parts(*plugin).calibration(), async, push, database);
        vt::runQueuedWork();
        if (flags & kCalibrateTwice)
            processSysConfigCalibration(parts(*plugin).calibration(), async, push, database);
    }
    CFRelease(service);
    VPRegistryReset();
    return 0;
}
