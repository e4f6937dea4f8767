// The device's fixed paths mapped onto folders of this machine. A path that
// starts with a mapped device prefix is rewritten onto the host folder; any
// other path is used as it stands.
//
//   "/System/Library/HIDPlugins"  -> VANTISH_SYSTEM_ROOT (the folder holding Vantish.plugin)
//   "/var/mobile"                 -> VANTISH_STATE_ROOT  (a writable state folder)
#pragma once

#include <string>

void VPSetPathRoot(const std::string& devicePrefix, const std::string& hostFolder);
void VPClearPathRoots();
std::string VPMapPath(const std::string& devicePath);
