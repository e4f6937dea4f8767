// A synthetic reading through the plug-in on an opened unit, exactly as
// `vantish run` passes a row of its input: the reading as a CSV row, read by
// the same reader (so every field it leaves out takes the same default), made
// into the driver's ALS event and filtered through the loaded bundle.
#pragma once

#include "host/inputs/SyntheticReading.h"
#include "host/vantish/ClientColour.h"
#include "host/vantish/OpenedUnit.h"

namespace vantish {

ClientColour filterReading(OpenedUnit& opened, const host::SensorReading& reading);

} // namespace vantish
