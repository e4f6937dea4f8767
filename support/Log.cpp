#include "support/Log.h"

std::atomic<os_log_t> _BRENZEL_LOG_DEFAULT{nullptr};
std::atomic<os_log_t> pluginLog{nullptr};

os_log_t init_default_brenzel_log()
{
    os_log_t log = os_log_create(VANTISH_FRAMEWORK_LOG_SUBSYSTEM, "default");
    if (!log) {
        if (os_log_type_enabled(OS_LOG_DEFAULT, OS_LOG_TYPE_ERROR))
            _os_log_emit(OS_LOG_DEFAULT, OS_LOG_TYPE_ERROR, "Failed to create Brenzel default log");
        log = OS_LOG_DEFAULT;
    }
    _BRENZEL_LOG_DEFAULT = log;
    return log;
}

os_log_t vantishLog()
{
    if (os_log_t log = pluginLog.load())
        return log;
    if (os_log_t log = _BRENZEL_LOG_DEFAULT.load())
        return log;
    return init_default_brenzel_log();
}
