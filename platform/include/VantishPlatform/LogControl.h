// Control over unified logging: which levels are enabled, where lines go,
// and a capture for tests that compare exact log lines.
#pragma once

#include <os/log.h>

#include <string>
#include <vector>

struct VPLogLine {
    os_log_type_t type;
    std::string subsystem;
    std::string category;
    std::string message;
};

// Default and error are enabled unless changed; VANTISH_LOG=debug|info|default|error|off
// in the environment sets the starting level.
enum class VPLogLevel { Off, Error, Default, Info, Debug };
void VPLogSetLevel(VPLogLevel level);
VPLogLevel VPLogGetLevel();
// Lines are echoed to stderr unless turned off.
void VPLogSetEcho(bool echo);
// Starts (or restarts, dropping earlier lines) capturing every emitted line.
void VPLogStartCapture();
void VPLogStopCapture();
std::vector<VPLogLine> VPLogTakeCaptured();
// Makes os_log_create fail (return null) from now on; for the fallback paths.
void VPLogSetCreateFails(bool fails);
const char* VPLogTypeName(os_log_type_t type);
