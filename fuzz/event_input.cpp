// The `vantish run` input: CSV or JSON lines of light samples and client
// actions, through EventReader, with what the command does with each row:
// a sample becomes a driver event (record encoded, time stamp in ticks), a
// property value becomes a CF value.
//
// Input: byte 0 = bit 0 JSON lines (else CSV); byte 1 = the unit's channel
// count; the rest is the text.
#include "common/FuzzSupport.h"
#include "common/PlainFiles.h"

#include "host/emulator/DeviceDescription.h"
#include "host/emulator/DriverSample.h"
#include "host/inputs/EventInput.h"

#include <cstdlib>
#include <sstream>
#include <string>
#include <vector>

namespace {

constexpr size_t kMaxRows = 4096;

// The event clock counts nanoseconds in 64 bits.
constexpr double kClockLimitNanoseconds = 18446744073709551616.0;

void useSample(const host::InputRow& row)
{
    // The command stamps the event with the row's time in nanoseconds: the
    // reader hands over only times the clock can hold.
    if (!(row.timeSeconds >= 0.0 && row.timeSeconds * 1e9 < kClockLimitNanoseconds))
        std::abort();
    IOHIDEventRef event = host::createALSEvent(row.record, uint64_t(row.timeSeconds * 1e9));
    CFRelease(event);
}

void useProperty(const host::InputRow& row)
{
    if (!fz::readsOnlyPlainFiles(row.value))
        return;
    try {
        CFRelease(host::createPropertyValue(row.value, fz::Workspace::get().root, "property value"));
    } catch (const std::exception&) {
        // Reported to the user as a bad value, as the command does.
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    fz::Workspace::get();
    fz::Input input(data, size);
    const uint8_t flags = input.take<uint8_t>();
    const uint8_t channels = input.take<uint8_t>();
    const auto text = input.rest();

    std::istringstream in(std::string(text.begin(), text.end()));
    host::EventReader reader(in, (flags & 1) ? host::InputFormat::JsonLines : host::InputFormat::Csv, channels);
    std::vector<host::InputError> errors;
    for (size_t rows = 0; rows < kMaxRows; ++rows) {
        const auto row = reader.next(errors);
        if (!row)
            break;
        switch (row->kind) {
        case host::InputRow::Kind::Sample:
            useSample(*row);
            break;
        case host::InputRow::Kind::SetProperty:
            useProperty(*row);
            break;
        case host::InputRow::Kind::CopyEvent:
            break;
        }
    }
    for (const auto& error : errors)
        (void) error.describe("input");
    return 0;
}
