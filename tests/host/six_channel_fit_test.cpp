// The six-channel sample unit (model sensor C6, XwCl device id 62, chip type
// 0) through the real plug-in, beside the same colour fit computed here in
// double precision straight from the model sensor: the reference sources
// folded with its channels and normalised to a lux-weighted sum over all six,
// the clear channel 0 left out of the similarity and the fit, every source
// weighted by its angular similarity to the reading. Any slip on the
// six-channel path (record entry or column mapping, first fitted channel,
// normaliser weights, which record channels the filter feeds to the fit)
// moves the plug-in away from this estimate. Where both are far from the
// truth (line spectra), the loss belongs to the sensor, not to the path.
#include "PlugInColour.h"
#include "common/TestSupport.h"
#include "host/emulator/Bundle.h"
#include "host/emulator/Unit.h"
#include "host/inputs/UnitSpectra.h"
#include "spectra/Catalogue.h"
#include "spectra/Colorimetry.h"
#include "spectra/SensorModel.h"
#include "spectra/TestLights.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>

// LAPACK least squares by QR (OpenBLAS), column-major.
extern "C" void dgels_(const char* trans, const int* m, const int* n, const int* nrhs, double* a, const int* lda,
                       double* b, const int* ldb, double* work, const int* lwork, int* info);

namespace {

namespace fs = std::filesystem;

constexpr size_t kFirstFitted = 1; // channel 0, the clear channel, only normalises
constexpr size_t kFitted = 5;
using Reading = std::array<double, kFitted>;

// The light's counts on the fitted channels, and the lux-weighted normaliser.
struct Folded {
    Reading fitted{};
    double weightedSum = 0;
};

class ModelFit {
public:
    ModelFit(const spectra::SensorModel& sensor, const std::vector<double>& luxCoefficients)
        : sensor_(sensor), luxCoefficients_(luxCoefficients)
    {
        for (const spectra::Source* source : spectra::referenceSources(spectra::ReferenceSet::Dense02)) {
            const Folded f = fold(source->spectrum);
            Reading r = f.fitted;
            for (double& v : r)
                v *= 300.0 / f.weightedSum;
            responses_.push_back(r);
            targets_.push_back(spectra::tristimulus(source->spectrum));
        }
    }

    Folded fold(const spectra::Spectrum& light) const
    {
        const std::vector<double> counts = spectra::channelResponses(sensor_, light);
        Folded f;
        for (size_t c = 0; c < counts.size(); ++c)
            f.weightedSum += luxCoefficients_[c] * counts[c];
        std::copy_n(counts.begin() + kFirstFitted, kFitted, f.fitted.begin());
        return f;
    }

    // Weighted least squares of XYZ on the fitted channels, weights
    // 1 / (1 - cos θ + 0.00001)², applied to the reading; negative components 0.
    spectra::Xyz estimate(const Reading& x) const
    {
        const int n = int(responses_.size());
        const int m = int(kFitted);
        std::vector<double> a(size_t(n) * kFitted), b(size_t(n) * 3);
        for (int i = 0; i < n; ++i) {
            const Reading& r = responses_[size_t(i)];
            double dot = 0, rr = 0, xx = 0;
            for (size_t j = 0; j < kFitted; ++j) {
                dot += r[j] * x[j];
                rr += r[j] * r[j];
                xx += x[j] * x[j];
            }
            const double d = 1.0 - dot / std::sqrt(rr * xx) + 0.00001;
            const double s = 1.0 / d; // √w
            for (size_t j = 0; j < kFitted; ++j)
                a[j * size_t(n) + size_t(i)] = s * r[j];
            const spectra::Xyz& t = targets_[size_t(i)];
            b[size_t(i)] = s * t.X;
            b[size_t(n) + size_t(i)] = s * t.Y;
            b[2 * size_t(n) + size_t(i)] = s * t.Z;
        }
        const char trans = 'N';
        const int nrhs = 3;
        int info = 0, lwork = -1;
        double optimal = 0;
        dgels_(&trans, &n, &m, &nrhs, a.data(), &n, b.data(), &n, &optimal, &lwork, &info);
        lwork = int(optimal);
        std::vector<double> work(size_t(std::max(lwork, 1)));
        dgels_(&trans, &n, &m, &nrhs, a.data(), &n, b.data(), &n, work.data(), &lwork, &info);
        EXPECT_EQ(info, 0);
        std::array<double, 3> xyz{};
        for (size_t c = 0; c < 3; ++c)
            for (size_t j = 0; j < kFitted; ++j)
                xyz[c] += b[c * size_t(n) + j] * x[j];
        return {std::max(0.0, xyz[0]), std::max(0.0, xyz[1]), std::max(0.0, xyz[2])};
    }

private:
    const spectra::SensorModel& sensor_;
    std::vector<double> luxCoefficients_;
    std::vector<Reading> responses_;
    std::vector<spectra::Xyz> targets_;
};

double distance(const spectra::Xyz& a, const spectra::Xyz& b)
{
    return spectra::deltaUvPrime(spectra::uvPrime(spectra::chromaticity(a)),
                                 spectra::uvPrime(spectra::chromaticity(b)));
}

TEST(SixChannelUnit, PlugInGivesTheFitOfItsFiveColourChannels)
{
    const fs::path data = fs::path(vt::sourceDir()) / "data";
    const host::DeviceDescription description = host::loadDeviceDescription(data / "devices/xwcl-62/device.json");
    const spectra::SensorModel sensor = spectra::loadSensorModel(data / "sensors/colour6.csv");
    ASSERT_EQ(sensor.channelCount(), kFirstFitted + kFitted);
    const ModelFit fit(sensor, host::loadUnitSpectra(description).luxCoefficients);

    vt::DeviceRoots roots;
    const host::Bundle bundle(vt::bundleDir());
    host::Unit unit(description);
    host::PlugInSession session(bundle, unit);
    ASSERT_EQ(session.match(), 1000);
    session.open();
    session.waitForQueuedWork();

    for (const spectra::Source& light : spectra::testLights()) {
        SCOPED_TRACE(light.name);
        // All six channels as the driver reports them, the strongest at 2000 counts.
        std::vector<double> counts = spectra::channelResponses(sensor, light.spectrum);
        const double scale = 2000.0 / *std::max_element(counts.begin(), counts.end());
        for (double& c : counts)
            c *= scale;
        const auto plugIn = vt::plugInColour(session, counts, 100.0);
        ASSERT_TRUE(plugIn) << "the event was not coloured";
        ASSERT_NEAR(plugIn->Y, 100.0, 0.01);

        const spectra::Xyz expected = fit.estimate(fit.fold(light.spectrum).fitted);
        EXPECT_LT(distance(*plugIn, expected), 1e-4);
    }
}

} // namespace
