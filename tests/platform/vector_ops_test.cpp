#include <Accelerate/Accelerate.h>

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <vector>

namespace {

TEST(VectorOps, MaxvHonoursStrideEmptyInputAndNaN)
{
    const float nan = std::numeric_limits<float>::quiet_NaN();
    const float a[] = {1.0f, 50.0f, -3.0f, 70.0f, 2.5f, 90.0f};
    const float negative[] = {-7.0f, -2.0f, -9.0f};
    const float nanFirst[] = {nan, 5.0f, 200.0f};
    const float nanLater[] = {5.0f, 200.0f, nan};
    const struct {
        const float* data;
        vDSP_Stride stride;
        vDSP_Length n;
        float max;
    } cases[] = {{a, 2, 3, 2.5f},      {a, 1, 6, 90.0f},      {negative, 1, 3, -2.0f},
                 {a, 1, 0, -INFINITY}, {nanFirst, 1, 3, nan}, {nanLater, 1, 3, nan}};
    for (const auto& c : cases) {
        SCOPED_TRACE(&c - cases);
        float result = 0;
        vDSP_maxv(c.data, c.stride, &result, c.n);
        if (std::isnan(c.max))
            EXPECT_TRUE(std::isnan(result));
        else
            EXPECT_EQ(result, c.max);
    }
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

TEST(VectorOps, VsqrtfWritesExactlyNValues)
{
    const float x[] = {0.0f, 4.0f, 2.25f, -1.0f};
    float y[] = {9, 9, 9, 9, 9};
    int n = 4;
    vvsqrtf(y, x, &n);
    EXPECT_EQ(std::vector<float>(y, y + 3), (std::vector<float>{0.0f, 2.0f, 1.5f}));
    EXPECT_TRUE(std::isnan(y[3]));
    EXPECT_EQ(y[4], 9.0f);
}

} // namespace
