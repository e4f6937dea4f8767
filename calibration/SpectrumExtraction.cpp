#include "calibration/SpectrumExtraction.h"

#include "calibration/Calibration.h"
#include "formats/VD6287Layout.h"
#include "formats/XwCAT2Layout.h"
#include "formats/XwClLayout.h"
#include "support/LittleEndian.h"
#include "support/Log.h"

namespace calib {
namespace {

constexpr unsigned kSamples = 401; // samples per channel spectrum in every factory layout

// Where a record keeps its channel spectra and lux coefficients.
struct StoredSpectra {
    std::span<const uint8_t> bytes;
    size_t first;         // sample 0 of stored channel 0
    size_t stride;        // bytes from one stored channel to the next
    size_t sampleSize;    // 2 (sign-extended) or 4
    unsigned channels;    // stored channels
    size_t weights;       // lux coefficient of stored channel 0
    unsigned weightSlots; // stored lux coefficients
    double weightDivisor;

    int32_t sample(unsigned channel, unsigned s) const
    {
        const size_t at = first + stride * channel + sampleSize * s;
        return sampleSize == 2 ? int32_t(le::get<int16_t>(bytes, at)) : le::get<int32_t>(bytes, at);
    }
    float weight(unsigned channel) const
    {
        return float(double(le::get<int32_t>(bytes, weights + 4 * channel)) / weightDivisor);
    }
};

// Chip types 1 and 2 leave stored channel 0 out of the columns: column c is
// stored channel c + 1, and the last column also carries stored channel 0
// (type 2) or counts twice (type 1).
bool foldsFirstChannel(uint32_t chipType) { return chipType == 1 || chipType == 2; }

int32_t columnSample(const StoredSpectra& sp, bool fold, uint32_t chipType, unsigned c, unsigned columns, unsigned s)
{
    if (!fold)
        return sp.sample(c, s);
    const int32_t value = sp.sample(c + 1, s);
    if (c + 1 != columns)
        return value;
    return chipType == 1 ? 2 * value : value + sp.sample(0, s);
}

bool fill(Calibration& p, Matrices& m, const StoredSpectra& sp, bool fold, bool infoLog)
{
    const uint32_t chipType = p.unit().chipType.load();
    const uint32_t weightCount = p.unit().numberOfChannels.load();
    const unsigned columns = m.nChannels > 0 ? unsigned(m.nChannels) : 0;
    const unsigned storedNeeded = fold ? columns + 1 : columns;
    if (columns < 1 || storedNeeded > sp.channels || weightCount < columns || weightCount > sp.weightSlots) {
        VLOG_ERROR("Calibration data hold no spectra for %d columns of chip type %u with %u weights\n", m.nChannels,
                   chipType, weightCount);
        return false;
    }

    p.unit().spectrumSampleCount = kSamples;
    m.channelSpectra.assign(size_t(kSamples) * columns, 0);
    for (unsigned s = 0; s < kSamples; ++s)
        for (unsigned c = 0; c < columns; ++c)
            m.channelSpectra[size_t(s) * columns + c] = columnSample(sp, fold, chipType, c, columns, s);
    m.channelWeights.resize(weightCount);
    for (unsigned c = 0; c < weightCount; ++c)
        m.channelWeights[c] = sp.weight(c);
    m.irCompensation = 0;
    m.nirFactor = 1.0f;
    m.irCoefficients.clear();

    if (infoLog)
        VLOG_INFO("Algo version: %d NSamples: %u\n", int(p.unit().algoVersion.load()),
                  p.unit().spectrumSampleCount.load());
    else
        VLOG_DEFAULT("Algo version: %d NSamples: %u\n", int(p.unit().algoVersion.load()),
                     p.unit().spectrumSampleCount.load());
    return true;
}

// The data of `data` when it is exactly `size` bytes long.
std::span<const uint8_t> bytesOfSize(CFDataRef data, size_t size)
{
    if (!data || CFDataGetLength(data) != CFIndex(size))
        return {};
    return {CFDataGetBytePtr(data), size};
}

} // namespace

bool extractXwClSpectrum(Calibration& p, std::span<const uint8_t> data, size_t entryOffset, Matrices& m)
{
    using namespace stored::xwcl;
    if (!le::fits(data.size(), entryOffset, kEntrySize))
        return false;
    const StoredSpectra sp{.bytes = data.subspan(entryOffset, kEntrySize),
                           .first = entry::spectrum,
                           .stride = entry::spectrumStride,
                           .sampleSize = 2,
                           .channels = kStoredChannels,
                           .weights = entry::luxCoeff,
                           .weightSlots = kStoredChannels,
                           .weightDivisor = 65536.0};
    return fill(p, m, sp, foldsFirstChannel(p.unit().chipType.load()), true);
}

} // namespace calib

bool Calibration::processQVTSpectrumXwCAT2(CFDataRef data, Matrices& matrices)
{
    using namespace stored::xwca;
    VLOG_DEFAULT("Process QVT calibration spectrum");
    const std::span<const uint8_t> bytes = calib::bytesOfSize(data, kSize);
    if (bytes.empty()) {
        VLOG_ERROR("QVT calibration data doesn't match with size of VD6286 structure (length = %ld)",
                   data ? long(CFDataGetLength(data)) : 0L);
        return false;
    }
    const calib::StoredSpectra sp{.bytes = bytes,
                                  .first = spectrum,
                                  .stride = spectrumStride,
                                  .sampleSize = 4,
                                  .channels = kStoredSpectra,
                                  .weights = luxCoeff,
                                  .weightSlots = kMaxChannels,
                                  .weightDivisor = 2147483648.0};
    return calib::fill(*this, matrices, sp, false, false);
}

bool Calibration::processQVTSpectrumVD6287_XwClv3(CFDataRef data, Matrices& matrices)
{
    using namespace stored::vd6287;
    VLOG_DEFAULT("Process QVT calibration spectrum");
    const std::span<const uint8_t> bytes = calib::bytesOfSize(data, kV3Size);
    if (bytes.empty()) {
        VLOG_ERROR("QVT calibration data doesn't match with size of VD6287 structure (length = %ld)",
                   data ? long(CFDataGetLength(data)) : 0L);
        return false;
    }
    // Spectra and weights come from the first blob only.
    const calib::StoredSpectra sp{.bytes = bytes.subspan(v3BlobOffset(0), kV3BlobSize),
                                  .first = blob::spectrum,
                                  .stride = blob::spectrumStride,
                                  .sampleSize = 2,
                                  .channels = kStoredSpectra,
                                  .weights = blob::luxCoeff,
                                  .weightSlots = kChannels,
                                  .weightDivisor = 65536.0};
    return calib::fill(*this, matrices, sp, false, false);
}
