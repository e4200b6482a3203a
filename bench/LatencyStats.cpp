#include "LatencyStats.h"

#include <algorithm>
#include <cmath>

double LatencyStats::percentileUs(double p) const {
    if (mSamples.empty()) return 0;
    std::vector<long long> sorted = mSamples;
    std::sort(sorted.begin(), sorted.end());
    const double rank = std::ceil(p / 100.0 * static_cast<double>(sorted.size()));
    const size_t index = rank < 1 ? 0 : std::min(sorted.size(), static_cast<size_t>(rank)) - 1;
    return static_cast<double>(sorted[index]) / 1000.0;
}
