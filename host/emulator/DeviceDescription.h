// A unit described in JSON: its HID service (properties as the driver
// publishes them), the registry entries above it (device-tree properties and
// calibration blobs), its factory-data store folder, boot arguments and
// device-information answers.
//
// Property values: JSON strings, booleans, integers (64-bit numbers), reals
// (double numbers) and arrays map onto the CF types; objects spell the rest:
//   {"data": "0a0b0c"}          bytes in hexadecimal (spaces allowed)
//   {"dataFile": "blob.bin"}    bytes of a file, relative to the description
//   {"int": 5}                  a 32-bit integer number
//   {"float": 0.25}             a 32-bit floating-point number
#pragma once

#include <CoreFoundation/CoreFoundation.h>

#include <nlohmann/json.hpp>

#include <cstdint>
#include <filesystem>
#include <optional>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

namespace host {

// A description that cannot be used; the message names the file and the field.
class DescriptionError : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

struct RegistryEntryDescription {
    uint64_t id = 0;
    uint64_t parent = 0; // 0: a root
    nlohmann::json properties = nlohmann::json::object();
};

struct DeviceDescription {
    std::filesystem::path file; // where it was read from (relative paths start there)
    std::string name;
    std::string summary;
    uint64_t registryID = 0;
    std::vector<std::pair<uint32_t, uint32_t>> usages;
    nlohmann::json serviceProperties = nlohmann::json::object();
    std::vector<RegistryEntryDescription> registry;
    std::optional<std::filesystem::path> factoryStore;
    std::string bootArgs;
    nlohmann::json answers = nlohmann::json::object(); // device-information answers
    int productType = 0;

    std::filesystem::path folder() const { return file.parent_path(); }
};

DeviceDescription loadDeviceDescription(const std::filesystem::path& file);
DeviceDescription parseDeviceDescription(const nlohmann::json& json, const std::filesystem::path& file);

// A new CF value (caller releases, never null) for a property value; throws
// DescriptionError, with `where` naming the value, for one that has no CF form.
CFTypeRef createPropertyValue(const nlohmann::json& value, const std::filesystem::path& folder,
                              const std::string& where);

} // namespace host
