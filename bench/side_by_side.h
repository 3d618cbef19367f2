#pragma once

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <vector>

// Timing two ways to do the same work in turns, so that the state of the machine counts alike for
// both.

namespace side_by_side {

template <typename Work>
double seconds_of(const Work& work) {
  const auto start = std::chrono::steady_clock::now();
  work();
  return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

inline double median(std::vector<double>& values) {
  std::nth_element(values.begin(), values.begin() + static_cast<long>(values.size() / 2),
                   values.end());
  return values[values.size() / 2];
}

// Prints the medians and their ratio. Returns whether the ratio is within the limit.
template <typename Ours, typename Bare>
bool compare(const char* name, double limit, const Ours& ours, const Bare& bare, int rounds = 41) {
  seconds_of(ours), seconds_of(bare);  // both then find what they read in the cache
  std::vector<double> our_times, bare_times;
  for (int i = 0; i < rounds; ++i) {
    our_times.push_back(seconds_of(ours));
    bare_times.push_back(seconds_of(bare));
  }
  const double our_time = median(our_times);
  const double bare_time = median(bare_times);
  std::printf("%-34s %10.3f ms  bare %10.3f ms  ratio %6.3f (limit %.1f)\n", name, our_time * 1e3,
              bare_time * 1e3, our_time / bare_time, limit);
  return our_time <= limit * bare_time;
}

}  // namespace side_by_side
