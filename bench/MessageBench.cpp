// The message builders, each form against two baselines of the same text:
//   floor    what any builder with this design must do: construct the std::ostringstream
//            that the message object holds, and append the same bytes to a std::string
//            reserved to size (the values need no escaping, so none is scanned);
//   libxml2  xmlTextWriter building the same element into a memory buffer, the usual
//            way to write XML from C or C++ (it escapes the attribute values itself).
// Figures: nanoseconds per message, construction only (the text stays in the object).

#include <libxml/xmlwriter.h>

#include <cstdio>
#include <sstream>
#include <string>
#include <string_view>
#include <vector>

#include <benchmark/benchmark.h>

#include <zarl/core/ZARLFailedResponse.h>
#include <zarl/core/ZARLRequest.h>
#include <zarl/core/ZARLResponse.h>

#include "Common.h"
#include "Workload.h"

namespace zarl::bench {
namespace {

using Pieces = std::vector<std::string_view>;
using core::ZARLFailedResponse;
using core::ZARLRequest;
using core::ZARLResponse;

constexpr char kFailedFormat[] = "mount point %s is busy (error %d)";

// The floor: the stream the object holds, and the bytes appended once to a reserved
// string.
void BuildFloor(const Pieces& pieces) {
    std::ostringstream stream;
    std::size_t size = 0;
    for (const std::string_view piece : pieces) {
        size += piece.size();
    }
    std::string text;
    text.reserve(size);
    for (const std::string_view piece : pieces) {
        text.append(piece);
    }
    benchmark::DoNotOptimize(stream);
    benchmark::DoNotOptimize(text.data());
    benchmark::ClobberMemory();
}

std::string Joined(const Pieces& pieces) {
    std::string text;
    for (const std::string_view piece : pieces) {
        text.append(piece);
    }
    return text;
}

// The pieces of the six request attributes, up to the Path value's closing quote
// (exclusive). `afterRequester` closes the Requester value.
void AddRequestAttributes(Pieces& p, std::string_view opener, const RequestValues& v,
                          std::string_view requestName, std::string_view afterRequester) {
    p.insert(p.end(),
             {kDeclaration, opener, v.subsystem, R"(" RequestName = ")", requestName,
              R"(" Requester = ")", v.requester, afterRequester, R"( SequenceNumber = ")",
              v.sequenceNumber, R"(" MountPoint = ")", v.mountPoint, R"(" Path = ")", v.path});
}

void AddOutcome(Pieces& p, const RequestValues& v, std::string_view requestName,
                std::string_view message) {
    AddRequestAttributes(p, R"(<ZARLResponse Subsystem = ")", v, requestName, "\"");
    p.insert(p.end(), {R"(" Status = ")", v.status, R"(" Message = ")", message});
}

void AddItems(Pieces& p, const std::list<std::string>& items) {
    for (const std::string& item : items) {
        p.push_back(item);
    }
}

// libxml2: a memory writer per message, as a caller building independent texts does.
class XmlWriter {
  public:
    XmlWriter() : buffer(xmlBufferCreate()), writer(xmlNewTextWriterMemory(buffer, 0)) {
        xmlTextWriterStartDocument(writer, "1.0", "UTF-8", nullptr);
    }
    ~XmlWriter() {
        if (writer != nullptr) {
            xmlFreeTextWriter(writer);
        }
        xmlBufferFree(buffer);
    }
    XmlWriter(const XmlWriter&) = delete;
    XmlWriter& operator=(const XmlWriter&) = delete;

    void Start(const char* name) { xmlTextWriterStartElement(writer, Cast(name)); }
    void Attribute(const char* name, const std::string& value) {
        xmlTextWriterWriteAttribute(writer, Cast(name), Cast(value.c_str()));
    }
    void Raw(const std::string& text) { xmlTextWriterWriteRaw(writer, Cast(text.c_str())); }
    xmlTextWriterPtr Get() { return writer; }
    // Ends the element (with a closing tag when `full`) and the document, and flushes.
    void Finish(bool full) {
        if (full) {
            xmlTextWriterFullEndElement(writer);
        } else {
            xmlTextWriterEndElement(writer);
        }
        xmlTextWriterEndDocument(writer);
        xmlFreeTextWriter(writer);
        writer = nullptr;
        benchmark::DoNotOptimize(buffer->content);
    }
    static const xmlChar* Cast(const char* text) { return reinterpret_cast<const xmlChar*>(text); }

  private:
    xmlBufferPtr buffer;
    xmlTextWriterPtr writer;
};

void XmlRequestAttributes(XmlWriter& w, const char* root, const RequestValues& v,
                          const std::string& requestName) {
    w.Start(root);
    w.Attribute("Subsystem", v.subsystem);
    w.Attribute("RequestName", requestName);
    w.Attribute("Requester", v.requester);
    w.Attribute("SequenceNumber", v.sequenceNumber);
    w.Attribute("MountPoint", v.mountPoint);
    w.Attribute("Path", v.path);
}

void XmlOutcome(XmlWriter& w, const RequestValues& v, const std::string& requestName) {
    XmlRequestAttributes(w, "ZARLResponse", v, requestName);
    w.Attribute("Status", v.status);
}

constexpr int kRounds = 41;
constexpr double kBlockSeconds = 0.0005;

// Times the library, its floor and libxml2 in alternating blocks and reports the
// medians: nanoseconds per message of each, and the library's time over each baseline's.
void TimeAndReport(benchmark::State& state, const Block& lib, const Block& floor,
                   const Block& xml) {
    std::vector<std::vector<double>> times;
    for (auto _ : state) {
        times = AlternateBlocks({lib, floor, xml}, kRounds, kBlockSeconds);
    }
    state.counters["lib_ns"] = Median(times[0]);
    state.counters["floor_ns"] = Median(times[1]);
    state.counters["libxml2_ns"] = Median(times[2]);
    state.counters["ratio_floor"] = MedianRatio(times[0], times[1]);
    state.counters["ratio_libxml2"] = MedianRatio(times[0], times[2]);
}

// Times the three variants in alternating blocks and reports the medians: nanoseconds
// per message of each, and the library's time over each baseline's.
// `build` makes one message of the library.
template <class Build>
void Compare(benchmark::State& state, const Pieces& floor, const Build& build, const Block& xml) {
    if (Joined(floor) != build().str()) {
        state.SkipWithError("the floor builds other bytes than the library");
        return;
    }
    const Block lib = [&build](int n) {
        for (int i = 0; i < n; ++i) {
            auto message = build();
            benchmark::DoNotOptimize(message);
        }
    };
    const Block floorBlock = [&floor](int n) {
        for (int i = 0; i < n; ++i) {
            BuildFloor(floor);
        }
    };
    TimeAndReport(state, lib, floorBlock, xml);
}

void RequestString(benchmark::State& state) {
    const RequestValues v;
    Pieces p;
    AddRequestAttributes(p, R"(<ZARLRequest Subsystem = ")", v, v.requestName, "\"\n");
    p.insert(p.end(), {R"(">)", v.content, "</ZARLRequest>"});
    const auto build = [&] {
        return ZARLRequest(v.subsystem, v.requestName, v.requester, v.sequenceNumber, v.mountPoint,
                           v.path, v.content);
    };
    Compare(state, p, build, [&](int n) {
        for (int i = 0; i < n; ++i) {
            XmlWriter w;
            XmlRequestAttributes(w, "ZARLRequest", v, v.requestName);
            w.Raw(v.content);
            w.Finish(true);
        }
    });
}

void RequestList(benchmark::State& state) {
    const RequestValues v;
    Pieces p;
    AddRequestAttributes(p, R"(<ZARLRequest Subsystem = ")", v, v.requestName, "\"");
    p.push_back(R"(">)");
    AddItems(p, v.items);
    p.push_back("</ZARLRequest>\n");
    const auto build = [&] {
        return ZARLRequest(v.subsystem, v.requestName, v.requester, v.sequenceNumber, v.mountPoint,
                           v.path, v.items);
    };
    Compare(state, p, build, [&](int n) {
        for (int i = 0; i < n; ++i) {
            XmlWriter w;
            XmlRequestAttributes(w, "ZARLRequest", v, v.requestName);
            for (const std::string& item : v.items) {
                w.Raw(item);
            }
            w.Finish(true);
        }
    });
}

void ResponseString(benchmark::State& state) {
    const RequestValues v;
    Pieces p;
    AddOutcome(p, v, v.requestName, v.message);
    p.insert(p.end(), {R"(">)", v.content, "</ZARLResponse>"});
    const auto build = [&] {
        return ZARLResponse(v.subsystem, v.requestName, v.requester, v.sequenceNumber, v.mountPoint,
                            v.path, v.status, v.message, v.content);
    };
    Compare(state, p, build, [&](int n) {
        for (int i = 0; i < n; ++i) {
            XmlWriter w;
            XmlOutcome(w, v, v.requestName);
            w.Attribute("Message", v.message);
            w.Raw(v.content);
            w.Finish(true);
        }
    });
}

void ResponseList(benchmark::State& state) {
    const RequestValues v;
    Pieces p;
    AddOutcome(p, v, v.requestName, v.message);
    p.push_back(R"(">)");
    AddItems(p, v.items);
    p.push_back("</ZARLResponse>");
    const auto build = [&] {
        return ZARLResponse(v.subsystem, v.requestName, v.requester, v.sequenceNumber, v.mountPoint,
                            v.path, v.status, v.message, v.items);
    };
    Compare(state, p, build, [&](int n) {
        for (int i = 0; i < n; ++i) {
            XmlWriter w;
            XmlOutcome(w, v, v.requestName);
            w.Attribute("Message", v.message);
            for (const std::string& item : v.items) {
                w.Raw(item);
            }
            w.Finish(true);
        }
    });
}

// The list form for GetStatus: the items are further attributes of the start tag.
void GetStatus(benchmark::State& state) {
    const RequestValues v;
    const std::string getStatus = "GetStatus";
    Pieces p;
    AddOutcome(p, v, getStatus, v.message);
    p.push_back("\"");
    AddItems(p, v.statusItems);
    p.push_back("</ZARLResponse>");
    const auto build = [&] {
        return ZARLResponse(v.subsystem, getStatus, v.requester, v.sequenceNumber, v.mountPoint,
                            v.path, v.status, v.message, v.statusItems);
    };
    Compare(state, p, build, [&](int n) {
        for (int i = 0; i < n; ++i) {
            XmlWriter w;
            XmlOutcome(w, v, getStatus);
            w.Attribute("Message", v.message);
            w.Attribute("Free", v.freeValue);
            w.Attribute("Used", v.usedValue);
            w.Finish(true);
        }
    });
}

void AddFailed(Pieces& p, const RequestValues& v, std::string_view message) {
    AddRequestAttributes(p, R"(<ZARLResponse Subsystem = ")", v, v.requestName, "\"");
    p.insert(p.end(), {"\" Status = \"failed\"\n", R"( Message = ")", message, "\"/>"});
}

void FailedMessage(benchmark::State& state) {
    const RequestValues v;
    const std::string failed = "failed";
    Pieces p;
    AddFailed(p, v, v.message);
    const auto build = [&] {
        return ZARLFailedResponse(v.subsystem, v.requestName, v.requester, v.sequenceNumber,
                                  v.mountPoint, v.path, v.message);
    };
    Compare(state, p, build, [&](int n) {
        for (int i = 0; i < n; ++i) {
            XmlWriter w;
            XmlRequestAttributes(w, "ZARLResponse", v, v.requestName);
            w.Attribute("Status", failed);
            w.Attribute("Message", v.message);
            w.Finish(false);
        }
    });
}

// The format form. Its floor formats the reason anew for each message, as the
// library must, into a buffer on the stack.
void FailedFormat(benchmark::State& state) {
    const RequestValues v;
    const std::string failed = "failed";
    char reason[128];
    const auto format = [&] {
        const int length =
            std::snprintf(reason, sizeof reason, kFailedFormat, v.mountPoint.c_str(), v.failedCode);
        return std::string_view(reason, static_cast<std::size_t>(length));
    };
    Pieces p;
    AddFailed(p, v, format());
    const auto build = [&] {
        return ZARLFailedResponse(v.subsystem, v.requestName, v.requester, v.sequenceNumber,
                                  v.mountPoint, v.path, kFailedFormat, v.mountPoint.c_str(),
                                  v.failedCode);
    };
    const std::string library = build().str();
    if (Joined(p) != library) {
        state.SkipWithError("the floor builds other bytes than the library");
        return;
    }
    const Block lib = [&](int n) {
        for (int i = 0; i < n; ++i) {
            ZARLFailedResponse message = build();
            benchmark::DoNotOptimize(message);
        }
    };
    const Block floor = [&](int n) {
        Pieces pieces;
        for (int i = 0; i < n; ++i) {
            pieces.clear();
            AddFailed(pieces, v, format());
            BuildFloor(pieces);
        }
    };
    const Block xml = [&](int n) {
        for (int i = 0; i < n; ++i) {
            XmlWriter w;
            XmlRequestAttributes(w, "ZARLResponse", v, v.requestName);
            w.Attribute("Status", failed);
            xmlTextWriterWriteFormatAttribute(w.Get(), XmlWriter::Cast("Message"), kFailedFormat,
                                              v.mountPoint.c_str(), v.failedCode);
            w.Finish(false);
        }
    };
    TimeAndReport(state, lib, floor, xml);
}

BENCHMARK(RequestString)->Name("msg/request_string")->Apply(Once);
BENCHMARK(RequestList)->Name("msg/request_list")->Apply(Once);
BENCHMARK(ResponseString)->Name("msg/response_string")->Apply(Once);
BENCHMARK(ResponseList)->Name("msg/response_list")->Apply(Once);
BENCHMARK(GetStatus)->Name("msg/response_getstatus")->Apply(Once);
BENCHMARK(FailedMessage)->Name("msg/failed_message")->Apply(Once);
BENCHMARK(FailedFormat)->Name("msg/failed_format")->Apply(Once);

}  // namespace
}  // namespace zarl::bench
