#pragma once

#include <cstdint>
#include <string>

// A one-line bar on stderr, drawn only when stderr is a terminal: logs and
// pipes get no control characters. The line ends when the bar goes away.
class ProgressBar {
  public:
    ProgressBar(std::string label, int64_t total);
    ~ProgressBar();
    ProgressBar(const ProgressBar &) = delete;
    ProgressBar &operator=(const ProgressBar &) = delete;

    void Update(int64_t done);

  private:
    std::string label;
    int64_t total;
    bool shown;
    bool drawn = false;
    int lastPercent = -1;
};
