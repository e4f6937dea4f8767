// Small reference and cache files for the light database tests, written into
// temporary folders that the device paths are mapped onto.
#pragma once

#include "common/TestSupport.h"
#include "lightdb/LDBMInfo.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <locale.h>
#include <string>
#include <vector>

namespace ldbtest {

// Runs one or more SQL statements on `file` (created when missing).
void runSql(const std::filesystem::path& file, const std::string& sql);
// The first column of every row of `query`, as text.
std::vector<std::string> queryColumn(const std::filesystem::path& file, const std::string& query);

struct Spectrum {
    int id;
    float x, y, z;
    std::vector<float> samples;
};

// A reference file: Info (version, sources, columns, samples) and Spectra
// (ID, X, Y, Z, L0 .. L<S-1>) with one row per entry of `spectra`.
void writeReference(const std::filesystem::path& file, const std::string& version, int sources,
                    const std::vector<Spectrum>& spectra);

// Each test gets its own system folder (holding Vantish.plugin) and state folder.
class LightDbTest : public ::testing::Test {
protected:
    LightDbTest();
    std::filesystem::path bigDB(const char* name = "bzlight.sqlite") const
    {
        return system_.path() / "Vantish.plugin" / name;
    }
    std::filesystem::path cacheFile(int orientation) const;

    vt::DeviceRoots roots_;
    vt::TempDir system_;
};

// A locale whose decimal separator is ',' (generated into a temporary folder
// when none is installed), or 0 when none can be had.
locale_t commaDecimalLocale();

// Switches the calling thread's locale for one scope.
class ThreadLocale {
public:
    explicit ThreadLocale(locale_t locale) : previous_(uselocale(locale)) {}
    ~ThreadLocale() { uselocale(previous_); }
    ThreadLocale(const ThreadLocale&) = delete;
    ThreadLocale& operator=(const ThreadLocale&) = delete;

private:
    locale_t previous_;
};

} // namespace ldbtest
