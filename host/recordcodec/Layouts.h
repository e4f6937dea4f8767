// The field walks of every calibration layout the codec knows: the factory
// records, the registry calibration blobs and the driver records.
#pragma once

#include "formats/DriverRecordLayouts.h"
#include "host/recordcodec/FieldLayout.h"

namespace recordcodec {

// Factory-data store records.
void describeXwCl(const Describer& d);
void describeXwCAT2(const Describer& d);
void describeVD6287v3(const Describer& d);
void describeVD6287v1(const Describer& d);

// Registry blobs "alsCalibration" and "alsAuxCalibration".
void describeAlsCalibration(const Describer& d);
void describeAlsAuxCalibration(const Describer& d);

// Driver records.
void describeChannelRecord(const Describer& d, const driver::ChannelRecordLayout& layout);
void describeVD6287Record(const Describer& d);
void describeColorCalibration(const Describer& d);

} // namespace recordcodec
