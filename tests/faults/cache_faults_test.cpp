// The cache folder and file failing the ways a disk fails them. Each case ends
// with the database the build made in use (colour on after a factory build, as
// it was after a registry build), one log line for the failed write, and the
// cache that was there before still whole.
#include "faults/FaultFixture.h"

#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <sys/mount.h>
#include <unistd.h>

using faults::Source;
using unit::kDefaultReference;
using unit::kSecondReference;

namespace {

constexpr float kFactorySmallVersion = 1.3f;       // XwCl units of device id 14
constexpr float kConfigurationSmallVersion = 1.1f; // registry calibration

class CacheFaults : public faults::FaultTest {
protected:
    std::filesystem::path buildingFile() const { return cacheFile().string() + ".tmp"; }
};

} // namespace

TEST_F(CacheFaults, UnwritableFolder)
{
    blockCacheFolder();
    open(Source::Factory);
    EXPECT_EQ(logged("Failed to create small DB 2\n"), 1u);
    EXPECT_TRUE(colourFrom(kSecondReference)) << "a factory build switches colour on without its file";

    open(Source::Configuration);
    EXPECT_EQ(logged("Failed to create small DB 2\n"), 2u);
    EXPECT_FALSE(colour()) << "a registry build waits for its file";

    std::filesystem::remove(cacheFolder());
    rebuild(Source::Configuration);
    EXPECT_TRUE(colourFrom(kDefaultReference));
    EXPECT_TRUE(cacheValidFor(kDefaultReference, kConfigurationSmallVersion));
}

TEST_F(CacheFaults, FolderVanishingBetweenWritesIsMadeAgain)
{
    open(Source::Factory);
    std::filesystem::remove_all(state_.path() / "Library");
    rebuild(Source::Factory);
    EXPECT_EQ(logged("Small DB has been created\n"), 2u);
    EXPECT_TRUE(cacheValidFor(kSecondReference, kFactorySmallVersion));
    EXPECT_TRUE(colourFrom(kSecondReference));
}

TEST_F(CacheFaults, FolderVanishingDuringAWrite)
{
    open(Source::Factory);
    {
        faults::StatementHook vanish("INSERT INTO Info", [this] { std::filesystem::remove_all(cacheFolder()); });
        rebuild(Source::Factory);
    }
    EXPECT_EQ(logged("Failed to create small DB 2\n"), 1u);
    EXPECT_TRUE(colourFrom(kSecondReference));

    rebuild(Source::Factory);
    EXPECT_TRUE(cacheValidFor(kSecondReference, kFactorySmallVersion));
}

// A write failing part-way: a statement refused (inserts into XX), and SQLite's
// page limit standing in for a disk that fills up (the last table cannot be
// created). The registry build of the other reference fails the same way.
TEST_F(CacheFaults, WriteFailingPartWayKeepsTheLastCache)
{
    open(Source::Factory);
    const auto good = cacheBytes();
    ASSERT_FALSE(good.empty());
    auto denyXX = [](void*, int action, const char* table, const char*, const char*, const char*) {
        return action == SQLITE_INSERT && table && std::string(table) == "XX" ? SQLITE_DENY : SQLITE_OK;
    };
    const std::pair<std::function<void(sqlite3*)>, const char*> failures[] = {
        {[denyXX](sqlite3* db) { sqlite3_set_authorizer(db, denyXX, nullptr); }, "Failed to create small DB 23\n"},
        {[](sqlite3* db) { sqlite3_exec(db, "PRAGMA max_page_count=3", nullptr, nullptr, nullptr); },
         "Failed to create small DB 13\n"},
    };
    for (const auto& [failure, line] : failures) {
        SCOPED_TRACE(line);
        {
            faults::WriterHook hook(failure);
            rebuild(Source::Factory);
            EXPECT_EQ(logged(line), 1u);
            EXPECT_TRUE(colourFrom(kSecondReference)) << "the new database, as after any factory build";
            rebuild(Source::Configuration);
            EXPECT_EQ(logged(line), 2u);
            EXPECT_TRUE(colourFrom(kDefaultReference));
        }
        EXPECT_TRUE(cacheBytes() == good) << "the cache file changed";
        EXPECT_TRUE(cacheValidFor(kSecondReference, kFactorySmallVersion));
        EXPECT_FALSE(std::filesystem::exists(buildingFile()));
    }
}

// A real file system that fills up, where the test may mount one.
TEST_F(CacheFaults, FullFileSystemKeepsTheLastCache)
{
    std::filesystem::create_directories(cacheFolder());
    if (mount("tmpfs", cacheFolder().c_str(), "tmpfs", 0, "size=512k") != 0)
        GTEST_SKIP() << "cannot mount a small file system here (" << std::strerror(errno) << ")";
    struct Unmount {
        std::string at;
        ~Unmount() { umount2(at.c_str(), MNT_DETACH); }
    } unmount{cacheFolder().string()};

    open(Source::Factory);
    const auto good = cacheBytes();
    ASSERT_FALSE(good.empty());
    // Fill it, then give back room for the reader's index and the start of a write.
    const std::vector<char> block(4096, 'f');
    unsigned blocks = 0;
    for (;; ++blocks) {
        const int fd = ::open((cacheFolder() / ("fill" + std::to_string(blocks))).c_str(), O_CREAT | O_WRONLY, 0644);
        const bool written = fd >= 0 && write(fd, block.data(), block.size()) == ssize_t(block.size());
        if (fd >= 0)
            close(fd);
        if (!written)
            break;
    }
    for (unsigned i = 0; i < 24 && i < blocks; ++i)
        std::filesystem::remove(cacheFolder() / ("fill" + std::to_string(i)));

    rebuild(Source::Factory);
    EXPECT_EQ(loggedStartingWith("Failed to create small DB"), 1u);
    EXPECT_TRUE(cacheBytes() == good) << "the cache file changed";
    for (unsigned i = 0; i <= blocks; ++i)
        std::filesystem::remove(cacheFolder() / ("fill" + std::to_string(i)));
    EXPECT_TRUE(cacheValidFor(kSecondReference, kFactorySmallVersion));
    EXPECT_TRUE(colourFrom(kSecondReference));
}

// A cache file that is not a database, and what a write that never finished
// left beside it, are replaced; colour comes on.
TEST_F(CacheFaults, DamagedCacheIsReplaced)
{
    std::filesystem::create_directories(cacheFolder());
    unit::writeFile(cacheFile(), {'n', 'o', 't', ' ', 'a', ' ', 'd', 'b'});
    unit::writeFile(buildingFile(), {'h', 'a', 'l', 'f'});
    open(Source::Configuration);
    EXPECT_EQ(logged("Small DB has been created\n"), 1u);
    EXPECT_TRUE(cacheValidFor(kDefaultReference, kConfigurationSmallVersion));
    EXPECT_TRUE(colourFrom(kDefaultReference));
    EXPECT_FALSE(std::filesystem::exists(buildingFile()));
}
