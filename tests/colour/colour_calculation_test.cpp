// The per-event colour estimate against an independent double-precision
// reference, its guards, and the lines it logs; and the matrix helpers it uses.
#include "SolverReference.h"
#include "colour/ColourCalculation.h"
#include "colour/MatrixUtilities.h"
#include "colour/SimdLevel.h"
#include "colour/Solvers.h"
#include "common/TestSupport.h"

#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <optional>

using namespace colourtest;

namespace {

using XYZ = std::array<float, 3>;

// Light sources with positive channel responses; X, Y, Z a mildly non-linear
// function of them, so the local weighting matters.
SpectralDatabase makeDatabase(int N, int M, unsigned seed)
{
    std::mt19937 rng(seed);
    std::uniform_real_distribution<float> response(0.05f, 1.0f);
    SpectralDatabase db;
    db.allocate(N, M);
    for (int i = 0; i < N; ++i) {
        float sum = 0.0f;
        for (int j = 0; j < M; ++j) {
            float r = response(rng);
            db.dbChannelResponses[size_t(j) * N + i] = r;
            sum += r;
        }
        for (int c = 0; c < 3; ++c) {
            float t = 0.0f;
            for (int j = 0; j < M; ++j)
                t += float((c + 2 * j) % 5 + 1) * db.dbChannelResponses[size_t(j) * N + i];
            db.dbXYZ[size_t(c) * N + i] = t + 0.2f * sum * sum / float(M);
        }
    }
    return db;
}

// What calibration does before publishing in normalised mode: unit-length
// samples, then each channel row divided by its deviation.
void normaliseDatabase(SpectralDatabase& db)
{
    int N = int(db.dbSampleCount), M = int(db.dbChannelCount);
    normalizedByEuklidNorm(db.dbChannelResponses.data(), N, M);
    db.channelStdDev.assign(M, 0.0f);
    calculateSTD(db.dbChannelResponses.data(), db.channelStdDev.data(), N, M);
    for (int j = 0; j < M; ++j)
        if (db.channelStdDev[j] != 0.0f)
            for (int i = 0; i < N; ++i)
                db.dbChannelResponses[size_t(j) * N + i] /= db.channelStdDev[j];
}

// The channel deviation the calculation scales by, 1 where there is none.
double deviation(const SpectralDatabase& db, int j, bool normalised)
{
    return normalised && !db.channelStdDev.empty() && db.channelStdDev[j] != 0.0f ? db.channelStdDev[j] : 1.0;
}

// Each sample's weight, 1 / (1 - cos(sample, x) + offset)^2, in float as the calculation keeps them.
std::vector<float> referenceWeights(const SpectralDatabase& db, const Eigen::VectorXd& x, bool normalised)
{
    int N = int(db.dbSampleCount), M = int(db.dbChannelCount);
    std::vector<float> w(N);
    for (int i = 0; i < N; ++i) {
        Eigen::VectorXd q(M);
        for (int j = 0; j < M; ++j)
            q(j) = db.dbChannelResponses[size_t(j) * N + i] * deviation(db, j, normalised);
        double cosine = q.dot(x) / (q.norm() * x.norm());
        w[i] = float(1.0 / std::pow(1.0 - cosine + double(0.00001f), 2.0));
    }
    return w;
}

// The calculation written out in double precision with Eigen.
Eigen::Vector3d reference(const SpectralDatabase& db, std::vector<float> measured, bool normalised, double lambda)
{
    int M = int(db.dbChannelCount);
    Eigen::VectorXd x = Eigen::Map<const Eigen::VectorXf>(measured.data(), M).cast<double>();
    if (normalised)
        x.normalize();
    Problem p;
    p.N = int(db.dbSampleCount);
    p.M = M;
    p.R = db.dbChannelResponses;
    p.T = db.dbXYZ;
    p.w = referenceWeights(db, x, normalised);
    if (normalised) {
        float largest = *std::max_element(p.w.begin(), p.w.end());
        for (float& w : p.w)
            w /= largest;
        for (int j = 0; j < M; ++j)
            x(j) /= deviation(db, j, true);
    }
    Eigen::Vector3d xyz = closedForm(p, lambda).transpose() * x;
    return xyz.cwiseMax(0.0);
}

void expectClose(const XYZ& got, const Eigen::Vector3d& want, double tolerance)
{
    for (int c = 0; c < 3; ++c)
        EXPECT_NEAR(got[c], want(c), tolerance * want.cwiseAbs().maxCoeff()) << "component " << c;
}

std::string colourLine(const XYZ& xyz)
{
    char line[160];
    std::snprintf(line, sizeof line, "Color: X=%f(%f) Y=%f(%f) Z=%f(%f) \n", double(xyz[0]), xyz[0] / M_PI,
                  double(xyz[1]), xyz[1] / M_PI, double(xyz[2]), xyz[2] / M_PI);
    return line;
}

const std::vector<float> kMeasured4 = {0.8f, 0.3f, 0.55f, 0.2f};
const std::vector<float> kMeasured5 = {0.2f, 0.9f, 0.4f, 0.35f, 0.6f};

const std::vector<float>& measured(int M) { return M == 4 ? kMeasured4 : kMeasured5; }

// Normalised mode with the lambda a configured device uses.
void useNormalisedMode(FitSettings& fit)
{
    fit.normalised = 1;
    fit.lambda = 0.01f;
}

} // namespace

TEST(ColourCalculation, RejectsBadArgumentsAndForeignDatabasesSilently)
{
    FitSettings fit;
    SpectralDatabase db = makeDatabase(50, 4, 1);
    std::vector<float> x = kMeasured4;
    XYZ xyz = {-1.0f, 2.0f, 3.0f};
    vt::LogCapture log;
    EXPECT_FALSE(colourCalculationDynamic(db, fit, nullptr, xyz.data(), 4));
    EXPECT_FALSE(colourCalculationDynamic(db, fit, x.data(), nullptr, 4));
    EXPECT_FALSE(colourCalculationDynamic(db, fit, x.data(), xyz.data(), 0));
    EXPECT_FALSE(colourCalculationDynamic(db, fit, x.data(), xyz.data(), -3));
    SpectralDatabase empty;
    empty.allocate(0, 4);
    EXPECT_FALSE(colourCalculationDynamic(empty, fit, x.data(), xyz.data(), 4));
    SpectralDatabase five = makeDatabase(50, 5, 2);
    EXPECT_FALSE(colourCalculationDynamic(five, fit, x.data(), xyz.data(), 4));
    SpectralDatabase truncated = makeDatabase(50, 4, 3);
    truncated.dbXYZ.resize(100);
    EXPECT_FALSE(colourCalculationDynamic(truncated, fit, x.data(), xyz.data(), 4));
    // Nothing published yet: the calculation against the object's database does nothing either.
    EXPECT_EQ(xyz, (XYZ{-1.0f, 2.0f, 3.0f}));
    EXPECT_EQ(x, kMeasured4);
    EXPECT_TRUE(log.lines().empty());
}

TEST(ColourCalculation, AllZeroChannelsTakeTheShortcut)
{
    FitSettings fit;
    useNormalisedMode(fit);
    SpectralDatabase db = makeDatabase(50, 4, 4);
    std::vector<float> x(4, 0.0f);
    XYZ xyz = {5.0f, 5.0f, 5.0f};
    vt::LogCapture log;
    EXPECT_TRUE(colourCalculationDynamic(db, fit, x.data(), xyz.data(), 4));
    EXPECT_EQ(xyz, (XYZ{0.0f, 0.0f, 0.0f}));
    EXPECT_EQ(log.messages(), (std::vector<std::string>{"All channels are zero. Take a shortcut",
                                                        "Color: X=0.000000(0.000000) Y=0.000000(0.000000) "
                                                        "Z=0.000000(0.000000) \n"}));
}

TEST(ColourCalculation, EveryModeMatchesTheReference)
{
    struct Mode {
        const char* what;
        bool configured; // normalised, with the configured lambda
        float lambda;
        unsigned seed;
    };
    // A client lambda without normalisation: raw weights reach far above 100,
    // so the fit goes through the augmented system.
    for (const Mode& mode : {Mode{"raw", false, 0.0f, 10}, Mode{"raw with client lambda", false, 0.5f, 20},
                             Mode{"normalised", true, 0.01f, 30}}) {
        for (int M : {4, 5}) {
            SCOPED_TRACE(testing::Message() << mode.what << ", M=" << M);
            FitSettings fit;
            fit.normalised = mode.configured;
            fit.lambda = mode.lambda;
            SpectralDatabase db = makeDatabase(400, M, mode.seed + M);
            if (mode.configured)
                normaliseDatabase(db);
            std::vector<float> x = measured(M);
            XYZ xyz{};
            EXPECT_TRUE(colourCalculationDynamic(db, fit, x.data(), xyz.data(), M));
            expectClose(xyz, reference(db, measured(M), mode.configured, mode.lambda), 1e-4);
            // Without normalisation the measurement is not touched.
            if (!mode.configured) {
                EXPECT_EQ(x, measured(M));
            }
        }
    }
}

TEST(ColourCalculation, ChannelsWithoutSpreadStayUnscaled)
{
    FitSettings fit;
    useNormalisedMode(fit);
    SpectralDatabase db = makeDatabase(300, 4, 40);
    normaliseDatabase(db);
    db.channelStdDev[2] = 0.0f; // as calibration leaves a channel that does not vary
    std::vector<float> x = kMeasured4;
    XYZ xyz{};
    EXPECT_TRUE(colourCalculationDynamic(db, fit, x.data(), xyz.data(), 4));
    expectClose(xyz, reference(db, kMeasured4, true, 0.01), 1e-4);
    // The measurement's channel 2 is unit-length scaled only.
    EXPECT_FLOAT_EQ(x[2], kMeasured4[2] / float(Eigen::Vector4d(0.8, 0.3, 0.55, 0.2).norm()));
}

TEST(ColourCalculation, ScalingTheMeasurementKeepsTheWeights)
{
    FitSettings fit;
    SpectralDatabase db = makeDatabase(400, 5, 50);
    auto colour = [&](float factor) {
        std::vector<float> x = kMeasured5;
        for (float& v : x)
            v *= factor;
        XYZ xyz{};
        EXPECT_TRUE(colourCalculationDynamic(db, fit, x.data(), xyz.data(), 5));
        return xyz;
    };
    // Raw mode: the same fit applied to a scaled vector.
    XYZ one = colour(1.0f), many = colour(37.5f);
    for (int c = 0; c < 3; ++c)
        EXPECT_NEAR(many[c], 37.5f * one[c], 1e-5 * 37.5f * one[c]);
    // Normalised mode: the measurement's scale is gone before the fit.
    useNormalisedMode(fit);
    normaliseDatabase(db);
    one = colour(1.0f);
    many = colour(37.5f);
    for (int c = 0; c < 3; ++c)
        EXPECT_NEAR(many[c], one[c], 1e-5 * one[c]);
}

TEST(ColourCalculation, NegativeComponentsAreReportedAsZero)
{
    FitSettings fit;
    SpectralDatabase db = makeDatabase(200, 4, 80);
    // Z falls with channel 0 and rises with channel 3; a measurement strong in
    // channel 0 fits a negative Z.
    for (int i = 0; i < 200; ++i)
        db.dbXYZ[400 + i] = db.dbChannelResponses[600 + i] - 2.0f * db.dbChannelResponses[i];
    std::vector<float> x = {0.9f, 0.3f, 0.3f, 0.1f};
    ASSERT_LT(reference(db, x, false, 0.0)(2), 0.0 + 1e-12); // clamped in the reference too
    XYZ xyz{};
    EXPECT_TRUE(colourCalculationDynamic(db, fit, x.data(), xyz.data(), 4));
    EXPECT_EQ(xyz[2], 0.0f);
    EXPECT_GT(xyz[0], 0.0f);
}

// A calculation that stops: what the caller's result held is kept, but Y
// is zeroed and negatives clamped, and the reason is logged just before the colour.
static void expectStopped(FitSettings& fit, const SpectralDatabase& db, std::vector<float> x, const std::string& reason,
                          size_t lineCount = 2)
{
    XYZ xyz = {-1.0f, -2.0f, 3.0f};
    vt::LogCapture log;
    EXPECT_FALSE(colourCalculationDynamic(db, fit, x.data(), xyz.data(), int(x.size())));
    EXPECT_EQ(xyz, (XYZ{0.0f, 0.0f, 3.0f}));
    std::vector<std::string> lines = log.messages();
    ASSERT_EQ(lines.size(), lineCount);
    EXPECT_EQ(
        std::vector<std::string>(lines.end() - 2, lines.end()),
        (std::vector<std::string>{reason, "Color: X=0.000000(0.000000) Y=0.000000(0.000000) Z=3.000000(0.954930) \n"}));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, reason));
}

TEST(ColourCalculation, ZeroSampleVectorStopsTheCalculation)
{
    FitSettings fit;
    SpectralDatabase db = makeDatabase(50, 4, 60);
    for (int j = 0; j < 4; ++j)
        db.dbChannelResponses[size_t(j) * 50 + 17] = 0.0f;
    expectStopped(fit, db, kMeasured4, "QiQi x QtQt == 0.000000, can not proceed with color calculation \n");
}

TEST(ColourCalculation, ZeroDistanceStopsTheCalculation)
{
    FitSettings fit;
    SpectralDatabase db = makeDatabase(50, 4, 70);
    // Sample 9 points exactly where the measurement does.
    const std::vector<float> direction = {1.0f, 2.0f, 3.0f, 4.0f};
    for (int j = 0; j < 4; ++j)
        db.dbChannelResponses[size_t(j) * 50 + 9] = direction[j];
    std::vector<float> x = direction;
    XYZ xyz{};
    // With the default offset the distance cannot reach zero.
    EXPECT_TRUE(colourCalculationDynamic(db, fit, x.data(), xyz.data(), 4));
    fit.weightOffset = 0.0f;
    expectStopped(fit, db, direction, "di+c == 0, can not proceed with color calculation \n");
}

TEST(ColourCalculation, AFailedFitNeverBecomesAColour)
{
    // A client lambda far below zero makes the regularised matrix indefinite.
    FitSettings fit;
    fit.normalised = 1;
    fit.lambda = -1e6f;
    SpectralDatabase db = makeDatabase(100, 4, 90);
    normaliseDatabase(db);
    // Normalised mode logs its two steps first.
    expectStopped(fit, db, kMeasured4, "Color fit failed, can not proceed with color calculation \n", 4);
}

TEST(ColourCalculation, NormalisedModeLogsItsSteps)
{
    FitSettings fit;
    useNormalisedMode(fit);
    SpectralDatabase db = makeDatabase(60, 4, 100);
    normaliseDatabase(db);
    std::vector<float> x = {3.0f, 4.0f, 0.0f, 0.0f};
    XYZ xyz{};
    vt::LogCapture log;
    EXPECT_TRUE(colourCalculationDynamic(db, fit, x.data(), xyz.data(), 4));
    std::vector<std::string> lines = log.messages();
    ASSERT_EQ(lines.size(), 3u);
    EXPECT_EQ(lines[0], "Normalization - Euklid norm = 5.000000\n");
    std::vector<float> weights = referenceWeights(db, Eigen::Vector4d(0.6, 0.8, 0.0, 0.0), true);
    double largest = *std::max_element(weights.begin(), weights.end());
    char expected[80];
    std::snprintf(expected, sizeof expected, "Normalization - Max WW = %f \n", largest);
    EXPECT_EQ(lines[1], expected);
    EXPECT_EQ(lines[2], colourLine(xyz));
    for (const VPLogLine& line : log.lines())
        EXPECT_EQ(line.type, OS_LOG_TYPE_DEBUG);
}

TEST(EuklidNorm, ScalesEachSampleToUnitLength)
{
    vt::LogCapture log;
    float v[2] = {3.0f, 4.0f};
    normalizedByEuklidNorm(v, 1, 2);
    EXPECT_EQ(v[0], 0.6f);
    EXPECT_EQ(v[1], 0.8f);
    EXPECT_EQ(log.messages(), std::vector<std::string>{"Normalization - Euklid norm = 5.000000\n"});
    // The float pair (0.6, 0.8) is slightly longer than 1, so it is scaled again.
    normalizedByEuklidNorm(v, 1, 2);
    EXPECT_EQ(log.lines().size(), 2u);

    // A 2 x 3 matrix: three samples, each a column with stride 3.
    float m[6] = {3.0f, 1.0f, 0.0f, 4.0f, 0.0f, 0.0f};
    log.clear();
    normalizedByEuklidNorm(m, 3, 2);
    const float want[6] = {0.6f, 1.0f, 0.0f, 0.8f, 0.0f, 0.0f};
    for (int k = 0; k < 6; ++k)
        EXPECT_EQ(m[k], want[k]) << k;
    // Only the first sample needed scaling; unit and zero samples log nothing.
    EXPECT_EQ(log.messages(), std::vector<std::string>{"Normalization - Euklid norm = 5.000000\n"});
    EXPECT_EQ(log.lines().front().type, OS_LOG_TYPE_DEBUG);

    log.clear();
    normalizedByEuklidNorm(nullptr, 1, 2);
    normalizedByEuklidNorm(v, 0, 2);
    EXPECT_TRUE(log.lines().empty());
}

TEST(StandardDeviation, PopulationFormPerRow)
{
    vt::LogCapture log;
    float rows[8] = {1, 2, 3, 4, 7, 7, 7, 7};
    float out[2] = {-1.0f, -1.0f};
    calculateSTD(rows, out, 4, 2);
    EXPECT_FLOAT_EQ(out[0], std::sqrt(1.25f));
    EXPECT_EQ(out[1], 0.0f);
    EXPECT_EQ(log.messages(),
              (std::vector<std::string>{"Standard deviation[0]: 1.118034\n", "Standard deviation[1]: 0.000000\n"}));

    float untouched[1] = {-1.0f};
    calculateSTD(rows, untouched, 0, 1);
    calculateSTD(rows, untouched, 4, 0);
    calculateSTD(nullptr, untouched, 4, 1);
    calculateSTD(rows, nullptr, 4, 1);
    EXPECT_EQ(untouched[0], -1.0f);
}

TEST(MatrixProduct, RowMajorWithSizeCheck)
{
    float A[12] = {1, 2, 3, 4, 0, 1, 0, 1, -1, 0.5f, 2, 0};
    float B[5] = {1, 2, 3, 4, 5};
    float C[3] = {9, 9, 9};
    EXPECT_TRUE(multiplyMatrices(A, 3, 4, B, 4, 1, C));
    EXPECT_EQ(C[0], 30.0f);
    EXPECT_EQ(C[1], 6.0f);
    EXPECT_EQ(C[2], 6.0f);

    float untouched[3] = {9, 9, 9};
    vt::LogCapture log;
    EXPECT_FALSE(multiplyMatrices(A, 3, 4, B, 5, 1, untouched));
    EXPECT_EQ(untouched[0], 9.0f);
    EXPECT_EQ(untouched[2], 9.0f);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "wrong matrix size \n"));
    // Nothing to compute is still a match.
    EXPECT_TRUE(multiplyMatrices(A, 0, 4, B, 4, 1, untouched));
}

// Every vector level this processor runs gives the bits of the baseline build:
// the fit as a whole in each mode, and the weighted sums on their own (sizes
// that leave every tail of the eight-, four- and two-lane blocks).
TEST(SimdLevels, EveryLevelGivesTheBaselineBits)
{
    struct ForcedLevel {
        explicit ForcedLevel(SimdLevel level) { forceSimdLevel(level); }
        ~ForcedLevel() { forceSimdLevel(std::nullopt); }
    };
    std::vector<SimdLevel> levels{SimdLevel::Baseline};
    for (SimdLevel level : {SimdLevel::Avx2, SimdLevel::Avx512})
        if (int(level) <= int(detectedSimdLevel()))
            levels.push_back(level);

    struct Mode {
        bool normalised;
        float lambda, exponent;
    };
    for (int N : {203, 1000}) {
        SpectralDatabase raw = makeDatabase(N, 5, 40u + unsigned(N));
        SpectralDatabase normalised = raw;
        normaliseDatabase(normalised);
        for (const Mode& mode :
             {Mode{false, 0.0f, 2.0f}, Mode{true, 0.01f, 2.0f}, Mode{false, 0.01f, 2.0f}, Mode{false, 0.0f, 1.7f}}) {
            const FitSettings fit{mode.exponent, 0.00001f, mode.lambda, mode.normalised};
            const SpectralDatabase& db = mode.normalised ? normalised : raw;
            std::vector<XYZ> results;
            for (SimdLevel level : levels) {
                ForcedLevel forced(level);
                std::vector<float> x = kMeasured5;
                XYZ xyz{};
                EXPECT_TRUE(colourCalculationDynamic(db, fit, x.data(), xyz.data(), 5));
                results.push_back(xyz);
            }
            for (size_t l = 1; l < results.size(); ++l)
                EXPECT_EQ(std::memcmp(results[l].data(), results[0].data(), sizeof(XYZ)), 0)
                    << simdLevelName(levels[l]) << " N=" << N << " lambda=" << mode.lambda;
        }

        std::vector<float> w(static_cast<size_t>(N));
        for (int i = 0; i < N; ++i)
            w[size_t(i)] = 0.25f + float(i % 7);
        std::vector<std::vector<float>> sums;
        for (SimdLevel level : levels) {
            ForcedLevel forced(level);
            for (int count : {N, N - 1, N - 2, N - 5}) {
                std::vector<float> out(4 * 5 + 15, 0.0f);
                weightedCrossProduct(count, 5, raw.dbXYZ.data(), N, w.data(), raw.dbChannelResponses.data(), N,
                                     out.data());
                weightedGramPacked(count, 5, raw.dbChannelResponses.data(), N, w.data(), out.data() + 20);
                sums.push_back(out);
            }
        }
        for (size_t s = 4; s < sums.size(); ++s)
            EXPECT_EQ(std::memcmp(sums[s].data(), sums[s % 4].data(), sums[s].size() * sizeof(float)), 0) << s;
    }
    std::printf("vector levels compared: %zu (this processor: %s)\n", levels.size(),
                simdLevelName(detectedSimdLevel()));
}
