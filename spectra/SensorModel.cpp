#include "spectra/SensorModel.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <fstream>
#include <sstream>
#include <stdexcept>

namespace spectra {

namespace {

std::vector<std::string> splitCells(const std::string& line)
{
    std::vector<std::string> cells;
    std::stringstream in(line);
    std::string cell;
    while (std::getline(in, cell, ','))
        cells.push_back(cell);
    if (!line.empty() && line.back() == ',')
        cells.emplace_back();
    for (std::string& c : cells) {
        const auto first = c.find_first_not_of(" \t\r");
        const auto last = c.find_last_not_of(" \t\r");
        c = first == std::string::npos ? std::string() : c.substr(first, last - first + 1);
    }
    return cells;
}

// The whole cell as a finite number, or nothing.
bool parseNumber(const std::string& cell, double& value)
{
    if (cell.empty())
        return false;
    size_t used = 0;
    try {
        value = std::stod(cell, &used);
    } catch (const std::exception&) {
        return false;
    }
    return used == cell.size() && std::isfinite(value);
}

} // namespace

double SensorModel::peak() const
{
    double best = 0.0;
    for (const Spectrum& s : channels)
        best = std::max(best, *std::max_element(s.begin(), s.end()));
    return best;
}

SensorModel loadSensorModel(const std::filesystem::path& file)
{
    std::ifstream in(file);
    if (!in)
        throw std::runtime_error(file.string() + ": cannot open the sensor file");
    auto fail = [&](size_t line, const std::string& what) {
        throw std::runtime_error(file.string() + ":" + std::to_string(line) + ": " + what);
    };

    SensorModel sensor;
    bool haveHeader = false;
    int row = 0;
    std::string text;
    for (size_t line = 1; std::getline(in, text); ++line) {
        const size_t start = text.find_first_not_of(" \t\r");
        if (start == std::string::npos || text[start] == '#')
            continue;
        const std::vector<std::string> cells = splitCells(text);
        if (!haveHeader) {
            if (cells.size() < 2 || cells[0] != "nm")
                fail(line, "the header must be \"nm\" followed by the channel names");
            sensor.channelNames.assign(cells.begin() + 1, cells.end());
            sensor.channels.assign(sensor.channelNames.size(), Spectrum{});
            haveHeader = true;
            continue;
        }
        if (row >= kSamples)
            fail(line, "more than " + std::to_string(kSamples) + " rows");
        if (cells.size() != sensor.channelNames.size() + 1)
            fail(line, "expected " + std::to_string(sensor.channelNames.size() + 1) + " values, found " +
                           std::to_string(cells.size()));
        double nm = 0.0;
        if (!parseNumber(cells[0], nm) || std::fabs(nm - wavelengthNm(row)) > 1e-6)
            fail(line,
                 "expected wavelength " + std::to_string(int(wavelengthNm(row))) + " nm, found \"" + cells[0] + "\"");
        for (size_t c = 0; c < sensor.channelNames.size(); ++c)
            if (!parseNumber(cells[c + 1], sensor.channels[c][size_t(row)]))
                fail(line, "channel " + sensor.channelNames[c] + ": \"" + cells[c + 1] + "\" is not a number");
        ++row;
    }
    if (!haveHeader)
        throw std::runtime_error(file.string() + ": no header line");
    if (row != kSamples)
        throw std::runtime_error(file.string() + ": " + std::to_string(row) + " rows, expected " +
                                 std::to_string(kSamples) + " (300 to 1100 nm in 2 nm steps)");
    return sensor;
}

std::string sensorModelCsv(const SensorModel& sensor, const std::vector<std::string>& comments)
{
    std::string out;
    for (const std::string& c : comments)
        out += "# " + c + "\n";
    out += "nm";
    for (const std::string& name : sensor.channelNames)
        out += "," + name;
    out += "\n";
    char cell[32];
    for (int s = 0; s < kSamples; ++s) {
        std::snprintf(cell, sizeof cell, "%d", int(wavelengthNm(s)));
        out += cell;
        for (const Spectrum& channel : sensor.channels) {
            std::snprintf(cell, sizeof cell, ",%.6f", channel[size_t(s)]);
            out += cell;
        }
        out += "\n";
    }
    return out;
}

std::vector<double> channelResponses(const SensorModel& sensor, const Spectrum& irradiance)
{
    std::vector<double> out;
    out.reserve(sensor.channelCount());
    for (const Spectrum& channel : sensor.channels) {
        double sum = 0.0;
        for (size_t s = 0; s < channel.size(); ++s)
            sum += channel[s] * irradiance[s];
        out.push_back(sum * kStepNm);
    }
    return out;
}

} // namespace spectra
