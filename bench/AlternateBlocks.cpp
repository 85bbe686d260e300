#include <algorithm>

#include "Common.h"

namespace zarl::bench {

std::vector<std::vector<double>> AlternateBlocks(const std::vector<Block>& variants, int rounds,
                                                 double blockSeconds) {
    // Size each variant's block from a short trial run (which also warms it up).
    std::vector<int> sizes;
    for (const Block& block : variants) {
        int n = 16;
        double seconds = 0;
        do {
            n *= 2;
            const auto start = Clock::now();
            block(n);
            seconds = Seconds(Clock::now() - start);
        } while (seconds < blockSeconds / 4 && n < (1 << 24));
        sizes.push_back(std::max(1, static_cast<int>(n * blockSeconds / std::max(seconds, 1e-9))));
    }
    std::vector<std::vector<double>> perCall(variants.size());
    for (int round = 0; round < rounds; ++round) {
        for (std::size_t v = 0; v < variants.size(); ++v) {
            // Start each round with another variant, so none always follows the same.
            const std::size_t which = (v + static_cast<std::size_t>(round)) % variants.size();
            const auto start = Clock::now();
            variants[which](sizes[which]);
            perCall[which].push_back(static_cast<double>(Nanoseconds(Clock::now() - start)) /
                                     sizes[which]);
        }
    }
    return perCall;
}

}  // namespace zarl::bench
