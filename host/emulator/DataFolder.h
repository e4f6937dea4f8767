// Where the vantish command finds its data (sample devices, model sensors,
// test lights): VANTISH_DATA, else the source tree it was built from, else
// the install tree next to the program.
#pragma once

#include <filesystem>

namespace host {

std::filesystem::path dataFolder();

} // namespace host
