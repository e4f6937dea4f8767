// The generic four-channel spectrum step: channel spectra and weights from the
// entry's spectrum block, optional infrared compensation from
// "alsAuxCalibration", then the reference scan.
#include "calibration/Calibration.h"
#include "support/LittleEndian.h"
#include "support/Log.h"
#include "sysconfig/DatabaseBuild.h"

#include <algorithm>
#include <cstdlib>

namespace sysconfig {

namespace {

// The near-infrared tail of a 401-sample spectrum starts here (196 samples).
constexpr size_t kFirstNirSample = 205;

// Largest magnitude of the spectra over the near-infrared samples. Kept as an
// int: -32768 has magnitude 32768, which a 16-bit value would turn negative and
// with it the sign of the whole compensated tail.
int nirMaximum(const Matrices& matrices, unsigned nSamples)
{
    int maximum = 0;
    const size_t channels = size_t(matrices.nChannels);
    for (size_t s = kFirstNirSample; s < nSamples; ++s)
        for (size_t c = 0; c < channels; ++c)
            maximum = std::max(maximum, std::abs(matrices.channelSpectra[s * channels + c]));
    return maximum;
}

// Sets up the tail scaling when the auxiliary blob has an entry for this
// orientation; anything malformed leaves the spectra uncompensated.
void applyInfraredCompensation(const Calibration& calibration, CFTypeRef auxBlob, unsigned nSamples, Matrices& matrices)
{
    VLOG_INFO("ALS auxiliary calibration found \n");
    if (CFGetTypeID(auxBlob) != CFDataGetTypeID())
        return;
    const auto bytes = bytesOf(static_cast<CFDataRef>(auxBlob));
    const auto header = ALSCalibrationHeader::decode(bytes);
    if (!header) {
        VLOG_ERROR("alsAuxCalibration of %ld bytes is shorter than its header.\n", long(bytes.size()));
        return;
    }
    const auto entry =
        findCalibrationEntry(bytes, header->entryCount, calibration.unit().orientation, "alsAuxCalibration");
    if (!entry)
        return;
    if (entry->bytes.size() < aux::kEntrySize) {
        VLOG_ERROR("alsAuxCalibration entry of %u bytes is too short for its coefficients (%u bytes).\n",
                   unsigned(entry->subHeader.entrySize), unsigned(aux::kEntrySize));
        return;
    }

    matrices.irCompensation = 1;
    matrices.irCoefficients.assign(size_t(matrices.nChannels), 0.0f);
    for (size_t k = 0; k < aux::kCoefficientCount && k < matrices.irCoefficients.size(); ++k)
        matrices.irCoefficients[k] = float(le::get<int32_t>(entry->bytes, aux::kCoefficients + 4 * k)) / 1000000.0f;
    const int nirMax = nirMaximum(matrices, nSamples);
    matrices.nirFactor = nirMax != 0 ? 32767.0f / float(nirMax) : 1.0f;
    VLOG_INFO("IR compensation coeffs: R=%f G=%f B=%f C=%f | NIR max: %d | NIR factor: %f\n ",
              double(matrices.irCoefficients[0]), double(matrices.irCoefficients[1]),
              double(matrices.irCoefficients[2]), double(matrices.irCoefficients[3]), nirMax,
              double(matrices.nirFactor));
}

} // namespace

bool buildGenericSpectrum(Calibration& calibration, bool asyncCreate, std::span<const uint8_t> entry, uint8_t revision,
                          CFTypeRef auxBlob, Matrices& matrices, const std::shared_ptr<SpectralDatabase>& db)
{
    if (matrices.nChannels != int32_t(generic::kSpectrumChannels))
        return false;
    const unsigned nGains = le::get<uint8_t>(entry, generic::kGainCount);
    if (nGains != 8 && nGains != 9) {
        VLOG_ERROR("Calibration entry has %u gains; its spectrum block follows 8 or 9.\n", nGains);
        return false;
    }
    const auto layout = genericEntryLayout(entry, revision);
    if (!layout)
        return false;
    const auto block = entry.subspan(layout->spectrumOffset, layout->spectrumSize);
    const unsigned nSamples = le::get<uint16_t>(block, generic::kSpectrumSampleCount);
    if (nSamples > kMaxSpectrumSamples) {
        VLOG_ERROR("Calibration spectrum declares %u samples; at most %u are supported.\n", nSamples,
                   kMaxSpectrumSamples);
        return false;
    }

    const uint8_t algoOverride = calibration.unit().colorAlgoOverride;
    calibration.unit().algoVersion = algoOverride != 0 ? algoOverride : le::get<uint8_t>(block, generic::kSpectrumAlgo);
    calibration.unit().spectrumSampleCount = nSamples;

    // Four channels per spectral sample, as stored (the step runs for four-channel sensors).
    constexpr size_t channels = generic::kSpectrumChannels;
    matrices.channelSpectra.resize(size_t(nSamples) * channels);
    for (size_t i = 0; i < matrices.channelSpectra.size(); ++i)
        matrices.channelSpectra[i] = le::get<int16_t>(block, layout->spectraOffset + 2 * i);
    matrices.channelWeights.assign(size_t(matrices.nChannels), 0.0f);
    for (size_t c = 0; c < channels && c < matrices.channelWeights.size(); ++c)
        matrices.channelWeights[c] = float(le::get<int32_t>(block, generic::kSpectrumWeights + 4 * c)) / 1000000.0f;

    if (auxBlob)
        applyInfraredCompensation(calibration, auxBlob, nSamples, matrices);

    VLOG_INFO("Algo version: %d NSamples: %d\n", int(calibration.unit().algoVersion.load()), int(nSamples));
    return finishDatabaseBuild(calibration, asyncCreate, matrices, db);
}

} // namespace sysconfig
