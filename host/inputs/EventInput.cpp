#include "host/inputs/EventInput.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <limits>
#include <map>
#include <sstream>

namespace host {

namespace {

// Event time stamps are nanoseconds in 64 bits (up to about 1.8e10 s); the
// reader keeps a margin so that the conversion never rounds past the end.
constexpr double kLatestTimeSeconds = 1.8e10;

std::string trim(const std::string& s)
{
    const auto begin = s.find_first_not_of(" \t\r");
    if (begin == std::string::npos)
        return "";
    const auto end = s.find_last_not_of(" \t\r");
    return s.substr(begin, end - begin + 1);
}

std::vector<std::string> splitCsv(const std::string& line)
{
    std::vector<std::string> cells;
    std::string cell;
    std::istringstream in(line);
    while (std::getline(in, cell, ','))
        cells.push_back(trim(cell));
    if (!line.empty() && line.back() == ',')
        cells.emplace_back();
    return cells;
}

std::optional<double> parseNumber(const std::string& text)
{
    double value = 0;
    const char* begin = text.data();
    const char* end = text.data() + text.size();
    auto [ptr, ec] = std::from_chars(begin, end, value);
    if (ec != std::errc() || ptr != end || !std::isfinite(value))
        return std::nullopt;
    return value;
}

// Integer fields must hold whole numbers inside their type's range.
template <typename T>
bool setInteger(T& out, double value)
{
    if (value != std::floor(value) || value < double(std::numeric_limits<T>::min()) ||
        value > double(std::numeric_limits<T>::max()))
        return false;
    out = T(value);
    return true;
}

using Setter = bool (*)(ALSSampleRecord&, double);

const std::map<std::string, Setter>& setters()
{
    static const std::map<std::string, Setter> table = {
        {"status", [](ALSSampleRecord& r, double v) { return setInteger(r.status, v); }},
        {"sampleChannelCount", [](ALSSampleRecord& r, double v) { return setInteger(r.sampleChannelCount, v); }},
        {"sampleOrientation", [](ALSSampleRecord& r, double v) { return setInteger(r.sampleOrientation, v); }},
        {"nits", [](ALSSampleRecord& r, double v) { return setInteger(r.nits, v); }},
        {"integrationTime", [](ALSSampleRecord& r, double v) { return setInteger(r.integrationTime, v); }},
        {"reportInterval", [](ALSSampleRecord& r, double v) { return setInteger(r.reportInterval, v); }},
        {"gain", [](ALSSampleRecord& r, double v) { return setInteger(r.gain, std::round(v * 65536.0)); }},
        {"lux", [](ALSSampleRecord& r, double v) { return r.lux = float(v), true; }},
        {"rawLux", [](ALSSampleRecord& r, double v) { return r.rawLux = float(v), true; }},
        {"c0", [](ALSSampleRecord& r, double v) { return r.channelValues[0] = float(v), true; }},
        {"c1", [](ALSSampleRecord& r, double v) { return r.channelValues[1] = float(v), true; }},
        {"c2", [](ALSSampleRecord& r, double v) { return r.channelValues[2] = float(v), true; }},
        {"c3", [](ALSSampleRecord& r, double v) { return r.channelValues[3] = float(v), true; }},
        {"c4", [](ALSSampleRecord& r, double v) { return r.channelValues[4] = float(v), true; }},
        {"c5", [](ALSSampleRecord& r, double v) { return r.channelValues[5] = float(v), true; }},
        {"cct", [](ALSSampleRecord& r, double v) { return r.cct = float(v), true; }},
        {"timestamp", [](ALSSampleRecord& r, double v) { return setInteger(r.timestamp, v); }},
        {"subsamples", [](ALSSampleRecord& r, double v) { return setInteger(r.subsamples, v); }},
        {"mode", [](ALSSampleRecord& r, double v) { return setInteger(r.mode, v); }},
        {"xTalk0", [](ALSSampleRecord& r, double v) { return setInteger(r.xTalk[0], v); }},
        {"xTalk1", [](ALSSampleRecord& r, double v) { return setInteger(r.xTalk[1], v); }},
        {"xTalk2", [](ALSSampleRecord& r, double v) { return setInteger(r.xTalk[2], v); }},
        {"xTalk3", [](ALSSampleRecord& r, double v) { return setInteger(r.xTalk[3], v); }},
        {"xTalk4", [](ALSSampleRecord& r, double v) { return setInteger(r.xTalk[4], v); }},
        {"xyzInRecord", [](ALSSampleRecord& r, double v) { return setInteger(r.xyzInRecord, v); }},
        {"xyzSensorX", [](ALSSampleRecord& r, double v) { return r.xyzSensor[0] = float(v), true; }},
        {"xyzSensorY", [](ALSSampleRecord& r, double v) { return r.xyzSensor[1] = float(v), true; }},
        {"xyzSensorZ", [](ALSSampleRecord& r, double v) { return r.xyzSensor[2] = float(v), true; }},
        {"filteredLux", [](ALSSampleRecord& r, double v) { return r.filteredLux = float(v), true; }},
        {"filteredLuxValid", [](ALSSampleRecord& r, double v) { return setInteger(r.filteredLuxValid, v); }},
    };
    return table;
}

} // namespace

const std::vector<std::string>& sampleFieldNames()
{
    static const std::vector<std::string> names = [] {
        std::vector<std::string> n;
        for (const auto& [name, setter] : setters())
            n.push_back(name);
        n.push_back("ts");
        return n;
    }();
    return names;
}

std::string InputError::describe(const std::string& source) const
{
    std::string text = source + ":" + std::to_string(line) + ": ";
    if (!field.empty())
        text += "field '" + field + "': ";
    return text + message;
}

std::optional<std::pair<std::string, nlohmann::json>> parseAssignment(const std::string& text)
{
    const auto eq = text.find('=');
    if (eq == std::string::npos || eq == 0)
        return std::nullopt;
    const std::string key = trim(text.substr(0, eq));
    const std::string raw = trim(text.substr(eq + 1));
    nlohmann::json value = nlohmann::json::parse(raw, nullptr, false);
    if (value.is_discarded())
        value = raw; // a bare word is a string
    return std::make_pair(key, value);
}

EventReader::EventReader(std::istream& in, InputFormat format, unsigned unitChannels)
    : in_(in), format_(format), unitChannels_(unitChannels)
{
}

std::optional<InputRow> EventReader::next(std::vector<InputError>& errors)
{
    std::string text;
    while (std::getline(in_, text)) {
        ++line_;
        const std::string line = trim(text);
        if (line.empty() || line[0] == '#')
            continue;
        std::optional<InputRow> row;
        if (line[0] == '!')
            row = parseAction(line.substr(1), errors);
        else if (format_ == InputFormat::Csv)
            row = parseCsvLine(line, errors);
        else
            row = parseJsonLine(line, errors);
        if (row) {
            row->line = line_;
            return row;
        }
    }
    return std::nullopt;
}

std::optional<InputRow> EventReader::parseAction(const std::string& text, std::vector<InputError>& errors)
{
    const std::string action = trim(text);
    InputRow row;
    if (action == "copy") {
        row.kind = InputRow::Kind::CopyEvent;
        return row;
    }
    if (action.rfind("set ", 0) == 0) {
        if (auto assignment = parseAssignment(action.substr(4))) {
            row.kind = InputRow::Kind::SetProperty;
            row.key = assignment->first;
            row.value = assignment->second;
            return row;
        }
    }
    errors.push_back({line_, "", "unknown action '!" + action + "' (use '!set KEY=VALUE' or '!copy')"});
    return std::nullopt;
}

std::optional<InputRow> EventReader::parseCsvLine(const std::string& text, std::vector<InputError>& errors)
{
    const auto cells = splitCsv(text);
    if (header_.empty()) {
        for (const auto& name : cells) {
            if (name != "ts" && !setters().count(name)) {
                errors.push_back({line_, name, "unknown field in the header"});
                header_.push_back(""); // its column is ignored
            } else {
                header_.push_back(name);
            }
        }
        return std::nullopt;
    }
    if (cells.size() != header_.size()) {
        errors.push_back({line_, "",
                          "has " + std::to_string(cells.size()) + " values for " + std::to_string(header_.size()) +
                              " header fields"});
        return std::nullopt;
    }
    std::vector<std::pair<std::string, double>> fields;
    for (size_t i = 0; i < cells.size(); ++i) {
        if (header_[i].empty() || cells[i].empty())
            continue;
        auto value = parseNumber(cells[i]);
        if (!value) {
            errors.push_back({line_, header_[i], "'" + cells[i] + "' is not a number"});
            return std::nullopt;
        }
        fields.emplace_back(header_[i], *value);
    }
    return buildSample(fields, errors);
}

std::optional<InputRow> EventReader::parseJsonLine(const std::string& text, std::vector<InputError>& errors)
{
    nlohmann::json object = nlohmann::json::parse(text, nullptr, false);
    if (object.is_discarded() || !object.is_object()) {
        errors.push_back({line_, "", "not a JSON object"});
        return std::nullopt;
    }
    if (object.contains("set")) {
        if (!object["set"].is_object() || object["set"].size() != 1) {
            errors.push_back({line_, "set", "expected {\"set\": {\"KEY\": VALUE}}"});
            return std::nullopt;
        }
        InputRow row;
        row.kind = InputRow::Kind::SetProperty;
        row.key = object["set"].begin().key();
        row.value = object["set"].begin().value();
        return row;
    }
    if (object.contains("copy")) {
        InputRow row;
        row.kind = InputRow::Kind::CopyEvent;
        return row;
    }
    std::vector<std::pair<std::string, double>> fields;
    for (const auto& [name, value] : object.items()) {
        if (name != "ts" && !setters().count(name)) {
            errors.push_back({line_, name, "unknown field"});
            return std::nullopt;
        }
        if (!value.is_number()) {
            errors.push_back({line_, name, "'" + value.dump() + "' is not a number"});
            return std::nullopt;
        }
        fields.emplace_back(name, value.get<double>());
    }
    return buildSample(fields, errors);
}

std::optional<InputRow> EventReader::buildSample(const std::vector<std::pair<std::string, double>>& fields,
                                                 std::vector<InputError>& errors)
{
    InputRow row;
    ALSSampleRecord& r = row.record;
    r.sampleOrientation = 1;
    r.integrationTime = 100;
    r.reportInterval = 100;
    r.gain = 65536;
    r.subsamples = 1;
    r.timestamp = uint32_t(samples_);
    row.timeSeconds = double(samples_) * 0.1;

    bool haveRawLux = false, haveCount = false;
    int highestChannel = -1;
    for (const auto& [name, value] : fields) {
        if (name == "ts") {
            // The event's time stamp counts nanoseconds in 64 bits.
            if (!(value >= 0.0 && value < kLatestTimeSeconds)) {
                errors.push_back({line_, name,
                                  "value " + std::to_string(value) + " is not a time from 0 to " +
                                      std::to_string(kLatestTimeSeconds) + " seconds"});
                return std::nullopt;
            }
            row.timeSeconds = value;
            continue;
        }
        if (!setters().at(name)(r, value)) {
            errors.push_back({line_, name, "value " + std::to_string(value) + " does not fit the field"});
            return std::nullopt;
        }
        haveRawLux |= name == "rawLux";
        haveCount |= name == "sampleChannelCount";
        if (name.size() == 2 && name[0] == 'c')
            highestChannel = std::max(highestChannel, name[1] - '0');
    }
    if (!haveRawLux)
        r.rawLux = r.lux;
    if (!haveCount)
        r.sampleChannelCount = uint8_t(unitChannels_ ? unitChannels_ : unsigned(std::max(4, highestChannel + 1)));
    ++samples_;
    return row;
}

} // namespace host
