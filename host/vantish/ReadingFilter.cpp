#include "host/vantish/ReadingFilter.h"

#include "host/emulator/DriverSample.h"
#include "host/inputs/EventInput.h"
#include "support/CFOwned.h"

#include <sstream>
#include <stdexcept>

namespace vantish {

ClientColour filterReading(OpenedUnit& opened, const host::SensorReading& reading)
{
    std::stringstream csv;
    host::writeReadingsCsvHeader(csv, reading.channels.size());
    host::writeReadingCsv(csv, reading);
    host::EventReader reader(csv, host::InputFormat::Csv, opened.channelCount());
    std::vector<host::InputError> errors;
    const std::optional<host::InputRow> row = reader.next(errors);
    if (!row || !errors.empty())
        throw std::logic_error("a synthetic reading did not read back: " +
                               (errors.empty() ? std::string("no row") : errors.front().describe("reading")));

    const CFOwned<IOHIDEventRef> event(host::createALSEvent(row->record, uint64_t(row->timeSeconds * 1e9)));
    opened.session->filter(event.get());
    return readClientColour(event.get(), row->record);
}

} // namespace vantish
