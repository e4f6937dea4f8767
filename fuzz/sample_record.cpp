// The driver's sample record inside an ALS event, of any length and content,
// through filter (overrides, spike tests, the colour fit against a published
// per-chip database, the write-back) and logALSSample, then the copy-event
// path on a second event carrying the same record.
//
// Input:
//   byte 0   flags: bit 0 RGBC override on, bit 1 chromaticity override on,
//            bit 2 channel-ratio mitigation on, bit 3 lambda configured, bit 4
//            the database is normalised (per-channel deviations), bit 5 the
//            event has no record child, bit 6 the event is not an ALS event,
//            bit 7 dbReady is off
//   byte 1   numberOfChannels      byte 2  database channels (0..7)
//   byte 3   sensorType            byte 4  chipType        byte 5  mitigationType
//   6 x u32  RGBC override values  3 x f64 chromaticity override x, y, Y
//   f32      lambda                u64     event time stamp
//   rest     the record
#include "common/FuzzSupport.h"

#include "common/ALSEvents.h"

namespace {

enum Flags : uint8_t {
    kRGBCOverride = 1 << 0,
    kChromaticityOverride = 1 << 1,
    kMitigation = 1 << 2,
    kLambda = 1 << 3,
    kNormalised = 1 << 4,
    kNoRecord = 1 << 5,
    kNotALS = 1 << 6,
    kNotReady = 1 << 7,
};

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    fz::Workspace::get();
    fz::Input input(data, size);
    const uint8_t flags = input.take<uint8_t>();
    const uint8_t channels = input.take<uint8_t>();
    const uint8_t dbChannels = input.take<uint8_t>() % 8;
    const uint8_t sensorType = input.take<uint8_t>();
    const uint8_t chipType = input.take<uint8_t>();
    const uint8_t mitigationType = input.take<uint8_t>();

    vt::PlugIn plugin(vt::PlugIn::AtRelease::RunQueuedWorkFirst);
    parts(*plugin).unit().numberOfChannels = channels;
    parts(*plugin).unit().dbChannelCount = dbChannels;
    parts(*plugin).unit().sensorType = sensorType;
    parts(*plugin).unit().chipType = chipType;
    parts(*plugin).unit().mitigationType = mitigationType;
    parts(*plugin).unit().channelRatioMitigation = (flags & kMitigation) != 0;
    parts(*plugin).overrides().rgbcOverrideActive = (flags & kRGBCOverride) != 0;
    for (auto& value : parts(*plugin).overrides().rgbcOverride)
        value = input.take<uint32_t>();
    parts(*plugin).overrides().chromaticityOverrideActive = (flags & kChromaticityOverride) != 0;
    parts(*plugin).overrides().overrideX = input.take<double>();
    parts(*plugin).overrides().overrideY = input.take<double>();
    parts(*plugin).overrides().overrideLuminance = input.take<double>();
    parts(*plugin).fit().lambdaConfigured = (flags & kLambda) != 0;
    parts(*plugin).fit().lambda = input.take<float>();
    const uint64_t timeStamp = input.take<uint64_t>();
    parts(*plugin).databases().publish(fz::smallDatabase(dbChannels, flags & kNormalised), !(flags & kNotReady));

    const IOHIDEventType type = flags & kNotALS ? kIOHIDEventTypeVendorDefined : kIOHIDEventTypeAmbientLightSensor;
    const vt::Record record(input.rest());
    const vt::Record* child = flags & kNoRecord ? nullptr : &record;
    const vt::Event event = vt::createEvent(type, child, timeStamp);
    plugin->filter(event.get(), false);
    const vt::Event copy = vt::createEvent(type, child, timeStamp);
    plugin->filterCopyEvent(copy.get());
    plugin->logALSSample(copy.get(), true);
    return 0;
}
