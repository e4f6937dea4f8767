// The per-event colour estimate: a locally weighted, ridge-regularised linear
// fit of X, Y, Z against the per-chip database. A pure function of the
// database it is given, the fit settings and the measurement; the caller
// takes both from their owners once per event.
#pragma once

#include "lightdb/SpectralDatabase.h"

// How the fit weighs and regularises, read once per call.
struct FitSettings {
    float weightExponent = 2.0f;   // p of the similarity weight 1 / (1 - cos + c)^p
    float weightOffset = 0.00001f; // c
    float lambda = 0.0f;           // ridge parameter
    bool normalised = false;       // database and measurement in unit-length, sigma-scaled form
};

// X, Y, Z (clamped at zero) of the measurement `channels` (channelCount values;
// scaled in place in normalised mode) into xyz[0..2]. False, with xyz
// untouched, when the database is empty or made for another channel count or
// an argument is missing; false, with the clamped result, when a guard fires or
// the fit fails. All-zero channels give zero colour and true.
bool colourCalculationDynamic(const SpectralDatabase& db, const FitSettings& settings, float* channels, float* xyz,
                              int channelCount);
