// One log line per ALS event of a VD6287 service, written after the filter
// has done its work, so the line shows what clients receive. With the
// driver's full sample record attached the line carries the record's details;
// otherwise a short line from the event's own fields.
#include "formats/ALSSampleRecord.h"
#include "plugin/SampleRecordBytes.h"
#include "plugin/VantishPlugIn.h"
#include "support/Log.h"

#include <cstdio>
#include <utility>

namespace {

// Room for " filteredLux=" and any float printed with three decimals.
constexpr size_t kFilteredLuxTextSize = 64;

// Chromaticity x, y of an event's X, Y, Z; (0, 0) when they sum to 0.
std::pair<float, float> eventChromaticity(IOHIDEventRef event)
{
    const double X = IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent0);
    const double Y = IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent1);
    const double Z = IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent2);
    const float sum = float((X + Y) + Z);
    if (sum == 0.0f)
        return {0.0f, 0.0f};
    return {float(X / sum), float(Y / sum)};
}

void logFullLine(double seconds, double lux, std::pair<float, float> xy, const ALSSampleRecord& r, bool isCopyEvent)
{
    char filteredLux[kFilteredLuxTextSize] = {};
    if (r.filteredLuxValid)
        std::snprintf(filteredLux, sizeof filteredLux, " filteredLux=%.3f", double(r.filteredLux));
    const auto& c = r.channelValues;
    VLOG_DEFAULT("[ALS] ts=%.3f lux=%.3f%s xy=(%.3f %.3f) chs=[%.0f %.0f %.0f %.0f %.0f] CCT1=%.3f gain=%dx "
                 "mode=%s subsamples=%u rawLux=%.3f nits=%u xTalk=[%u %u %u %u %u] status=0x%02X copyEvent=%d",
                 seconds, lux, filteredLux, double(xy.first), double(xy.second), double(c[0]), double(c[1]),
                 double(c[2]), double(c[3]), double(c[4]), double(r.cct), int(r.gain >> 16), r.mode ? "ASYNC" : "SYNC",
                 unsigned(r.subsamples), double(r.rawLux), unsigned(r.nits), r.xTalk[0], r.xTalk[1], r.xTalk[2],
                 r.xTalk[3], r.xTalk[4], r.status, int(isCopyEvent));
}

void logShortLine(IOHIDEventRef event, double seconds, double lux, std::pair<float, float> xy, bool isCopyEvent)
{
    VLOG_DEFAULT("[ALS] ts=%.3f lux=%.3f xy=(%.3f %.3f) chs=[%.0f %.0f %.0f %.0f N/A] copyEvent=%d", seconds, lux,
                 double(xy.first), double(xy.second),
                 IOHIDEventGetFloatValue(event, kIOHIDEventFieldAmbientLightSensorRawChannel0),
                 IOHIDEventGetFloatValue(event, kIOHIDEventFieldAmbientLightSensorRawChannel1),
                 IOHIDEventGetFloatValue(event, kIOHIDEventFieldAmbientLightSensorRawChannel2),
                 IOHIDEventGetFloatValue(event, kIOHIDEventFieldAmbientLightSensorRawChannel3), int(isCopyEvent));
}

} // namespace

void VantishPlugIn::logALSSample(IOHIDEventRef event, bool isCopyEvent)
{
    if (unit_.sensorType.load() != eALSSensorTypeVD6287 || !event ||
        IOHIDEventGetType(event) != kIOHIDEventTypeAmbientLightSensor)
        return;
    // Nothing below is worth computing when the line would not be written.
    if (!os_log_type_enabled(vantishLog(), OS_LOG_TYPE_DEFAULT))
        return;

    const double seconds = double(IOHIDEventGetTimeStamp(event)) * machTimeToSeconds_;
    const double lux = IOHIDEventGetDoubleValue(event, kIOHIDEventFieldAmbientLightSensorIlluminance);
    const auto xy = eventChromaticity(event);

    // Only a record of exactly the driver's size gets the full line.
    const std::span<uint8_t> recordBytes = sampleRecordBytes(event);
    const auto record =
        recordBytes.size() == ALSSampleRecord::kSize ? ALSSampleRecord::decode(recordBytes) : std::nullopt;
    if (record)
        logFullLine(seconds, lux, xy, *record, isCopyEvent);
    else
        logShortLine(event, seconds, lux, xy, isCopyEvent);
}
