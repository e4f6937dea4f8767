// Logging for every part of the plug-in. Each message goes to the plug-in's
// own log when it exists, else to the framework's default log (created on
// first need). Every message is guarded by os_log_type_enabled, so its
// arguments are computed only when its level is enabled.
#pragma once

#include "plugin/VantishPlugIn.h"

#include <os/log.h>

// The handle chosen by the rule above.
os_log_t vantishLog();

#define VLOG_DEFAULT(format, ...) os_log_with_type(vantishLog(), OS_LOG_TYPE_DEFAULT, format, ##__VA_ARGS__)
#define VLOG_INFO(format, ...) os_log_with_type(vantishLog(), OS_LOG_TYPE_INFO, format, ##__VA_ARGS__)
#define VLOG_DEBUG(format, ...) os_log_with_type(vantishLog(), OS_LOG_TYPE_DEBUG, format, ##__VA_ARGS__)
#define VLOG_ERROR(format, ...) os_log_with_type(vantishLog(), OS_LOG_TYPE_ERROR, format, ##__VA_ARGS__)
