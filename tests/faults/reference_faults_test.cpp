// A shipped reference database that is missing or cut short: nothing is
// built, the database in use (and colour) stays as it was, the cache file is
// not touched, and the fault is logged once.
#include "faults/FaultFixture.h"

using faults::Source;
using unit::kSecondReference;

namespace {

class ReferenceFaults : public faults::FaultTest {
protected:
    // A factory-calibrated unit with colour on and its cache written.
    void SetUp() override
    {
        FaultTest::SetUp();
        open(Source::Factory);
        ASSERT_TRUE(colourFrom(kSecondReference));
        database_ = plugin_->parts().databases().snapshot().db;
        cache_ = cacheBytes();
        ASSERT_FALSE(cache_.empty());
    }

    // The rebuild failed for `cause` (the `times`-th time) and nothing changed.
    void expectRefused(const std::string& cause, size_t times)
    {
        EXPECT_EQ(logged(cause), times);
        EXPECT_EQ(logged("Failed to rebuild databases."), times);
        EXPECT_EQ(plugin_->parts().databases().snapshot().db, database_) << "the database in use was replaced";
        EXPECT_TRUE(colourFrom(kSecondReference));
        EXPECT_TRUE(cacheBytes() == cache_) << "the cache file changed";
    }

    SpectralDatabasePtr database_;
    std::vector<uint8_t> cache_;
};

} // namespace

TEST_F(ReferenceFaults, MissingOrCutShortReference)
{
    std::filesystem::remove(reference(kSecondReference));
    rebuild(Source::Factory);
    expectRefused("Database not found!\n", 1);

    unit::writeReferences(system_.path() / "Vantish.plugin");
    const auto file = reference(kSecondReference);
    std::filesystem::resize_file(file, std::filesystem::file_size(file) / 2);
    rebuild(Source::Factory);
    expectRefused("Database not found!\n", 2);
}

// The file reads, but holds fewer light sources than its Info promises.
TEST_F(ReferenceFaults, ReferenceWithRowsMissing)
{
    for (const auto* r : {&kSecondReference, &unit::kDefaultReference}) {
        sqlite3* db = nullptr;
        ASSERT_EQ(sqlite3_open(reference(*r).c_str(), &db), SQLITE_OK);
        unit::execSql(db, "DELETE FROM Spectra WHERE ID >= " + std::to_string(unit::kSources / 2));
        sqlite3_close(db);
    }
    rebuild(Source::Factory);
    expectRefused("Failed to parse big DB -1\n", 1);
    rebuild(Source::Configuration);
    expectRefused("Failed to parse big DB -1\n", 2);
}

// At bring-up there is no database to keep: the driver has its factory
// record, colour stays off, and nothing is written.
TEST_F(ReferenceFaults, MissingReferenceAtBringUp)
{
    std::filesystem::remove(reference(kSecondReference));
    std::filesystem::remove(cacheFile());
    open(Source::Factory);
    EXPECT_EQ(logged("Database not found!\n"), 1u);
    EXPECT_EQ(logged("QVT Calibration has been loaded successfully"), 2u) << "the record reached the driver";
    EXPECT_FALSE(colour());
    EXPECT_FALSE(std::filesystem::exists(cacheFile()));
}
