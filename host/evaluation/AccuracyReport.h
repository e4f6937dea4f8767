// The evaluation as one self-contained HTML file (well-formed XHTML, no
// external resources): two CIE 1931 xy diagrams as inline SVG (the whole
// diagram with the spectral locus and the Planckian locus from 1000 K to
// 25000 K, and a close-up around the lights), each light's true chromaticity
// joined by a line to the plug-in's estimate and the global-matrix
// baseline's estimate in another mark; then the summary and the table.
#pragma once

#include "host/evaluation/Evaluation.h"

#include <iosfwd>
#include <string>
#include <vector>

namespace host {

struct ReportContext {
    std::string unitName;
    std::string unitSummary;
    std::string deviceFile;
    std::string spectraOrigin; // where the unit's channel spectra came from
    std::string referenceSet;  // the reference file the plug-in and the baseline use
    std::string lightsName;    // "the built-in test lights", or the files given
    double lux = 100.0;
};

void writeAccuracyReport(std::ostream& out, const ReportContext& context, const std::vector<LightResult>& results);

} // namespace host
