// High-intensity discharge lamps: sodium and metal halide.
//
// High-pressure sodium: the self-absorbed sodium D line, drawn as two wings
// around a dark 589 nm centre (blue wing at 589 − b nm, red wing at
// 589 + 1.2·b nm, b = `broadeningNm`, which grows with the vapour pressure),
// the weaker sodium lines 466.5, 498.3, 515.4, 568.8 and 616.0 nm, traces of
// mercury, and the near infrared: the 818.3/819.5 nm doublet and the xenon and
// thermal continuum around 900 nm, both scaled by `infraredScale`.
//
// Metal halide: a broad continuum, the mercury lines, and three additive line
// groups (blue: indium, scandium, mercury; green: thallium, mercury; red:
// sodium, lithium, scandium) solved for the target colour on the locus; the
// near-infrared lines of sodium, potassium, caesium, argon and mercury carry
// a fixed fraction of the radiant power. Ceramic burners have more continuum,
// broader sodium and more infrared than quartz ones.
#pragma once

#include "spectra/Grid.h"

#include <optional>

namespace spectra {

struct SodiumLamp {
    double broadeningNm = 12.0;
    double infraredScale = 1.0;
};

Spectrum highPressureSodium(const SodiumLamp& lamp);
// Low-pressure sodium: the 589.3 nm doublet and the 819 nm doublet.
Spectrum lowPressureSodium();

enum class BurnerKind { Quartz, Ceramic };

// Empty when the line groups cannot reach the target colour.
std::optional<Spectrum> metalHalide(BurnerKind kind, double kelvin);

} // namespace spectra
