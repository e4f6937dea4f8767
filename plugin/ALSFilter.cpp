// The per-event filter: every ALS event of the service passes through here.
// It applies the client overrides, rejects light spikes, estimates the colour
// of the sample against the per-chip database and writes it back into the
// event (or into the driver's record), then hands the event to the sample log.
//
// Called for every sample on the host's thread: nothing here allocates, and
// one snapshot of the database serves the whole call, however calibration
// replaces it meanwhile.
#include "colour/ColourCalculation.h"
#include "formats/ALSSampleRecord.h"
#include "plugin/ChromaticityOverride.h"
#include "plugin/SampleRecordBytes.h"
#include "plugin/SpikeDetector.h"
#include "plugin/VantishPlugIn.h"
#include "support/Log.h"

#include <array>
#include <cmath>
#include <span>

namespace {

using XYZ = std::array<float, 3>;

// What the filter reads and writes of the instance, part by part.
struct EventParts {
    const UnitConfiguration& unit;
    const FitParameters& fit;
    const ClientOverrides& overrides;
    const DatabaseSlot& databases;
    std::array<std::atomic<float>, 3>& lastXYZ;
    std::atomic<uint64_t>& shortRecords;
    std::atomic<uint64_t>& nonFiniteLux;
};

constexpr uint32_t kMaxChannels = 6;
constexpr double kComparisonThreshold = 0.005; // 0.5 % of our own value
// A driver that sends short records sends them all the time: log the first
// one and then every 1000th.
constexpr uint64_t kShortRecordLogInterval = 1000;

bool isALSEvent(IOHIDEventRef event) { return event && IOHIDEventGetType(event) == kIOHIDEventTypeAmbientLightSensor; }

void writeEventXYZ(IOHIDEventRef event, const XYZ& xyz)
{
    IOHIDEventSetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent0, xyz[0]);
    IOHIDEventSetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent1, xyz[1]);
    IOHIDEventSetDoubleValue(event, kIOHIDEventFieldAmbientLightColorComponent2, xyz[2]);
    IOHIDEventSetIntegerValue(event, kIOHIDEventFieldAmbientLightColorSpace, 1);
}

// Counts one more occurrence; true for the ones that are logged (the first,
// then every kShortRecordLogInterval-th).
bool countAndThrottle(std::atomic<uint64_t>& counter, uint64_t& count)
{
    count = counter.fetch_add(1) + 1;
    return count % kShortRecordLogInterval == 1;
}

void reportShortRecord(std::atomic<uint64_t>& shortRecords, size_t length)
{
    uint64_t count = 0;
    if (countAndThrottle(shortRecords, count))
        VLOG_ERROR("Sample record of %lu bytes is shorter than %lu bytes, event passed unchanged (%llu so far)\n",
                   (unsigned long) length, (unsigned long) ALSSampleRecord::kFilterSize, (unsigned long long) count);
}

// A lux that is not a number cannot scale a colour: the sample gets none, as
// one whose fit gives no positive Y. Logged like short records.
void reportNonFiniteLux(std::atomic<uint64_t>& nonFiniteLux, float lux)
{
    uint64_t count = 0;
    if (countAndThrottle(nonFiniteLux, count))
        VLOG_ERROR("Sample lux %f is not a finite number, colour set to zero (%llu so far)\n", double(lux),
                   (unsigned long long) count);
}

// A spike zeroes the level now and the colour on the way out.
bool rejectSpike(IOHIDEventRef event, const ALSSampleRecord& record, const SpikeSettings& settings)
{
    const SpikeResult spike = detectSpike(record, settings);
    if (!spike.spike)
        return false;
    VLOG_INFO("ALS spike detected (type = %d). Lux = %f, Channel ratio = %f", int(settings.mitigationType),
              double(record.lux), double(spike.ratio));
    VLOG_DEBUG("ALS spike is detected -> setting zero lux and zero color.");
    IOHIDEventSetFloatValue(event, kIOHIDEventFieldAmbientLightSensorLevel, 0.0);
    return true;
}

// Replaces the colour input and the record's channels by the client's values
// and shows them in the event: in the driver's record and the raw channel fields.
void applyRGBCOverride(const ClientOverrides& overrides, IOHIDEventRef event, ALSSampleRecord& record,
                       std::span<uint8_t> recordBytes, std::array<float, kMaxChannels>& channel, uint32_t channelCount,
                       uint32_t skip)
{
    std::array<uint32_t, kMaxChannels> values{};
    for (size_t i = 0; i < values.size(); ++i)
        values[i] = overrides.rgbcOverride[i].load();
    for (uint32_t i = 0; i < channelCount; ++i) {
        channel[i] = float(values[i]);
        record.channelValues[skip + i] = float(values[i]);
    }
    ALSSampleRecord::writeChannelValues(recordBytes, record.channelValues);
    IOHIDEventSetFloatValue(event, kIOHIDEventFieldAmbientLightSensorRawChannel0, values[0]);
    IOHIDEventSetFloatValue(event, kIOHIDEventFieldAmbientLightSensorRawChannel1, values[1]);
    IOHIDEventSetFloatValue(event, kIOHIDEventFieldAmbientLightSensorRawChannel2, values[2]);
    IOHIDEventSetFloatValue(event, kIOHIDEventFieldAmbientLightSensorRawChannel3, values[3]);
}

void logSample(const ALSSampleRecord& r, const XYZ& xyz)
{
    const auto& c = r.channelValues;
    VLOG_DEBUG("lux=%f status=%d nChannels=%d orientation=%d integrationTime=%u reportInterval=%u gain=%f "
               "XYZ=[%f;%f;%f] Channels=[%f;%f;%f;%f;%f;%f]",
               double(r.lux), int(r.status), int(r.sampleChannelCount), int(r.sampleOrientation), r.integrationTime,
               r.reportInterval, double(float(r.gain) / 65536.0f), double(xyz[0]), double(xyz[1]), double(xyz[2]),
               double(c[0]), double(c[1]), double(c[2]), double(c[3]), double(c[4]), double(c[5]));
}

// The colour fit gives a direction; the record's lux gives the magnitude.
XYZ scaleToLux(const XYZ& xyz, float lux)
{
    if (!(xyz[1] > 0.0f))
        return {};
    const float k = lux / xyz[1];
    return {xyz[0] * k, lux, k * xyz[2]};
}

// Our XYZ against the one the sensor side computed, for X and Z.
void logComparisonWithSensor(const ALSSampleRecord& r, const XYZ& xyz)
{
    VLOG_DEBUG("[ColorCalc] ts=%u XYZAP=[%f %f %f] XYZAOP=[%f %f %f]", r.timestamp, double(xyz[0]), double(xyz[1]),
               double(xyz[2]), double(r.xyzSensor[0]), double(r.xyzSensor[1]), double(r.xyzSensor[2]));
    for (int i : {0, 2}) {
        const double ours = xyz[i];
        const double sensor = r.xyzSensor[i];
        const double diff = std::fabs(ours - sensor);
        const double threshold = ours * kComparisonThreshold;
        VLOG_DEBUG("[ColorCalc] diff(XYZAP[%d], XYZAOP[%d]) = diff(%f, %f) = %f treshholdValue(%.2f%%) = %f "
                   "isBelowTreshhold = %s",
                   i, i, ours, sensor, diff, kComparisonThreshold * 100.0, threshold,
                   threshold >= diff ? "YES" : "!!NO!!");
    }
}

// The colour of one sample, scaled to its lux; zero when the sample is a spike
// or the channel layout cannot be matched with the database. May change the
// record (clamped channels, client channels) and the event (level, raw fields).
XYZ sampleColour(const EventParts& parts, IOHIDEventRef event, const SpectralDatabase& db, ALSSampleRecord& record,
                 std::span<uint8_t> recordBytes)
{
    const UnitConfiguration& unit = parts.unit;
    const uint32_t sensorChannels = unit.numberOfChannels.load();
    if (sensorChannels < 4 || sensorChannels > kMaxChannels) {
        VLOG_ERROR("Unknown number of channels (%d) \n", int(sensorChannels));
        return {};
    }

    const uint32_t sensorType = unit.sensorType.load();
    const SpikeSettings spikeSettings{unit.channelRatioMitigation.load() != 0, unit.mitigationType.load(),
                                      unit.chipType.load(), sensorType};
    if (rejectSpike(event, record, spikeSettings))
        return {};

    // The database's channels are the sensor's last ones; a database with more
    // channels than the sensor delivers cannot be fed.
    const uint32_t dbChannels = db.dbChannelCount;
    if (dbChannels < 1 || dbChannels > sensorChannels) {
        VLOG_ERROR("Unsupported database channel count (%u) for %u sensor channels \n", dbChannels, sensorChannels);
        return {};
    }
    const uint32_t skip = sensorChannels == kMaxChannels ? kMaxChannels - dbChannels : 0;

    for (float& value : record.channelValues)
        value = value < 0.0f ? 0.0f : value;
    std::array<float, kMaxChannels> channel{};
    for (uint32_t i = 0; i < dbChannels; ++i)
        channel[i] = record.channelValues[skip + i];

    if (parts.overrides.rgbcOverrideActive.load())
        applyRGBCOverride(parts.overrides, event, record, recordBytes, channel, dbChannels, skip);

    XYZ xyz{};
    colourCalculationDynamic(db, parts.fit.settings(), channel.data(), xyz.data(), int(dbChannels));
    if (sensorType != eALSSensorTypeVD6287)
        logSample(record, xyz);

    if (!std::isfinite(record.lux)) {
        reportNonFiniteLux(parts.nonFiniteLux, record.lux);
        return {};
    }
    xyz = scaleToLux(xyz, record.lux);
    if (record.xyzInRecord)
        logComparisonWithSensor(record, xyz);
    return xyz;
}

void filterALSEvent(const EventParts& parts, IOHIDEventRef event)
{
    if (const auto override = ChromaticityOverride::active(parts.overrides)) {
        applyChromaticityOverride(event, *override);
        return;
    }

    const std::span<uint8_t> recordBytes = sampleRecordBytes(event);
    if (recordBytes.empty())
        return;
    auto record = ALSSampleRecord::decode(recordBytes);
    if (!record) {
        reportShortRecord(parts.shortRecords, recordBytes.size());
        return;
    }

    const DatabaseSlot::Snapshot snapshot = parts.databases.snapshot();
    if (!snapshot.ready || !snapshot.db)
        return;

    const XYZ xyz = sampleColour(parts, event, *snapshot.db, *record, recordBytes);
    for (size_t i = 0; i < xyz.size(); ++i)
        parts.lastXYZ[i].store(xyz[i]);
    if (record->xyzInRecord)
        ALSSampleRecord::writeXYZResult(recordBytes, xyz);
    else
        writeEventXYZ(event, xyz);
}

} // namespace

IOHIDEventRef VantishPlugIn::filter(IOHIDEventRef event, bool isCopyEvent)
{
    if (isALSEvent(event))
        filterALSEvent({unit_, fit_, overrides_, databases_, lastXYZ_, shortSampleRecords_, nonFiniteLuxSamples_},
                       event);
    logALSSample(event, isCopyEvent);
    return event;
}
