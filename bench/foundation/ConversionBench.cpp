// Throughput of the text conversions and of small appends, each against a
// memcpy of the same output bytes measured in the same run.
#include <benchmark/benchmark.h>

#include <chrono>
#include <cstdint>
#include <cstring>
#include <iterator>
#include <random>
#include <string>
#include <vector>

#include "foundation/StringBase.h"
#include "foundation/Utf.h"
#include "foundation/osdep/IConv.h"

namespace qel::fnd {
namespace {

constexpr uint32_t kDocumentChars = 1u << 20;

// An XML-like configuration document: ASCII markup and values with about 2%
// non-ASCII characters, a few of them outside the BMP.
WString MakeDocument() {
    static const wchar_t* const kNames[] = {L"Interface", L"Address", L"Gateway", L"Description", L"Enabled"};
    static const wchar_t kForeign[] = {0xE9, 0xFC, 0xDF, 0x20AC, 0x4E2D, 0x6587, 0x0416, 0x1F600, 0x1D11E};
    std::mt19937 rng(2024);
    std::wstring doc = L"<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<Configuration>\n";
    while (doc.size() < kDocumentChars) {
        const wchar_t* name = kNames[rng() % std::size(kNames)];
        doc.append(L"  <").append(name).append(L" id=\"").append(1, static_cast<wchar_t>(L'0' + rng() % 10));
        doc.append(L"\">");
        for (int i = 0, n = 10 + static_cast<int>(rng() % 40); i < n; ++i) {
            if (rng() % 100 < 5) doc.push_back(kForeign[rng() % std::size(kForeign)]);
            else doc.push_back(static_cast<wchar_t>(L'a' + rng() % 26));
        }
        doc.append(L"</").append(name).append(L">\n");
    }
    return WString(doc.data(), kDocumentChars);
}

const WString& Document() {
    static const WString doc = MakeDocument();
    return doc;
}

double Seconds(std::chrono::steady_clock::duration d) { return std::chrono::duration<double>(d).count(); }

char* PageAligned(std::vector<char>& buffer) {
    const auto address = reinterpret_cast<uintptr_t>(buffer.data());
    return buffer.data() + (-address & 4095u);
}

// Seconds for one memcpy of `bytes`, averaged over `repeats` copies between
// the same two buffers (warm, like the conversion's input). The target sits
// half a page out of step with the source: with targets a few bytes past the
// source modulo a page, the string-copy instruction memcpy uses for mid-sized
// blocks is many times slower on some processors, which would flatter every
// ratio.
double MemcpySeconds(size_t bytes, int64_t repeats) {
    std::vector<char> source(bytes + 4096, 'x'), target(bytes + 8192);
    const char* from = PageAligned(source);
    char* to = PageAligned(target) + 2048;
    auto t0 = std::chrono::steady_clock::now();
    for (int64_t i = 0; i < repeats; ++i) {
        std::memcpy(to, from, bytes);
        benchmark::ClobberMemory();
    }
    return Seconds(std::chrono::steady_clock::now() - t0) / static_cast<double>(repeats);
}

// Times `convert` (which returns the bytes it produced), then as many
// memcpy calls of that output, and reports the ratio of the two.
template <typename Convert>
void RunAgainstMemcpy(benchmark::State& state, Convert&& convert) {
    const size_t outBytes = convert();
    std::chrono::steady_clock::duration converting{};
    for (auto _ : state) {
        auto t0 = std::chrono::steady_clock::now();
        benchmark::DoNotOptimize(convert());
        auto elapsed = std::chrono::steady_clock::now() - t0;
        converting += elapsed;
        state.SetIterationTime(Seconds(elapsed));
    }
    const double copy = MemcpySeconds(outBytes, state.iterations());
    state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) * static_cast<int64_t>(outBytes));
    state.counters["out_bytes"] = static_cast<double>(outBytes);
    state.counters["memcpy_us"] = 1e6 * copy;
    state.counters["x_memcpy"] = Seconds(converting) / static_cast<double>(state.iterations()) / copy;
}

void BM_WideToUtf16Le_Document(benchmark::State& state) {
    const WString& doc = Document();
    RunAgainstMemcpy(state, [&doc] { return static_cast<size_t>(osdep::IConv(doc, "UTF-16LE").Length()); });
}
BENCHMARK(BM_WideToUtf16Le_Document)->UseManualTime()->Unit(benchmark::kMicrosecond);

void BM_WideToUtf8_Document(benchmark::State& state) {
    const WString& doc = Document();
    RunAgainstMemcpy(state, [&doc] { return static_cast<size_t>(WideToUtf8(doc).Length()); });
}
BENCHMARK(BM_WideToUtf8_Document)->UseManualTime()->Unit(benchmark::kMicrosecond);

void BM_Utf8ToWide_Document(benchmark::State& state) {
    const NString bytes = WideToUtf8(Document());
    RunAgainstMemcpy(state, [&bytes] { return sizeof(wchar_t) * Utf8ToWide(bytes).Length(); });
}
BENCHMARK(BM_Utf8ToWide_Document)->UseManualTime()->Unit(benchmark::kMicrosecond);

// Appends pieces of 1 to 16 characters until `state.range(0)` characters are
// in the string, starting from empty each time; the time per character stays
// flat across sizes when growth is amortised constant.
void BM_StringBase_AppendSmallPieces(benchmark::State& state) {
    const auto total = static_cast<WString::size_type>(state.range(0));
    const wchar_t piece[17] = L"abcdefghijklmnop";
    std::vector<WString::size_type> lengths;
    for (WString::size_type sum = 0, i = 0; sum < total; ++i) {
        WString::size_type n = 1 + (i * 7) % 16;
        if (n > total - sum) n = total - sum;
        lengths.push_back(n);
        sum += n;
    }
    std::chrono::steady_clock::duration appending{};
    for (auto _ : state) {
        auto t0 = std::chrono::steady_clock::now();
        WString s;
        for (WString::size_type n : lengths) s.Append(piece, n);
        benchmark::DoNotOptimize(s.Data());
        auto elapsed = std::chrono::steady_clock::now() - t0;
        appending += elapsed;
        state.SetIterationTime(Seconds(elapsed));
    }
    const double perIteration = Seconds(appending) / static_cast<double>(state.iterations());
    // The same bytes in one piece: the floor for building the text.
    const double copy = MemcpySeconds(static_cast<size_t>(total) * sizeof(wchar_t), state.iterations());
    state.counters["pieces"] = static_cast<double>(lengths.size());
    state.counters["ns_per_char"] = 1e9 * perIteration / total;
    state.counters["memcpy_ns"] = 1e9 * copy;
    state.counters["x_memcpy"] = perIteration / copy;
}
BENCHMARK(BM_StringBase_AppendSmallPieces)->RangeMultiplier(8)->Range(64, 1 << 21)->UseManualTime();

}  // namespace
}  // namespace qel::fnd
