// The vantish command as a user runs it: a subprocess in a fresh working
// folder with its own state folder, its exit status, output and errors.
#pragma once

#include "common/TestSupport.h"

#include <gtest/gtest.h>

#include <sys/wait.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

namespace vt::command {

namespace fs = std::filesystem;

struct Outcome {
    int status = -1;
    std::string out;
    std::string err;
};

inline std::string slurp(const fs::path& path)
{
    std::ifstream in(path);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

inline std::string quoted(const std::string& s) { return "'" + s + "'"; }

inline std::string device(const std::string& unit)
{
    return quoted((fs::path(vt::sourceDir()) / "data" / "devices" / unit / "device.json").string());
}

// The command in a fresh working folder with its own state folder.
class VantishCommand : public testing::Test {
protected:
    // `environment`: assignments put before the command ("NAME=value ...").
    Outcome run(const std::string& arguments, const std::string& environment = "")
    {
        std::string command = "cd " + quoted(dir_.str()) + " && " + environment + " " + quoted(VANTISH_COMMAND) +
                              " --state " + quoted((dir_.path() / "state").string()) + " " + arguments;
        command += " > out.txt 2> err.txt";
        Outcome o;
        const int raw = std::system(command.c_str());
        o.status = WIFEXITED(raw) ? WEXITSTATUS(raw) : -1;
        o.out = slurp(dir_.path() / "out.txt");
        o.err = slurp(dir_.path() / "err.txt");
        return o;
    }
    fs::path file(const std::string& name, const std::string& text)
    {
        std::ofstream(dir_.path() / name) << text;
        return dir_.path() / name;
    }
    fs::path path(const std::string& name) const { return dir_.path() / name; }

private:
    vt::TempDir dir_;
};

inline int lineCount(const std::string& text) { return int(std::count(text.begin(), text.end(), '\n')); }

// The numbers after `label` on the first output line that starts with it
// (after indentation), as in "  plug-in   0.0002   0.0025   0.0067".
inline std::vector<double> rowNumbers(const std::string& out, const std::string& label)
{
    std::istringstream lines(out);
    for (std::string line; std::getline(lines, line);) {
        const size_t start = line.find_first_not_of(' ');
        const size_t end = start + label.size();
        if (start == std::string::npos || line.compare(start, label.size(), label) != 0 || end >= line.size() ||
            line[end] != ' ')
            continue;
        std::istringstream fields(line.substr(end));
        std::vector<double> numbers;
        for (double x; fields >> x;)
            numbers.push_back(x);
        return numbers;
    }
    return {};
}

} // namespace vt::command
