// zarl::util::Encodestring on values of 16 B, 1 KiB and 1 MiB, with few special
// characters (one in 128 bytes, at least one) and many (one in 4), against memcpy of
// the same bytes into a buffer allocated beforehand. Figures: MB/s of input.

#include <cstring>
#include <string>
#include <vector>

#include <benchmark/benchmark.h>

#include <zarl/util/StringUtil.h>

#include "Common.h"

namespace zarl::bench {
namespace {

// A path-like value of `size` bytes in which every `every`-th byte is one of the five
// characters that become entity references, the last byte always one of them.
std::string Value(std::size_t size, std::size_t every) {
    static constexpr char kPlain[] = "abcdefghijklmnopqrstuvwxyz0123456789/._-";
    static constexpr char kSpecial[] = "&<>\"'";
    std::string value(size, 'x');
    for (std::size_t i = 0; i < size; ++i) {
        value[i] = (i + 1) % every == 0 ? kSpecial[(i / every) % 5] : kPlain[i % 40];
    }
    value[size - 1] = '&';
    return value;
}

void EncodeLib(benchmark::State& state) {
    const std::string value =
        Value(static_cast<std::size_t>(state.range(0)), static_cast<std::size_t>(state.range(1)));
    for (auto _ : state) {
        std::string encoded = util::Encodestring(value);
        benchmark::DoNotOptimize(encoded.data());
    }
    state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(value.size()));
}

void EncodeMemcpy(benchmark::State& state) {
    const std::string value =
        Value(static_cast<std::size_t>(state.range(0)), static_cast<std::size_t>(state.range(1)));
    std::vector<char> copy(value.size());
    for (auto _ : state) {
        std::memcpy(copy.data(), value.data(), value.size());
        benchmark::DoNotOptimize(copy.data());
        benchmark::ClobberMemory();
    }
    state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(value.size()));
}

void Sizes(benchmark::internal::Benchmark* b) {
    Micro(b);
    b->ArgNames({"bytes", "every"});
    for (const std::int64_t size : {16, 1024, 1024 * 1024}) {
        for (const std::int64_t every : {128, 4}) {
            b->Args({size, every});
        }
    }
}

BENCHMARK(EncodeLib)->Name("encode/lib")->Apply(Sizes);
BENCHMARK(EncodeMemcpy)->Name("encode/memcpy")->Apply(Sizes);

}  // namespace
}  // namespace zarl::bench
