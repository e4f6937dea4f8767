// Property values of the `vantish` inputs may read files ({"dataFile": name}).
// The fuzz targets allow only relative paths that stay inside the folder the
// value is read from, so that no input can make the fuzzer read devices or
// other files of the machine.
#pragma once

#include <nlohmann/json.hpp>

#include <filesystem>
#include <string>

namespace fz {

inline bool staysInside(const std::string& name)
{
    const std::filesystem::path path(name);
    if (path.empty() || path.is_absolute())
        return false;
    for (const auto& part : path)
        if (part == "..")
            return false;
    return true;
}

inline bool readsOnlyPlainFiles(const nlohmann::json& value)
{
    if (value.is_object())
        for (const auto& [key, member] : value.items())
            if ((key == "dataFile" && member.is_string() && !staysInside(member.get<std::string>())) ||
                !readsOnlyPlainFiles(member))
                return false;
    if (value.is_array())
        for (const auto& element : value)
            if (!readsOnlyPlainFiles(element))
                return false;
    return true;
}

} // namespace fz
