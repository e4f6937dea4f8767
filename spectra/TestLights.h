// The built-in test lights: sources that are NOT among the reference sources
// the plug-in fits against, so that an evaluation over them measures how the
// fit carries over to lights it has not seen. They come from the same models
// as the catalogue but off its parameter grid: white LEDs with other pump and
// phosphor parameters, warm and violet-pumped LEDs between the grid points,
// daylight between the sampled temperatures, the tabulated CIE D55 and D93
// (the CIE tables B and C are reference sources), a dimmed incandescent lamp
// and a halogen lamp between the Planckian steps, fluorescent, sodium and
// metal-halide lamps off the grid, and lamp mixtures at other ratios and with
// other parts.
//
// Every light is stored at 100 lux (kReferenceLux), like the catalogue. Names
// start with "test-" and never collide with a catalogue name.
#pragma once

#include "spectra/Catalogue.h"

#include <string_view>
#include <vector>

namespace spectra {

// In a fixed order; built on first use. Throws std::runtime_error when the CIE
// data is missing or a model has no solution for its parameters.
const std::vector<Source>& testLights();
// Null when there is no test light of that name.
const Source* findTestLight(std::string_view name);

} // namespace spectra
