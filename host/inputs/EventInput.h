// Light samples (and client actions) read from CSV or JSON lines, as input to
// `vantish run`.
//
// CSV: a header naming the fields, then one sample per line. JSON lines: one
// object per line with the same field names. Both accept client actions:
//   CSV:   "!set KEY=VALUE" (VALUE in JSON: 1, [100,200,300,400], 0.05, true)   "!copy"
//   JSON:  {"set": {"KEY": VALUE}}                                                {"copy": true}
// and skip blank lines and lines starting with "#".
//
// Sample fields (absent ones take these defaults):
//   c0..c5 0; lux 0; rawLux = lux; sampleChannelCount = the unit's channel count
//   (or the highest channel given + 1, at least 4); sampleOrientation 1; status 0; nits 0;
//   integrationTime 100; reportInterval 100; gain 1.0 (a multiplier; stored as
//   16.16 fixed point); cct 0; timestamp = row index; subsamples 1; mode 0;
//   xTalk0..xTalk4 0; xyzInRecord 0; xyzSensorX/Y/Z 0; filteredLux 0;
//   filteredLuxValid 0; ts = row index x 0.1 (event time in seconds, 0 to 1.8e10).
#pragma once

#include "formats/ALSSampleRecord.h"

#include <nlohmann/json.hpp>

#include <istream>
#include <optional>
#include <string>
#include <vector>

namespace host {

enum class InputFormat { Csv, JsonLines };

struct InputRow {
    enum class Kind { Sample, SetProperty, CopyEvent };
    Kind kind = Kind::Sample;
    size_t line = 0;        // 1-based line in the input
    ALSSampleRecord record; // Kind::Sample
    double timeSeconds = 0; // Kind::Sample
    std::string key;        // Kind::SetProperty
    nlohmann::json value;   // Kind::SetProperty
};

// A problem with one line; the reader goes on with the next one.
struct InputError {
    size_t line = 0;
    std::string field; // empty when it concerns the whole line
    std::string message;
    std::string describe(const std::string& source) const;
};

class EventReader {
public:
    EventReader(std::istream& in, InputFormat format, unsigned unitChannels);
    // The next row; nothing at the end. Problems go to `errors` and the line is skipped.
    std::optional<InputRow> next(std::vector<InputError>& errors);

private:
    std::optional<InputRow> parseCsvLine(const std::string& text, std::vector<InputError>& errors);
    std::optional<InputRow> parseJsonLine(const std::string& text, std::vector<InputError>& errors);
    std::optional<InputRow> parseAction(const std::string& text, std::vector<InputError>& errors);
    std::optional<InputRow> buildSample(const std::vector<std::pair<std::string, double>>& fields,
                                        std::vector<InputError>& errors);

    std::istream& in_;
    InputFormat format_;
    unsigned unitChannels_;
    size_t line_ = 0;
    size_t samples_ = 0;
    std::vector<std::string> header_;
};

// Parses "KEY=VALUE" (VALUE in JSON; a bare word is taken as a string).
std::optional<std::pair<std::string, nlohmann::json>> parseAssignment(const std::string& text);

// The names of the sample fields, for --help and error messages.
const std::vector<std::string>& sampleFieldNames();

} // namespace host
