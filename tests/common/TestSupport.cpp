#include "common/TestSupport.h"

#include <VantishPlatform/DispatchControl.h>
#include <VantishPlatform/Paths.h>

#include <algorithm>
#include <atomic>
#include <unistd.h>

namespace vt {

TempDir::TempDir()
{
    static std::atomic<unsigned> counter{0};
    auto base = std::filesystem::temp_directory_path();
    for (;;) {
        auto candidate = base / ("vantish-test-" + std::to_string(getpid()) + "-" + std::to_string(counter++));
        std::error_code ec;
        if (std::filesystem::create_directory(candidate, ec)) {
            path_ = candidate;
            return;
        }
    }
}

TempDir::~TempDir()
{
    std::error_code ec;
    std::filesystem::remove_all(path_, ec);
}

DeviceRoots::DeviceRoots()
{
    VPSetPathRoot("/System/Library/HIDPlugins", std::filesystem::path(bundleDir()).parent_path().string());
    VPSetPathRoot("/var/mobile", state_.str());
}

DeviceRoots::~DeviceRoots()
{
    VPDispatchDrain();
    VPClearPathRoots();
}

LogCapture::LogCapture(VPLogLevel level) : previous_(VPLogGetLevel())
{
    VPLogSetLevel(level);
    VPLogStartCapture();
}

LogCapture::~LogCapture()
{
    VPLogStopCapture();
    VPLogSetLevel(previous_);
}

const std::vector<VPLogLine>& LogCapture::lines()
{
    auto more = VPLogTakeCaptured();
    lines_.insert(lines_.end(), more.begin(), more.end());
    return lines_;
}

std::vector<std::string> LogCapture::messages()
{
    std::vector<std::string> out;
    for (const auto& l : lines())
        out.push_back(l.message);
    return out;
}

bool LogCapture::contains(const std::string& message) { return count(message) > 0; }

bool LogCapture::contains(os_log_type_t type, const std::string& message)
{
    const auto& all = lines();
    return std::any_of(all.begin(), all.end(),
                       [&](const VPLogLine& l) { return l.type == type && l.message == message; });
}

size_t LogCapture::count(const std::string& message)
{
    const auto& all = lines();
    return size_t(std::count_if(all.begin(), all.end(), [&](const VPLogLine& l) { return l.message == message; }));
}

void LogCapture::clear()
{
    lines();
    lines_.clear();
}

std::string bundleDir() { return VANTISH_BUNDLE_DIR; }
std::string sourceDir() { return VANTISH_SOURCE_DIR; }

} // namespace vt
