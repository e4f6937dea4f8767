#include "LightDbFiles.h"

#include <VantishPlatform/Paths.h>

#include <sqlite3.h>

// gcc says it builds with AddressSanitizer by __SANITIZE_ADDRESS__, clang by
// __has_feature.
#if defined(__SANITIZE_ADDRESS__)
#define LIGHTDB_TEST_ASAN 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer)
#define LIGHTDB_TEST_ASAN 1
#endif
#endif
#if defined(LIGHTDB_TEST_ASAN)
#include <sanitizer/lsan_interface.h>
#endif

#include <cstdlib>
#include <langinfo.h>
#include <sstream>

namespace ldbtest {

void runSql(const std::filesystem::path& file, const std::string& sql)
{
    sqlite3* db = nullptr;
    ASSERT_EQ(sqlite3_open(file.c_str(), &db), SQLITE_OK) << file;
    char* error = nullptr;
    EXPECT_EQ(sqlite3_exec(db, sql.c_str(), nullptr, nullptr, &error), SQLITE_OK) << (error ? error : "") << "\n"
                                                                                  << sql;
    sqlite3_free(error);
    sqlite3_close(db);
}

std::vector<std::string> queryColumn(const std::filesystem::path& file, const std::string& query)
{
    std::vector<std::string> out;
    sqlite3* db = nullptr;
    if (sqlite3_open_v2(file.c_str(), &db, SQLITE_OPEN_READONLY, nullptr) == SQLITE_OK) {
        auto collect = [](void* context, int, char** values, char**) {
            static_cast<std::vector<std::string>*>(context)->push_back(values[0] ? values[0] : "NULL");
            return 0;
        };
        sqlite3_exec(db, query.c_str(), collect, &out, nullptr);
    }
    sqlite3_close(db);
    return out;
}

void writeReference(const std::filesystem::path& file, const std::string& version, int sources,
                    const std::vector<Spectrum>& spectra)
{
    const size_t samples = spectra.empty() ? 0 : spectra.front().samples.size();
    std::ostringstream sql;
    sql.precision(9);
    sql << "CREATE TABLE Info (version REAL, sources INTEGER, columns INTEGER, samples INTEGER);"
        << "INSERT INTO Info VALUES (" << version << ", " << sources << ", " << samples + 4 << ", " << samples << ");"
        << "CREATE TABLE Spectra (ID INTEGER, X REAL, Y REAL, Z REAL";
    for (size_t s = 0; s < samples; ++s)
        sql << ", L" << s << " REAL";
    sql << ");";
    for (const auto& row : spectra) {
        sql << "INSERT INTO Spectra VALUES (" << row.id << ", " << row.x << ", " << row.y << ", " << row.z;
        for (float value : row.samples)
            sql << ", " << value;
        sql << ");";
    }
    runSql(file, sql.str());
}

LightDbTest::LightDbTest()
{
    VPSetPathRoot("/System/Library/HIDPlugins", system_.str());
    std::filesystem::create_directory(system_.path() / "Vantish.plugin");
}

std::filesystem::path LightDbTest::cacheFile(int orientation) const
{
    return roots_.cacheDir() / ("bzrgbc_" + std::to_string(orientation) + ".sqlite");
}

namespace {

bool usesComma(locale_t locale) { return locale && std::string(nl_langinfo_l(RADIXCHAR, locale)) == ","; }

// Builds de_DE.UTF-8 with localedef into a folder kept for the whole run.
locale_t generatedGermanLocale()
{
    static vt::TempDir folder;
    const std::string command = "localedef -i de_DE -f UTF-8 " + folder.str() + "/de_DE.UTF-8 >/dev/null 2>&1";
    if (std::system(command.c_str()) != 0)
        return locale_t(0);
    setenv("LOCPATH", folder.str().c_str(), 1);
#if defined(LIGHTDB_TEST_ASAN)
    __lsan_disable(); // the C library keeps a copy of LOCPATH it never frees
#endif
    locale_t locale = newlocale(LC_ALL_MASK, "de_DE.UTF-8", locale_t(0));
#if defined(LIGHTDB_TEST_ASAN)
    __lsan_enable();
#endif
    unsetenv("LOCPATH");
    return locale;
}

} // namespace

locale_t commaDecimalLocale()
{
    static const locale_t locale = [] {
        for (const char* name : {"de_DE.UTF-8", "de_DE.utf8", "fr_FR.UTF-8"})
            if (locale_t l = newlocale(LC_ALL_MASK, name, locale_t(0)); usesComma(l))
                return l;
        locale_t l = generatedGermanLocale();
        return usesComma(l) ? l : locale_t(0);
    }();
    return locale;
}

} // namespace ldbtest
