// The two property-heavy operations through the dispatcher against an
// in-process framework, each against memcpy of its output bytes.
#include <benchmark/benchmark.h>

#include <chrono>
#include <cstring>
#include <string>
#include <vector>

#include "api/ArgumentMap.h"
#include "api/Dispatcher.h"
#include "api/Framework.h"
#include "api/FrameworkAccess.h"
#include "foundation/Status.h"

namespace {

using namespace qel::api;
using qel::fnd::WString;

struct Property {
    PropertyTag tag;
    PropertyTypeCode type;
    int32_t integer;
    double real;
    Guid guid;
    std::wstring text;
    AbsTime time;
};

// Reference counts are kept but never free anything: every object lives for
// the whole run, so the measurement is the service's work, not the fake's.
template <typename I>
class Static : public I {
public:
    uint32_t AddRef() override { return ++refs; }
    uint32_t Release() override { return --refs; }
    int32_t QueryInterface(const Guid&, void** out) override {
        *out = nullptr;
        return qel::fnd::kStatusNoInterface;
    }
    uint32_t refs = 0;
};

class Tags final : public Static<IkrSysEnumTags> {
public:
    const std::vector<Property>* properties = nullptr;
    size_t next = 0;
    int32_t Next(uint32_t, PropertyTag* out, uint32_t* fetched) override {
        if (next >= properties->size()) return 1;
        *out = (*properties)[next++].tag;
        *fetched = 1;
        return 0;
    }
};

// A bag whose properties sit in tag order; lookups go by the low bits.
class Bag final : public Static<IkrSysPropertyBagEx> {
public:
    std::vector<Property> properties;
    Tags tags;

    explicit Bag(uint32_t count) {
        for (uint32_t i = 0; i < count; ++i) {
            Property p{0x01006000u + i, i % 7 + 1, static_cast<int32_t>(i * 7919) - 100000, i * 0.37, {}, {}, {}};
            p.guid.Data1 = i * 2654435761u;
            p.text = L"value <" + std::to_wstring(i) + L"> of the item & more text";
            p.time.seconds = 3379550706 + i;
            properties.push_back(p);
        }
    }
    int32_t QueryInterface(const Guid& iid, void** out) override {
        if (iid == kIID_IkrSysPropertyBagEx || iid == kIID_IkrSysPropertyBag || iid == kIID_IUnknown) {
            *out = this;
            ++refs;
            return 0;
        }
        *out = nullptr;
        return qel::fnd::kStatusNoInterface;
    }
    const Property& At(PropertyTag tag) const { return properties[(tag - 0x01006000u) % properties.size()]; }

    int32_t EnumPropertyTags(IkrSysEnumTags** out) override {
        tags.properties = &properties;
        tags.next = 0;
        tags.AddRef();
        *out = &tags;
        return 0;
    }
    int32_t GetPropertyType(PropertyTag tag, PropertyTypeCode* type) override {
        *type = At(tag).type;
        return 0;
    }
    int32_t SetInteger1(PropertyTag, int32_t) override { return 0; }
    int32_t SetInteger2(PropertyTag, int32_t) override { return 0; }
    int32_t SetUnsigned(PropertyTag, uint32_t) override { return 0; }
    int32_t SetDouble(PropertyTag, double) override { return 0; }
    int32_t SetGuid(PropertyTag, Guid) override { return 0; }
    int32_t SetString(PropertyTag, const wchar_t*) override { return 0; }
    int32_t GetInteger1(PropertyTag tag, int32_t* v) override { return *v = At(tag).integer, 0; }
    int32_t GetInteger2(PropertyTag tag, int32_t* v) override { return *v = At(tag).integer, 0; }
    int32_t GetUnsigned(PropertyTag tag, uint32_t* v) override {
        return *v = static_cast<uint32_t>(At(tag).integer), 0;
    }
    int32_t GetDouble(PropertyTag tag, double* v) override { return *v = At(tag).real, 0; }
    int32_t GetGuid(PropertyTag tag, Guid* v) override { return *v = At(tag).guid, 0; }
    int32_t GetString(PropertyTag tag, SysString* v) override {
        const std::wstring& text = At(tag).text;
        *v = SysStringAllocLen(text.data(), static_cast<uint32_t>(text.size()));
        return 0;
    }
    int32_t GetDateTime(PropertyTag, DateTimeFields*) override { return qel::fnd::kStatusFail; }
    int32_t ResetChangeTracking() override { return 0; }
    int32_t GetTimestamp(PropertyTag tag, AbsTime* v) override { return *v = At(tag).time, 0; }
    int32_t SetTimestamp(PropertyTag, const AbsTime*) override { return 0; }
};

class Bags final : public Static<IkrSysEnumPropertyBags> {
public:
    std::vector<Bag>* bags = nullptr;
    size_t next = 0;
    int32_t Next(uint32_t, IkrSysPropertyBag** out, uint32_t* fetched) override {
        if (next >= bags->size()) return 1;
        Bag& bag = (*bags)[next++];
        bag.AddRef();
        *out = &bag;
        *fetched = 1;
        return 0;
    }
};

class Framework final : public Static<IkrSysFramework> {
public:
    Bag item{500};
    std::vector<Bag> found;
    Bags enumerator;

    Framework() {
        for (int i = 0; i < 1000; ++i) found.emplace_back(8);
        enumerator.bags = &found;
    }
    int32_t SearchForItemsAndProperties(const wchar_t*, uint32_t, IkrSysPropertyBag*,
                                        IkrSysEnumPropertyBags** out) override {
        enumerator.next = 0;
        enumerator.AddRef();
        *out = &enumerator;
        return 0;
    }
    int32_t SearchForItemNames(const wchar_t*, IkrSysEnumUris** out) override { return *out = nullptr, 1; }
    int32_t GetPropertiesOfItem(const wchar_t*, IkrSysPropertyBag** out) override {
        item.AddRef();
        *out = &item;
        return 0;
    }
    int32_t EnumSystemExperts(const wchar_t*, IkrSysEnumExperts** out) override { return *out = nullptr, 1; }
    int32_t SetNotificationHandler(const wchar_t*, IkrSysNotificationHandler*, uint32_t) override { return 0; }
    int32_t PopulateOrRefreshProperties(IkrSysPropertyBag*, uint32_t, const PropertyTag*, uint32_t) override {
        return 0;
    }
    int32_t CreatePropertyBag(IkrSysPropertyBag** out) override { return *out = nullptr, qel::fnd::kStatusFail; }
    int32_t RenameAlias(const wchar_t*, const wchar_t*, uint32_t, uint32_t*, SysString*, SysString*) override {
        return qel::fnd::kStatusFail;
    }
    int32_t PersistChanges(IkrSysPropertyBag*, uint32_t, uint32_t*, SysString*) override {
        return qel::fnd::kStatusFail;
    }
};

Framework& TheFramework() {
    static Framework framework;
    return framework;
}

// The document goes out as UTF-16LE: two bytes per character of the body.
void RunOperation(benchmark::State& state, const wchar_t* function) {
    EnsureFramework();
    ArgumentMap args;
    args[WString(L"Function")] = WString(function);
    args[WString(L"Plugins")] = WString(L"P");
    args[WString(L"Items")] = WString(L"I");
    size_t bytes = 0;
    const auto start = std::chrono::steady_clock::now();
    for (auto _ : state) {
        WString body;
        WString debug;
        benchmark::DoNotOptimize(DispatchFunction(args, body, debug, false, false));
        bytes = static_cast<size_t>(body.Length()) * 2;
        benchmark::DoNotOptimize(body.Data());
    }
    const double requestNs =
        std::chrono::duration<double, std::nano>(std::chrono::steady_clock::now() - start).count() /
        static_cast<double>(state.iterations());

    // The baseline in the same run: copying the same number of bytes.
    std::vector<char> from(bytes, 'x'), to(bytes);
    constexpr int kCopies = 2000;
    const auto copyStart = std::chrono::steady_clock::now();
    for (int i = 0; i < kCopies; ++i) {
        std::memcpy(to.data(), from.data(), bytes);
        benchmark::DoNotOptimize(to.data());
        benchmark::ClobberMemory();
    }
    const double copyNs =
        std::chrono::duration<double, std::nano>(std::chrono::steady_clock::now() - copyStart).count() / kCopies;
    state.counters["x_memcpy"] = requestNs / copyNs;
    state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * bytes));
    state.counters["doc_bytes"] = static_cast<double>(bytes);
    state.counters["ns_per_byte"] = benchmark::Counter(static_cast<double>(state.iterations() * bytes),
                                                       benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
}

void Memcpy(benchmark::State& state, const wchar_t* function) {
    EnsureFramework();
    ArgumentMap args;
    args[WString(L"Function")] = WString(function);
    WString body, debug;
    DispatchFunction(args, body, debug, false, false);
    const size_t bytes = static_cast<size_t>(body.Length()) * 2;
    std::vector<char> from(bytes, 'x'), to(bytes);
    for (auto _ : state) {
        std::memcpy(to.data(), from.data(), bytes);
        benchmark::DoNotOptimize(to.data());
        benchmark::ClobberMemory();
    }
    state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * bytes));
    state.counters["doc_bytes"] = static_cast<double>(bytes);
    state.counters["ns_per_byte"] = benchmark::Counter(static_cast<double>(state.iterations() * bytes),
                                                       benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
}

void BM_GetPropertiesOfItem_500Mixed(benchmark::State& s) { RunOperation(s, L"GetPropertiesOfItem"); }
void BM_GetPropertiesOfItem_Memcpy(benchmark::State& s) { Memcpy(s, L"GetPropertiesOfItem"); }
void BM_SearchForItemsAndProperties_1000Bags(benchmark::State& s) { RunOperation(s, L"SearchForItemsAndProperties"); }
void BM_SearchForItemsAndProperties_Memcpy(benchmark::State& s) { Memcpy(s, L"SearchForItemsAndProperties"); }

BENCHMARK(BM_GetPropertiesOfItem_500Mixed);
BENCHMARK(BM_GetPropertiesOfItem_Memcpy);
BENCHMARK(BM_SearchForItemsAndProperties_1000Bags);
BENCHMARK(BM_SearchForItemsAndProperties_Memcpy);

}  // namespace

extern "C" int32_t qelsysInstantiateFramework(IkrSysFramework** out) {
    *out = &TheFramework();
    return 0;
}
