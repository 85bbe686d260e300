// The receive side: zarl::core::ParseMessage, nanoseconds per message against libxml2
// reading the same text into a document (xmlReadMemory + xmlFreeDoc); and
// zarl::core::MessageFramer, MB/s of a delimited stream fed in 4 KiB chunks with every
// message taken out, against memcpy of the same bytes.

#include <libxml/parser.h>

#include <cstring>
#include <string>
#include <vector>

#include <benchmark/benchmark.h>

#include <zarl/core/Message.h>
#include <zarl/core/MessageFramer.h>
#include <zarl/core/Protocol.h>
#include <zarl/core/ZARLRequest.h>
#include <zarl/core/ZARLResponse.h>

#include "Common.h"
#include "Workload.h"

namespace zarl::bench {
namespace {

std::string ResponseText() {
    const RequestValues v;
    return core::ZARLResponse(v.subsystem, v.requestName, v.requester, v.sequenceNumber,
                              v.mountPoint, v.path, v.status, v.message, v.content)
        .str();
}

void ParseLib(benchmark::State& state) {
    const std::string text = ResponseText();
    for (auto _ : state) {
        core::Message message = core::ParseMessage(text);
        benchmark::DoNotOptimize(message);
    }
}

void ParseXml(benchmark::State& state) {
    const std::string text = ResponseText();
    for (auto _ : state) {
        xmlDocPtr document = xmlReadMemory(text.data(), static_cast<int>(text.size()), nullptr,
                                           nullptr, XML_PARSE_NONET);
        benchmark::DoNotOptimize(document);
        xmlFreeDoc(document);
    }
}

// 1,000 request texts, each followed by the delimiter.
std::string Stream() {
    const RequestValues v;
    const std::string text = core::ZARLRequest(v.subsystem, v.requestName, v.requester,
                                               v.sequenceNumber, v.mountPoint, v.path, v.content)
                                 .str();
    std::string stream;
    for (int i = 0; i < 1000; ++i) {
        stream.append(text).append(core::ZARL_MESSAGE_DELIMITER,
                                   static_cast<std::size_t>(core::ZARL_MESSAGE_DELIMITER_LENGTH));
    }
    return stream;
}

constexpr std::size_t kChunk = 4096;

void FramerLib(benchmark::State& state) {
    const std::string stream = Stream();
    const std::string_view bytes(stream);
    for (auto _ : state) {
        core::MessageFramer framer;
        for (std::size_t at = 0; at < bytes.size(); at += kChunk) {
            framer.Feed(bytes.substr(at, kChunk));
            while (auto message = framer.Next()) {
                benchmark::DoNotOptimize(message->data());
            }
        }
    }
    state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(stream.size()));
}

void FramerMemcpy(benchmark::State& state) {
    const std::string stream = Stream();
    std::vector<char> copy(stream.size());
    for (auto _ : state) {
        std::memcpy(copy.data(), stream.data(), stream.size());
        benchmark::DoNotOptimize(copy.data());
        benchmark::ClobberMemory();
    }
    state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(stream.size()));
}

BENCHMARK(ParseLib)->Name("parse/lib")->Apply(Micro);
BENCHMARK(ParseXml)->Name("parse/libxml2")->Apply(Micro);
BENCHMARK(FramerLib)->Name("framer/lib")->Apply(Micro);
BENCHMARK(FramerMemcpy)->Name("framer/memcpy")->Apply(Micro);

}  // namespace
}  // namespace zarl::bench
