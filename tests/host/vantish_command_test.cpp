// The vantish command as a user runs it (a subprocess): the demo and its
// report, synth piped into run, the light-database view, and bad input
// answered with one clear error naming what and where, failing only when
// nothing could be done.
#include "ReportXml.h"
#include "spectra/Colorimetry.h"
#include "spectra/TestLights.h"
#include "support/TestSupport.h"

#include <gtest/gtest.h>

#include <sys/wait.h>

#include <algorithm>
#include <cmath>
#include <fstream>
#include <sstream>
#include <vector>

namespace {

namespace fs = std::filesystem;

struct Outcome {
    int status = -1;
    std::string out;
    std::string err;
};

std::string slurp(const fs::path& path)
{
    std::ifstream in(path);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

std::string quoted(const std::string& s) { return "'" + s + "'"; }

std::string device(const std::string& unit)
{
    return quoted((fs::path(vt::sourceDir()) / "data" / "devices" / unit / "device.json").string());
}

// The command in a fresh working folder with its own state folder.
class VantishCommand : public testing::Test {
protected:
    Outcome run(const std::string& arguments, const std::string& input = "")
    {
        std::string command = "cd " + quoted(dir_.str()) + " && " + quoted(VANTISH_COMMAND) + " --state " +
                              quoted((dir_.path() / "state").string()) + " " + arguments;
        if (!input.empty())
            command += " < " + quoted(input);
        command += " > out.txt 2> err.txt";
        Outcome o;
        const int raw = std::system(command.c_str());
        o.status = WIFEXITED(raw) ? WEXITSTATUS(raw) : -1;
        o.out = slurp(dir_.path() / "out.txt");
        o.err = slurp(dir_.path() / "err.txt");
        return o;
    }
    fs::path file(const std::string& name, const std::string& text)
    {
        std::ofstream(dir_.path() / name) << text;
        return dir_.path() / name;
    }
    fs::path path(const std::string& name) const { return dir_.path() / name; }

private:
    vt::TempDir dir_;
};

int lineCount(const std::string& text) { return int(std::count(text.begin(), text.end(), '\n')); }

// The numbers after `label` on the first output line that starts with it
// (after indentation), as in "  plug-in   0.0002   0.0025   0.0067".
std::vector<double> rowNumbers(const std::string& out, const std::string& label)
{
    std::istringstream lines(out);
    for (std::string line; std::getline(lines, line);) {
        const size_t start = line.find_first_not_of(' ');
        const size_t end = start + label.size();
        if (start == std::string::npos || line.compare(start, label.size(), label) != 0 || end >= line.size() ||
            line[end] != ' ')
            continue;
        std::istringstream fields(line.substr(end));
        std::vector<double> numbers;
        for (double x; fields >> x;)
            numbers.push_back(x);
        return numbers;
    }
    return {};
}

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
    // The light's row: true x, y, CCT, estimated x, y, then Δu′v′.
    const auto row = rowNumbers(eval.out, light);
    ASSERT_GE(row.size(), 6u) << eval.out;
    const double evaluated = row[5];
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
    EXPECT_NE(o.out.find("Info      version 1, sources 425"), std::string::npos) << o.out;
    EXPECT_NE(o.out.find("Sources   425"), std::string::npos) << o.out;
    EXPECT_NE(o.out.find("Grid      401 sample columns, S0 … S400 (300–1100 nm in 2 nm steps)"), std::string::npos);
    EXPECT_NE(o.out.find("Families  cie daylight hps led ledr lps mh mix planck tri\n"), std::string::npos) << o.out;

    ASSERT_EQ(run("open " + device("xwca-t2")).status, 0);
    const Outcome cache = run("lightdb info " + quoted(path("state/Library/Brenzel/bzrgbc_1.sqlite").string()));
    ASSERT_EQ(cache.status, 0) << cache.err;
    EXPECT_NE(cache.out.find("per-chip database cache"), std::string::npos) << cache.out;
    EXPECT_NE(cache.out.find("Channels  5: CH0, CH1, CH2, CH3, CH4"), std::string::npos) << cache.out;

    const fs::path text = file("notes.sqlite", "not a database at all, but long enough to be looked at...........");
    const Outcome bad = run("lightdb info " + quoted(text.string()));
    EXPECT_EQ(bad.status, 2);
    EXPECT_EQ(bad.err, "vantish lightdb info: " + text.string() + ": cannot read (file is not a database)\n");
}

TEST_F(VantishCommand, BadDevicesAreNamedAndStopTheCommand)
{
    const fs::path missing = path("nowhere.json");
    Outcome o = run("run " + quoted(missing.string()) + " --events -", "/dev/null");
    EXPECT_EQ(o.status, 2);
    EXPECT_EQ(o.err, "vantish: " + missing.string() + ": cannot open the device description\n");

    const fs::path broken = file("broken.json", "{\"name\": \"x\", \"service\": {");
    o = run("synth " + quoted(broken.string()) + " --source cie-a");
    EXPECT_EQ(o.status, 2);
    EXPECT_EQ(lineCount(o.err), 1) << o.err;
    EXPECT_EQ(o.err.rfind("vantish synth: " + broken.string() + ": not valid JSON: ", 0), 0u) << o.err;

    const fs::path empty = file("empty.json", "");
    o = run("eval " + quoted(empty.string()));
    EXPECT_EQ(o.status, 2);
    EXPECT_EQ(o.err.rfind("vantish eval: " + empty.string() + ": not valid JSON: ", 0), 0u) << o.err;

    o = run("synth " + device("basic-rgbc") + " --source cie-a");
    EXPECT_EQ(o.status, 2);
    EXPECT_NE(o.err.find("basic-rgbc/device.json: the unit has no factory store and no registry calibration"),
              std::string::npos)
        << o.err;
    EXPECT_EQ(o.out, "");
}

TEST_F(VantishCommand, BadRowsAreSkippedAndOnlyNothingDoneFails)
{
    file("events.csv", "c0,c1,c2,c3,c4,lux\n900,2000,1500,4000,10,100\n900,abc,1500,4000,10,100\n"
                       "900,2000,1500,4000,10,100\n");
    Outcome o = run("run " + device("xwca-t2") + " --events events.csv");
    EXPECT_EQ(o.status, 0);
    EXPECT_EQ(o.err, "vantish: events.csv:3: field 'c1': 'abc' is not a number\n");
    EXPECT_EQ(lineCount(o.out), 1 + 2) << o.out;

    file("bad.csv", "c0,c1,lux\nx,1,2\n");
    o = run("run " + device("xwca-t2") + " --events bad.csv");
    EXPECT_EQ(o.status, 1);
    EXPECT_EQ(o.err, "vantish: bad.csv:2: field 'c0': 'x' is not a number\n");

    file("nothing.csv", "");
    o = run("run " + device("xwca-t2") + " --events nothing.csv");
    EXPECT_EQ(o.status, 1);
    EXPECT_EQ(o.err, "vantish: nothing.csv: no samples (the input is empty or only a header)\n");
}

TEST_F(VantishCommand, BadSpectraAreNamedAndSkipped)
{
    const fs::path narrow = file("narrow.csv", "nm,value\n500,1\n600,1\n1000,1\n");
    Outcome o = run("synth " + device("xwca-t2") + " --spectrum " + quoted(narrow.string()));
    EXPECT_EQ(o.status, 2);
    EXPECT_EQ(o.err, "vantish synth: " + narrow.string() +
                         ": the spectrum covers 500–1000 nm; it must cover the visible range 400–700 nm\n");

    const fs::path empty = file("empty.sp", "");
    o = run("synth " + device("xwca-t2") + " --spectrum " + quoted(empty.string()));
    EXPECT_EQ(o.status, 2);
    EXPECT_EQ(o.err, "vantish synth: " + empty.string() + ": empty file, no spectrum\n");

    o = run("synth " + device("xwca-t2") + " --source no-such-light");
    EXPECT_EQ(o.status, 2);
    EXPECT_NE(o.err.find("--source no-such-light: no such light"), std::string::npos) << o.err;

    // On another grid and covering 400–700 nm: used.
    fs::create_directory(path("lights"));
    file("lights/wide.csv", "380,0.5\n450,1.0\n550,0.8\n650,0.9\n780,0.7\n");
    file("lights/word.csv", "380,0.5\n450,bright\n780,0.7\n");
    o = run("eval " + device("xwca-t2") + " --spectra lights");
    EXPECT_EQ(o.status, 0) << o.err;
    EXPECT_EQ(o.err, "vantish eval: lights/word.csv:2: 'bright' is not a number\n");
    EXPECT_NE(o.out.find("\nwide "), std::string::npos) << o.out;
    EXPECT_NE(o.out.find("over 1 lights"), std::string::npos) << o.out;

    o = run("eval " + device("xwca-t2") + " --spectra lights/word.csv");
    EXPECT_EQ(o.status, 2);
    EXPECT_EQ(o.err, "vantish eval: lights/word.csv:2: 'bright' is not a number\nvantish eval: no light to evaluate\n");

    // A report that cannot be written stops the evaluation before it starts.
    file("blocked", "a file where the report's folder should be");
    o = run("eval " + device("xwca-t2") + " --report blocked/report.html");
    EXPECT_EQ(o.status, 2);
    EXPECT_EQ(o.err, "vantish eval: blocked/report.html: cannot write the report\n");
    EXPECT_EQ(o.out, "");
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
}

} // namespace
