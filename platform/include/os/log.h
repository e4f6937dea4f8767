// Unified logging: log handles by subsystem and category, four levels, and
// printf formats with the privacy annotations (%{public}s, %{private}s) and
// %@ for CF objects (printed with their description).
#pragma once

#include <cstdint>

typedef struct os_log_s* os_log_t;
typedef uint8_t os_log_type_t;

#define OS_LOG_TYPE_DEFAULT ((os_log_type_t) 0x00)
#define OS_LOG_TYPE_INFO ((os_log_type_t) 0x01)
#define OS_LOG_TYPE_DEBUG ((os_log_type_t) 0x02)
#define OS_LOG_TYPE_ERROR ((os_log_type_t) 0x10)
#define OS_LOG_TYPE_FAULT ((os_log_type_t) 0x11)

extern struct os_log_s _os_log_default;
#define OS_LOG_DEFAULT (&_os_log_default)

extern "C" {
// The handle of a subsystem and category, made on first use and never freed
// (as on the host platform); asking again gives the same handle.
os_log_t os_log_create(const char* subsystem, const char* category);
bool os_log_type_enabled(os_log_t log, os_log_type_t type);
void _os_log_emit(os_log_t log, os_log_type_t type, const char* format, ...);
}

#define os_log_with_type(log, type, format, ...)                    \
    do {                                                            \
        os_log_t _vl_log = (log);                                   \
        os_log_type_t _vl_type = (type);                            \
        if (os_log_type_enabled(_vl_log, _vl_type))                 \
            _os_log_emit(_vl_log, _vl_type, format, ##__VA_ARGS__); \
    } while (0)

#define os_log(log, format, ...) os_log_with_type(log, OS_LOG_TYPE_DEFAULT, format, ##__VA_ARGS__)
#define os_log_info(log, format, ...) os_log_with_type(log, OS_LOG_TYPE_INFO, format, ##__VA_ARGS__)
#define os_log_debug(log, format, ...) os_log_with_type(log, OS_LOG_TYPE_DEBUG, format, ##__VA_ARGS__)
#define os_log_error(log, format, ...) os_log_with_type(log, OS_LOG_TYPE_ERROR, format, ##__VA_ARGS__)
#define os_log_fault(log, format, ...) os_log_with_type(log, OS_LOG_TYPE_FAULT, format, ##__VA_ARGS__)
