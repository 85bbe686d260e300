// Runs the benchmarks with the notification port held by a receiver for the whole run.
// Usage as any Google Benchmark program; `make bench` passes the repetitions' settings
// and writes the JSON that bench/report.py turns into the table and the chart.

#include <libxml/parser.h>

#include <cstdio>
#include <exception>
#include <memory>

#include <benchmark/benchmark.h>

#include <zarl/core/Protocol.h>

#include "Common.h"

namespace zarl::bench {
namespace {
std::unique_ptr<Receiver> receiver;
}  // namespace

Receiver& GetReceiver() {
    return *receiver;
}

}  // namespace zarl::bench

int main(int argc, char** argv) {
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) {
        return 1;
    }
    xmlInitParser();
    try {
        zarl::bench::receiver = std::make_unique<zarl::bench::Receiver>(
            zarl::core::ZARL_NOTIFICATION_PORT, std::chrono::seconds(30));
    } catch (const std::exception& e) {
        std::fprintf(stderr, "zarl-bench: %s\n", e.what());
        return 1;
    }
    benchmark::AddCustomContext("receive_buffer_bytes",
                                std::to_string(zarl::bench::receiver->GetReceiveBufferSize()));
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    zarl::bench::receiver.reset();
    xmlCleanupParser();
    return 0;
}
