#include "host/emulator/DataFolder.h"

#include <cstdlib>

namespace fs = std::filesystem;

namespace host {

fs::path dataFolder()
{
    if (const char* env = std::getenv("VANTISH_DATA"); env && *env)
        return env;
    const fs::path source = fs::path(VANTISH_SOURCE_DIR) / "data";
    if (fs::exists(source / "devices"))
        return source;
    std::error_code ec;
    const fs::path exe = fs::read_symlink("/proc/self/exe", ec);
    return exe.parent_path().parent_path() / "share" / "vantish";
}

} // namespace host
