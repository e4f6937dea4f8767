#include "host/evaluation/GlobalMatrixBaseline.h"

#include <stdexcept>
#include <string>

// LAPACK least squares by QR (OpenBLAS), column-major.
extern "C" void dgels_(const char* trans, const int* m, const int* n, const int* nrhs, double* a, const int* lda,
                       double* b, const int* ldb, double* work, const int* lwork, int* info);

namespace host {

GlobalMatrixBaseline::GlobalMatrixBaseline(const UnitSpectra& unit, const std::vector<const spectra::Source*>& sources)
{
    const int rows = int(sources.size());
    const int channels = int(unit.channelCount());
    if (channels == 0 || rows < channels)
        throw std::runtime_error("a global matrix needs at least as many reference sources as channels");

    // A: one reading per source (rows), B: its X, Y, Z at the reading's lux.
    std::vector<double> a(size_t(rows) * size_t(channels));
    std::vector<double> b(size_t(rows) * 3);
    for (int i = 0; i < rows; ++i) {
        const spectra::Spectrum& light = sources[size_t(i)]->spectrum;
        const SensorReading reading = synthesiseReading(unit, light, spectra::kReferenceLux);
        const spectra::Xyz xyz = spectra::tristimulus(spectra::atIlluminance(light, reading.lux));
        for (int c = 0; c < channels; ++c)
            a[size_t(c) * size_t(rows) + size_t(i)] = reading.channels[size_t(c)];
        b[size_t(i)] = xyz.X;
        b[size_t(rows) + size_t(i)] = xyz.Y;
        b[2 * size_t(rows) + size_t(i)] = xyz.Z;
    }

    const char trans = 'N';
    const int nrhs = 3;
    int info = 0;
    int lwork = -1;
    double optimal = 0;
    dgels_(&trans, &rows, &channels, &nrhs, a.data(), &rows, b.data(), &rows, &optimal, &lwork, &info);
    lwork = int(optimal);
    std::vector<double> work(size_t(std::max(lwork, 1)));
    dgels_(&trans, &rows, &channels, &nrhs, a.data(), &rows, b.data(), &rows, work.data(), &lwork, &info);
    if (info != 0)
        throw std::runtime_error("the global matrix fit failed (LAPACK dgels info " + std::to_string(info) +
                                 "): the channels do not tell the reference sources apart");

    // The solution's first `channels` rows of each right-hand side.
    for (int j = 0; j < 3; ++j)
        matrix_[size_t(j)].assign(b.begin() + j * rows, b.begin() + j * rows + channels);
}

std::optional<spectra::Xyz> GlobalMatrixBaseline::estimate(const SensorReading& reading) const
{
    std::array<double, 3> xyz{};
    for (size_t j = 0; j < 3; ++j)
        for (size_t c = 0; c < reading.channels.size() && c < matrix_[j].size(); ++c)
            xyz[j] += matrix_[j][c] * reading.channels[c];
    if (!(xyz[1] > 0))
        return std::nullopt;
    const double k = reading.lux / xyz[1];
    return spectra::Xyz{xyz[0] * k, reading.lux, xyz[2] * k};
}

} // namespace host
