// A CIE 1931 xy chromaticity diagram as an SVG element: axes with ticks, the
// spectral locus (from the colour-matching functions) closed by the purple
// line, the Planckian locus from 1000 K to 25000 K, and the evaluated lights:
// each true chromaticity joined by a line to the plug-in's estimate, the
// global-matrix baseline's estimate in another mark; a legend.
#pragma once

#include "host/evaluation/Evaluation.h"

#include <string>
#include <vector>

namespace host {

struct DiagramView {
    double xMin = 0.0, xMax = 0.8;
    double yMin = 0.0, yMax = 0.9;
};

// The whole diagram.
DiagramView fullDiagramView();
// A square-scaled window around every true and estimated point, with a margin.
DiagramView closeUpView(const std::vector<LightResult>& results);

// An <svg> element (with the SVG namespace) `widthPx` wide; `title` heads it.
std::string chromaticityDiagramSvg(const std::vector<LightResult>& results, const DiagramView& view, int widthPx,
                                   const std::string& title);

} // namespace host
