#include "host/recordcodec/RecordCodec.h"

#include "formats/DriverRecordLayouts.h"
#include "formats/VD6287Layout.h"
#include "formats/XwCAT2Layout.h"
#include "formats/XwClLayout.h"
#include "host/recordcodec/Layouts.h"

#include <algorithm>
#include <stdexcept>

namespace recordcodec {
namespace {

struct KindInfo {
    Kind kind;
    std::string_view name;
    std::vector<size_t> sizes; // empty: any size
};

const std::vector<KindInfo>& kinds()
{
    static const std::vector<KindInfo> all = {
        {Kind::XwCl, "factory-xwcl", {stored::xwcl::kOneEntrySize, stored::xwcl::kTwoEntrySize}},
        {Kind::XwCAT2, "factory-xwca-t2", {stored::xwca::kSize}},
        {Kind::VD6287v1, "factory-vd6287-v1", {stored::vd6287::kV1Size}},
        {Kind::VD6287v3, "factory-vd6287-v3", {stored::vd6287::kV3Size}},
        {Kind::AlsCalibration, "registry-alsCalibration", {}},
        {Kind::AlsAuxCalibration, "registry-alsAuxCalibration", {}},
        {Kind::Driver4Channel, "driver-4-channel", {driver::kFourChannelRecord.size}},
        {Kind::Driver5Channel, "driver-5-channel", {driver::kFiveChannelRecord.size}},
        {Kind::Driver6Channel, "driver-6-channel", {driver::kSixChannelRecord.size}},
        {Kind::DriverVD6287, "driver-vd6287", {driver::vd6287::kSize}},
        {Kind::ColorCalibration, "driver-ALSColorCalibration", {driver::colour::kSize}},
    };
    return all;
}

const KindInfo& infoOf(Kind kind)
{
    for (const KindInfo& info : kinds())
        if (info.kind == kind)
            return info;
    throw std::logic_error("unknown calibration kind");
}

bool sizeAllowed(const KindInfo& info, size_t size)
{
    return info.sizes.empty() || std::find(info.sizes.begin(), info.sizes.end(), size) != info.sizes.end();
}

std::vector<Field> describe(Kind kind, std::span<const uint8_t> bytes)
{
    const Describer d(bytes);
    switch (kind) {
    case Kind::XwCl:
        describeXwCl(d);
        break;
    case Kind::XwCAT2:
        describeXwCAT2(d);
        break;
    case Kind::VD6287v1:
        describeVD6287v1(d);
        break;
    case Kind::VD6287v3:
        describeVD6287v3(d);
        break;
    case Kind::AlsCalibration:
        describeAlsCalibration(d);
        break;
    case Kind::AlsAuxCalibration:
        describeAlsAuxCalibration(d);
        break;
    case Kind::Driver4Channel:
        describeChannelRecord(d, driver::kFourChannelRecord);
        break;
    case Kind::Driver5Channel:
        describeChannelRecord(d, driver::kFiveChannelRecord);
        break;
    case Kind::Driver6Channel:
        describeChannelRecord(d, driver::kSixChannelRecord);
        break;
    case Kind::DriverVD6287:
        describeVD6287Record(d);
        break;
    case Kind::ColorCalibration:
        describeColorCalibration(d);
        break;
    }
    return d.fields();
}

// Runs of bytes no field covers, as {"offset", "hex"}.
Json unnamedRuns(const std::vector<Field>& fields, std::span<const uint8_t> bytes)
{
    std::vector<bool> covered(bytes.size(), false);
    for (const Field& f : fields)
        for (size_t i = f.offset; i < f.offset + f.byteLength(); ++i)
            covered[i] = true;
    Json runs = Json::array();
    for (size_t i = 0; i < bytes.size();) {
        if (covered[i]) {
            ++i;
            continue;
        }
        size_t end = i;
        while (end < bytes.size() && !covered[end])
            ++end;
        runs.push_back(Json{{"offset", i}, {"hex", hexOf(bytes.subspan(i, end - i))}});
        i = end;
    }
    return runs;
}

std::vector<uint8_t> withUnnamed(size_t size, const Json& runs)
{
    std::vector<uint8_t> bytes(size, 0);
    if (runs.is_null())
        return bytes;
    if (!runs.is_array())
        throw std::runtime_error("\"unnamed\" is not an array");
    for (const Json& run : runs) {
        if (!run.is_object() || !run.contains("offset") || !run["offset"].is_number_unsigned() ||
            !run.contains("hex") || !run["hex"].is_string())
            throw std::runtime_error("\"unnamed\" entries need \"offset\" and \"hex\"");
        const size_t offset = run["offset"].get<size_t>();
        const std::string hex = run["hex"].get<std::string>();
        if (hex.size() % 2 != 0 || offset > size || hex.size() / 2 > size - offset)
            throw std::runtime_error("unnamed bytes at " + std::to_string(offset) + " do not fit the record");
        for (size_t i = 0; i < hex.size() / 2; ++i) {
            const std::string pair = hex.substr(2 * i, 2);
            if (pair.find_first_not_of("0123456789abcdefABCDEF") != std::string::npos)
                throw std::runtime_error("unnamed bytes at " + std::to_string(offset) + " are not hexadecimal");
            bytes[offset + i] = uint8_t(std::stoul(pair, nullptr, 16));
        }
    }
    return bytes;
}

// Bytes with the unnamed runs and every field of `fields` that the JSON gives.
std::vector<uint8_t> assemble(size_t size, const Json& record, const std::vector<Field>& fields)
{
    std::vector<uint8_t> bytes = withUnnamed(size, record.contains("unnamed") ? record["unnamed"] : Json());
    const Json empty = Json::object();
    const Json& values = record.contains("fields") ? record["fields"] : empty;
    for (const Field& f : fields)
        if (const Json* value = findAtPath(values, f.path))
            fieldFromJson(f, *value, bytes);
    return bytes;
}

// Where later fields lie depends on counts and sizes written by earlier ones:
// describe the bytes built so far and rebuild until the layout stays the same.
// Each pass can place one more entry of a registry blob (at most 255) or one
// more level of nesting.
constexpr int kMaxLayoutPasses = 300;

} // namespace

std::string_view kindName(Kind kind) { return infoOf(kind).name; }

std::optional<Kind> kindNamed(std::string_view name)
{
    for (const KindInfo& info : kinds())
        if (info.name == name)
            return info.kind;
    return std::nullopt;
}

const std::vector<Kind>& allKinds()
{
    static const std::vector<Kind> all = [] {
        std::vector<Kind> out;
        for (const KindInfo& info : kinds())
            out.push_back(info.kind);
        return out;
    }();
    return all;
}

std::optional<Kind> kindForSize(size_t size)
{
    for (const KindInfo& info : kinds())
        if (!info.sizes.empty() && sizeAllowed(info, size))
            return info.kind;
    return std::nullopt;
}

Result<Json> decode(std::span<const uint8_t> bytes, std::optional<Kind> kind)
{
    if (!kind)
        kind = kindForSize(bytes.size());
    if (!kind)
        return {std::nullopt, "no calibration layout is " + std::to_string(bytes.size()) +
                                  " bytes long; name the format of a registry blob"};
    const KindInfo& info = infoOf(*kind);
    if (!sizeAllowed(info, bytes.size()))
        return {std::nullopt,
                std::string(info.name) + " records are not " + std::to_string(bytes.size()) + " bytes long"};

    const std::vector<Field> fields = describe(*kind, bytes);
    Json values = Json::object();
    for (const Field& f : fields)
        makeAtPath(values, f.path) = fieldToJson(f, bytes);
    Json out = Json::object();
    out["format"] = info.name;
    out["size"] = bytes.size();
    out["fields"] = std::move(values);
    out["unnamed"] = unnamedRuns(fields, bytes);
    return {std::move(out), ""};
}

Result<std::vector<uint8_t>> encode(const Json& record)
{
    try {
        if (!record.is_object() || !record.contains("format") || !record["format"].is_string())
            return {std::nullopt, "the record has no \"format\""};
        const std::optional<Kind> kind = kindNamed(record["format"].get<std::string>());
        if (!kind)
            return {std::nullopt, "unknown format " + record["format"].dump()};
        if (!record.contains("size") || !record["size"].is_number_unsigned())
            return {std::nullopt, "the record has no \"size\""};
        const size_t size = record["size"].get<size_t>();
        const KindInfo& info = infoOf(*kind);
        if (!sizeAllowed(info, size))
            return {std::nullopt, std::string(info.name) + " records are not " + std::to_string(size) + " bytes long"};

        std::vector<uint8_t> bytes = assemble(size, record, {});
        std::vector<Field> layout;
        for (int pass = 0; pass < kMaxLayoutPasses; ++pass) {
            std::vector<Field> next = describe(*kind, bytes);
            if (pass > 0 && next == layout)
                return {std::move(bytes), ""};
            layout = std::move(next);
            bytes = assemble(size, record, layout);
        }
        return {std::nullopt, "the record's counts and sizes do not settle on one layout"};
    } catch (const std::exception& e) {
        return {std::nullopt, e.what()};
    }
}

} // namespace recordcodec
