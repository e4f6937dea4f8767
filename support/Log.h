// Logging for every part of the plug-in. Each message goes to the plug-in's
// own log when it exists, else to the framework's default log (created on
// first need). Every message is guarded by os_log_type_enabled, so its
// arguments are computed only when its level is enabled.
#pragma once

#include <os/log.h>

#include <atomic>

#define VANTISH_FRAMEWORK_LOG_SUBSYSTEM "org.vantish.brenzel"
#define VANTISH_PLUGIN_LOG_SUBSYSTEM VANTISH_FRAMEWORK_LOG_SUBSYSTEM ".Vantish"

// Process-wide log handles: the framework's default log and the plug-in's own
// (created with the first instance).
extern std::atomic<os_log_t> _BRENZEL_LOG_DEFAULT;
extern std::atomic<os_log_t> pluginLog;

// Creates the framework's default log (or falls back to OS_LOG_DEFAULT) and
// stores it in _BRENZEL_LOG_DEFAULT.
os_log_t init_default_brenzel_log();

// The handle chosen by the rule above.
os_log_t vantishLog();

#define VLOG_DEFAULT(format, ...) os_log_with_type(vantishLog(), OS_LOG_TYPE_DEFAULT, format, ##__VA_ARGS__)
#define VLOG_INFO(format, ...) os_log_with_type(vantishLog(), OS_LOG_TYPE_INFO, format, ##__VA_ARGS__)
#define VLOG_DEBUG(format, ...) os_log_with_type(vantishLog(), OS_LOG_TYPE_DEBUG, format, ##__VA_ARGS__)
#define VLOG_ERROR(format, ...) os_log_with_type(vantishLog(), OS_LOG_TYPE_ERROR, format, ##__VA_ARGS__)
