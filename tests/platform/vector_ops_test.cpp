#include <Accelerate/Accelerate.h>

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <vector>

namespace {

TEST(VectorOps, MaxvHonoursStrideAndEmptyInput)
{
    const float a[] = {1.0f, 50.0f, -3.0f, 70.0f, 2.5f, 90.0f};
    float c = 0;
    vDSP_maxv(a, 2, &c, 3);
    EXPECT_EQ(c, 2.5f);
    vDSP_maxv(a, 1, &c, 6);
    EXPECT_EQ(c, 90.0f);
    const float negative[] = {-7.0f, -2.0f, -9.0f};
    vDSP_maxv(negative, 1, &c, 3);
    EXPECT_EQ(c, -2.0f);
    vDSP_maxv(a, 1, &c, 0);
    EXPECT_EQ(c, -std::numeric_limits<float>::infinity());
}

TEST(VectorOps, MaxvOverANaNIsNaN)
{
    const float nan = std::numeric_limits<float>::quiet_NaN();
    const float first[] = {nan, 5.0f, 200.0f};
    const float later[] = {5.0f, 200.0f, nan};
    float c = 0;
    vDSP_maxv(first, 1, &c, 3);
    EXPECT_TRUE(std::isnan(c));
    vDSP_maxv(later, 1, &c, 3);
    EXPECT_TRUE(std::isnan(c));
}

TEST(VectorOps, VmulWithStridesAndInPlace)
{
    const float a[] = {1, 2, 3, 4, 5, 6};
    const float b[] = {10, 20, 30};
    float c[6] = {};
    vDSP_vmul(a, 2, b, 1, c, 2, 3);
    EXPECT_EQ(std::vector<float>(c, c + 6), (std::vector<float>{10, 0, 60, 0, 150, 0}));

    float d[] = {2, 3, 4};
    vDSP_vmul(d, 1, d, 1, d, 1, 3);
    EXPECT_EQ(std::vector<float>(d, d + 3), (std::vector<float>{4, 9, 16}));
}

TEST(VectorOps, Vsqrtf)
{
    const float x[] = {0.0f, 4.0f, 2.25f, -1.0f};
    float y[] = {9, 9, 9, 9, 9};
    int n = 4;
    vvsqrtf(y, x, &n);
    EXPECT_EQ(y[0], 0.0f);
    EXPECT_EQ(y[1], 2.0f);
    EXPECT_EQ(y[2], 1.5f);
    EXPECT_TRUE(std::isnan(y[3]));
    EXPECT_EQ(y[4], 9.0f);
    n = 0;
    vvsqrtf(y, x, &n);
    EXPECT_EQ(y[0], 0.0f);
}

} // namespace
