// The accuracy report is one well-formed XHTML file with inline SVG, whatever
// the names in it, and carries the summary and one table row per light.
#include "ReportXml.h"
#include "host/evaluation/AccuracyReport.h"
#include "host/evaluation/ChromaticityDiagram.h"

#include <gtest/gtest.h>

#include <sstream>

namespace {

host::LightResult light(const std::string& name, spectra::Xy truth, bool plugIn, bool baseline)
{
    host::LightResult r;
    r.name = name;
    r.trueXy = truth;
    r.trueCct = spectra::correlatedColourTemperature(truth);
    r.plugIn.valid = plugIn;
    r.plugIn.xy = {truth.x + 0.002, truth.y - 0.001};
    r.plugIn.deltaUv = 0.0015;
    r.baseline.valid = baseline;
    r.baseline.xy = {truth.x - 0.004, truth.y + 0.003};
    r.baseline.deltaUv = 0.004;
    return r;
}

TEST(AccuracyReport, IsWellFormedWithDiagramsSummaryAndTable)
{
    const std::vector<host::LightResult> results = {
        light("lamp <A> & \"B\" 'C'", {0.4476, 0.4074}, true, true),
        light("daylight\x01", {0.3127, 0.3290}, true, false),
        light("dark", {0.33, 0.33}, false, true),
    };
    std::ostringstream out;
    host::writeAccuracyReport(out, {"unit <1>", "a & b", "dev.json", "store", "bzlight.sqlite", "lights", 100.0},
                              results);
    const vt::ReportXml xml(out.str());
    ASSERT_TRUE(xml.ok()) << out.str();

    EXPECT_EQ(xml.count("//svg:svg"), 2);
    EXPECT_EQ(xml.count("//svg:svg/svg:g/svg:polygon"), 2); // spectral locus
    EXPECT_EQ(xml.count("//svg:polyline[svg:title]"), 2);   // Planckian locus
    // Each light's true point, the plug-in's line and mark where it gave colour, the baseline's mark.
    EXPECT_EQ(xml.count("//svg:circle[svg:title[contains(., ': true')]]"), 2 * 3);
    EXPECT_EQ(xml.count("//svg:circle[svg:title[contains(., ': plug-in')]]"), 2 * 2);
    EXPECT_EQ(xml.count("//svg:path[svg:title[contains(., ': global matrix')]]"), 2 * 2);
    EXPECT_EQ(xml.count("//svg:circle[svg:title=concat('lamp <A> & \"B\" ', \"'C'\", ': true')]"), 2);

    EXPECT_EQ(xml.count("//h:table[@id='summary']/h:tr"), 3);
    EXPECT_EQ(xml.count("//h:table[@id='lights']/h:tr"), 2 + 3);
    EXPECT_EQ(xml.count("//h:table[@id='lights']//h:td[.='no colour']"), 2);
    EXPECT_EQ(xml.count("//h:h1[.='Colour accuracy of unit <1>']"), 1);
}

TEST(AccuracyReport, CloseUpFramesEveryPointSquarely)
{
    const std::vector<host::LightResult> results = {light("a", {0.30, 0.32}, true, true),
                                                    light("b", {0.45, 0.41}, true, true)};
    const host::DiagramView v = host::closeUpView(results);
    EXPECT_LT(v.xMin, 0.296);
    EXPECT_GT(v.xMax, 0.452);
    EXPECT_LT(v.yMin, 0.319);
    EXPECT_GT(v.yMax, 0.413);
    EXPECT_NEAR(v.xMax - v.xMin, v.yMax - v.yMin, 1e-12);
    // Nothing to frame: the whole diagram.
    EXPECT_EQ(host::closeUpView({}).xMax, host::fullDiagramView().xMax);
}

} // namespace
