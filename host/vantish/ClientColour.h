// The colour of one ALS event as the event system's clients receive it, after
// the plug-in's filter: the level, X, Y, Z (from the event's colour fields, or
// from the driver's record when the sample asked for that), the colour space,
// and whether the plug-in treated the sample as a light spike.
#pragma once

#include "formats/ALSSampleRecord.h"

#include <IOKit/hid/IOHIDEvent.h>

#include <string>

namespace vantish {

struct ClientColour {
    std::string index; // the sample's number, or "copy"
    double lux = 0, X = 0, Y = 0, Z = 0;
    long colorSpace = 0;
    bool spike = false;
};

// Reads a filtered event; `input` is the record the driver sent with it.
ClientColour readClientColour(IOHIDEventRef event, const ALSSampleRecord& input);

} // namespace vantish
