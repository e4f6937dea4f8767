// The named light sources the tools know, and the two reference sets built
// from them. Every source is stored at 100 lux (Y = 100, spectrum in
// mW·m⁻²·nm⁻¹). Names are stable: tools and tests ask for sources by name, and
// a name always denotes the same model with the same parameters.
#pragma once

#include "spectra/Grid.h"

#include <string>
#include <string_view>
#include <vector>

namespace spectra {

inline constexpr double kReferenceLux = 100.0;

struct Source {
    std::string name;   // e.g. "planck-2856K", "led-450-555-115-5000K", "mix-d65-a-30"
    std::string family; // e.g. "planck", "led", "mix-incandescent"
    Spectrum spectrum;  // at kReferenceLux
};

enum class ReferenceSet {
    Default, // bzlight.sqlite: broad coverage of every family
    Dense02, // bzlight-02.sqlite: denser solid-state and mixed indoor light
};

struct ReferenceFile {
    const char* fileName;
    float version; // the Info "version" of the file
    ReferenceSet set;
};

inline constexpr ReferenceFile kReferenceFiles[] = {
    {"bzlight.sqlite", 1.0f, ReferenceSet::Default},
    {"bzlight-02.sqlite", 2.0f, ReferenceSet::Dense02},
};

// Every named source, in a fixed order (the default set's sources first).
// Built on first use; throws std::runtime_error when the CIE data is missing.
const std::vector<Source>& catalogue();
// Null when there is no source of that name.
const Source* findSource(std::string_view name);
// The sources of a reference set, in database ID order.
std::vector<const Source*> referenceSources(ReferenceSet set);

} // namespace spectra
