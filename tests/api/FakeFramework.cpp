// The framework object that the dispatcher of the test program finds: it
// forwards every call to the fake that the running test installed.
#include "FakeFramework.h"

#include "api/Dispatcher.h"
#include "api/FrameworkAccess.h"

namespace qel::api::testing {
namespace {

FakeFramework* g_current = nullptr;

FakeFramework& Current() {
    if (!g_current) ADD_FAILURE() << "no fake framework installed";
    return *g_current;
}

// Lives for the whole program: the dispatcher keeps the framework pointer.
class Forwarder final : public IkrSysFramework {
public:
    int32_t QueryInterface(const Guid& iid, void** out) override { return Current().QueryInterface(iid, out); }
    uint32_t AddRef() override { return 1; }
    uint32_t Release() override { return 1; }
    int32_t SearchForItemsAndProperties(const wchar_t* l, uint32_t m, IkrSysPropertyBag* f,
                                        IkrSysEnumPropertyBags** o) override {
        return Current().SearchForItemsAndProperties(l, m, f, o);
    }
    int32_t SearchForItemNames(const wchar_t* l, IkrSysEnumUris** o) override {
        return Current().SearchForItemNames(l, o);
    }
    int32_t GetPropertiesOfItem(const wchar_t* l, IkrSysPropertyBag** o) override {
        return Current().GetPropertiesOfItem(l, o);
    }
    int32_t EnumSystemExperts(const wchar_t* l, IkrSysEnumExperts** o) override {
        return Current().EnumSystemExperts(l, o);
    }
    int32_t SetNotificationHandler(const wchar_t* l, IkrSysNotificationHandler* h, uint32_t f) override {
        return Current().SetNotificationHandler(l, h, f);
    }
    int32_t PopulateOrRefreshProperties(IkrSysPropertyBag* b, uint32_t c, const PropertyTag* t,
                                        uint32_t a) override {
        return Current().PopulateOrRefreshProperties(b, c, t, a);
    }
    int32_t CreatePropertyBag(IkrSysPropertyBag** o) override { return Current().CreatePropertyBag(o); }
    int32_t RenameAlias(const wchar_t* l, const wchar_t* n, uint32_t m, uint32_t* c, SysString* a,
                        SysString* b) override {
        return Current().RenameAlias(l, n, m, c, a, b);
    }
    int32_t PersistChanges(IkrSysPropertyBag* b, uint32_t v, uint32_t* r, SysString* d) override {
        return Current().PersistChanges(b, v, r, d);
    }
};

Forwarder g_forwarder;

}  // namespace

Dispatch::Dispatch(FakeFramework& fake) {
    g_current = &fake;
    EXPECT_EQ(EnsureFramework(), 0);
    EXPECT_EQ(FrameworkPointer(), &g_forwarder);
}

Dispatch::~Dispatch() { g_current = nullptr; }

Dispatch::Result Dispatch::Run(std::initializer_list<std::pair<const wchar_t*, std::wstring>> args,
                               bool authenticated, bool firmware) {
    ArgumentMap map;
    for (const auto& [key, value] : args) map[WString(key)] = WString(value.c_str());
    return Run(map, authenticated, firmware);
}

Dispatch::Result Dispatch::Run(const ArgumentMap& args, bool authenticated, bool firmware) {
    Result result;
    WString body;
    WString debug;
    try {
        result.status = DispatchFunction(args, body, debug, authenticated, firmware);
    } catch (long status) {
        result.thrown = true;
        result.status = static_cast<int32_t>(status);
        EXPECT_EQ(status, static_cast<long>(result.status)) << "a status must be thrown sign-extended";
    }
    result.body = Std(body);
    result.debug = Std(debug);
    return result;
}

}  // namespace qel::api::testing

extern "C" int32_t qelsysInstantiateFramework(qel::api::IkrSysFramework** out) {
    *out = &qel::api::testing::g_forwarder;
    return 0;
}
