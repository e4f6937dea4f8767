// The named catalogue and the two reference sets drawn from it.
#include "spectra/Catalogue.h"
#include "spectra/CieIlluminants.h"
#include "spectra/Colorimetry.h"
#include "spectra/Daylight.h"
#include "spectra/Mixing.h"
#include "spectra/ReferenceDatabase.h"

#include <gtest/gtest.h>

#include <set>
#include <string>

using namespace spectra;

TEST(Catalogue, NamesAreUniqueAndEverySourceIsAtTheReferenceIlluminance)
{
    std::set<std::string> names;
    for (const Source& s : catalogue()) {
        EXPECT_TRUE(names.insert(s.name).second) << s.name;
        EXPECT_FALSE(s.family.empty()) << s.name;
        EXPECT_NEAR(tristimulus(s.spectrum).Y, kReferenceLux, 1e-9) << s.name;
        EXPECT_EQ(findSource(s.name), &s);
    }
    EXPECT_EQ(findSource("planck-99K"), nullptr);
}

TEST(Catalogue, NamesDenoteTheirModels)
{
    const Source* planck = findSource("planck-2856K");
    ASSERT_NE(planck, nullptr);
    EXPECT_NEAR(*correlatedColourTemperature(chromaticity(tristimulus(planck->spectrum))), 2856.0, 3.0);

    const Source* mix = findSource("mix-d65-a-30");
    ASSERT_NE(mix, nullptr);
    const Spectrum a = cieA();
    const Spectrum d65 = cieDaylight(6504.0);
    const Share shares[] = {{&d65, 0.7}, {&a, 0.3}};
    const Spectrum expected = atIlluminance(mixByIlluminance(shares), kReferenceLux);
    for (int i = 0; i < kSamples; i += 50)
        EXPECT_NEAR(mix->spectrum[size_t(i)], expected[size_t(i)], 1e-9);

    for (const char* name :
         {"cie-a", "cie-f12", "daylight-6500K", "led-450-565-115-5000K", "ledr-450-545-105-r630w90-3000K",
          "tri-4000K-duv0-c5", "hps-b12-ir10", "lps", "mh-ceramic-4000K", "ledv-405-3000K", "mix-d50-ledr3000-40"})
        EXPECT_NE(findSource(name), nullptr) << name;
}

TEST(Catalogue, ReferenceSetsFitTheDatabaseAndDiffer)
{
    const std::vector<const Source*> base = referenceSources(ReferenceSet::Default);
    const std::vector<const Source*> dense = referenceSources(ReferenceSet::Dense02);
    EXPECT_LE(base.size(), kMaxReferenceSources);
    EXPECT_LE(dense.size(), kMaxReferenceSources);
    EXPECT_GT(dense.size(), base.size());

    std::set<std::string> families;
    for (const Source* s : base)
        families.insert(s->family);
    EXPECT_EQ(families, (std::set<std::string>{"cie", "daylight", "fluorescent", "led", "led-red", "metal-halide",
                                               "mix-incandescent", "mix-led", "planck", "sodium"}));
    EXPECT_EQ(base.front()->name, "planck-1800K");
    EXPECT_NE(kReferenceFiles[0].version, kReferenceFiles[1].version);
}
