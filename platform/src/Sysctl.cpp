// sysctlbyname for the one name the plug-in reads, "kern.bootargs": the boot
// arguments set by the host, else this machine's kernel command line.
#include <sys/sysctl.h>

#include <VantishPlatform/DeviceState.h>

#include <atomic>
#include <cerrno>
#include <cstring>
#include <fstream>
#include <iterator>
#include <mutex>

namespace {

struct SysctlState {
    std::mutex mutex;
    std::optional<std::string> bootArgs;
    std::atomic<int> failure{0};
};

SysctlState& state()
{
    static SysctlState* const instance = new SysctlState;
    return *instance;
}

std::string kernelCommandLine()
{
    std::ifstream in("/proc/cmdline", std::ios::binary);
    std::string text((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
    if (!text.empty() && text.back() == '\n')
        text.pop_back();
    return text;
}

std::string bootArgs()
{
    {
        std::lock_guard lock(state().mutex);
        if (state().bootArgs)
            return *state().bootArgs;
    }
    return kernelCommandLine();
}

int fail(int err)
{
    errno = err;
    return -1;
}

} // namespace

// A buffer too small for the whole value receives nothing (never a string cut
// short without its NUL); *oldlenp then tells the size needed.
int sysctlbyname(const char* name, void* oldp, size_t* oldlenp, void* newp, size_t newlen)
{
    if (int forced = state().failure.load())
        return fail(forced);
    if (!name)
        return fail(EINVAL);
    if (std::strcmp(name, "kern.bootargs") != 0)
        return fail(ENOENT);
    if (newp)
        return fail(EPERM);
    if (!oldlenp)
        return oldp ? fail(EINVAL) : 0;
    std::string value = bootArgs();
    size_t needed = value.size() + 1;
    if (oldp && *oldlenp < needed) {
        *oldlenp = needed;
        return fail(ENOMEM);
    }
    if (oldp)
        std::memcpy(oldp, value.c_str(), needed);
    *oldlenp = needed;
    return 0;
}

void VPSetBootArgs(std::optional<std::string> bootArgs)
{
    std::lock_guard lock(state().mutex);
    state().bootArgs = std::move(bootArgs);
}

void VPSetSysctlFailure(int err) { state().failure.store(err); }
