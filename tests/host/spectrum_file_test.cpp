// Light spectra from files: CGATS through lcms2, two-column CSV, other grids
// resampled, and files that give no spectrum named with the reason.
#include "common/TestSupport.h"
#include "host/inputs/SpectrumFile.h"
#include "spectra/CieData.h"
#include "spectra/CieIlluminants.h"
#include "spectra/Colorimetry.h"
#include "spectra/Planck.h"

#include <gtest/gtest.h>

#include <cmath>
#include <fstream>

namespace {

namespace fs = std::filesystem;

fs::path write(const vt::TempDir& dir, const std::string& name, const std::string& text)
{
    const fs::path path = dir.path() / name;
    std::ofstream(path) << text;
    return path;
}

std::string errorOf(const fs::path& file)
{
    try {
        host::loadSpectrumFile(file);
    } catch (const host::SpectrumFileError& e) {
        return e.what();
    }
    return "no error";
}

double chromaticityDistance(const spectra::Spectrum& a, const spectra::Spectrum& b)
{
    return spectra::deltaUvPrime(spectra::uvPrime(spectra::chromaticity(spectra::tristimulus(a))),
                                 spectra::uvPrime(spectra::chromaticity(spectra::tristimulus(b))));
}

TEST(SpectrumFile, ReadsCgatsAndCsvOnAnyGrid)
{
    // A CGATS file of colord-data, 340–770 nm at 5 nm.
    const spectra::Source b = host::loadSpectrumFile(spectra::colordPath("illuminant/CIE-B.sp"));
    EXPECT_EQ(b.name, "CIE-B");
    EXPECT_NEAR(spectra::tristimulus(b.spectrum).Y, spectra::kReferenceLux, 1e-9);
    EXPECT_LT(chromaticityDistance(b.spectrum, spectra::cieB()), 1e-9);

    // A 2856 K radiator tabulated every 10 nm from 380 to 1000 nm, with a
    // header, comments and blank lines; beyond 1000 nm the grid stays dark.
    vt::TempDir dir;
    std::string csv = "# incandescent\nnm,power\n\n";
    for (int nm = 380; nm <= 1000; nm += 10)
        csv += std::to_string(nm) + "," + std::to_string(spectra::planckRelative(nm, 2856)) + "\n";
    const spectra::Source a = host::loadSpectrumFile(write(dir, "lamp.csv", csv));
    EXPECT_EQ(a.name, "lamp");
    EXPECT_LT(chromaticityDistance(a.spectrum, spectra::planck(2856)), 2e-4);
    EXPECT_EQ(a.spectrum[size_t(spectra::sampleAtOrBelow(1050))], 0.0);
    EXPECT_GT(a.spectrum[size_t(spectra::sampleAtOrBelow(900))], 0.0);

    // Semicolons or white space separate the columns as well.
    const spectra::Source w = host::loadSpectrumFile(write(dir, "flat.csv", "390 1\n710 1\n"));
    EXPECT_NEAR(spectra::tristimulus(w.spectrum).Y, spectra::kReferenceLux, 1e-9);
    EXPECT_NO_THROW(host::loadSpectrumFile(write(dir, "semi.csv", "390;1\n710;1\n")));
}

TEST(SpectrumFile, FilesWithoutASpectrumNameFileLineAndReason)
{
    struct Case {
        const char* name;
        const char* text;  // nullptr: no such file
        std::string error; // what follows the file's path
        bool exact = true;
    };
    const Case cases[] = {
        {"missing.csv", nullptr, ": no such file"},
        {"empty.csv", "", ": empty file, no spectrum"},
        {"comments.csv", "# nothing\n\n", ": no spectrum: the file has no (nm, value) rows"},
        {"word.csv", "nm,value\n400,1\n500,bright\n700,1\n", ":3: 'bright' is not a number"},
        {"three.csv", "400,1,2\n", ":1: expected two values (nm, value), found 3"},
        {"down.csv", "700,1\n400,1\n", ":2: wavelengths must ascend", false},
        // Another grid is fine, but it has to cover the visible range.
        {"infrared.csv", "500,1\n600,1\n1000,1\n",
         ": the spectrum covers 500–1000 nm; it must cover the visible range 400–700 nm"},
        {"dark.csv", "380,0\n780,0\n", ": the spectrum has no light in the visible range"},
        {"light.sp", "this is not CGATS\n", "", false},
    };
    vt::TempDir dir;
    for (const Case& c : cases) {
        const fs::path file = c.text ? write(dir, c.name, c.text) : dir.path() / c.name;
        const std::string expected = file.string() + c.error;
        if (c.exact)
            EXPECT_EQ(errorOf(file), expected);
        else
            EXPECT_NE(errorOf(file).find(expected), std::string::npos) << errorOf(file);
    }
}

TEST(SpectrumFile, FoldersAreReadInNameOrderAndBadFilesSkipped)
{
    vt::TempDir dir;
    write(dir, "b.csv", "380,1\n780,1\n");
    write(dir, "a.csv", "380,1\n780,2\n");
    write(dir, "c.csv", "nm,value\n380,x\n");
    write(dir, "notes.txt", "not a spectrum");
    std::vector<std::string> errors;
    const auto lights = host::loadSpectrumFiles({dir.path(), dir.path() / "nowhere.sp"}, errors);
    ASSERT_EQ(lights.size(), 2u);
    EXPECT_EQ(lights[0].name, "a");
    EXPECT_EQ(lights[1].name, "b");
    ASSERT_EQ(errors.size(), 2u);
    EXPECT_NE(errors[0].find("c.csv:2: 'x' is not a number"), std::string::npos) << errors[0];
    EXPECT_NE(errors[1].find("nowhere.sp: no such file"), std::string::npos) << errors[1];
}

} // namespace
