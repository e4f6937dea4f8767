// The per-event colour estimate: a locally weighted, ridge-regularised linear
// fit of X, Y, Z against the per-chip database. Every database sample is
// weighted by how closely its channel vector points in the measured direction,
// the solver fits a channel-to-XYZ matrix to the weighted samples, and the
// matrix is applied to the measurement.
#include "colour/ColourCalculation.h"

#include "colour/MatrixUtilities.h"
#include "colour/SimdTargets.h"
#include "colour/SolverSupport.h"
#include "support/Log.h"

#include <algorithm>
#include <cmath>

using solver::allocateArray;

namespace {

constexpr double kPi = 3.141592653589793;

// The settings as the weights use them: exponent and offset widened once.
struct WeightSettings {
    double exponent;
    double offset;
};

// The database has samples, is made for channelCount channels (as many as
// the fit supports), and its arrays hold what its counts promise.
bool databaseFits(const SpectralDatabase& db, int channelCount)
{
    size_t N = db.dbSampleCount;
    size_t M = db.dbChannelCount;
    return N > 0 && M == size_t(channelCount) && channelCount <= kSolverMaxChannels && db.dbXYZ.size() >= 3 * N &&
           db.dbChannelResponses.size() >= M * N && (db.channelStdDev.empty() || db.channelStdDev.size() >= M);
}

bool allZero(const float* channels, int count)
{
    for (int j = 0; j < count; ++j)
        if (channels[j] != 0.0f)
            return false;
    return true;
}

// Samples are weighed in chunks: the per-sample sums of a chunk are formed
// channel by channel over contiguous rows, then turned into weights, both
// loops free of branches so that they vectorise. The guards are then checked
// in sample order, so the first offender is the one reported.
constexpr size_t kChunk = 64;

struct SimilarityInput {
    const float* responses; // M x N, channel-major
    size_t N;
    int M;
    double x[kSolverMaxChannels];     // the measurement, widened
    double scale[kSolverMaxChannels]; // sigma_j undoing the database scaling, or 1
    double measuredSquares;           // the same for every sample
    double exponent;
    double offset;
};

struct ChunkSums {
    double dot[kChunk];      // sample . measurement
    double squares[kChunk];  // sample . sample
    double distance[kChunk]; // 1 - cosine + offset
};

[[gnu::always_inline]] inline void sumChunk(const SimilarityInput& in, size_t start, size_t count, ChunkSums& sums)
{
    for (size_t k = 0; k < count; ++k)
        sums.dot[k] = sums.squares[k] = 0.0;
    for (int j = 0; j < in.M; ++j) {
        const float* row = in.responses + j * in.N + start;
        const double xj = in.x[j], scale = in.scale[j];
        for (size_t k = 0; k < count; ++k) {
            double q = double(row[k]) * scale;
            sums.dot[k] += q * xj;
            sums.squares[k] += q * q;
        }
    }
}

// The exponent 2 is a product: the correctly rounded square that pow stands
// for, without the cost of a general power.
template <bool Squared>
[[gnu::always_inline]] inline void chunkWeights(const SimilarityInput& in, ChunkSums& sums, size_t count,
                                                float* weights)
{
    for (size_t k = 0; k < count; ++k) {
        double product = sums.squares[k] * in.measuredSquares;
        double d = 1.0 - sums.dot[k] / std::sqrt(product) + in.offset;
        sums.distance[k] = d;
        double power = Squared ? d * d : std::pow(d, in.exponent);
        weights[k] = static_cast<float>(1.0 / power);
    }
}

// Whether a guard may fire in the chunk (a zero product or distance): a
// branch-free count, so that the sample-by-sample check runs only then.
[[gnu::always_inline]] inline bool chunkSuspicious(const SimilarityInput& in, const ChunkSums& sums, size_t count)
{
    int zeros = 0;
    for (size_t k = 0; k < count; ++k)
        zeros += int(sums.squares[k] * in.measuredSquares == 0.0) + int(sums.distance[k] == 0.0);
    return zeros != 0;
}

// Logs the first sample of the chunk for which a guard fires; false if none does.
bool guardFired(const SimilarityInput& in, const ChunkSums& sums, size_t count)
{
    for (size_t k = 0; k < count; ++k) {
        double product = sums.squares[k] * in.measuredSquares;
        if (product == 0.0) {
            VLOG_INFO("QiQi x QtQt == %f, can not proceed with color calculation \n", product);
            return true;
        }
        if (sums.distance[k] == 0.0) {
            VLOG_INFO("di+c == 0, can not proceed with color calculation \n");
            return true;
        }
    }
    return false;
}

// The weights chunk by chunk; false at the first chunk in which a guard fires.
// Compiled once per SimdLevel (colour/SimdTargets.h).
template <bool Squared>
[[gnu::always_inline]] inline bool weighChunks(const SimilarityInput& in, float* weights)
{
    ChunkSums sums;
    for (size_t start = 0; start < in.N; start += kChunk) {
        size_t count = std::min(kChunk, in.N - start);
        sumChunk(in, start, count, sums);
        chunkWeights<Squared>(in, sums, count, weights + start);
        if (chunkSuspicious(in, sums, count) && guardFired(in, sums, count))
            return false;
    }
    return true;
}

[[gnu::always_inline]] inline bool weighSamples(const SimilarityInput& in, bool squared, float* weights)
{
    return squared ? weighChunks<true>(in, weights) : weighChunks<false>(in, weights);
}

VANTISH_SIMD_VARIANTS(weighSamplesAt, weighSamples, bool, (const SimilarityInput& in, bool squared, float* weights),
                      (in, squared, weights))

// 1 / (1 - cos(angle between measurement and sample) + c)^p for every sample,
// in double precision. sigma, when given, undoes the per-channel scaling of
// the database (channels with sigma 0 were left unscaled). Stops at the first
// chunk in which a guard fires.
bool similarityWeights(const SpectralDatabase& db, const float* channels, int M, const float* sigma,
                       const WeightSettings& settings, float* weights)
{
    SimilarityInput in{
        db.dbChannelResponses.data(), db.dbSampleCount, M, {}, {}, 0.0, settings.exponent, settings.offset};
    for (int j = 0; j < M; ++j) {
        in.x[j] = channels[j];
        in.measuredSquares += in.x[j] * in.x[j];
        in.scale[j] = sigma && sigma[j] != 0.0f ? double(sigma[j]) : 1.0;
    }
    return weighSamplesAt(activeSimdLevel(), in, settings.exponent == 2.0, weights);
}

// The largest weight, or 0 when none is above 0. Comparing the floats orders
// them as their widened values would; sixteen running maxima keep the loop off
// one dependency chain and give the same answer, the maximum being the same
// in any order (a NaN is never taken).
[[gnu::always_inline]] inline float largestWeight(const float* weights, size_t N)
{
    constexpr size_t kLanes = 16;
    float lanes[kLanes] = {};
    size_t i = 0;
    for (; i + kLanes <= N; i += kLanes)
        for (size_t l = 0; l < kLanes; ++l)
            lanes[l] = weights[i + l] > lanes[l] ? weights[i + l] : lanes[l];
    for (; i < N; ++i)
        lanes[0] = weights[i] > lanes[0] ? weights[i] : lanes[0];
    float largest = lanes[0];
    for (size_t l = 1; l < kLanes; ++l)
        largest = lanes[l] > largest ? lanes[l] : largest;
    return largest;
}

// Divides every weight by the largest (in double precision); returns the
// largest. Compiled once per SimdLevel.
[[gnu::always_inline]] inline float scaleWeights(size_t N, float* weights)
{
    const float largest = largestWeight(weights, N);
    if (largest != 0.0f) {
        const double divisor = largest;
        for (size_t i = 0; i < N; ++i)
            weights[i] = static_cast<float>(weights[i] / divisor);
    }
    return largest;
}

VANTISH_SIMD_VARIANTS(scaleWeightsAt, scaleWeights, float, (size_t N, float* weights), (N, weights))

// Scales the weights so that the largest is 1 and puts the measurement into
// the sigma-scaled space of the database.
void normaliseWeightsAndMeasurement(size_t N, float* weights, float* channels, int M, const float* sigma)
{
    const float largest = scaleWeightsAt(activeSimdLevel(), N, weights);
    VLOG_DEBUG("Normalization - Max WW = %f \n", double(largest));
    if (sigma)
        for (int j = 0; j < M; ++j)
            if (sigma[j] != 0.0f)
                channels[j] /= sigma[j];
}

bool coefficientsFinite(const float* coefficients, int M)
{
    for (int j = 0; j < M; ++j)
        for (int c = 0; c < 3; ++c)
            if (!std::isfinite(coefficients[4 * j + c]))
                return false;
    return true;
}

void clampAndLog(float* xyz)
{
    for (int c = 0; c < 3; ++c)
        if (xyz[c] < 0.0f)
            xyz[c] = 0.0f;
    VLOG_DEBUG("Color: X=%f(%f) Y=%f(%f) Z=%f(%f) \n", double(xyz[0]), xyz[0] / kPi, double(xyz[1]), xyz[1] / kPi,
               double(xyz[2]), xyz[2] / kPi);
}

} // namespace

bool colourCalculationDynamic(const SpectralDatabase& db, const FitSettings& settings, float* channels, float* xyz,
                              int channelCount)
{
    if (!channels || !xyz || channelCount < 1)
        return false;
    // No fit without a database made for this many channels.
    if (!databaseFits(db, channelCount))
        return false;
    if (allZero(channels, channelCount)) {
        xyz[0] = xyz[1] = xyz[2] = 0.0f;
        VLOG_DEBUG("All channels are zero. Take a shortcut");
        clampAndLog(xyz);
        return true;
    }

    const WeightSettings weighting{double(settings.weightExponent), double(settings.weightOffset)};
    const int M = channelCount;
    const size_t N = db.dbSampleCount;
    const float* sigma = settings.normalised ? db.stdDevOrNull() : nullptr;
    if (settings.normalised)
        normalizedByEuklidNorm(channels, 1, M);

    auto weights = allocateArray<float>(N);
    auto coefficients = allocateArray<float>(size_t(4) * M);
    auto transform = allocateArray<float>(size_t(3) * M);
    bool fitted = false;
    if (!weights || !coefficients || !transform) {
        VLOG_ERROR("Color calculation is out of memory \n");
    } else if (similarityWeights(db, channels, M, sigma, weighting, weights.get())) {
        if (settings.normalised)
            normaliseWeightsAndMeasurement(N, weights.get(), channels, M, sigma);
        hybridSolveWithRegularization(int(N), M, db.dbXYZ.data(), weights.get(), db.dbChannelResponses.data(),
                                      coefficients.get(), settings.lambda);
        // A failed solve leaves NaN; a colour is never made from it.
        fitted = coefficientsFinite(coefficients.get(), M);
        if (!fitted)
            VLOG_INFO("Color fit failed, can not proceed with color calculation \n");
    }
    if (fitted) {
        for (int c = 0; c < 3; ++c)
            for (int j = 0; j < M; ++j)
                transform[size_t(c) * M + j] = coefficients[size_t(4) * j + c];
        multiplyMatrices(transform.get(), 3, unsigned(M), channels, unsigned(M), 1, xyz);
    }
    clampAndLog(xyz);
    return fitted;
}
