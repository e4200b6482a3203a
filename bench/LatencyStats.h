// Round-trip samples of one benchmark figure and their percentiles.
#ifndef QUELLBORN_BENCH_LATENCYSTATS_H
#define QUELLBORN_BENCH_LATENCYSTATS_H

#include <chrono>
#include <cstddef>
#include <vector>

class LatencyStats {
public:
    void reserve(size_t n) { mSamples.reserve(n); }
    void add(std::chrono::nanoseconds sample) { mSamples.push_back(sample.count()); }
    size_t count() const { return mSamples.size(); }

    // Microseconds; nearest-rank percentiles over every sample.
    double percentileUs(double p) const;
    double p50Us() const { return percentileUs(50); }
    double p99Us() const { return percentileUs(99); }
    double maxUs() const { return percentileUs(100); }

private:
    std::vector<long long> mSamples;
};

// One figure measured in several repetitions: judged on its median, with
// the lowest and highest value as its spread.
class Repeated {
public:
    void add(double value) { mValues.push_back(value); }
    bool empty() const { return mValues.empty(); }
    double median() const;
    double min() const;
    double max() const;
    // Spread relative to the median: (max - min) / median.
    double relativeSpread() const;

private:
    std::vector<double> mValues;
};

#endif  // QUELLBORN_BENCH_LATENCYSTATS_H
