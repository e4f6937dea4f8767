// The per-event colour estimate against an independent double-precision
// reference, its guards, and the lines it logs.
#include "SolverReference.h"
#include "plugin/VantishPlugIn.h"
#include "support/TestSupport.h"

#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <cstdio>

using namespace colourtest;

namespace {

struct PlugIn {
    VantishPlugIn* p =
        static_cast<VantishPlugIn*>(VantishPlugInFactory(kCFAllocatorDefault, kIOHIDServiceFilterPlugInTypeID));
    ~PlugIn() { p->Release(); }
    VantishPlugIn* operator->() const { return p; }
};

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
void normaliseDatabase(VantishPlugIn* plugin, SpectralDatabase& db)
{
    int N = int(db.dbSampleCount), M = int(db.dbChannelCount);
    plugin->normalizedByEuklidNorm(db.dbChannelResponses.data(), N, M);
    db.channelStdDev.assign(M, 0.0f);
    plugin->calculateSTD(db.dbChannelResponses.data(), db.channelStdDev.data(), N, M);
    for (int j = 0; j < M; ++j)
        if (db.channelStdDev[j] != 0.0f)
            for (int i = 0; i < N; ++i)
                db.dbChannelResponses[size_t(j) * N + i] /= db.channelStdDev[j];
}

// The calculation written out in double precision with Eigen.
Eigen::Vector3d reference(const SpectralDatabase& db, std::vector<float> measured, bool normalised, double lambda,
                          double exponent = 2.0, double offset = double(0.00001f))
{
    int N = int(db.dbSampleCount), M = int(db.dbChannelCount);
    Eigen::VectorXd x(M);
    for (int j = 0; j < M; ++j)
        x(j) = measured[j];
    if (normalised)
        x.normalize();
    Problem p;
    p.N = N;
    p.M = M;
    p.R = db.dbChannelResponses;
    p.T = db.dbXYZ;
    p.w.resize(N);
    for (int i = 0; i < N; ++i) {
        Eigen::VectorXd q(M);
        for (int j = 0; j < M; ++j) {
            double sigma = normalised && !db.channelStdDev.empty() && db.channelStdDev[j] != 0.0f
                               ? db.channelStdDev[j]
                               : 1.0;
            q(j) = db.dbChannelResponses[size_t(j) * N + i] * sigma;
        }
        double cosine = q.dot(x) / (q.norm() * x.norm());
        p.w[i] = float(1.0 / std::pow(1.0 - cosine + offset, exponent));
    }
    if (normalised) {
        float largest = *std::max_element(p.w.begin(), p.w.end());
        for (float& w : p.w)
            w /= largest;
        for (int j = 0; j < M; ++j)
            if (!db.channelStdDev.empty() && db.channelStdDev[j] != 0.0f)
                x(j) /= db.channelStdDev[j];
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

} // namespace

TEST(ColourCalculation, RejectsMissingArgumentsSilently)
{
    PlugIn plugin;
    SpectralDatabase db = makeDatabase(50, 4, 1);
    std::vector<float> x = kMeasured4;
    XYZ xyz = {-1.0f, 2.0f, 3.0f};
    vt::LogCapture log;
    EXPECT_FALSE(plugin->colourCalculationDynamic(db, nullptr, xyz.data(), 4));
    EXPECT_FALSE(plugin->colourCalculationDynamic(db, x.data(), nullptr, 4));
    EXPECT_FALSE(plugin->colourCalculationDynamic(db, x.data(), xyz.data(), 0));
    EXPECT_FALSE(plugin->colourCalculationDynamic(db, x.data(), xyz.data(), -3));
    EXPECT_EQ(xyz, (XYZ{-1.0f, 2.0f, 3.0f}));
    EXPECT_TRUE(log.lines().empty());
}

TEST(ColourCalculation, RunsOnlyAgainstADatabaseMadeForTheChannels)
{
    PlugIn plugin;
    std::vector<float> x = kMeasured4;
    XYZ xyz = {-1.0f, 2.0f, 3.0f};
    vt::LogCapture log;
    SpectralDatabase empty;
    empty.allocate(0, 4);
    EXPECT_FALSE(plugin->colourCalculationDynamic(empty, x.data(), xyz.data(), 4));
    SpectralDatabase five = makeDatabase(50, 5, 2);
    EXPECT_FALSE(plugin->colourCalculationDynamic(five, x.data(), xyz.data(), 4));
    SpectralDatabase truncated = makeDatabase(50, 4, 3);
    truncated.dbXYZ.resize(100);
    EXPECT_FALSE(plugin->colourCalculationDynamic(truncated, x.data(), xyz.data(), 4));
    // Nothing published yet: the calculation against the object's database does nothing either.
    EXPECT_FALSE(plugin->colourCalculationDynamic(x.data(), xyz.data(), 4));
    EXPECT_EQ(xyz, (XYZ{-1.0f, 2.0f, 3.0f}));
    EXPECT_EQ(x, kMeasured4);
    EXPECT_TRUE(log.lines().empty());
}

TEST(ColourCalculation, AllZeroChannelsTakeTheShortcut)
{
    PlugIn plugin;
    plugin->lambdaConfigured = 1;
    plugin->lambda = 0.01f;
    SpectralDatabase db = makeDatabase(50, 4, 4);
    std::vector<float> x(4, 0.0f);
    XYZ xyz = {5.0f, 5.0f, 5.0f};
    vt::LogCapture log;
    EXPECT_TRUE(plugin->colourCalculationDynamic(db, x.data(), xyz.data(), 4));
    EXPECT_EQ(xyz, (XYZ{0.0f, 0.0f, 0.0f}));
    EXPECT_EQ(log.messages(), (std::vector<std::string>{"All channels are zero. Take a shortcut",
                                                        "Color: X=0.000000(0.000000) Y=0.000000(0.000000) "
                                                        "Z=0.000000(0.000000) \n"}));
}

TEST(ColourCalculation, RawModeMatchesTheReference)
{
    PlugIn plugin;
    for (int M : {4, 5}) {
        SpectralDatabase db = makeDatabase(400, M, 10u + M);
        std::vector<float> x = M == 4 ? kMeasured4 : kMeasured5;
        XYZ xyz{};
        EXPECT_TRUE(plugin->colourCalculationDynamic(db, x.data(), xyz.data(), M));
        expectClose(xyz, reference(db, M == 4 ? kMeasured4 : kMeasured5, false, 0.0), 1e-4);
        // Without normalisation the measurement is not touched.
        EXPECT_EQ(x, M == 4 ? kMeasured4 : kMeasured5);
    }
}

TEST(ColourCalculation, ClientLambdaWithoutNormalisationMatchesTheReference)
{
    // Raw weights reach far above 100, so the fit goes through the augmented system.
    PlugIn plugin;
    plugin->lambda = 0.5f;
    for (int M : {4, 5}) {
        SpectralDatabase db = makeDatabase(400, M, 20u + M);
        std::vector<float> x = M == 4 ? kMeasured4 : kMeasured5;
        XYZ xyz{};
        EXPECT_TRUE(plugin->colourCalculationDynamic(db, x.data(), xyz.data(), M));
        expectClose(xyz, reference(db, M == 4 ? kMeasured4 : kMeasured5, false, 0.5), 1e-4);
    }
}

TEST(ColourCalculation, NormalisedModeMatchesTheReference)
{
    PlugIn plugin;
    plugin->lambdaConfigured = 1;
    plugin->lambda = 0.01f;
    for (int M : {4, 5}) {
        SpectralDatabase db = makeDatabase(400, M, 30u + M);
        normaliseDatabase(plugin.p, db);
        std::vector<float> x = M == 4 ? kMeasured4 : kMeasured5;
        XYZ xyz{};
        EXPECT_TRUE(plugin->colourCalculationDynamic(db, x.data(), xyz.data(), M));
        expectClose(xyz, reference(db, M == 4 ? kMeasured4 : kMeasured5, true, 0.01), 1e-4);
    }
}

TEST(ColourCalculation, ChannelsWithoutSpreadStayUnscaled)
{
    PlugIn plugin;
    plugin->lambdaConfigured = 1;
    plugin->lambda = 0.01f;
    SpectralDatabase db = makeDatabase(300, 4, 40);
    normaliseDatabase(plugin.p, db);
    db.channelStdDev[2] = 0.0f; // as calibration leaves a channel that does not vary
    std::vector<float> x = kMeasured4;
    XYZ xyz{};
    EXPECT_TRUE(plugin->colourCalculationDynamic(db, x.data(), xyz.data(), 4));
    expectClose(xyz, reference(db, kMeasured4, true, 0.01), 1e-4);
    // The measurement's channel 2 is unit-length scaled only.
    EXPECT_FLOAT_EQ(x[2], kMeasured4[2] / float(Eigen::Vector4d(0.8, 0.3, 0.55, 0.2).norm()));
}

TEST(ColourCalculation, ScalingTheMeasurementKeepsTheWeights)
{
    PlugIn plugin;
    SpectralDatabase db = makeDatabase(400, 5, 50);
    auto colour = [&](float factor) {
        std::vector<float> x = kMeasured5;
        for (float& v : x)
            v *= factor;
        XYZ xyz{};
        EXPECT_TRUE(plugin->colourCalculationDynamic(db, x.data(), xyz.data(), 5));
        return xyz;
    };
    // Raw mode: the same fit applied to a scaled vector.
    XYZ one = colour(1.0f), many = colour(37.5f);
    for (int c = 0; c < 3; ++c)
        EXPECT_NEAR(many[c], 37.5f * one[c], 1e-5 * 37.5f * one[c]);
    // Normalised mode: the measurement's scale is gone before the fit.
    plugin->lambdaConfigured = 1;
    plugin->lambda = 0.01f;
    normaliseDatabase(plugin.p, db);
    one = colour(1.0f);
    many = colour(37.5f);
    for (int c = 0; c < 3; ++c)
        EXPECT_NEAR(many[c], one[c], 1e-5 * one[c]);
}

TEST(ColourCalculation, ZeroSampleVectorStopsTheCalculation)
{
    PlugIn plugin;
    SpectralDatabase db = makeDatabase(50, 4, 60);
    for (int j = 0; j < 4; ++j)
        db.dbChannelResponses[size_t(j) * 50 + 17] = 0.0f;
    std::vector<float> x = kMeasured4;
    XYZ xyz = {1.0f, -2.0f, 3.0f};
    vt::LogCapture log;
    EXPECT_FALSE(plugin->colourCalculationDynamic(db, x.data(), xyz.data(), 4));
    EXPECT_EQ(xyz, (XYZ{1.0f, 0.0f, 3.0f}));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, "QiQi x QtQt == 0.000000, can not proceed with color calculation \n"));
    EXPECT_EQ(log.messages().back(), "Color: X=1.000000(0.318310) Y=0.000000(0.000000) Z=3.000000(0.954930) \n");
    EXPECT_EQ(log.lines().size(), 2u);
}

TEST(ColourCalculation, ZeroDistanceStopsTheCalculation)
{
    PlugIn plugin;
    SpectralDatabase db = makeDatabase(50, 4, 70);
    // Sample 9 points exactly where the measurement does.
    const std::vector<float> direction = {1.0f, 2.0f, 3.0f, 4.0f};
    for (int j = 0; j < 4; ++j)
        db.dbChannelResponses[size_t(j) * 50 + 9] = direction[j];
    std::vector<float> x = direction;
    XYZ xyz = {-1.0f, -1.0f, 2.0f};
    // With the default offset the distance cannot reach zero.
    EXPECT_TRUE(plugin->colourCalculationDynamic(db, x.data(), xyz.data(), 4));
    plugin->weightOffset = 0.0f;
    xyz = {-1.0f, -1.0f, 2.0f};
    vt::LogCapture log;
    EXPECT_FALSE(plugin->colourCalculationDynamic(db, x.data(), xyz.data(), 4));
    EXPECT_EQ(xyz, (XYZ{0.0f, 0.0f, 2.0f}));
    EXPECT_EQ(log.messages(), (std::vector<std::string>{"di+c == 0, can not proceed with color calculation \n",
                                                        colourLine(xyz)}));
    EXPECT_EQ(log.lines().front().type, OS_LOG_TYPE_INFO);
}

TEST(ColourCalculation, NegativeComponentsAreReportedAsZero)
{
    PlugIn plugin;
    SpectralDatabase db = makeDatabase(200, 4, 80);
    // Z falls with channel 0 and rises with channel 3; a measurement strong in
    // channel 0 fits a negative Z.
    for (int i = 0; i < 200; ++i)
        db.dbXYZ[400 + i] = db.dbChannelResponses[600 + i] - 2.0f * db.dbChannelResponses[i];
    std::vector<float> x = {0.9f, 0.3f, 0.3f, 0.1f};
    ASSERT_LT(reference(db, x, false, 0.0)(2), 0.0 + 1e-12); // clamped in the reference too
    XYZ xyz{};
    EXPECT_TRUE(plugin->colourCalculationDynamic(db, x.data(), xyz.data(), 4));
    EXPECT_EQ(xyz[2], 0.0f);
    EXPECT_GT(xyz[0], 0.0f);
}

TEST(ColourCalculation, AFailedFitNeverBecomesAColour)
{
    // A client lambda far below zero makes the regularised matrix indefinite.
    PlugIn plugin;
    plugin->lambdaConfigured = 1;
    plugin->lambda = -1e6f;
    SpectralDatabase db = makeDatabase(100, 4, 90);
    normaliseDatabase(plugin.p, db);
    std::vector<float> x = kMeasured4;
    XYZ xyz = {4.0f, -5.0f, 6.0f};
    vt::LogCapture log;
    EXPECT_FALSE(plugin->colourCalculationDynamic(db, x.data(), xyz.data(), 4));
    EXPECT_EQ(xyz, (XYZ{4.0f, 0.0f, 6.0f}));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, "Color fit failed, can not proceed with color calculation \n"));
    EXPECT_EQ(log.messages().back(), colourLine(xyz));
}

TEST(ColourCalculation, NormalisedModeLogsItsSteps)
{
    PlugIn plugin;
    plugin->lambdaConfigured = 1;
    plugin->lambda = 0.01f;
    SpectralDatabase db = makeDatabase(60, 4, 100);
    normaliseDatabase(plugin.p, db);
    std::vector<float> x = {3.0f, 4.0f, 0.0f, 0.0f};
    XYZ xyz{};
    vt::LogCapture log;
    EXPECT_TRUE(plugin->colourCalculationDynamic(db, x.data(), xyz.data(), 4));
    std::vector<std::string> lines = log.messages();
    ASSERT_EQ(lines.size(), 3u);
    EXPECT_EQ(lines[0], "Normalization - Euklid norm = 5.000000\n");
    // The largest weight belongs to the sample closest in direction to (0.6, 0.8, 0, 0).
    double largest = 0.0;
    for (int i = 0; i < 60; ++i) {
        Eigen::Vector4d q;
        for (int j = 0; j < 4; ++j)
            q(j) = double(db.dbChannelResponses[size_t(j) * 60 + i]) * db.channelStdDev[j];
        double cosine = (0.6 * q(0) + 0.8 * q(1)) / q.norm();
        largest = std::max(largest, double(float(1.0 / std::pow(1.0 - cosine + double(0.00001f), 2.0))));
    }
    char expected[80];
    std::snprintf(expected, sizeof expected, "Normalization - Max WW = %f \n", largest);
    EXPECT_EQ(lines[1], expected);
    EXPECT_EQ(lines[2], colourLine(xyz));
    for (const VPLogLine& line : log.lines())
        EXPECT_EQ(line.type, OS_LOG_TYPE_DEBUG);
}
