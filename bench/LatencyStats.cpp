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

double Repeated::median() const {
    if (mValues.empty()) return 0;
    std::vector<double> sorted = mValues;
    std::sort(sorted.begin(), sorted.end());
    const size_t n = sorted.size();
    return n % 2 == 1 ? sorted[n / 2] : (sorted[n / 2 - 1] + sorted[n / 2]) / 2;
}

double Repeated::min() const {
    return mValues.empty() ? 0 : *std::min_element(mValues.begin(), mValues.end());
}

double Repeated::max() const {
    return mValues.empty() ? 0 : *std::max_element(mValues.begin(), mValues.end());
}

double Repeated::relativeSpread() const {
    const double m = median();
    return m == 0 ? 0 : (max() - min()) / m;
}
