// What every fuzz target shares: a private workspace on a memory file system
// (device paths mapped into it, a small reference database, an empty state
// folder and factory store), quiet logging, and a reader that takes option
// bytes from the front of an input. Each input gets its own plug-in instance
// (vt::PlugIn, with AtRelease::RunQueuedWorkFirst, from tests/common).
//
// Every input starts from the same state: no cache file, no store record, no
// queued work left over from the input before.
#pragma once

#include "common/PlugInHolder.h"
#include "plugin/VantishPlugIn.h"

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <filesystem>
#include <span>
#include <string>

namespace fz {

// Sources in the workspace's reference databases: enough for a real fit,
// few enough to build a per-chip database in well under a millisecond.
constexpr int kReferenceSources = 6;
// The chip ID the generated factory records carry and the plug-in expects.
constexpr uint32_t kChipId = 0x1A2B3C4D;

class Workspace {
public:
    // The process's workspace, made on first use and removed at exit. Logging
    // is switched to debug level (every message is formatted) without echo
    // (VANTISH_FUZZ_LOG=1 in the environment keeps the echo),
    // and delayed work waits until fired (so factory retries never run on
    // their own).
    static const Workspace& get();

    std::filesystem::path root;   // everything below lives here
    std::filesystem::path system; // "/System/Library/HIDPlugins"
    std::filesystem::path state;  // "/var/mobile"
    std::filesystem::path store;  // the factory-data store

    std::filesystem::path bundle() const { return system / "Vantish.plugin"; }
    std::filesystem::path cacheFolder() const { return state / "Library" / "Brenzel"; }
    std::filesystem::path referenceFile(BigDBType type) const;

    // Removes every cache file (with SQLite's side files) and store record.
    void clear() const;

private:
    Workspace();
};

// A reference database of `sources` smooth spectra of `samples` samples (the
// calibration spectra have 401; fewer are allowed).
void writeReferenceDatabase(const std::filesystem::path& file, int sources, int samples = 401);

void writeFile(const std::filesystem::path& file, std::span<const uint8_t> bytes);

// A published-ready per-chip database of eight sources whose channel balance
// differs, with `channels` channels; normalised (every channel's deviation
// 1.5) when asked.
SpectralDatabasePtr smallDatabase(uint32_t channels, bool normalised = false);

// Takes option bytes from the front of an input; reads past the end give 0.
class Input {
public:
    Input(const uint8_t* data, size_t size) : bytes_(data, size) {}

    template <typename T>
    T take()
    {
        T value{};
        const size_t n = std::min(sizeof(T), bytes_.size());
        std::memcpy(&value, bytes_.data(), n);
        bytes_ = bytes_.subspan(n);
        return value;
    }
    std::span<const uint8_t> takeBytes(size_t count)
    {
        const auto taken = bytes_.first(std::min(count, bytes_.size()));
        bytes_ = bytes_.subspan(taken.size());
        return taken;
    }
    std::span<const uint8_t> rest() const { return bytes_; }
    size_t size() const { return bytes_.size(); }

private:
    std::span<const uint8_t> bytes_;
};

CFDataRef createData(std::span<const uint8_t> bytes);

} // namespace fz
