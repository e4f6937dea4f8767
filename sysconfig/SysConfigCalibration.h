// Calibration supplied by the device configuration: the "alsCalibration" blob
// (and "alsAuxCalibration") on the service's registry entry or an ancestor.
// The entry for the unit's orientation becomes the driver's calibration record
// and the source of the per-chip database, loaded from its cache or built from
// the entry's channel spectra. Runs on the instance's Calibration part, under
// its lock.
#pragma once

#include "calibration/Calibration.h"
#include "lightdb/Matrices.h"
#include "lightdb/SpectralDatabase.h"
#include "sysconfig/SysConfigFormat.h"

#include <CoreFoundation/CoreFoundation.h>

#include <memory>

// The whole path: with `pushCalibration` the driver record is handed to the
// driver, with `processDatabase` the per-chip database is loaded or built (its
// cache written by a queued task when `asyncCreate`).
bool processSysConfigCalibration(Calibration& calibration, bool asyncCreate, bool pushCalibration,
                                 bool processDatabase);
// The 193-byte driver record of the VD6286 entry at `entryOffset` of `blob`
// (and the unit's channel counts set from it), or null.
CFOwned<CFDataRef> processSysConfigSensorCalibrationVD6286(Calibration& calibration, CFDataRef blob, long entryOffset,
                                                           const ALSCalibrationHeader& header,
                                                           const ALSCalibrationSubHeader& subHeader);
// The VD6286 entry's channel spectra into `matrices`, then the reference scan
// into `build` (the private database `matrices` points into), published once
// complete.
bool processSysConfigSpectrumVD6286(Calibration& calibration, bool asyncCreate, CFDataRef blob, long entryOffset,
                                    const ALSCalibrationSubHeader& subHeader, Matrices& matrices,
                                    const std::shared_ptr<SpectralDatabase>& build);
