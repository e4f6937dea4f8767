// The spectral sensitivity of a unit's channels as its calibration stores
// them: what the plug-in folds the reference light sources with, and what
// synthetic readings of the unit are computed from.
//
// The calibration is found the way the plug-in finds it at bring-up: the
// registry blob "alsCalibration" (entry for the unit's orientation, with the
// infrared compensation of "alsAuxCalibration") when the service asks for
// configuration-supplied calibration, else the first factory-store class the
// plug-in reads ("XwCA" then "XwCl", or "XwCM" then "XwCA" on Dravik OS).
// Records are decoded with the record codec (host/recordcodec/RecordCodec.h).
#pragma once

#include "host/emulator/DeviceDescription.h"
#include "spectra/Catalogue.h"
#include "spectra/Grid.h"

#include <cstdint>
#include <stdexcept>
#include <string>
#include <vector>

namespace host {

// The unit has no usable stored spectra; the message names the file and why.
class UnitSpectraError : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

struct UnitSpectra {
    // Where the spectra were read, e.g. "factory store class XwCA (…/store/XwCA, factory-xwca-t2)".
    std::string origin;
    // One sensitivity per channel the driver reports (c0, c1, …), in stored
    // units per grid sample; samples the calibration does not store are zero.
    // Channels are mapped and scaled exactly as the plug-in folds them (the
    // chip-type column mapping of XwCl records, the compensated near-infrared
    // tail of registry units with an auxiliary blob).
    std::vector<spectra::Spectrum> channels;
    // The calibration's lux coefficients (lux per count) per reported channel:
    // the weights of the plug-in's response normaliser; 0 for a channel
    // outside it.
    std::vector<double> luxCoefficients;
    // The reference light sources the plug-in folds for this unit.
    spectra::ReferenceSet referenceSet = spectra::ReferenceSet::Default;

    size_t channelCount() const { return channels.size(); }
};

// Throws UnitSpectraError when the unit has no stored spectra (no factory
// record and no registry calibration, the default calibration forced, a
// record the plug-in cannot use) or a record cannot be read or decoded.
UnitSpectra loadUnitSpectra(const DeviceDescription& unit);

// The unit's orientation as the plug-in reads it: the 32-bit little-endian
// "IOHIDOrientationType" of the service's registry entry or its parents, else 1.
uint32_t unitOrientation(const DeviceDescription& unit);

} // namespace host
