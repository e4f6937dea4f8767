// A database built privately and then published is never seen half-written,
// and one a reader still holds stays intact while newer ones replace it.
#include "LightDbFiles.h"

#include "lightdb/CachedDB.h"
#include "lightdb/DatabaseSlot.h"
#include "lightdb/LDBM.h"

#include <atomic>
#include <thread>

namespace {

constexpr int kGenerations = 40;

// Every array of generation g holds g; sizes follow N and M.
bool consistent(const SpectralDatabase& db, float& generation)
{
    const size_t n = db.dbSampleCount;
    const size_t m = db.dbChannelCount;
    if (db.dbXYZ.size() != 3 * n || db.dbChannelResponses.size() != m * n || db.channelStdDev.size() != m || n == 0)
        return false;
    generation = db.dbXYZ[0];
    auto all = [&](const std::vector<float>& v) {
        return std::all_of(v.begin(), v.end(), [&](float x) { return x == generation; });
    };
    return all(db.dbXYZ) && all(db.dbChannelResponses) && all(db.channelStdDev);
}

class PublicationTest : public ldbtest::LightDbTest {};

} // namespace

TEST_F(PublicationTest, ReadersNeverSeeATornDatabase)
{
    std::vector<ldbtest::Spectrum> rows;
    for (int id = 0; id < 64; ++id)
        rows.push_back({id, 1.0f, 1.0f, 1.0f, {1.0f}});
    ldbtest::writeReference(bigDB(), "1.0", 64, rows);
    DatabaseSlot slot;

    // The reader runs before the first publication and until it has seen the
    // last one, so its reads really overlap the writer's publications.
    std::atomic<bool> started{false};
    std::atomic<int> torn{0}, backwards{0}, seen{0};
    std::thread reader([&] {
        DatabaseSlot::Snapshot held;
        float last = 0.0f;
        while (last < float(kGenerations)) {
            started = true;
            DatabaseSlot::Snapshot snap = slot.snapshot();
            if (!snap.db)
                continue;
            float generation = 0.0f, heldGeneration = 0.0f;
            if (!consistent(*snap.db, generation))
                ++torn;
            if (generation < last)
                ++backwards;
            if (held.db && (!consistent(*held.db, heldGeneration) || heldGeneration > generation))
                ++torn;
            if (generation != last)
                ++seen;
            last = generation;
            held = snap;
        }
    });
    while (!started.load())
        std::this_thread::yield();

    for (int g = 1; g <= kGenerations; ++g) {
        SpectralDatabase db;
        ASSERT_FALSE(processCachedDB(CacheKey{}, 4 + g % 2, BigDBTypeDefault, db)); // no cache: sized for a build
        for (auto* v : {&db.dbXYZ, &db.dbChannelResponses})
            for (float& x : *v)
                x = float(g);
        db.channelStdDev.assign(db.dbChannelCount, float(g));
        slot.publish(std::make_shared<const SpectralDatabase>(std::move(db)), true);
    }
    reader.join();

    EXPECT_EQ(torn.load(), 0);
    EXPECT_EQ(backwards.load(), 0);
    EXPECT_GT(seen.load(), 0);
    const auto last = slot.snapshot();
    ASSERT_TRUE(last.ready && last.db);
    float generation = 0.0f;
    EXPECT_TRUE(consistent(*last.db, generation));
    EXPECT_EQ(generation, float(kGenerations));
}
