// A whole EnumSystemExperts request through the built plug-in, against the
// same document built with libxml2's xmlTextWriter and a memcpy of its bytes,
// plus the request's peak heap use relative to its UTF-16LE document.
#include <benchmark/benchmark.h>
#include <dlfcn.h>
#include <libxml/xmlwriter.h>
#include <malloc.h>
#include <stdlib.h>

#include <atomic>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <new>
#include <stdexcept>
#include <string>
#include <vector>

#include "service/PluginHost.h"
#include "service/WebhostRuntime.h"
#include "webhost_runtime/Request.h"

// --- counting heap --------------------------------------------------------
//
// The program's operator new and delete replace the library's for every
// module in the process, the dlopen'ed plug-in included, so that one
// request's live and peak bytes can be read off. Blocks are counted by their
// usable size, which new and delete see alike. Memory taken with malloc
// directly (the framework stand-in's SysStrings, libxml2) is not counted.
namespace {

std::atomic<int64_t> gLive{0};
std::atomic<int64_t> gPeak{0};

void* CountedAlloc(size_t size) {
    void* p = std::malloc(size ? size : 1);
    if (!p) return nullptr;
    const auto usable = static_cast<int64_t>(malloc_usable_size(p));
    const int64_t live = gLive.fetch_add(usable, std::memory_order_relaxed) + usable;
    int64_t peak = gPeak.load(std::memory_order_relaxed);
    while (live > peak && !gPeak.compare_exchange_weak(peak, live, std::memory_order_relaxed)) {
    }
    return p;
}

void CountedFree(void* p) noexcept {
    if (!p) return;
    gLive.fetch_sub(static_cast<int64_t>(malloc_usable_size(p)), std::memory_order_relaxed);
    std::free(p);
}

void* CountedNew(size_t size) {
    if (void* p = CountedAlloc(size)) return p;
    throw std::bad_alloc();
}

}  // namespace

void* operator new(size_t size) { return CountedNew(size); }
void* operator new[](size_t size) { return CountedNew(size); }
void* operator new(size_t size, const std::nothrow_t&) noexcept { return CountedAlloc(size); }
void* operator new[](size_t size, const std::nothrow_t&) noexcept { return CountedAlloc(size); }
void operator delete(void* p) noexcept { CountedFree(p); }
void operator delete[](void* p) noexcept { CountedFree(p); }
void operator delete(void* p, size_t) noexcept { CountedFree(p); }
void operator delete[](void* p, size_t) noexcept { CountedFree(p); }
void operator delete(void* p, const std::nothrow_t&) noexcept { CountedFree(p); }
void operator delete[](void* p, const std::nothrow_t&) noexcept { CountedFree(p); }

namespace qel::bench {
namespace {

namespace fs = std::filesystem;

constexpr int kExperts = 200;

struct Expert {
    std::string productId;  // upper-case GUID text, as the plug-in writes it
    std::string displayName;  // UTF-8
    std::string version;
    std::string programmaticName;
};

// Names as a controller with many modules would list them: words from a
// small vocabulary, an index, now and then a character that needs escaping
// or lies outside ASCII.
std::vector<Expert> MakeExperts() {
    static const char* const kAreas[] = {"Network", "Motion Axis", "Storage", "Time Sync", "Fieldbus",
                                         "Safety",  "I/O Module",  "Display", "Logging",   "Firewall"};
    static const char* const kKinds[] = {"Settings", "Diagnostics", "Firmware", "Profile", "Calibration"};
    static const char* const kExtras[] = {"", " & Co", " <primary>", " \"Stra\xC3\x9F" "e\"", " R\xC3\xA9seau",
                                          " 'beta'", "", ""};
    std::vector<Expert> experts;
    for (int i = 0; i < kExperts; ++i) {
        char id[40];
        std::snprintf(id, sizeof id, "{%08X-%04X-4%03X-A%03X-%012llX}", 0x2A4C6E80u + static_cast<unsigned>(i) * 7919u,
                      (i * 31) & 0xFFFF, (i * 17) & 0xFFF, (i * 13) & 0xFFF,
                      0x5E7F91B3D5F7ull + static_cast<unsigned long long>(i) * 104729ull);
        std::string name = std::string(kAreas[i % 10]) + " " + kKinds[i % 5] + " " + std::to_string(i / 50 + 1) +
                           kExtras[i % 8];
        std::string programmatic = std::string("module") + std::to_string(i) + "_" + kKinds[i % 5];
        for (char& c : programmatic) c = static_cast<char>(c >= 'A' && c <= 'Z' ? c - 'A' + 'a' : c);
        experts.push_back({id, name, std::to_string(1 + i % 5) + "." + std::to_string(i % 10) + "." + std::to_string(i),
                           programmatic});
    }
    return experts;
}

std::string JsonText(const std::string& utf8) {
    std::string out = "\"";
    for (char c : utf8) {
        if (c == '"' || c == '\\') out += '\\';
        out += c;
    }
    return out + "\"";
}

std::string DeviceJson(const std::vector<Expert>& experts) {
    std::string json = "{\"experts\": [\n";
    for (size_t i = 0; i < experts.size(); ++i) {
        const Expert& e = experts[i];
        json += "  {\"programmaticName\": " + JsonText(e.programmaticName) + ", \"displayName\": " +
                JsonText(e.displayName) + ", \"version\": " + JsonText(e.version) + ", \"productId\": " +
                JsonText(e.productId) + "}" + (i + 1 < experts.size() ? ",\n" : "\n");
    }
    return json + "]}\n";
}

// The plug-in loaded by the test host over a temporary shared data directory
// holding the device model and the runtime stand-in, as the web server would
// find them. Lives for the whole program; the directory goes at exit.
class Host {
public:
    Host() : experts_(MakeExperts()), plugin_(qel::testing::RuntimeVariant::kAll, DeviceJson(experts_)) {}

    const std::vector<Expert>& Experts() const { return experts_; }

    // One request as a client sends it; the request object is built by the
    // caller so that only the plug-in's work is inside a measurement.
    static void Prepare(webhost::Request& request, bool utf8) {
        request.SetMethod("POST");
        request.SetVariable("CONTENT_TYPE", "application/x-www-form-urlencoded");
        request.AddFormField("form_data", utf8 ? "Function=EnumSystemExperts&response_encoding=UTF-8&"
                                               : "Function=EnumSystemExperts&");
    }
    void Run(webhost::Request& request) const { plugin_.Run(server_, request); }

private:
    std::vector<Expert> experts_;
    qel::testing::PluginHost plugin_;
    qel::testing::Mapping server_{L"Server"};
};

Host& TheHost() {
    static Host host;
    return host;
}

double Seconds(std::chrono::steady_clock::duration d) { return std::chrono::duration<double>(d).count(); }

// The peer: libxml2 builds the same elements and attributes from the expert
// data in UTF-8 (its native text), escaping attribute values itself, and
// encodes to UTF-16LE with its own output encoder as it writes, into one
// xmlBuffer. Its declaration and attributes use double quotes and it ends
// the declaration and the document with a newline; otherwise the documents
// match. It does not decode a form, talk to a framework or go through the
// runtime, which the plug-in's time includes.
size_t PeerDocument(const std::vector<Expert>& experts, std::string* copy = nullptr) {
    xmlBufferPtr buffer = xmlBufferCreate();
    xmlTextWriterPtr writer = xmlNewTextWriterMemory(buffer, 0);
    if (!writer) throw std::runtime_error("xmlNewTextWriterMemory");
    xmlTextWriterStartDocument(writer, "1.0", "UTF-16LE", nullptr);
    xmlTextWriterStartElement(writer, BAD_CAST "QelSysAPI_Results");
    xmlTextWriterWriteAttribute(writer, BAD_CAST "hr", BAD_CAST "0");
    xmlTextWriterWriteAttribute(writer, BAD_CAST "version", BAD_CAST "00010001");
    xmlTextWriterStartElement(writer, BAD_CAST "SystemExperts");
    for (const Expert& e : experts) {
        xmlTextWriterStartElement(writer, BAD_CAST "ExpertInfo");
        xmlTextWriterWriteAttribute(writer, BAD_CAST "productID", BAD_CAST e.productId.c_str());
        xmlTextWriterWriteAttribute(writer, BAD_CAST "productDisplayName", BAD_CAST e.displayName.c_str());
        xmlTextWriterWriteAttribute(writer, BAD_CAST "productVersion", BAD_CAST e.version.c_str());
        xmlTextWriterWriteAttribute(writer, BAD_CAST "programmaticName", BAD_CAST e.programmaticName.c_str());
        xmlTextWriterEndElement(writer);
    }
    xmlTextWriterEndElement(writer);
    xmlTextWriterEndElement(writer);
    xmlTextWriterEndDocument(writer);
    xmlFreeTextWriter(writer);  // flushes the encoder into the buffer
    const size_t size = static_cast<size_t>(xmlBufferLength(buffer));
    benchmark::DoNotOptimize(xmlBufferContent(buffer));
    if (copy) copy->assign(reinterpret_cast<const char*>(xmlBufferContent(buffer)), size);
    xmlBufferFree(buffer);
    return size;
}

// Occurrences of an ASCII text in a document, in UTF-16LE when `wide`.
size_t Count(const std::string& document, const std::string& ascii, bool wide) {
    std::string needle;
    for (char c : ascii) {
        needle += c;
        if (wide) needle += '\0';
    }
    size_t n = 0;
    for (size_t at = document.find(needle); at != std::string::npos; at = document.find(needle, at + needle.size()))
        ++n;
    return n;
}

// Times the plug-in's request, then as many peer documents and memcpy calls
// of the plug-in's output, and reports both ratios of the plug-in's time to
// theirs: x_peer at most 0.5 is the goal of twice the peer's speed.
void RunRequest(benchmark::State& state, bool utf8) {
    const Host& host = TheHost();
    size_t outBytes = 0;
    {
        webhost::Request warm;  // creates the framework outside the timing
        Host::Prepare(warm, utf8);
        host.Run(warm);
        outBytes = warm.Output().size();
        if (Count(warm.Output(), "hr='0'", !utf8) != 1 || Count(warm.Output(), "<ExpertInfo ", !utf8) != kExperts)
            state.SkipWithError("the request failed or lost experts");
    }
    std::chrono::steady_clock::duration serving{};
    for (auto _ : state) {
        state.PauseTiming();
        webhost::Request request;
        Host::Prepare(request, utf8);
        state.ResumeTiming();
        auto t0 = std::chrono::steady_clock::now();
        host.Run(request);
        auto elapsed = std::chrono::steady_clock::now() - t0;
        serving += elapsed;
        state.SetIterationTime(Seconds(elapsed));
        benchmark::DoNotOptimize(request.Output().data());
    }
    const auto n = state.iterations();
    const double ours = Seconds(serving) / static_cast<double>(n);

    auto t0 = std::chrono::steady_clock::now();
    for (int64_t i = 0; i < n; ++i) benchmark::DoNotOptimize(PeerDocument(host.Experts()));
    const double peer = Seconds(std::chrono::steady_clock::now() - t0) / static_cast<double>(n);

    std::vector<char> from(outBytes + 64, 'x'), to(outBytes + 4096);
    t0 = std::chrono::steady_clock::now();
    for (int64_t i = 0; i < n; ++i) {
        // Half a page out of step, as in the conversion benchmarks.
        std::memcpy(to.data() + 2048, from.data(), outBytes);
        benchmark::ClobberMemory();
    }
    const double copy = Seconds(std::chrono::steady_clock::now() - t0) / static_cast<double>(n);

    state.counters["out_bytes"] = static_cast<double>(outBytes);
    state.counters["peer_us"] = 1e6 * peer;
    state.counters["memcpy_us"] = 1e6 * copy;
    state.counters["x_peer"] = ours / peer;
    state.counters["x_memcpy"] = ours / copy;
}

void BM_Pipeline_EnumSystemExperts_Utf16(benchmark::State& state) { RunRequest(state, false); }
BENCHMARK(BM_Pipeline_EnumSystemExperts_Utf16)->UseManualTime()->Unit(benchmark::kMicrosecond);

void BM_Pipeline_EnumSystemExperts_Utf8(benchmark::State& state) { RunRequest(state, true); }
BENCHMARK(BM_Pipeline_EnumSystemExperts_Utf8)->UseManualTime()->Unit(benchmark::kMicrosecond);

// The peer alone, for its absolute time and size.
void BM_Peer_Libxml2TextWriter_Utf16(benchmark::State& state) {
    const Host& host = TheHost();
    size_t size = 0;
    for (auto _ : state) size = PeerDocument(host.Experts());
    state.counters["out_bytes"] = static_cast<double>(size);
}
BENCHMARK(BM_Peer_Libxml2TextWriter_Utf16)->Unit(benchmark::kMicrosecond);

// Peak heap bytes (operator new) that one warm request adds above what was
// live when it began, over the size of its UTF-16LE document. The count
// includes the runtime stand-in's copy of the output (the web server's own
// buffer), and leaves out the framework stand-in's malloc'ed SysStrings.
void BM_Pipeline_PeakMemory_Utf16(benchmark::State& state) {
    const Host& host = TheHost();
    {
        webhost::Request warm;
        Host::Prepare(warm, false);
        host.Run(warm);
    }
    int64_t extra = 0;
    size_t docBytes = 0;
    for (auto _ : state) {
        webhost::Request request;
        Host::Prepare(request, false);
        const int64_t before = gLive.load(std::memory_order_relaxed);
        gPeak.store(before, std::memory_order_relaxed);
        host.Run(request);
        extra = gPeak.load(std::memory_order_relaxed) - before;
        docBytes = request.Output().size();
    }
    state.counters["doc_bytes"] = static_cast<double>(docBytes);
    state.counters["peak_extra_bytes"] = static_cast<double>(extra);
    state.counters["peak_over_doc"] = static_cast<double>(extra) / static_cast<double>(docBytes);
}
BENCHMARK(BM_Pipeline_PeakMemory_Utf16)->Iterations(20);

}  // namespace
}  // namespace qel::bench
