// Factory-data store: one file per record class in a folder the host sets.
// Records are read whole on every request; the store keeps nothing cached.
#include <QVT/QVT.h>
#include <VantishPlatform/DeviceState.h>

#include "PlatformText.h"

#include <atomic>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <map>
#include <mutex>
#include <unistd.h>
#include <vector>

namespace {

// Levels passed to the log handler.
constexpr int kLevelInfo = 0;
constexpr int kLevelError = 1;

struct StoreState {
    std::atomic<QVTLogHandler> handler{nullptr};
    std::atomic<size_t> reads{0};
    std::mutex mutex;
    std::string directory;
    std::map<std::string, long> failures;
};

StoreState& state()
{
    static StoreState* const instance = new StoreState;
    return *instance;
}

void say(int level, const std::string& line)
{
    if (QVTLogHandler handler = state().handler.load())
        handler(level, line.c_str());
}

// A class key names a file inside the store folder, never a path out of it.
bool isPlainName(const std::string& key)
{
    return !key.empty() && key != "." && key != ".." && key.find('/') == std::string::npos;
}

// The whole file; false with errno set when it cannot be read. A missing file
// reports ENOENT.
bool readFile(const std::string& path, std::vector<UInt8>& bytes)
{
    int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0)
        return false;
    UInt8 chunk[65536];
    for (;;) {
        ssize_t got = read(fd, chunk, sizeof chunk);
        if (got < 0 && errno == EINTR)
            continue;
        if (got < 0) {
            int err = errno;
            close(fd);
            errno = err;
            return false;
        }
        if (got == 0)
            break;
        bytes.insert(bytes.end(), chunk, chunk + got);
    }
    close(fd);
    return true;
}

CFErrorRef makeError(long code) { return CFErrorCreate(kCFAllocatorDefault, CFSTR("QVTErrorDomain"), code, nullptr); }

} // namespace

void QVTLogSetHandler(QVTLogHandler handler) { state().handler.store(handler); }

CFDataRef QVTSealingMapCopyLocalDataForClass(CFStringRef classKey, CFDictionaryRef options, CFErrorRef* error)
{
    ++state().reads;
    std::string key = vp::textOf(classKey);
    std::string directory;
    long failure = 0;
    {
        std::lock_guard lock(state().mutex);
        directory = state().directory;
        if (auto it = state().failures.find(key); it != state().failures.end())
            failure = it->second;
    }
    if (failure != 0) {
        say(kLevelError, "QVT: reading class " + key + " failed with code " + std::to_string(failure));
        if (error)
            *error = makeError(failure);
        return nullptr;
    }
    if (directory.empty() || !isPlainName(key)) {
        say(kLevelInfo, "QVT: no record for class " + key);
        return nullptr;
    }
    std::string path = directory + "/" + key;
    say(kLevelInfo, "QVT: reading class " + key + " from " + path);
    std::vector<UInt8> bytes;
    if (!readFile(path, bytes)) {
        int err = errno;
        if (err == ENOENT) {
            say(kLevelInfo, "QVT: no record for class " + key);
            return nullptr;
        }
        say(kLevelError, "QVT: reading " + path + " failed: " + std::strerror(err));
        if (error)
            *error = makeError(err);
        return nullptr;
    }
    return CFDataCreate(kCFAllocatorDefault, bytes.data(), CFIndex(bytes.size()));
}

void VPQVTSetStoreDirectory(const std::string& directory)
{
    std::lock_guard lock(state().mutex);
    state().directory = directory;
}

void VPQVTSetFailure(const std::string& classKey, long code)
{
    std::lock_guard lock(state().mutex);
    if (code == 0)
        state().failures.erase(classKey);
    else
        state().failures[classKey] = code;
}

size_t VPQVTReadCount() { return state().reads.load(); }
void VPQVTResetReadCount() { state().reads.store(0); }
