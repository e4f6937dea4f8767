// Device paths mapped onto folders of this machine. The longest mapped prefix
// that ends at a path component wins; the two standard roots fall back on the
// environment when the host has not set them.
#include <VantishPlatform/Paths.h>

#include <cstdlib>
#include <map>
#include <mutex>

namespace {

struct Roots {
    std::mutex mutex;
    std::map<std::string, std::string> byPrefix;
};

Roots& roots()
{
    static Roots* const instance = new Roots;
    return *instance;
}

const struct {
    const char* prefix;
    const char* variable;
} environmentRoots[] = {
    {"/System/Library/HIDPlugins", "VANTISH_SYSTEM_ROOT"},
    {"/var/mobile", "VANTISH_STATE_ROOT"},
};

std::string withoutTrailingSlashes(std::string path)
{
    while (!path.empty() && path.back() == '/')
        path.pop_back();
    return path;
}

// "/var/mobile" covers "/var/mobile" and "/var/mobile/...", not "/var/mobileX".
bool covers(const std::string& prefix, const std::string& path)
{
    return path.compare(0, prefix.size(), prefix) == 0 && (path.size() == prefix.size() || path[prefix.size()] == '/');
}

// `host` has no trailing slash; "" stands for the root folder.
std::string rebase(const std::string& host, const std::string& rest)
{
    if (host.empty())
        return rest.empty() ? "/" : rest;
    return host + rest;
}

} // namespace

// An empty host folder removes the mapping of that prefix; "/" cannot be mapped.
void VPSetPathRoot(const std::string& devicePrefix, const std::string& hostFolder)
{
    std::string prefix = withoutTrailingSlashes(devicePrefix);
    if (prefix.empty())
        return;
    std::lock_guard lock(roots().mutex);
    if (hostFolder.empty())
        roots().byPrefix.erase(prefix);
    else
        roots().byPrefix[prefix] = withoutTrailingSlashes(hostFolder);
}

void VPClearPathRoots()
{
    std::lock_guard lock(roots().mutex);
    roots().byPrefix.clear();
}

std::string VPMapPath(const std::string& devicePath)
{
    std::map<std::string, std::string> candidates;
    {
        std::lock_guard lock(roots().mutex);
        candidates = roots().byPrefix;
    }
    for (const auto& root : environmentRoots) {
        const char* value = std::getenv(root.variable);
        if (value && *value)
            candidates.emplace(root.prefix, withoutTrailingSlashes(value)); // a set root stays
    }
    const std::pair<const std::string, std::string>* best = nullptr;
    for (const auto& candidate : candidates)
        if (covers(candidate.first, devicePath) && (!best || candidate.first.size() > best->first.size()))
            best = &candidate;
    if (!best)
        return devicePath;
    return rebase(best->second, devicePath.substr(best->first.size()));
}
