// Shared pieces for the test programs: a temporary folder per test, the
// device-path roots pointing into it, and exact log-line capture.
#pragma once

#include <VantishPlatform/LogControl.h>

#include <filesystem>
#include <string>
#include <vector>

namespace vt {

// A fresh, empty folder removed when the object goes away.
class TempDir {
public:
    TempDir();
    ~TempDir();
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;
    const std::filesystem::path& path() const { return path_; }
    std::string str() const { return path_.string(); }

private:
    std::filesystem::path path_;
};

// Maps the device paths for one test: the system root onto the built bundle's
// parent folder (so the shipped reference files are found), the state root onto
// a private temporary folder. Restores the previous mapping on destruction.
class DeviceRoots {
public:
    DeviceRoots();
    ~DeviceRoots();
    const std::filesystem::path& state() const { return state_.path(); }
    // The cache folder as the plug-in sees it on this machine.
    std::filesystem::path cacheDir() const { return state_.path() / "Library" / "Brenzel"; }

private:
    TempDir state_;
};

// Captures every log line emitted while it exists, at the given level.
class LogCapture {
public:
    explicit LogCapture(VPLogLevel level = VPLogLevel::Debug);
    ~LogCapture();
    // Lines captured so far (kept).
    const std::vector<VPLogLine>& lines();
    std::vector<std::string> messages();
    bool contains(const std::string& message);
    bool contains(os_log_type_t type, const std::string& message);
    size_t count(const std::string& message);
    void clear();

private:
    std::vector<VPLogLine> lines_;
    VPLogLevel previous_;
};

std::string bundleDir(); // the built Vantish.plugin folder
std::string sourceDir(); // the project's source tree

} // namespace vt
