// Unit length for sample vectors, per-row deviations and the matrix product,
// with the lines they log.
#include "plugin/VantishPlugIn.h"
#include "support/TestSupport.h"

#include <gtest/gtest.h>

#include <cmath>

namespace {

struct PlugIn {
    VantishPlugIn* p =
        static_cast<VantishPlugIn*>(VantishPlugInFactory(kCFAllocatorDefault, kIOHIDServiceFilterPlugInTypeID));
    ~PlugIn() { p->Release(); }
    VantishPlugIn* operator->() const { return p; }
};

} // namespace

TEST(EuklidNorm, ScalesEachSampleToUnitLength)
{
    PlugIn plugin;
    vt::LogCapture log;
    float v[2] = {3.0f, 4.0f};
    plugin->normalizedByEuklidNorm(v, 1, 2);
    EXPECT_EQ(v[0], 0.6f);
    EXPECT_EQ(v[1], 0.8f);
    EXPECT_EQ(log.messages(), std::vector<std::string>{"Normalization - Euklid norm = 5.000000\n"});
    // The float pair (0.6, 0.8) is slightly longer than 1, so it is scaled again.
    plugin->normalizedByEuklidNorm(v, 1, 2);
    EXPECT_EQ(log.lines().size(), 2u);

    // A 2 x 3 matrix: three samples, each a column with stride 3.
    float m[6] = {3.0f, 1.0f, 0.0f, 4.0f, 0.0f, 0.0f};
    log.clear();
    plugin->normalizedByEuklidNorm(m, 3, 2);
    const float want[6] = {0.6f, 1.0f, 0.0f, 0.8f, 0.0f, 0.0f};
    for (int k = 0; k < 6; ++k)
        EXPECT_EQ(m[k], want[k]) << k;
    // Only the first sample needed scaling; unit and zero samples log nothing.
    EXPECT_EQ(log.messages(), std::vector<std::string>{"Normalization - Euklid norm = 5.000000\n"});
    EXPECT_EQ(log.lines().front().type, OS_LOG_TYPE_DEBUG);

    log.clear();
    plugin->normalizedByEuklidNorm(nullptr, 1, 2);
    plugin->normalizedByEuklidNorm(v, 0, 2);
    EXPECT_TRUE(log.lines().empty());
}

TEST(StandardDeviation, PopulationFormPerRow)
{
    PlugIn plugin;
    vt::LogCapture log;
    float rows[8] = {1, 2, 3, 4, 7, 7, 7, 7};
    float out[2] = {-1.0f, -1.0f};
    plugin->calculateSTD(rows, out, 4, 2);
    EXPECT_FLOAT_EQ(out[0], std::sqrt(1.25f));
    EXPECT_EQ(out[1], 0.0f);
    EXPECT_EQ(log.messages(), (std::vector<std::string>{"Standard deviation[0]: 1.118034\n",
                                                        "Standard deviation[1]: 0.000000\n"}));

    float untouched[1] = {-1.0f};
    plugin->calculateSTD(rows, untouched, 0, 1);
    plugin->calculateSTD(rows, untouched, 4, 0);
    plugin->calculateSTD(nullptr, untouched, 4, 1);
    plugin->calculateSTD(rows, nullptr, 4, 1);
    EXPECT_EQ(untouched[0], -1.0f);
}

TEST(MatrixProduct, RowMajorWithSizeCheck)
{
    PlugIn plugin;
    float A[12] = {1, 2, 3, 4, 0, 1, 0, 1, -1, 0.5f, 2, 0};
    float B[5] = {1, 2, 3, 4, 5};
    float C[3] = {9, 9, 9};
    EXPECT_TRUE(plugin->multiplyMatrices(A, 3, 4, B, 4, 1, C));
    EXPECT_EQ(C[0], 30.0f);
    EXPECT_EQ(C[1], 6.0f);
    EXPECT_EQ(C[2], 6.0f);

    float untouched[3] = {9, 9, 9};
    vt::LogCapture log;
    EXPECT_FALSE(plugin->multiplyMatrices(A, 3, 4, B, 5, 1, untouched));
    EXPECT_EQ(untouched[0], 9.0f);
    EXPECT_EQ(untouched[2], 9.0f);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "wrong matrix size \n"));
    // Nothing to compute is still a match.
    EXPECT_TRUE(plugin->multiplyMatrices(A, 0, 4, B, 4, 1, untouched));
}
