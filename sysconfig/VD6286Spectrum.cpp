// Channel spectra of a VD6286 registry entry (chip type 3, five channels),
// then the reference scan. No infrared compensation for this chip.
#include "support/LittleEndian.h"
#include "support/Log.h"
#include "sysconfig/SysConfigCalibration.h"

#include "calibration/Calibration.h"
#include "sysconfig/DatabaseBuild.h"

using namespace sysconfig;

bool processSysConfigSpectrumVD6286(Calibration& calibration, bool asyncCreate, CFDataRef blob, long entryOffset,
                                    const ALSCalibrationSubHeader& subHeader, Matrices& matrices,
                                    const std::shared_ptr<SpectralDatabase>& build)
{
    const auto located = vd6286::entryAt(blob, entryOffset, subHeader.entrySize);
    if (!located)
        return false;
    const auto entry = *located;
    const size_t channels = size_t(matrices.nChannels);
    const unsigned nSamples = le::get<uint16_t>(entry, vd6286::kSampleCount);
    if (channels == 0 || channels > vd6286::kMaxChannels || nSamples > kMaxSpectrumSamples ||
        nSamples * channels > vd6286::kMaxSpectrumValues) {
        VLOG_ERROR("Calibration spectrum of %u samples and %u channels does not fit the entry (at most %u samples, "
                   "%u values).\n",
                   nSamples, unsigned(channels), kMaxSpectrumSamples, unsigned(vd6286::kMaxSpectrumValues));
        return false;
    }

    const uint8_t algoOverride = calibration.unit().colorAlgoOverride;
    calibration.unit().algoVersion = algoOverride != 0 ? algoOverride : le::get<uint8_t>(entry, vd6286::kAlgo);
    calibration.unit().spectrumSampleCount = nSamples;

    matrices.channelSpectra.resize(nSamples * channels);
    for (size_t i = 0; i < matrices.channelSpectra.size(); ++i)
        matrices.channelSpectra[i] = le::get<int16_t>(entry, vd6286::kSpectra + 2 * i);
    matrices.channelWeights.resize(channels);
    for (size_t c = 0; c < channels; ++c)
        matrices.channelWeights[c] = float(le::get<int32_t>(entry, vd6286::kWeights + 4 * c)) / 1000000.0f;

    VLOG_INFO("Algo version: %d NSamples: %d\n", int(calibration.unit().algoVersion.load()), int(nSamples));
    return finishDatabaseBuild(calibration, asyncCreate, matrices, build);
}
