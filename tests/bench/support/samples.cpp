#include "tests/bench/support/samples.h"

#include <algorithm>
#include <stddef.h>

namespace {

sample_list get_turn_medians(const sample_list &samples)
{
    const size_t turn_size = samples.size() / TURNS;
    sample_list medians;
    for (size_t start = 0; start + turn_size <= samples.size(); start += turn_size) {
        const auto first = samples.begin() + static_cast<ptrdiff_t>(start);
        medians.push_back(get_percentile(sample_list(first, first + static_cast<ptrdiff_t>(turn_size)), 0.5));
    }
    return medians;
}

} // namespace

double elapsed_us(clock_type::time_point start)
{
    return std::chrono::duration<double, std::micro>(clock_type::now() - start).count();
}

double get_percentile(sample_list samples, double part)
{
    std::sort(samples.begin(), samples.end());
    return samples[static_cast<size_t>(part * static_cast<double>(samples.size() - 1))];
}

double get_paired_ratio(const sample_list &ours, const sample_list &theirs)
{
    sample_list ratios = get_turn_medians(ours);
    const sample_list their_medians = get_turn_medians(theirs);
    for (size_t i = 0; i < ratios.size(); i++) {
        ratios[i] /= their_medians[i];
    }
    return get_percentile(ratios, 0.5);
}
