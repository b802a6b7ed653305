#include "tools/rs2/ProgressBar.hpp"

#include <cstdio>
#include <unistd.h>
#include <utility>

namespace {
constexpr int kBarWidth = 40;
}

ProgressBar::ProgressBar(std::string labelIn, int64_t totalIn)
    : label(std::move(labelIn)), total(totalIn),
      shown(isatty(STDERR_FILENO) == 1) {}

ProgressBar::~ProgressBar() {
    if (drawn)
        std::fputc('\n', stderr);
}

void ProgressBar::Update(int64_t done) {
    if (!shown || total <= 0)
        return;
    const int percent = static_cast<int>(done * 100 / total);
    if (percent == lastPercent)
        return;
    lastPercent = percent;
    const int filled = percent * kBarWidth / 100;
    std::fprintf(stderr, "\r%s [%s%s] %3d%%", label.c_str(),
                 std::string(filled, '#').c_str(),
                 std::string(kBarWidth - filled, ' ').c_str(), percent);
    std::fflush(stderr);
    drawn = true;
}
