// The vantish command as a user runs it (a subprocess): the demo and its
// report, synth piped into run, the light-database view, and bad input
// answered with one clear error naming what and where, failing only when
// nothing could be done.
#include "ReportXml.h"
#include "VantishCommand.h"
#include "common/TestSupport.h"
#include "spectra/Colorimetry.h"
#include "spectra/TestLights.h"

#include <gtest/gtest.h>

#include <sys/wait.h>

#include <algorithm>
#include <cmath>
#include <fstream>
#include <sstream>
#include <vector>

namespace {

using namespace vt::command;

// The median Δu′v′ of one summary row.
double summaryMedian(const std::string& out, const std::string& label)
{
    const auto numbers = rowNumbers(out, label);
    return numbers.size() == 3 ? numbers[0] : NAN;
}

TEST_F(VantishCommand, DemoBeatsTheGlobalMatrixAndWritesAWellFormedReport)
{
    const Outcome o = run("demo");
    ASSERT_EQ(o.status, 0) << o.err;
    const double plugIn = summaryMedian(o.out, "plug-in");
    const double matrix = summaryMedian(o.out, "global matrix");
    ASSERT_FALSE(std::isnan(plugIn) || std::isnan(matrix)) << o.out;
    EXPECT_LT(plugIn, matrix) << o.out;
    EXPECT_NE(o.out.find(path("vantish-report.html").string()), std::string::npos) << o.out;

    const vt::ReportXml report(slurp(path("vantish-report.html")));
    ASSERT_TRUE(report.ok());
    EXPECT_EQ(report.count("//svg:svg"), 2);
    EXPECT_EQ(report.count("//h:table[@id='lights']/h:tr"), 2 + int(spectra::testLights().size()));
    EXPECT_EQ(report.count("//h:table[@id='summary']/h:tr"), 3);

    // With no command at all, vantish runs the same demonstration.
    fs::remove(path("vantish-report.html"));
    const Outcome bare = run("");
    ASSERT_EQ(bare.status, 0) << bare.err;
    EXPECT_EQ(summaryMedian(bare.out, "plug-in"), plugIn);
    EXPECT_TRUE(fs::exists(path("vantish-report.html")));
}

// One row of run's CSV output: u′ and v′.
std::vector<spectra::Uv> runChromaticities(const std::string& out)
{
    std::vector<spectra::Uv> uv;
    std::istringstream in(out);
    std::string line;
    std::getline(in, line); // header
    while (std::getline(in, line)) {
        std::vector<std::string> cells;
        std::istringstream row(line);
        for (std::string cell; std::getline(row, cell, ',');)
            cells.push_back(cell);
        if (cells.size() >= 9 && !cells[7].empty())
            uv.push_back({std::stod(cells[7]), std::stod(cells[8])});
    }
    return uv;
}

TEST_F(VantishCommand, SynthIntoRunReturnsTheLightWithinTheEvaluatedAccuracy)
{
    const std::string light = "test-mix-d55-ledr2700-35";
    const Outcome synth = run("synth " + device("xwcl-14") + " --source " + light + " --count 4 --lux 250");
    ASSERT_EQ(synth.status, 0) << synth.err;
    EXPECT_EQ(lineCount(synth.out), 3 + 1 + 4) << synth.out; // comments, header, samples
    file("samples.csv", synth.out);

    const Outcome ran = run("run " + device("xwcl-14") + " --events samples.csv");
    ASSERT_EQ(ran.status, 0) << ran.err;
    const auto estimates = runChromaticities(ran.out);
    ASSERT_EQ(estimates.size(), 4u) << ran.out;

    // The same light in the evaluation: its row's Δu′v′, and the unit's maximum.
    const Outcome eval = run("eval " + device("xwcl-14"));
    ASSERT_EQ(eval.status, 0) << eval.err;
    // The light's row: true x, y, CCT, Duv, estimated x, y, Duv, then Δu′v′.
    const auto row = rowNumbers(eval.out, light);
    ASSERT_GE(row.size(), 8u) << eval.out;
    const double evaluated = row[7];
    const auto summary = rowNumbers(eval.out, "plug-in");
    ASSERT_EQ(summary.size(), 3u) << eval.out;
    const double worst = summary[2];

    const spectra::Uv truth =
        spectra::uvPrime(spectra::chromaticity(spectra::tristimulus(spectra::findTestLight(light)->spectrum)));
    for (const spectra::Uv& uv : estimates) {
        const double error = spectra::deltaUvPrime(uv, truth);
        EXPECT_NEAR(error, evaluated, 2e-4); // run prints u′v′ to four decimals
        EXPECT_LE(error, worst + 1e-4);
    }
}

TEST_F(VantishCommand, LightdbInfoShowsTheReferenceFileAndACache)
{
    const std::string reference = (fs::path(vt::bundleDir()) / "bzlight.sqlite").string();
    const Outcome o = run("lightdb info " + quoted(reference));
    ASSERT_EQ(o.status, 0) << o.err;
    for (const char* line : {"Info      version 1, sources 425", "Sources   425",
                             "Grid      401 sample columns, S0 … S400 (300–1100 nm in 2 nm steps)",
                             "Families  cie daylight hps led ledr lps mh mix planck tri\n"})
        EXPECT_NE(o.out.find(line), std::string::npos) << line << " in\n" << o.out;

    ASSERT_EQ(run("open " + device("xwca-t2")).status, 0);
    const Outcome cache = run("lightdb info " + quoted(path("state/Library/Brenzel/bzrgbc_1.sqlite").string()));
    ASSERT_EQ(cache.status, 0) << cache.err;
    EXPECT_NE(cache.out.find("per-chip database cache"), std::string::npos) << cache.out;
    EXPECT_NE(cache.out.find("Channels  5: CH0, CH1, CH2, CH3, CH4"), std::string::npos) << cache.out;
}

// Bad input is named with what and where; the command fails (1) only when
// nothing could be done, and stops (2) on a bad device, light or report.
TEST_F(VantishCommand, BadInputIsNamedAndOnlyNothingDoneFails)
{
    file("broken.json", "{\"name\": \"x\", \"service\": {");
    file("empty.json", "");
    file("events.csv", "c0,c1,c2,c3,c4,lux\n900,2000,1500,4000,10,100\n900,abc,1500,4000,10,100\n"
                       "900,2000,1500,4000,10,100\n");
    file("bad.csv", "c0,c1,lux\nx,1,2\n");
    file("nothing.csv", "");
    // Text that is not UTF-8 has no property value (found by fuzzing: the command aborted).
    file("utf8.csv", "lux,c0,c1,c2,c3\n100,10,20,30,40\n!set \xFF=1\n!set RGBCOverride=\xFE\n120,10,20,30,40\n");
    file("narrow.csv", "nm,value\n500,1\n600,1\n1000,1\n");
    file("empty.sp", "");
    fs::create_directory(path("lights"));
    file("lights/wide.csv", "380,0.5\n450,1.0\n550,0.8\n650,0.9\n780,0.7\n"); // another grid, covers 400–700 nm
    file("lights/word.csv", "380,0.5\n450,bright\n780,0.7\n");
    file("blocked", "a file where the report's folder should be");
    file("notes.sqlite", "not a database at all, but long enough to be looked at...........");

    enum class Match { Exact, Prefix, Contains };
    struct Case {
        std::string args;
        int status;
        std::string err;
        Match match = Match::Exact;
        std::vector<std::string> out = {}; // texts the output holds
        int outLines = -1;                 // 0: no output at all
    };
    const std::string xwca = device("xwca-t2");
    const Case cases[] = {
        {"run nowhere.json --events - < /dev/null", 2, "vantish: nowhere.json: cannot open the device description\n"},
        {"synth broken.json --source cie-a", 2, "vantish synth: broken.json: not valid JSON: ", Match::Prefix},
        {"eval empty.json", 2, "vantish eval: empty.json: not valid JSON: ", Match::Prefix},
        {"synth " + device("basic-rgbc") + " --source cie-a",
         2,
         "basic-rgbc/device.json: the unit has no factory store and no registry calibration",
         Match::Contains,
         {},
         0},
        {"run " + xwca + " --events events.csv",
         0,
         "vantish: events.csv:3: field 'c1': 'abc' is not a number\n",
         Match::Exact,
         {},
         1 + 2},
        {"run " + xwca + " --events bad.csv", 1, "vantish: bad.csv:2: field 'c0': 'x' is not a number\n"},
        {"run " + xwca + " --events nothing.csv", 1,
         "vantish: nothing.csv: no samples (the input is empty or only a header)\n"},
        {"run " + device("basic-rgbc") + " --events utf8.csv",
         0,
         "vantish: utf8.csv:3: field '\xFF': the key is not UTF-8 text\n"
         "vantish: utf8.csv:4: field 'RGBCOverride': property value: the text is not UTF-8\n",
         Match::Exact,
         {"\n0,", "\n1,"},
         1 + 2},
        {"synth " + xwca + " --spectrum narrow.csv", 2,
         "vantish synth: narrow.csv: the spectrum covers 500–1000 nm; it must cover the visible range 400–700 nm\n"},
        {"synth " + xwca + " --spectrum empty.sp", 2, "vantish synth: empty.sp: empty file, no spectrum\n"},
        {"synth " + xwca + " --source no-such-light", 2, "--source no-such-light: no such light", Match::Contains},
        {"eval " + xwca + " --spectra lights",
         0,
         "vantish eval: lights/word.csv:2: 'bright' is not a number\n",
         Match::Exact,
         {"\nwide ", "over 1 lights"}},
        {"eval " + xwca + " --spectra lights/word.csv", 2,
         "vantish eval: lights/word.csv:2: 'bright' is not a number\nvantish eval: no light to evaluate\n"},
        // A report that cannot be written stops the evaluation before it starts.
        {"eval " + xwca + " --report blocked/report.html",
         2,
         "vantish eval: blocked/report.html: cannot write the report\n",
         Match::Exact,
         {},
         0},
        {"lightdb info notes.sqlite", 2, "vantish lightdb info: notes.sqlite: cannot read (file is not a database)\n"},
        {"lightdb export notes.sqlite",
         2,
         "vantish lightdb export: notes.sqlite: cannot read (file is not a database)\n",
         Match::Exact,
         {},
         0},
        {"lightdb export nowhere.sqlite", 2,
         "vantish lightdb export: nowhere.sqlite: cannot read (unable to open database file)\n"},
        {"lightdb export " + quoted(vt::bundleDir() + "/bzlight.sqlite") + " -o blocked/ref.csv", 2,
         "vantish lightdb export: blocked/ref.csv: cannot write (Not a directory)\n"},
        // A folder that cannot be made stops open before the work.
        {"open " + xwca + " --save blocked/saved",
         2,
         "vantish: blocked/saved: cannot create the folder (Not a directory)\n",
         Match::Exact,
         {},
         0},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.args);
        const Outcome o = run(c.args);
        EXPECT_EQ(o.status, c.status);
        switch (c.match) {
        case Match::Exact:
            EXPECT_EQ(o.err, c.err);
            break;
        case Match::Prefix:
            EXPECT_EQ(o.err.rfind(c.err, 0), 0u) << o.err;
            EXPECT_EQ(lineCount(o.err), 1) << o.err;
            break;
        case Match::Contains:
            EXPECT_NE(o.err.find(c.err), std::string::npos) << o.err;
            break;
        }
        for (const std::string& text : c.out)
            EXPECT_NE(o.out.find(text), std::string::npos) << text << " in\n" << o.out;
        if (c.outLines == 0) {
            EXPECT_EQ(o.out, "");
        } else if (c.outLines > 0) {
            EXPECT_EQ(lineCount(o.out), c.outLines) << o.out;
        }
    }
}

TEST_F(VantishCommand, OneHelpTreeDocumentsEverySubcommand)
{
    const Outcome o = run("--help-all");
    EXPECT_EQ(o.status, 0);
    for (const char* sub : {"open", "run", "synth", "eval", "demo", "lightdb"})
        EXPECT_NE(o.out.find(std::string("\n") + sub + "\n"), std::string::npos) << sub << "\n" << o.out;
    EXPECT_NE(o.out.find("\n    info "), std::string::npos) << o.out;
    for (const char* option : {"--events", "--spectrum", "--source", "--noise", "--seed", "--spectra", "--report"})
        EXPECT_NE(o.out.find(option), std::string::npos) << option;
    const Outcome synth = run("synth --help");
    EXPECT_NE(synth.out.find("test-incandescent-dimmed-2250K"), std::string::npos) << synth.out;
    EXPECT_NE(run("lightdb info --help").out.find("Names"), std::string::npos);

    // docs/usage.md shows this help (scripts/usage_help.sh record writes it there).
    const std::string usage = slurp(fs::path(vt::sourceDir()) / "docs" / "usage.md");
    const std::string begin = "<!-- begin vantish --help-all -->\n```text\n",
                      end = "```\n<!-- end vantish --help-all -->";
    const size_t from = usage.find(begin), to = usage.find(end);
    ASSERT_TRUE(from != std::string::npos && to != std::string::npos) << "docs/usage.md has no help block";
    const Outcome documented = run("--help-all", "VANTISH_BUNDLE=build/Vantish.plugin XDG_STATE_HOME='~/.local/state'");
    EXPECT_EQ(usage.substr(from + begin.size(), to - from - begin.size()), documented.out)
        << "docs/usage.md differs from vantish --help-all: run scripts/usage_help.sh record";
}

} // namespace
