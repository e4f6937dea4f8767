#include "host/evaluation/ProgressBar.h"

#include <algorithm>
#include <cstdio>
#include <unistd.h>

namespace host {

namespace {
constexpr int kWidth = 30;
}

ProgressBar::ProgressBar(std::string label, size_t total, bool enabled)
    : label_(std::move(label)), total_(total), enabled_(enabled && total > 0)
{
}

ProgressBar::ProgressBar(std::string label, size_t total)
    : ProgressBar(std::move(label), total, isatty(STDERR_FILENO) != 0)
{
}

ProgressBar::~ProgressBar()
{
    if (enabled_ && lastDrawn_ >= 0)
        std::fprintf(stderr, "\r\033[K");
}

void ProgressBar::update(size_t done)
{
    if (!enabled_)
        return;
    done = std::min(done, total_);
    const int filled = int(double(done) / double(total_) * kWidth);
    if (filled == lastDrawn_ && done != total_)
        return;
    lastDrawn_ = filled;
    std::fprintf(stderr, "\r%s [%s%s] %zu/%zu", label_.c_str(), std::string(size_t(filled), '#').c_str(),
                 std::string(size_t(kWidth - filled), ' ').c_str(), done, total_);
    std::fflush(stderr);
}

} // namespace host
