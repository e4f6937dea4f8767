// A one-line progress bar on standard error, drawn only when standard error
// is a terminal, so that redirected output and logs stay clean.
#pragma once

#include <cstddef>
#include <string>

namespace host {

class ProgressBar {
public:
    // Draws nothing unless `enabled` (by default: standard error is a terminal).
    ProgressBar(std::string label, size_t total, bool enabled);
    ProgressBar(std::string label, size_t total);
    ~ProgressBar(); // clears the line
    ProgressBar(const ProgressBar&) = delete;
    ProgressBar& operator=(const ProgressBar&) = delete;

    void update(size_t done);

private:
    std::string label_;
    size_t total_;
    bool enabled_;
    int lastDrawn_ = -1; // the filled width last drawn
};

} // namespace host
