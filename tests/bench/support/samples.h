#pragma once

#include <chrono>
#include <vector>

/* What a series of measurements comes down to. Times are in microseconds. */

using clock_type = std::chrono::steady_clock;
using sample_list = std::vector<double>;

/* So often do two sides take turns. */
constexpr int TURNS = 50;

double elapsed_us(clock_type::time_point start);

/* The sample below which this part (0 to 1) of them lies. */
double get_percentile(sample_list samples, double part);

/* The median, over all turns, of one side's median over the other's in the same turn. */
double get_paired_ratio(const sample_list &ours, const sample_list &theirs);
