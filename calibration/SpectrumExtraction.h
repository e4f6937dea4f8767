// Channel spectra and weights of the per-chip build, taken from the factory
// record the driver record was made from. The XwCA T2 and VD6287 variants are
// members of the plug-in; the XwCl variant reads the entry the in-place parse
// used.
#pragma once

#include "calibration/Calibration.h"
#include "lightdb/Matrices.h"

#include <cstddef>
#include <cstdint>
#include <span>

namespace calib {

// Fills the spectra, weights and tail settings of `matrices` (whose nChannels
// the caller has set) from the XwCl entry at `entryOffset`. False, with
// nothing filled, when the columns asked for do not exist in the entry.
bool extractXwClSpectrum(Calibration& calibration, std::span<const uint8_t> data, size_t entryOffset,
                         Matrices& matrices);

} // namespace calib
