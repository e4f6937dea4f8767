// The unit's channel spectra and what the per-chip build needs besides them,
// handed to the reference-database scan as its consumer's user data. Filled by
// the calibration code, consumed by ProgressCallback.
#pragma once

#include "lightdb/SpectralDatabase.h"

#include <cstdint>
#include <vector>

struct Matrices {
    float* xyzOut = nullptr;             // destination of XX (3 x nSources), not owned
    float* responsesOut = nullptr;       // destination of RR ((nChannels - firstChannel) x nSources), not owned
    int32_t nSources = 0;                // N
    int32_t responseRows = 0;            // rows of nSources floats that responsesOut holds
    int32_t nChannels = 0;               // channel columns of channelSpectra
    int32_t firstChannel = 0;            // first channel that becomes an RR row; earlier ones only normalise
    uint8_t irCompensation = 0;          // scale the near-infrared tail of the spectra
    float nirFactor = 0.0f;              // common factor of that scaling
    std::vector<int32_t> channelSpectra; // sample-major: [s * nChannels + c]
    std::vector<float> channelWeights;   // nChannels weights of the normaliser
    std::vector<float> irCoefficients;   // nChannels tail factors, or empty

    // Points the outputs at a database sized by SpectralDatabase::allocate.
    void bindOutputs(SpectralDatabase& db)
    {
        xyzOut = db.dbXYZ.data();
        responsesOut = db.dbChannelResponses.data();
        nSources = int32_t(db.dbSampleCount);
        responseRows = int32_t(db.dbChannelCount);
    }

    // Spectral samples per channel held in channelSpectra.
    int32_t spectrumSamples() const { return nChannels > 0 ? int32_t(channelSpectra.size() / size_t(nChannels)) : 0; }
};
