// Unified logging: handles, the level gate, the stderr echo and the capture
// that tests read.
//
// Handles and the logging state are never freed, so that blocks still running
// while the process exits can log.
#include <os/log.h>

#include <VantishPlatform/LogControl.h>

#include "LogFormat.h"

#include <atomic>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <deque>
#include <mutex>
#include <string>
#include <string_view>
#include <strings.h>
#include <utility>
#include <vector>

struct os_log_s {
    const char* subsystem;
    const char* category;
};

// The default log has no subsystem; its echoed lines carry only the level.
os_log_s _os_log_default = {"", ""};

namespace {

VPLogLevel startLevel()
{
    const char* env = std::getenv("VANTISH_LOG");
    if (!env)
        return VPLogLevel::Default;
    static const struct {
        const char* name;
        VPLogLevel level;
    } names[] = {{"off", VPLogLevel::Off},
                 {"error", VPLogLevel::Error},
                 {"default", VPLogLevel::Default},
                 {"info", VPLogLevel::Info},
                 {"debug", VPLogLevel::Debug}};
    for (const auto& n : names)
        if (strcasecmp(env, n.name) == 0)
            return n.level;
    return VPLogLevel::Default;
}

// The lowest setting at which a message type is shown. Types the system does
// not know count as default.
VPLogLevel levelNeeded(os_log_type_t type)
{
    switch (type) {
    case OS_LOG_TYPE_DEBUG:
        return VPLogLevel::Debug;
    case OS_LOG_TYPE_INFO:
        return VPLogLevel::Info;
    case OS_LOG_TYPE_ERROR:
    case OS_LOG_TYPE_FAULT:
        return VPLogLevel::Error;
    default:
        return VPLogLevel::Default;
    }
}

// A created handle with the strings it points into (a deque never moves them).
struct CreatedLog {
    std::string subsystem;
    std::string category;
    os_log_s handle;
};

class LogState {
public:
    std::atomic<VPLogLevel> level{startLevel()};
    std::atomic<bool> echo{true};
    std::atomic<bool> createFails{false};

    // One handle per subsystem and category, as the system's log keeps them: a
    // host that creates and releases plug-in instances all day does not grow.
    os_log_t create(const char* subsystem, const char* category)
    {
        std::lock_guard lock(mutex_);
        const std::string_view wantedSubsystem = subsystem ? subsystem : "";
        const std::string_view wantedCategory = category ? category : "";
        for (CreatedLog& log : created_)
            if (log.subsystem == wantedSubsystem && log.category == wantedCategory)
                return &log.handle;
        CreatedLog& log = created_.emplace_back();
        log.subsystem = wantedSubsystem;
        log.category = wantedCategory;
        log.handle = {log.subsystem.c_str(), log.category.c_str()};
        return &log.handle;
    }

    void startCapture()
    {
        std::lock_guard lock(mutex_);
        captured_.clear();
        capturing_ = true;
    }

    void stopCapture()
    {
        std::lock_guard lock(mutex_);
        capturing_ = false;
    }

    std::vector<VPLogLine> takeCaptured()
    {
        std::lock_guard lock(mutex_);
        return std::exchange(captured_, {});
    }

    // One lock for echo and capture keeps both in the same order.
    void record(const os_log_s& log, os_log_type_t type, std::string message)
    {
        std::lock_guard lock(mutex_);
        if (echo.load())
            echoLine(log, type, message);
        if (capturing_)
            captured_.push_back({type, log.subsystem, log.category, std::move(message)});
    }

private:
    // Messages often end in a newline of their own; the line gets exactly one.
    static void echoLine(const os_log_s& log, os_log_type_t type, const std::string& message)
    {
        std::string line;
        if (*log.subsystem || *log.category)
            line = std::string(log.subsystem) + ":" + log.category + " ";
        line += VPLogTypeName(type);
        line += ": ";
        line.append(message, 0, !message.empty() && message.back() == '\n' ? message.size() - 1 : message.size());
        line += '\n';
        std::fwrite(line.data(), 1, line.size(), stderr);
    }

    std::mutex mutex_;
    std::deque<CreatedLog> created_;
    bool capturing_ = false;
    std::vector<VPLogLine> captured_;
};

LogState& state()
{
    static LogState* const instance = new LogState;
    return *instance;
}

} // namespace

os_log_t os_log_create(const char* subsystem, const char* category)
{
    if (state().createFails.load())
        return nullptr;
    return state().create(subsystem, category);
}

bool os_log_type_enabled(os_log_t log, os_log_type_t type) { return levelNeeded(type) <= state().level.load(); }

void _os_log_emit(os_log_t log, os_log_type_t type, const char* format, ...)
{
    if (!os_log_type_enabled(log, type))
        return;
    va_list args;
    va_start(args, format);
    std::string message = vp::formatLogMessage(format ? format : "", args);
    va_end(args);
    // A null handle is taken as the default log rather than dereferenced.
    state().record(log ? *log : _os_log_default, type, std::move(message));
}

void VPLogSetLevel(VPLogLevel level) { state().level.store(level); }
VPLogLevel VPLogGetLevel() { return state().level.load(); }
void VPLogSetEcho(bool echo) { state().echo.store(echo); }
void VPLogStartCapture() { state().startCapture(); }
void VPLogStopCapture() { state().stopCapture(); }
std::vector<VPLogLine> VPLogTakeCaptured() { return state().takeCaptured(); }
void VPLogSetCreateFails(bool fails) { state().createFails.store(fails); }

const char* VPLogTypeName(os_log_type_t type)
{
    switch (type) {
    case OS_LOG_TYPE_DEFAULT:
        return "default";
    case OS_LOG_TYPE_INFO:
        return "info";
    case OS_LOG_TYPE_DEBUG:
        return "debug";
    case OS_LOG_TYPE_ERROR:
        return "error";
    case OS_LOG_TYPE_FAULT:
        return "fault";
    default: // logged as default, so named so
        return "default";
    }
}
