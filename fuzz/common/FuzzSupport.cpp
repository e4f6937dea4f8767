#include "common/FuzzSupport.h"

#include <VantishPlatform/DeviceState.h>
#include <VantishPlatform/DispatchControl.h>
#include <VantishPlatform/LogControl.h>
#include <VantishPlatform/Paths.h>

#include <sqlite3.h>

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <stdexcept>
#include <unistd.h>

namespace fs = std::filesystem;

namespace fz {

namespace {

// Inputs write files all the time: a memory file system keeps that cheap.
fs::path workspaceParent()
{
    std::error_code ec;
    if (fs::is_directory("/dev/shm", ec) && access("/dev/shm", W_OK) == 0)
        return "/dev/shm";
    return fs::temp_directory_path();
}

void exec(sqlite3* db, const std::string& sql)
{
    char* error = nullptr;
    if (sqlite3_exec(db, sql.c_str(), nullptr, nullptr, &error) != SQLITE_OK) {
        const std::string message = error ? error : "unknown error";
        sqlite3_free(error);
        throw std::runtime_error("reference database: " + message);
    }
}

void removeWorkspace()
{
    std::error_code ec;
    fs::remove_all(Workspace::get().root, ec);
}

} // namespace

Workspace::Workspace()
{
    root = workspaceParent() / ("vantish-fuzz-" + std::to_string(getpid()));
    system = root / "system";
    state = root / "state";
    store = root / "store";
    fs::create_directories(bundle());
    fs::create_directories(state);
    fs::create_directories(store);
    writeReferenceDatabase(referenceFile(BigDBTypeDefault), kReferenceSources);
    writeReferenceDatabase(referenceFile(BigDBType02), kReferenceSources);

    VPSetPathRoot("/System/Library/HIDPlugins", system.string());
    VPSetPathRoot("/var/mobile", state.string());
    VPQVTSetStoreDirectory(store.string());
    // VANTISH_FUZZ_LOG=1 shows the plug-in's log, for looking into one input.
    VPLogSetEcho(std::getenv("VANTISH_FUZZ_LOG") != nullptr);
    VPLogSetLevel(VPLogLevel::Debug);
    VPDispatchSetDelayMode(VPDelayMode::Manual);
}

const Workspace& Workspace::get()
{
    static const Workspace* const instance = [] {
        auto* w = new Workspace;
        std::atexit(removeWorkspace);
        return w;
    }();
    return *instance;
}

fs::path Workspace::referenceFile(BigDBType type) const
{
    return bundle() / (type == BigDBTypeDefault ? "bzlight.sqlite" : "bzlight-02.sqlite");
}

void Workspace::clear() const
{
    std::error_code ec;
    fs::remove_all(cacheFolder(), ec);
    for (const auto& entry : fs::directory_iterator(store, ec))
        fs::remove_all(entry.path(), ec);
}

void writeReferenceDatabase(const fs::path& file, int sources, int samples)
{
    std::error_code ec;
    fs::remove(file, ec);
    for (const char* side : {"-wal", "-shm", "-journal"})
        fs::remove(file.string() + side, ec);
    sqlite3* db = nullptr;
    if (sqlite3_open(file.c_str(), &db) != SQLITE_OK) {
        sqlite3_close(db);
        throw std::runtime_error("cannot create " + file.string());
    }
    exec(db, "CREATE TABLE Info (version REAL, sources INTEGER, columns INTEGER, samples INTEGER)");
    exec(db, "INSERT INTO Info VALUES (1.5, " + std::to_string(sources) + ", " + std::to_string(samples + 4) + ", " +
                 std::to_string(samples) + ")");
    std::string columns = "ID INTEGER PRIMARY KEY, X REAL, Y REAL, Z REAL";
    for (int s = 0; s < samples; ++s)
        columns += ", S" + std::to_string(s) + " REAL";
    exec(db, "CREATE TABLE Spectra (" + columns + ")");
    exec(db, "BEGIN");
    for (int i = 0; i < sources; ++i) {
        std::string row = std::to_string(i) + ", " + std::to_string(0.3 + 0.1 * i) + ", " +
                          std::to_string(0.35 + 0.05 * (i % 3)) + ", " + std::to_string(0.4 - 0.05 * i);
        // Smooth spectra whose slope differs from source to source.
        for (int s = 0; s < samples; ++s)
            row += ", " + std::to_string(1.0 + 0.01 * s * (i % 3) + 0.005 * (400 - s) * ((i + 1) % 2));
        exec(db, "INSERT INTO Spectra VALUES (" + row + ")");
    }
    exec(db, "COMMIT");
    sqlite3_close(db);
}

void writeFile(const fs::path& file, std::span<const uint8_t> bytes)
{
    std::ofstream out(file, std::ios::binary | std::ios::trunc);
    out.write(reinterpret_cast<const char*>(bytes.data()), std::streamsize(bytes.size()));
}

CFDataRef createData(std::span<const uint8_t> bytes)
{
    return CFDataCreate(kCFAllocatorDefault, bytes.data(), CFIndex(bytes.size()));
}

SpectralDatabasePtr smallDatabase(uint32_t channels, bool normalised)
{
    constexpr uint32_t kSources = 8;
    auto db = std::make_shared<SpectralDatabase>();
    db->allocate(kSources, channels);
    for (uint32_t i = 0; i < kSources; ++i) {
        for (uint32_t j = 0; j < channels; ++j)
            db->dbChannelResponses[j * kSources + i] = float(1 + (i * 7 + j * 3) % 11);
        db->dbXYZ[i] = 0.3f + 0.05f * float(i);
        db->dbXYZ[kSources + i] = 0.35f;
        db->dbXYZ[2 * kSources + i] = 0.4f - 0.03f * float(i);
    }
    if (normalised)
        db->channelStdDev.assign(channels, 1.5f);
    db->dbInfo.sources = int32_t(kSources);
    return db;
}

} // namespace fz
