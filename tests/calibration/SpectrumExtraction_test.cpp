#include "CalibrationFixture.h"

#include "calibration/SpectrumExtraction.h"

#include <algorithm>

namespace {

class SpectrumExtractionTest : public ct::CalibrationTest {
protected:
    Matrices matrices(int columns)
    {
        Matrices m;
        m.nChannels = columns;
        return m;
    }
    int32_t at(const Matrices& m, unsigned s, unsigned c) const
    {
        return m.channelSpectra.at(size_t(s) * size_t(m.nChannels) + c);
    }
};

TEST_F(SpectrumExtractionTest, XwClColumnsAreTheStoredChannelsForChipType0)
{
    const ct::Bytes record = ct::makeXwCl({.entries = 2});
    parts(*plugin).unit().chipType = 0;
    parts(*plugin).unit().numberOfChannels = 6;
    Matrices m = matrices(6);
    ASSERT_TRUE(calib::extractXwClSpectrum(parts(*plugin).calibration(), record.vec(), 76 + 5080, m));
    ASSERT_EQ(m.channelSpectra.size(), 401u * 6);
    for (unsigned s = 0; s < 401; ++s)
        for (unsigned c = 0; c < 6; ++c)
            ASSERT_EQ(at(m, s, c), ct::xwcl::sample(1, c, s)) << s << "/" << c;
    EXPECT_TRUE(std::any_of(m.channelSpectra.begin(), m.channelSpectra.end(), [](int32_t v) { return v < 0; }));
    ASSERT_EQ(m.channelWeights.size(), 6u);
    for (unsigned c = 0; c < 6; ++c)
        EXPECT_FLOAT_EQ(m.channelWeights[c], float(ct::xwcl::lux(1, c) / 65536.0));
    EXPECT_EQ(m.irCompensation, 0);
    EXPECT_EQ(m.nirFactor, 1.0f);
    EXPECT_EQ(parts(*plugin).unit().spectrumSampleCount.load(), 401u);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, "Algo version: 0 NSamples: 401\n"));
}

TEST_F(SpectrumExtractionTest, XwClChipTypes1And2FoldTheFirstStoredChannel)
{
    const ct::Bytes record = ct::makeXwCl({.deviceID = 62});
    parts(*plugin).unit().numberOfChannels = 6;
    for (uint32_t chipType : {1u, 2u}) {
        SCOPED_TRACE(chipType);
        parts(*plugin).unit().chipType = chipType;
        Matrices m = matrices(5);
        ASSERT_TRUE(calib::extractXwClSpectrum(parts(*plugin).calibration(), record.vec(), 76, m));
        for (unsigned s = 0; s < 401; ++s) {
            for (unsigned c = 0; c < 4; ++c)
                ASSERT_EQ(at(m, s, c), ct::xwcl::sample(0, c + 1, s));
            const int32_t last = ct::xwcl::sample(0, 5, s);
            const int32_t want = chipType == 1 ? 2 * last : last + ct::xwcl::sample(0, 0, s);
            ASSERT_EQ(at(m, s, 4), want) << s;
        }
        EXPECT_EQ(m.channelWeights.size(), 6u); // all stored lux coefficients, in stored order
        EXPECT_FLOAT_EQ(m.channelWeights[0], float(ct::xwcl::lux(0, 0) / 65536.0));
    }
}

TEST_F(SpectrumExtractionTest, XwClColumnsBeyondTheEntryAreRejected)
{
    const ct::Bytes record = ct::makeXwCl({});
    parts(*plugin).unit().numberOfChannels = 6;
    parts(*plugin).unit().chipType = 1;
    Matrices sixFolded = matrices(6); // would need a seventh stored channel
    EXPECT_FALSE(calib::extractXwClSpectrum(parts(*plugin).calibration(), record.vec(), 76, sixFolded));
    EXPECT_TRUE(sixFolded.channelSpectra.empty());

    parts(*plugin).unit().chipType = 0;
    parts(*plugin).unit().numberOfChannels = 7;
    Matrices seven = matrices(7);
    EXPECT_FALSE(calib::extractXwClSpectrum(parts(*plugin).calibration(), record.vec(), 76, seven));
    Matrices past = matrices(5);
    parts(*plugin).unit().numberOfChannels = 5;
    EXPECT_FALSE(
        calib::extractXwClSpectrum(parts(*plugin).calibration(), record.vec(), 76 + 5080, past)); // one entry only
    EXPECT_TRUE(past.channelWeights.empty());
}

TEST_F(SpectrumExtractionTest, XwCAT2SpectraAre32BitWithWeightsOf31FractionBits)
{
    const ct::Bytes record = ct::makeXwCA({});
    CFDataRef data = record.data();
    parts(*plugin).unit().numberOfChannels = 5;
    parts(*plugin).unit().chipType = 0;
    Matrices m = matrices(5);
    ASSERT_TRUE(parts(*plugin).calibration().processQVTSpectrumXwCAT2(data, m));
    for (unsigned s = 0; s < 401; s += 40)
        for (unsigned c = 0; c < 5; ++c)
            EXPECT_EQ(at(m, s, c), ct::xwca::sample(c, s));
    EXPECT_LT(at(m, 0, 4), 0);
    for (unsigned c = 0; c < 5; ++c)
        EXPECT_FLOAT_EQ(m.channelWeights.at(c), float(ct::xwca::lux(c) / 2147483648.0));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "Process QVT calibration spectrum"));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "Algo version: 0 NSamples: 401\n"));
    CFRelease(data);

    ct::Bytes wrong(100);
    data = wrong.data();
    Matrices untouched = matrices(5);
    EXPECT_FALSE(parts(*plugin).calibration().processQVTSpectrumXwCAT2(data, untouched));
    EXPECT_TRUE(untouched.channelSpectra.empty());
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR,
                             "QVT calibration data doesn't match with size of VD6286 structure (length = 100)"));
    CFRelease(data);
}

TEST_F(SpectrumExtractionTest, VD6287SpectraAndWeightsComeFromTheFirstBlob)
{
    const ct::Bytes record = ct::makeVD6287v3();
    CFDataRef data = record.data();
    parts(*plugin).unit().numberOfChannels = 5;
    Matrices m = matrices(5);
    ASSERT_TRUE(parts(*plugin).calibration().processQVTSpectrumVD6287_XwClv3(data, m));
    for (unsigned s = 0; s < 401; ++s)
        for (unsigned c = 0; c < 5; ++c)
            ASSERT_EQ(at(m, s, c), ct::vd::sample(0, c, s));
    for (unsigned c = 0; c < 5; ++c)
        EXPECT_FLOAT_EQ(m.channelWeights.at(c), float(ct::vd::lux(0, c) / 65536.0));
    CFRelease(data);

    ct::Bytes wrong(10440);
    data = wrong.data();
    EXPECT_FALSE(parts(*plugin).calibration().processQVTSpectrumVD6287_XwClv3(data, m));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR,
                             "QVT calibration data doesn't match with size of VD6287 structure (length = 10440)"));
    CFRelease(data);
}

} // namespace
