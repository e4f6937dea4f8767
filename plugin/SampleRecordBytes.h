// Where an ALS event carries the driver's sample record.
#pragma once

#include <IOKit/hid/IOHIDEvent.h>

#include <cstdint>
#include <span>

// The record bytes of an ALS event: the vendor data of its first child, as
// long as the child's announced length. Empty when the event has no child,
// the child no data, or the length is not positive.
std::span<uint8_t> sampleRecordBytes(IOHIDEventRef event);
