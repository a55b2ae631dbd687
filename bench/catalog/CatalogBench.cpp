// "ItemDefs" for 200 items through the built plug-in, against reading the
// same definition and constants files into one buffer with read().
#include <benchmark/benchmark.h>
#include <dlfcn.h>
#include <fcntl.h>
#include <stdlib.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "catalog/CatalogDocuments.h"
#include "service/PluginHost.h"
#include "service/WebhostRuntime.h"
#include "webhost_runtime/Request.h"

namespace qel::bench {
namespace {

namespace fs = std::filesystem;

constexpr int kItems = 200;
constexpr size_t kDefinitionBytes = 8 * 1024;
constexpr size_t kConstantsBytes = 4 * 1024;

std::string ItemName(int i) {
    char name[16];
    std::snprintf(name, sizeof name, "Module%03d", i);
    return name;
}

// A definition as a plug-in would install it: a declaration, the item
// element and property lines of the usual length, up to the given size.
std::string Definition(int item) {
    static const char* const kTypes[] = {"string", "unsigned", "boolean", "ipv4", "datetime"};
    std::string text = "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n<item category=\"module\" title=\"@Title\" order=\"" +
                       std::to_string(item) + "\">\n";
    for (int p = 0; text.size() < kDefinitionBytes - 80; ++p) {
        char line[192];
        std::snprintf(line, sizeof line,
                      "  <property name=\"Setting%d\" tag=\"0x%08X\" type=\"%s\" access=\"readwrite\" "
                      "label=\"@Setting%d\"/>\n",
                      p, 0x04000000u + static_cast<unsigned>(item) * 0x1000u + static_cast<unsigned>(p),
                      kTypes[p % 5], p);
        text += line;
    }
    return text + "</item>\n";
}

// German display names, some of them with umlauts (two bytes in UTF-8).
std::string Constants(int item) {
    std::string text = "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n<constants item=\"" + ItemName(item) +
                       "\" lang=\"de\">\n";
    for (int p = 0; text.size() < kConstantsBytes - 40; ++p) {
        text += "  <text id=\"Setting" + std::to_string(p) + "\">Einstellung " + std::to_string(p) +
                (p % 3 ? " f\xC3\xBCr die Schnittstelle" : " der Ger\xC3\xA4teklasse") + "</text>\n";
    }
    return text + "</constants>\n";
}

// The plug-in loaded by the test host over a temporary shared data directory
// with the catalogue, as the web server would find it. Lives for the whole
// program.
class Host {
public:
    Host() {
        const fs::path shareDir = plugin_.ShareDir();
        const fs::path catalogue = shareDir / "uixml" / "sysconfig";
        fs::create_directories(catalogue);
        for (int i = 0; i < kItems; ++i) {
            const std::string name = ItemName(i);
            items_ += (i ? "," : "") + name;
            files_.push_back((catalogue / (name + ".def.xml")).string());
            files_.push_back((catalogue / (name + ".const.de.xml")).string());
            std::ofstream(files_[files_.size() - 2], std::ios::binary) << Definition(i);
            std::ofstream(files_.back(), std::ios::binary) << Constants(i);
            std::ofstream(catalogue / (name + ".const.xml"), std::ios::binary) << Constants(i);
        }
    }

    // A client's request for every item with German-speaking Switzerland's
    // tag, so that each item's constants come from the "de" file.
    void Prepare(webhost::Request& request) const {
        request.SetMethod("GET");
        request.SetVariable("items", items_);
        request.SetVariable("loc", "de-CH");
    }
    void Run(webhost::Request& request) const { plugin_.Run(mapping_, request); }
    const std::vector<std::string>& Files() const { return files_; }
    const std::string& Items() const { return items_; }

private:
    qel::testing::PluginHost plugin_;
    std::string items_;
    std::vector<std::string> files_;  // definition, constants, per item in request order
    qel::testing::Mapping mapping_{L"ItemDefs"};
};

const Host& TheHost() {
    static const Host host;
    return host;
}

double Seconds(std::chrono::steady_clock::duration d) { return std::chrono::duration<double>(d).count(); }

// The limit: each file opened, read whole with read() into the end of one
// buffer that doubles when full (no filling of new space) and closed, as
// any server copying these files must.
size_t ReadAll(const std::vector<std::string>& files) {
    constexpr size_t kChunk = 16 * 1024;
    size_t capacity = kChunk;
    size_t used = 0;
    std::unique_ptr<char[]> buffer(new char[capacity]);
    for (const std::string& path : files) {
        int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
        if (fd < 0) throw std::runtime_error("open " + path);
        for (;;) {
            if (capacity - used < kChunk) {
                std::unique_ptr<char[]> grown(new char[capacity * 2]);
                std::memcpy(grown.get(), buffer.get(), used);
                buffer = std::move(grown);
                capacity *= 2;
            }
            ssize_t got = ::read(fd, buffer.get() + used, kChunk);
            if (got <= 0) break;
            used += static_cast<size_t>(got);
        }
        ::close(fd);
    }
    benchmark::DoNotOptimize(buffer.get());
    return used;
}

void BM_ItemDefs_200Items(benchmark::State& state) {
    const Host& host = TheHost();
    size_t outBytes = 0;
    {
        webhost::Request warm;
        host.Prepare(warm);
        host.Run(warm);
        outBytes = warm.Output().size();
        if (warm.Output().find("hr='0'") == std::string::npos || outBytes < kItems * kDefinitionBytes)
            state.SkipWithError("the request failed");
    }
    std::chrono::steady_clock::duration serving{};
    for (auto _ : state) {
        state.PauseTiming();
        webhost::Request request;
        host.Prepare(request);
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

    size_t readBytes = 0;
    auto t0 = std::chrono::steady_clock::now();
    for (int64_t i = 0; i < n; ++i) readBytes = ReadAll(host.Files());
    const double limit = Seconds(std::chrono::steady_clock::now() - t0) / static_cast<double>(n);

    state.counters["out_bytes"] = static_cast<double>(outBytes);
    state.counters["file_bytes"] = static_cast<double>(readBytes);
    state.counters["read_us"] = 1e6 * limit;
    state.counters["x_read"] = ours / limit;
}
BENCHMARK(BM_ItemDefs_200Items)->UseManualTime()->Unit(benchmark::kMicrosecond);

// The catalogue's own part, linked in statically: the same document body
// without the request pipeline's envelope and the runtime's copy of it.
void BM_WriteItemDefinitions_200Items(benchmark::State& state) {
    const Host& host = TheHost();
    std::vector<fnd::WString> items;
    for (size_t start = 0; start < host.Items().size();) {
        size_t comma = host.Items().find(',', start);
        if (comma == std::string::npos) comma = host.Items().size();
        std::string name = host.Items().substr(start, comma - start);
        items.emplace_back(fnd::WString(std::wstring(name.begin(), name.end()).c_str()));
        start = comma + 1;
    }
    size_t bytes = 0;
    for (auto _ : state) {
        fnd::NString body;
        if (catalog::WriteItemDefinitions(items, fnd::WString(L"de-CH"), body) != 0) state.SkipWithError("no items");
        bytes = body.Length();
    }
    state.counters["out_bytes"] = static_cast<double>(bytes);
}
BENCHMARK(BM_WriteItemDefinitions_200Items)->Unit(benchmark::kMicrosecond);

// The limit alone, for its absolute time.
void BM_ReadConcatenate_400Files(benchmark::State& state) {
    const Host& host = TheHost();
    size_t bytes = 0;
    for (auto _ : state) bytes = ReadAll(host.Files());
    state.counters["file_bytes"] = static_cast<double>(bytes);
}
BENCHMARK(BM_ReadConcatenate_400Files)->Unit(benchmark::kMicrosecond);

}  // namespace
}  // namespace qel::bench
