#include "lightdb/LDBM.h"

#include <array>
#include <cmath>

namespace {

// Sensors have at most a handful of channels; the fold keeps one accumulator
// per channel on the stack.
constexpr int32_t kMaxChannels = 16;
// The near-infrared tail: the last 196 samples of the spectrum.
constexpr int kInfraredTailSamples = 196;
// Each source's responses are scaled so that their weighted sum is this.
constexpr double kResponseTotal = 300.0;

// Whether the record can take the row `id` of a `sampleCount`-sample spectrum
// without reading or writing outside its arrays.
bool fitsRecord(const Matrices& m, int id, int sampleCount)
{
    if (!m.xyzOut || id < 0 || id >= m.nSources)
        return false;
    if (m.nChannels < 1)
        return true;
    const int32_t rows = m.nChannels - m.firstChannel;
    return m.nChannels <= kMaxChannels && m.firstChannel >= 0 && rows >= 0 && rows <= m.responseRows &&
           (rows == 0 || m.responsesOut) && sampleCount >= 0 && sampleCount <= m.spectrumSamples() &&
           m.channelWeights.size() >= size_t(m.nChannels) &&
           (!m.irCompensation || m.irCoefficients.size() >= size_t(m.nChannels));
}

// Channel c's sensitivity at sample s, with the infrared tail scaled when asked.
double sensitivity(const Matrices& m, int s, int c, int tailStart)
{
    const int32_t raw = m.channelSpectra[size_t(s) * size_t(m.nChannels) + size_t(c)];
    if (m.irCompensation && s >= tailStart) {
        const float scaled = (float(raw) * m.nirFactor) * m.irCoefficients[size_t(c)];
        return double(scaled);
    }
    return double(raw);
}

} // namespace

int ProgressCallback(void* matrices, int id, float* xyz, float* spectrum, int sampleCount)
{
    const Matrices& m = *static_cast<const Matrices*>(matrices);
    if (!fitsRecord(m, id, sampleCount))
        return 1;

    const size_t n = size_t(m.nSources);
    m.xyzOut[id] = xyz[0];
    m.xyzOut[size_t(id) + n] = xyz[1];
    m.xyzOut[size_t(id) + 2 * n] = xyz[2];
    if (m.nChannels < 1)
        return 0;

    std::array<double, kMaxChannels> response{};
    const int tailStart = sampleCount - kInfraredTailSamples;
    for (int s = 0; s < sampleCount; ++s)
        for (int c = 0; c < m.nChannels; ++c)
            response[size_t(c)] += sensitivity(m, s, c, tailStart) * double(spectrum[s]);

    double total = 0.0;
    for (int c = 0; c < m.nChannels; ++c)
        total += response[size_t(c)] * double(m.channelWeights[size_t(c)]);

    // A source the weighted channels do not see at all (or a non-number)
    // means the channel spectra or weights are unusable: stop the build rather
    // than store infinite responses or a source that can never match. The
    // caller then keeps no database and writes no cache.
    if (total == 0.0 || !std::isfinite(total))
        return 1;

    for (int32_t j = 0; j < m.nChannels - m.firstChannel; ++j)
        m.responsesOut[size_t(id) + n * size_t(j)] =
            float((kResponseTotal / total) * response[size_t(m.firstChannel + j)]);
    return 0;
}
