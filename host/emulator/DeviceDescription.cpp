#include "host/emulator/DeviceDescription.h"

#include "support/CFOwned.h"

#include <cctype>
#include <fstream>
#include <iterator>

namespace fs = std::filesystem;

namespace host {

namespace {

[[noreturn]] void fail(const fs::path& file, const std::string& where, const std::string& what)
{
    throw DescriptionError(file.string() + ": " + where + ": " + what);
}

std::vector<uint8_t> parseHex(const std::string& text, const std::string& where)
{
    std::vector<uint8_t> bytes;
    int high = -1;
    for (char c : text) {
        if (std::isspace(static_cast<unsigned char>(c)))
            continue;
        if (!std::isxdigit(static_cast<unsigned char>(c)))
            throw DescriptionError(where + ": '" + std::string(1, c) + "' is not a hexadecimal digit");
        const int nibble = std::isdigit(static_cast<unsigned char>(c)) ? c - '0' : std::tolower(c) - 'a' + 10;
        if (high < 0) {
            high = nibble;
        } else {
            bytes.push_back(uint8_t(high << 4 | nibble));
            high = -1;
        }
    }
    if (high >= 0)
        throw DescriptionError(where + ": odd number of hexadecimal digits");
    return bytes;
}

CFTypeRef createData(const std::vector<uint8_t>& bytes)
{
    return CFDataCreate(nullptr, bytes.data(), CFIndex(bytes.size()));
}

template <typename T>
T unsignedField(const nlohmann::json& json, const char* key, T fallback, const fs::path& file, const std::string& where)
{
    if (!json.contains(key))
        return fallback;
    const auto& v = json[key];
    if (!v.is_number_unsigned() && !(v.is_number_integer() && v.get<int64_t>() >= 0))
        fail(file, where + "." + key, "expected a non-negative integer");
    return v.get<T>();
}

} // namespace

CFTypeRef createPropertyValue(const nlohmann::json& value, const fs::path& folder, const std::string& where)
{
    switch (value.type()) {
    case nlohmann::json::value_t::string:
        // Text that did not come through the JSON parser (a bare word after
        // "KEY=") may not be UTF-8, and then no CF string can hold it.
        if (CFStringRef string =
                CFStringCreateWithCString(nullptr, value.get<std::string>().c_str(), kCFStringEncodingUTF8))
            return string;
        throw DescriptionError(where + ": the text is not UTF-8");
    case nlohmann::json::value_t::boolean:
        return CFRetain(value.get<bool>() ? kCFBooleanTrue : kCFBooleanFalse);
    case nlohmann::json::value_t::number_integer:
    case nlohmann::json::value_t::number_unsigned: {
        const int64_t v = value.get<int64_t>();
        return CFNumberCreate(nullptr, kCFNumberSInt64Type, &v);
    }
    case nlohmann::json::value_t::number_float: {
        const double v = value.get<double>();
        return CFNumberCreate(nullptr, kCFNumberFloat64Type, &v);
    }
    case nlohmann::json::value_t::array: {
        // An element that has no CF form ends the whole value (and releases what was made of it).
        CFOwned<CFMutableArrayRef> array(CFArrayCreateMutable(nullptr, CFIndex(value.size()), &kCFTypeArrayCallBacks));
        for (size_t i = 0; i < value.size(); ++i) {
            const CFOwned<CFTypeRef> element(
                createPropertyValue(value[i], folder, where + "[" + std::to_string(i) + "]"));
            CFArrayAppendValue(array.get(), element.get());
        }
        return array.release();
    }
    case nlohmann::json::value_t::object:
        if (value.size() == 1 && value.contains("data") && value["data"].is_string())
            return createData(parseHex(value["data"].get<std::string>(), where));
        if (value.size() == 1 && value.contains("dataFile") && value["dataFile"].is_string()) {
            const fs::path path = folder / value["dataFile"].get<std::string>();
            std::ifstream in(path, std::ios::binary);
            if (!in)
                throw DescriptionError(where + ": cannot read " + path.string());
            std::vector<uint8_t> bytes((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
            return createData(bytes);
        }
        if (value.size() == 1 && value.contains("int") && value["int"].is_number_integer()) {
            const int32_t v = value["int"].get<int32_t>();
            return CFNumberCreate(nullptr, kCFNumberSInt32Type, &v);
        }
        if (value.size() == 1 && value.contains("float") && value["float"].is_number()) {
            const float v = value["float"].get<float>();
            return CFNumberCreate(nullptr, kCFNumberFloat32Type, &v);
        }
        throw DescriptionError(where +
                               ": an object value must be one of {\"data\"}, {\"dataFile\"}, {\"int\"}, {\"float\"}");
    default:
        throw DescriptionError(where + ": null is not a property value");
    }
}

DeviceDescription parseDeviceDescription(const nlohmann::json& json, const fs::path& file)
{
    if (!json.is_object())
        fail(file, "top level", "expected an object");
    DeviceDescription d;
    d.file = file;
    d.name = json.value("name", file.stem().string());
    d.summary = json.value("summary", "");

    const nlohmann::json service = json.value("service", nlohmann::json::object());
    if (!service.is_object())
        fail(file, "service", "expected an object");
    d.registryID = unsignedField<uint64_t>(service, "registryID", 0, file, "service");
    if (service.contains("usages")) {
        for (const auto& usage : service["usages"]) {
            if (!usage.is_array() || usage.size() != 2 || !usage[0].is_number_integer() ||
                !usage[1].is_number_integer())
                fail(file, "service.usages", "each usage is [page, usage]");
            d.usages.emplace_back(usage[0].get<uint32_t>(), usage[1].get<uint32_t>());
        }
    } else {
        d.usages.emplace_back(0xFF00u, 0x0004u); // an ambient-light sensor
    }
    d.serviceProperties = service.value("properties", nlohmann::json::object());
    if (!d.serviceProperties.is_object())
        fail(file, "service.properties", "expected an object");

    if (json.contains("registry")) {
        if (!json["registry"].is_array())
            fail(file, "registry", "expected an array of entries");
        for (size_t i = 0; i < json["registry"].size(); ++i) {
            const auto& entry = json["registry"][i];
            const std::string where = "registry[" + std::to_string(i) + "]";
            if (!entry.is_object() || !entry.contains("id"))
                fail(file, where, "each entry needs an \"id\"");
            RegistryEntryDescription e;
            e.id = unsignedField<uint64_t>(entry, "id", 0, file, where);
            e.parent = unsignedField<uint64_t>(entry, "parent", 0, file, where);
            e.properties = entry.value("properties", nlohmann::json::object());
            if (!e.properties.is_object())
                fail(file, where + ".properties", "expected an object");
            d.registry.push_back(std::move(e));
        }
    }
    if (json.contains("factoryStore")) {
        if (!json["factoryStore"].is_string())
            fail(file, "factoryStore", "expected a folder name");
        d.factoryStore = file.parent_path() / json["factoryStore"].get<std::string>();
    }
    d.bootArgs = json.value("bootArgs", "");
    if (json.contains("deviceInfo")) {
        const auto& info = json["deviceInfo"];
        if (!info.is_object())
            fail(file, "deviceInfo", "expected an object");
        for (const auto& [key, value] : info.items()) {
            if (key == "productType")
                d.productType = value.get<int>();
            else
                d.answers[key] = value;
        }
    }

    // Check every value now, so a bad one is reported before anything runs.
    for (const auto& [key, value] : d.serviceProperties.items())
        CFRelease(createPropertyValue(value, d.folder(), file.string() + ": service.properties." + key));
    for (size_t i = 0; i < d.registry.size(); ++i)
        for (const auto& [key, value] : d.registry[i].properties.items())
            CFRelease(createPropertyValue(value, d.folder(),
                                          file.string() + ": registry[" + std::to_string(i) + "].properties." + key));
    for (const auto& [key, value] : d.answers.items())
        CFRelease(createPropertyValue(value, d.folder(), file.string() + ": deviceInfo." + key));
    return d;
}

DeviceDescription loadDeviceDescription(const fs::path& file)
{
    std::ifstream in(file);
    if (!in)
        throw DescriptionError(file.string() + ": cannot open the device description");
    nlohmann::json json;
    try {
        json = nlohmann::json::parse(in);
    } catch (const nlohmann::json::parse_error& e) {
        throw DescriptionError(file.string() + ": not valid JSON: " + e.what());
    }
    return parseDeviceDescription(json, file);
}

} // namespace host
