#include "lightdb/LDBM.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <functional>

namespace {

constexpr float kUntouched = -7.0f;

// A database of `sources` sources and `rows` response rows, filled with a
// marker, and a record pointing at it with the given channel spectra.
struct Build {
    SpectralDatabase db;
    Matrices m;

    Build(int sources, int rows, int channels, std::vector<int32_t> spectra, std::vector<float> weights)
    {
        db.allocate(uint32_t(sources), uint32_t(rows));
        std::fill(db.dbXYZ.begin(), db.dbXYZ.end(), kUntouched);
        std::fill(db.dbChannelResponses.begin(), db.dbChannelResponses.end(), kUntouched);
        m.bindOutputs(db);
        m.nChannels = channels;
        m.channelSpectra = std::move(spectra);
        m.channelWeights = std::move(weights);
    }
    float response(int row, int id) const { return db.dbChannelResponses[size_t(row) * db.dbSampleCount + size_t(id)]; }
    bool untouched() const
    {
        auto same = [](const std::vector<float>& v) {
            return std::all_of(v.begin(), v.end(), [](float x) { return x == kUntouched; });
        };
        return same(db.dbXYZ) && same(db.dbChannelResponses);
    }
};

std::vector<int32_t> constantChannels(int samples, std::vector<int32_t> perChannel)
{
    std::vector<int32_t> spectra;
    for (int s = 0; s < samples; ++s)
        spectra.insert(spectra.end(), perChannel.begin(), perChannel.end());
    return spectra;
}

} // namespace

TEST(ProgressCallback, FoldsAndScalesToTheWeightedTotal)
{
    // Sample-major: channel 0 = (1, 2, 3), channel 1 = (0, 1, 0).
    Build b(2, 2, 2, {1, 0, 2, 1, 3, 0}, {1.0f, 2.0f});
    float xyz[3] = {10.0f, 20.0f, 30.0f};
    float spectrum[3] = {1.0f, 1.0f, 1.0f};
    ASSERT_EQ(ProgressCallback(&b.m, 1, xyz, spectrum, 3), 0);
    // a = (6, 1), total = 6 * 1 + 1 * 2 = 8
    EXPECT_FLOAT_EQ(b.response(0, 1), 225.0f);
    EXPECT_FLOAT_EQ(b.response(1, 1), 37.5f);
    EXPECT_EQ(b.db.dbXYZ, (std::vector<float>{kUntouched, 10.0f, kUntouched, 20.0f, kUntouched, 30.0f}));
    EXPECT_EQ(b.response(0, 0), kUntouched);
}

TEST(ProgressCallback, InfraredTailIsScaledOnlyWhenCompensating)
{
    // 200 samples of 1: the last 196 are the tail. Weights count channel 0 only.
    Build b(1, 2, 2, constantChannels(200, {1, 1}), {1.0f, 0.0f});
    b.m.nirFactor = 2.0f;
    b.m.irCoefficients = {1.0f, 3.0f};
    std::vector<float> spectrum(200, 1.0f);
    float xyz[3] = {};

    ASSERT_EQ(ProgressCallback(&b.m, 0, xyz, spectrum.data(), 200), 0);
    EXPECT_FLOAT_EQ(b.response(1, 0), 300.0f) << "irCompensation 0 uses the tail unscaled";

    b.m.irCompensation = 1;
    ASSERT_EQ(ProgressCallback(&b.m, 0, xyz, spectrum.data(), 200), 0);
    // a0 = 4 + 196 * 2, a1 = 4 + 196 * 6
    EXPECT_FLOAT_EQ(b.response(0, 0), 300.0f);
    EXPECT_FLOAT_EQ(b.response(1, 0), float(300.0 * 1180.0 / 396.0));
}

TEST(ProgressCallback, FirstChannelOnlyEntersTheNormaliser)
{
    // Five channels of constant sensitivity 1 .. 5 over two samples; four RR rows.
    Build b(1, 5, 5, constantChannels(2, {1, 2, 3, 4, 5}), {1, 1, 1, 1, 1});
    b.m.firstChannel = 1;
    float xyz[3] = {};
    float spectrum[2] = {1.0f, 1.0f};
    ASSERT_EQ(ProgressCallback(&b.m, 0, xyz, spectrum, 2), 0);
    // a = (2, 4, 6, 8, 10), total 30
    EXPECT_FLOAT_EQ(b.response(0, 0), 40.0f);
    EXPECT_FLOAT_EQ(b.response(1, 0), 60.0f);
    EXPECT_FLOAT_EQ(b.response(2, 0), 80.0f);
    EXPECT_FLOAT_EQ(b.response(3, 0), 100.0f);
    EXPECT_EQ(b.response(4, 0), kUntouched);
}

TEST(ProgressCallback, ZeroTotalStopsInsteadOfDividing)
{
    float xyz[3] = {};
    std::vector<float> spectrum(2, 1.0f);
    Build noWeights(1, 2, 2, constantChannels(2, {1, 1}), {0.0f, 0.0f});
    EXPECT_NE(ProgressCallback(&noWeights.m, 0, xyz, spectrum.data(), 2), 0);
    EXPECT_EQ(noWeights.response(0, 0), kUntouched);

    Build blind(1, 2, 2, constantChannels(2, {1, 1}), {1.0f, 1.0f});
    std::vector<float> dark(2, 0.0f);
    EXPECT_NE(ProgressCallback(&blind.m, 0, xyz, dark.data(), 2), 0);
    EXPECT_EQ(blind.response(1, 0), kUntouched);
}

TEST(ProgressCallback, RejectsRowsThatDoNotFitTheRecord)
{
    float xyz[3] = {1.0f, 2.0f, 3.0f};
    std::vector<float> spectrum(4, 1.0f);
    struct Case {
        const char* what;
        std::function<void(Matrices&)> change;
        int id = 0;
        int samples = 2;
    };
    const Case cases[] = {
        {"id beyond the sources", [](Matrices&) {}, 2},
        {"negative id", [](Matrices&) {}, -1},
        {"spectrum longer than the channel spectra", [](Matrices&) {}, 0, 3},
        {"more rows than the responses hold", [](Matrices& m) { m.responseRows = 1; }},
        {"first channel past the channels", [](Matrices& m) { m.firstChannel = 3; }},
        {"negative first channel", [](Matrices& m) { m.firstChannel = -1; }},
        {"too few weights", [](Matrices& m) { m.channelWeights.pop_back(); }},
        {"compensation without coefficients", [](Matrices& m) { m.irCompensation = 1; }},
        {"no XYZ destination", [](Matrices& m) { m.xyzOut = nullptr; }},
    };
    for (const auto& c : cases) {
        Build b(2, 2, 2, constantChannels(2, {1, 1}), {1.0f, 1.0f});
        c.change(b.m);
        EXPECT_NE(ProgressCallback(&b.m, c.id, xyz, spectrum.data(), c.samples), 0) << c.what;
        EXPECT_TRUE(b.untouched()) << c.what;
    }
}
