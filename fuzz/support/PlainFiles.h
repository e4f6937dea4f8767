// Property values of the `vantish` inputs may read files ({"dataFile": name}).
// The fuzz targets allow only plain names, inside the folder the value is read
// from, so that no input can make the fuzzer read devices or other files of
// the machine.
#pragma once

#include <nlohmann/json.hpp>

#include <string>

namespace fz {

inline bool readsOnlyPlainFiles(const nlohmann::json& value)
{
    if (value.is_object())
        for (const auto& [key, member] : value.items())
            if ((key == "dataFile" && member.is_string() && member.get<std::string>().find('/') != std::string::npos) ||
                !readsOnlyPlainFiles(member))
                return false;
    if (value.is_array())
        for (const auto& element : value)
            if (!readsOnlyPlainFiles(element))
                return false;
    return true;
}

} // namespace fz
