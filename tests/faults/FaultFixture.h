// One unit, opened the way the host opens it, with a good cache in place
// before a fault is injected; and the means to inject faults into SQLite's
// writes from outside the plug-in.
#pragma once

#include "common/PlugInHolder.h"
#include "common/TestSupport.h"
#include "stress/SyntheticUnit.h"

#include <gtest/gtest.h>
#include <sqlite3.h>

#include <filesystem>
#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace faults {

// Where the unit's calibration comes from.
enum class Source {
    Factory,       // the XwCl record in the factory store: the second reference database
    Configuration, // the registry blob: the default reference database
};

class FaultTest : public ::testing::Test {
protected:
    void SetUp() override;
    void TearDown() override;

    // A new instance opened on the service, its bring-up run to the end.
    void open(Source source);
    void releasePlugIn();
    // "RebuildVelderDB", from the given source.
    void rebuild(Source source);

    // The colour of one filtered event, or nothing when colour is off.
    std::optional<unit::Chromaticity> colour();
    bool colourFrom(const unit::Reference& reference);

    std::filesystem::path cacheFolder() const { return state_.path() / "Library" / "Brenzel"; }
    std::filesystem::path cacheFile() const { return cacheFolder() / "bzrgbc_1.sqlite"; }
    std::filesystem::path reference(const unit::Reference& r) const
    {
        return system_.path() / "Vantish.plugin" / r.file;
    }
    std::filesystem::path storeRecord() const { return store_.path() / "XwCl"; }
    std::vector<uint8_t> cacheBytes() const { return unit::readFile(cacheFile()); }
    // Whether the cache file holds a whole cache built from `r`.
    bool cacheValidFor(const unit::Reference& r, float smallVersion);
    // A regular file where the cache folder should be.
    void blockCacheFolder();
    // The driver's "crgb", or -1 when the plug-in never set it.
    int crgb();
    // The calibration source (byte 1) of the record the driver received last.
    int receivedRecordSource();

    // Lines logged with exactly this text.
    size_t logged(const std::string& message) { return log_.count(message); }
    size_t loggedStartingWith(const std::string& start);

    // Made before the folders, so that they are made on a memory file system.
    struct MemoryTemporaryFolder {
        MemoryTemporaryFolder();
    } memoryTemporaryFolder_;
    vt::TempDir system_, state_, store_;
    IOHIDServiceRef service_ = nullptr;
    std::optional<vt::PlugIn> plugin_;
    vt::LogCapture log_{VPLogLevel::Info};
};

// Runs `action` on every connection that opens a database for writing, from
// the moment it opens, for as long as the object lives. SQLite calls it for
// each new connection, so faults reach the plug-in's own writes.
class WriterHook {
public:
    explicit WriterHook(std::function<void(sqlite3*)> action);
    ~WriterHook();
    WriterHook(const WriterHook&) = delete;
    WriterHook& operator=(const WriterHook&) = delete;
};

// Runs `action` once, as the first statement starting with `sqlPrefix` begins
// on a connection opened for writing.
class StatementHook {
public:
    StatementHook(std::string sqlPrefix, std::function<void()> action);

private:
    struct State {
        std::string prefix;
        std::function<void()> action;
        bool done = false;
    };
    std::shared_ptr<State> state_;
    WriterHook hook_;
};

} // namespace faults
