#include "host/emulator/Bundle.h"

#include "support/CFOwned.h"

#include <nlohmann/json.hpp>

#include <dlfcn.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <stdexcept>

namespace fs = std::filesystem;

namespace host {

namespace {

const char* kTypeKey = "CFPlugInTypes";
const char* kFactoriesKey = "CFPlugInFactories";

// Null when the text is not a UUID; text that is not ASCII is not one either.
CFOwned<CFUUIDRef> parseUUID(const std::string& text)
{
    const CFOwned<CFStringRef> string(CFStringCreateWithCString(nullptr, text.c_str(), kCFStringEncodingASCII));
    if (!string)
        return {};
    return CFOwned<CFUUIDRef>(CFUUIDCreateFromString(nullptr, string.get()));
}

std::string uuidString(CFUUIDRef uuid)
{
    const CFOwned<CFStringRef> string(CFUUIDCreateString(nullptr, uuid));
    return CFStringGetCStringPtr(string.get(), kCFStringEncodingASCII);
}

// The factory function name registered for the service-filter type.
std::string findFactory(const nlohmann::json& info, const fs::path& infoPath)
{
    const std::string wantedType = uuidString(kIOHIDServiceFilterPlugInTypeID);
    if (!info.contains(kTypeKey) || !info.contains(kFactoriesKey))
        throw std::runtime_error(infoPath.string() + ": no " + kTypeKey + " or " + kFactoriesKey);
    for (const auto& [type, factories] : info[kTypeKey].items()) {
        const CFOwned<CFUUIDRef> typeID = parseUUID(type);
        if (!typeID || !CFEqual(typeID.get(), kIOHIDServiceFilterPlugInTypeID) || !factories.is_array())
            continue;
        for (const auto& factory : factories) {
            if (!factory.is_string())
                continue;
            for (const auto& [id, name] : info[kFactoriesKey].items()) {
                const CFOwned<CFUUIDRef> a = parseUUID(id);
                const CFOwned<CFUUIDRef> b = parseUUID(factory.get<std::string>());
                if (a && b && CFEqual(a.get(), b.get()) && name.is_string())
                    return name.get<std::string>();
            }
        }
    }
    throw std::runtime_error(infoPath.string() + ": no factory registered for the service-filter type " + wantedType);
}

} // namespace

Bundle::Bundle(const std::string& folder) : folder_(folder)
{
    const fs::path infoPath = fs::path(folder) / "Info.json";
    std::ifstream in(infoPath);
    if (!in)
        throw std::runtime_error("cannot read the bundle registration " + infoPath.string());
    nlohmann::json info;
    try {
        info = nlohmann::json::parse(in);
    } catch (const nlohmann::json::parse_error& e) {
        throw std::runtime_error(infoPath.string() + ": " + e.what());
    }
    factoryName_ = findFactory(info, infoPath);
    const std::string executable = info.value("CFBundleExecutable", "");
    if (executable.empty())
        throw std::runtime_error(infoPath.string() + ": no CFBundleExecutable");
    const fs::path libraryPath = fs::path(folder) / executable;
    library_ = dlopen(libraryPath.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (!library_)
        throw std::runtime_error("cannot load " + libraryPath.string() + ": " + dlerror());
    factory_ = reinterpret_cast<Factory>(dlsym(library_, factoryName_.c_str()));
    if (!factory_)
        throw std::runtime_error(libraryPath.string() + " has no factory " + factoryName_);
}

Bundle::~Bundle()
{
    // The library stays loaded: queued work of released instances may still be
    // running its code, as in the event system, which never unloads filters.
}

FilterInterface Bundle::createFilter() const
{
    void* unknown = factory_(kCFAllocatorDefault, kIOHIDServiceFilterPlugInTypeID);
    if (!unknown)
        return nullptr;
    auto iunknown = static_cast<IOHIDServiceFilterPlugInInterface**>(unknown);
    LPVOID filter = nullptr;
    const HRESULT result =
        (*iunknown)->QueryInterface(unknown, CFUUIDGetUUIDBytes(kIOHIDServiceFilterPlugInInterfaceID), &filter);
    (*iunknown)->Release(unknown);
    if (result != S_OK)
        return nullptr;
    return static_cast<FilterInterface>(filter);
}

std::string defaultBundleFolder()
{
    if (const char* env = std::getenv("VANTISH_BUNDLE"))
        return env;
    std::error_code ec;
    const fs::path exe = fs::read_symlink("/proc/self/exe", ec);
    if (!ec) {
        for (const fs::path& candidate : {exe.parent_path().parent_path() / "Vantish.plugin",
                                          exe.parent_path().parent_path() / "lib" / "vantish" / "Vantish.plugin"}) {
            if (fs::exists(candidate / "Info.json"))
                return candidate.string();
        }
    }
    return "Vantish.plugin";
}

} // namespace host
