// In-process fakes of the framework's objects for the operation tests: each
// counts its references and logs the calls it receives, and the framework
// the dispatcher finds forwards to whichever fake a test installs.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <string>
#include <vector>

#include "api/ArgumentMap.h"
#include "api/Framework.h"
#include "foundation/Status.h"

#if defined(__SANITIZE_ADDRESS__)
#include <sanitizer/lsan_interface.h>
#endif

namespace qel::api::testing {

inline std::wstring Std(const WString& s) { return std::wstring(s.CStr(), s.Length()); }

/// Strings the fakes hand out; the receiver must free each of them, which
/// the leak check of the sanitizer build verifies.
inline int g_stringsHandedOut = 0;
inline SysString HandOut(const std::wstring& text) {
    ++g_stringsHandedOut;
    return SysStringAllocLen(text.c_str(), static_cast<uint32_t>(text.size()));
}

inline void ExpectNoLeaks() {
#if defined(__SANITIZE_ADDRESS__)
    EXPECT_EQ(__lsan_do_recoverable_leak_check(), 0) << "a received string or object was not freed";
#endif
}

/// Reference counting shared by all fakes. A fake starts with the number of
/// references its creator holds (0 for one handed out by another fake).
template <typename Interface>
class Counted : public Interface {
public:
    int refs = 0;
    uint32_t AddRef() override { return static_cast<uint32_t>(++refs); }
    uint32_t Release() override {
        EXPECT_GT(refs, 0) << "released more often than referenced";
        return static_cast<uint32_t>(--refs);
    }
    int32_t QueryInterface(const Guid& iid, void** out) override {
        *out = nullptr;
        if (iid == kIID_IUnknown || Offers(iid)) {
            *out = static_cast<Interface*>(this);
            AddRef();
            return fnd::kStatusOk;
        }
        return fnd::kStatusNoInterface;
    }

protected:
    virtual bool Offers(const Guid&) const { return false; }
};

struct FakeProperty {
    PropertyTag tag = 0;
    PropertyTypeCode type = kTypeInteger1;
    int32_t integer = 0;
    uint32_t unsignedValue = 0;
    double real = 0.0;
    Guid guid{};
    std::wstring text;
    AbsTime time{};
    DateTimeFields fields{};
};

class FakeEnumTags final : public Counted<IkrSysEnumTags> {
public:
    std::vector<PropertyTag> tags;
    size_t next = 0;
    int32_t Next(uint32_t, PropertyTag* out, uint32_t* fetched) override {
        if (next >= tags.size()) return fnd::kStatusFalse;
        *out = tags[next++];
        *fetched = 1;
        return fnd::kStatusOk;
    }
};

/// A property bag with the extended interface unless `extended` is cleared.
/// Every setter appends "<kind> <tag hex> <value>" to `log`.
class FakeBag final : public Counted<IkrSysPropertyBagEx> {
public:
    bool extended = true;
    std::vector<FakeProperty> properties;
    std::vector<std::wstring> log;
    FakeEnumTags tagEnumerator;
    PropertyTag failingTag = 0xFFFFFFFF;  // its getters (and setters) fail
    int32_t failure = fnd::Status(0x8ABC0001u);

    FakeProperty& Add(PropertyTag tag, PropertyTypeCode type) {
        properties.push_back(FakeProperty{});
        properties.back().tag = tag;
        properties.back().type = type;
        return properties.back();
    }

    int32_t EnumPropertyTags(IkrSysEnumTags** out) override {
        tagEnumerator.tags.clear();
        tagEnumerator.next = 0;
        for (const FakeProperty& p : properties) tagEnumerator.tags.push_back(p.tag);
        tagEnumerator.AddRef();
        *out = &tagEnumerator;
        return fnd::kStatusOk;
    }
    int32_t GetPropertyType(PropertyTag tag, PropertyTypeCode* type) override {
        const FakeProperty* p = Find(tag);
        *type = p ? p->type : 0;
        return p ? fnd::kStatusOk : fnd::kStatusFail;
    }
    int32_t SetInteger1(PropertyTag tag, int32_t v) override { return Set(L"I1", tag, std::to_wstring(v)); }
    int32_t SetInteger2(PropertyTag tag, int32_t v) override { return Set(L"I2", tag, std::to_wstring(v)); }
    int32_t SetUnsigned(PropertyTag tag, uint32_t v) override { return Set(L"U", tag, std::to_wstring(v)); }
    int32_t SetDouble(PropertyTag tag, double v) override { return Set(L"D", tag, std::to_wstring(v)); }
    int32_t SetGuid(PropertyTag tag, Guid v) override { return Set(L"G", tag, Std(v.ToString())); }
    int32_t SetString(PropertyTag tag, const wchar_t* v) override { return Set(L"S", tag, v); }
    int32_t SetTimestamp(PropertyTag tag, const AbsTime* v) override {
        return Set(L"T", tag, std::to_wstring(v->fraction) + L"/" + std::to_wstring(v->seconds));
    }
    int32_t ResetChangeTracking() override {
        log.push_back(L"reset");
        return resetStatus;
    }
    int32_t resetStatus = fnd::kStatusOk;

    int32_t GetInteger1(PropertyTag tag, int32_t* v) override { return Get(tag, [&](auto& p) { *v = p.integer; }); }
    int32_t GetInteger2(PropertyTag tag, int32_t* v) override { return Get(tag, [&](auto& p) { *v = p.integer; }); }
    int32_t GetUnsigned(PropertyTag tag, uint32_t* v) override {
        return Get(tag, [&](auto& p) { *v = p.unsignedValue; });
    }
    int32_t GetDouble(PropertyTag tag, double* v) override { return Get(tag, [&](auto& p) { *v = p.real; }); }
    int32_t GetGuid(PropertyTag tag, Guid* v) override { return Get(tag, [&](auto& p) { *v = p.guid; }); }
    int32_t GetString(PropertyTag tag, SysString* v) override {
        return Get(tag, [&](auto& p) { *v = HandOut(p.text); });
    }
    int32_t GetDateTime(PropertyTag tag, DateTimeFields* v) override {
        return Get(tag, [&](auto& p) { *v = p.fields; });
    }
    int32_t GetTimestamp(PropertyTag tag, AbsTime* v) override { return Get(tag, [&](auto& p) { *v = p.time; }); }

protected:
    bool Offers(const Guid& iid) const override {
        return iid == kIID_IkrSysPropertyBag || (extended && iid == kIID_IkrSysPropertyBagEx);
    }

private:
    const FakeProperty* Find(PropertyTag tag) const {
        for (const FakeProperty& p : properties)
            if (p.tag == tag) return &p;
        return nullptr;
    }
    template <typename F>
    int32_t Get(PropertyTag tag, F read) {
        const FakeProperty* p = Find(tag);
        if (!p) return fnd::kStatusFail;
        read(*p);
        return tag == failingTag ? failure : fnd::kStatusOk;
    }
    int32_t Set(const wchar_t* kind, PropertyTag tag, const std::wstring& value) {
        wchar_t hex[16];
        std::swprintf(hex, 16, L"%X", tag);
        log.push_back(std::wstring(kind) + L" " + hex + L" " + value);
        return tag == failingTag ? failure : fnd::kStatusOk;
    }
};

template <typename Interface, typename Element>
class FakeEnumerator final : public Counted<Interface> {
public:
    std::vector<Element*> items;
    size_t next = 0;
    int32_t Next(uint32_t, Element** out, uint32_t* fetched) override {
        if (next >= items.size()) return fnd::kStatusFalse;
        *out = items[next++];
        (*out)->AddRef();
        *fetched = 1;
        return fnd::kStatusOk;
    }
};
using FakeEnumBags = FakeEnumerator<IkrSysEnumPropertyBags, IkrSysPropertyBag>;

class FakeEnumUris final : public Counted<IkrSysEnumUris> {
public:
    std::vector<std::wstring> uris;
    size_t next = 0;
    int32_t Next(uint32_t, SysString* out, uint32_t* fetched) override {
        if (next >= uris.size()) return fnd::kStatusFalse;
        *out = HandOut(uris[next++]);
        *fetched = 1;
        return fnd::kStatusOk;
    }
};

/// Firmware and diagnostics: each call is logged with its arguments and
/// answers `status`; text outputs are handed out even on failure, because
/// the caller owns whatever it receives.
class FakeFirmware final : public Counted<IkrSysFirmware> {
public:
    int32_t status = fnd::kStatusOk;
    std::wstring detail = L"ok";
    std::wstring version = L"5.1 <beta>";
    uint32_t state = 2, percent = 100, restart = 1;
    std::vector<std::wstring> log;
    std::vector<uint8_t> imageBytes;
    IkrSysBinaryImage* keptImage = nullptr;  // set: the fake keeps a reference
    bool keepImage = false;

    int32_t BeginFirmwareChange(const wchar_t* locator, uint32_t stop, uint32_t length, SysString* out) override {
        log.push_back(L"begin " + std::wstring(locator) + L" " + std::to_wstring(stop) + L" " +
                      std::to_wstring(length));
        *out = HandOut(detail);
        return status;
    }
    int32_t UpdateFirmwareImage(const wchar_t* locator, const wchar_t* token, uint32_t overwrite,
                                const wchar_t* clientName, IkrSysBinaryImage* image) override {
        uint32_t size = 0;
        const uint8_t* data = nullptr;
        EXPECT_EQ(image->GetSize(&size), 0);
        EXPECT_EQ(image->GetData(&data), 0);
        imageBytes.assign(data, data + size);
        if (keepImage) {
            image->AddRef();
            keptImage = image;
        }
        log.push_back(L"image " + std::wstring(locator) + L" " + token + L" " + std::to_wstring(overwrite) + L" " +
                      clientName + L" " + std::to_wstring(size));
        return status;
    }
    int32_t UpdateFirmwareVersion(const wchar_t* locator, const wchar_t* token, uint32_t overwrite,
                                  const wchar_t* v) override {
        log.push_back(L"version " + std::wstring(locator) + L" " + token + L" " + std::to_wstring(overwrite) + L" " +
                      v);
        return status;
    }
    int32_t EraseFirmware(const wchar_t* locator, const wchar_t* token) override {
        log.push_back(L"erase " + std::wstring(locator) + L" " + token);
        return status;
    }
    int32_t CheckFirmwareStatus(const wchar_t* locator, uint32_t* s, uint32_t* p, uint32_t* r,
                                SysString* v) override {
        log.push_back(L"check " + std::wstring(locator));
        *s = state;
        *p = percent;
        *r = restart;
        *v = HandOut(version);
        return status;
    }
};

class FakeDiagnostics final : public Counted<IkrSysDiagnostics> {
public:
    int32_t status = fnd::kStatusOk;
    std::wstring detail = L"passed";
    std::vector<std::wstring> log;
    int32_t Reset(const wchar_t* locator, uint32_t mode) override {
        log.push_back(L"reset " + std::wstring(locator) + L" " + std::to_wstring(mode));
        return status;
    }
    int32_t SelfTest(const wchar_t* locator, uint32_t mode, SysString* out) override {
        log.push_back(L"test " + std::wstring(locator) + L" " + std::to_wstring(mode));
        *out = HandOut(detail);
        return status;
    }
    int32_t SelfCalibrate(const wchar_t* locator, SysString* out) override {
        log.push_back(L"calibrate " + std::wstring(locator));
        *out = HandOut(detail);
        return status;
    }
};

/// The framework: each call logs "<call> <locator>" and answers from its
/// public members. Bags it creates come from `created`.
class FakeFramework final : public Counted<IkrSysFramework> {
public:
    FakeFirmware firmware;
    FakeDiagnostics diagnostics;
    bool offersFirmware = true, offersDiagnostics = true;
    std::vector<std::wstring> log;

    int32_t searchStatus = fnd::kStatusOk;
    uint32_t searchFilterMode = 0xDEAD;
    bool searchHadFilter = false;
    FakeEnumBags bags;
    FakeEnumUris uris;
    int32_t namesStatus = fnd::kStatusOk;
    FakeBag item;  // GetPropertiesOfItem
    int32_t itemStatus = fnd::kStatusOk;
    FakeBag created;  // CreatePropertyBag
    int32_t createStatus = fnd::kStatusOk;
    int32_t populateStatus = fnd::kStatusOk;
    std::vector<PropertyTag> populatedTags;
    uint32_t populateAsync = 0xDEAD;
    uint32_t conflict = 1;
    std::wstring uri1 = L"//localhost/P/a'b", uri2 = L"//localhost/P/<c>";
    int32_t renameStatus = fnd::kStatusOk;
    std::wstring renameArgs;
    int32_t persistStatus = fnd::kStatusOk;
    uint32_t persistRestart = 1, persistValidate = 0xDEAD;
    std::wstring persistDetail = L"saved";
    std::vector<std::wstring> persistedLog;  // the bag's log when persisted

    int32_t SearchForItemsAndProperties(const wchar_t* locator, uint32_t mode, IkrSysPropertyBag* filter,
                                        IkrSysEnumPropertyBags** out) override {
        log.push_back(L"search " + std::wstring(locator));
        searchFilterMode = mode;
        searchHadFilter = filter != nullptr;
        bags.AddRef();
        *out = &bags;
        return searchStatus;
    }
    int32_t SearchForItemNames(const wchar_t* locator, IkrSysEnumUris** out) override {
        log.push_back(L"names " + std::wstring(locator));
        uris.AddRef();
        *out = &uris;
        return namesStatus;
    }
    int32_t GetPropertiesOfItem(const wchar_t* locator, IkrSysPropertyBag** out) override {
        log.push_back(L"get " + std::wstring(locator));
        item.AddRef();
        *out = &item;
        return itemStatus;
    }
    int32_t EnumSystemExperts(const wchar_t*, IkrSysEnumExperts** out) override {
        *out = nullptr;
        return fnd::kStatusNotImplemented;
    }
    int32_t SetNotificationHandler(const wchar_t*, IkrSysNotificationHandler*, uint32_t) override {
        return fnd::kStatusNotImplemented;
    }
    int32_t PopulateOrRefreshProperties(IkrSysPropertyBag* bag, uint32_t count, const PropertyTag* tags,
                                        uint32_t async) override {
        log.push_back(L"populate");
        EXPECT_EQ(bag, static_cast<IkrSysPropertyBag*>(&item));
        populatedTags.assign(tags, tags + count);
        populateAsync = async;
        return populateStatus;
    }
    int32_t CreatePropertyBag(IkrSysPropertyBag** out) override {
        log.push_back(L"create");
        created.AddRef();
        *out = &created;
        return createStatus;
    }
    int32_t RenameAlias(const wchar_t* locator, const wchar_t* name, uint32_t mode, uint32_t* c, SysString* a,
                        SysString* b) override {
        renameArgs = std::wstring(locator) + L" " + name + L" " + std::to_wstring(mode);
        *c = conflict;
        *a = HandOut(uri1);
        *b = HandOut(uri2);
        return renameStatus;
    }
    int32_t PersistChanges(IkrSysPropertyBag* bag, uint32_t validate, uint32_t* restart, SysString* detail) override {
        log.push_back(L"persist");
        EXPECT_EQ(bag, static_cast<IkrSysPropertyBag*>(&created));
        persistedLog = created.log;
        persistValidate = validate;
        *restart = persistRestart;
        *detail = HandOut(persistDetail);
        return persistStatus;
    }

    /// Every object handed out has been released again.
    void ExpectAllReleased() const {
        EXPECT_EQ(item.refs, 0);
        EXPECT_EQ(item.tagEnumerator.refs, 0);
        EXPECT_EQ(created.refs, 0);
        EXPECT_EQ(created.tagEnumerator.refs, 0);
        EXPECT_EQ(bags.refs, 0);
        EXPECT_EQ(uris.refs, 0);
        EXPECT_EQ(firmware.refs, 0);
        EXPECT_EQ(diagnostics.refs, 0);
    }

protected:
    bool Offers(const Guid& iid) const override { return iid == kIID_IkrSysFramework; }

public:
    int32_t QueryInterface(const Guid& iid, void** out) override {
        *out = nullptr;
        if (iid == kIID_IkrSysFirmware && offersFirmware) {
            firmware.AddRef();
            *out = static_cast<IkrSysFirmware*>(&firmware);
            return fnd::kStatusOk;
        }
        if (iid == kIID_IkrSysDiagnostics && offersDiagnostics) {
            diagnostics.AddRef();
            *out = static_cast<IkrSysDiagnostics*>(&diagnostics);
            return fnd::kStatusOk;
        }
        return Counted<IkrSysFramework>::QueryInterface(iid, out);
    }
};

/// Installs `fake` as the framework the dispatcher finds (for the life of
/// this object) and runs requests through the dispatcher.
class Dispatch {
public:
    explicit Dispatch(FakeFramework& fake);
    ~Dispatch();

    struct Result {
        int32_t status = 0;
        bool thrown = false;
        std::wstring body;
        std::wstring debug;
    };
    /// Runs `args` ("Key", "Value" pairs) through the given mapping. A thrown
    /// status is caught and reported with `thrown` set.
    Result Run(std::initializer_list<std::pair<const wchar_t*, std::wstring>> args, bool authenticated = true,
               bool firmware = true);
    Result Run(const ArgumentMap& args, bool authenticated = true, bool firmware = true);
};

}  // namespace qel::api::testing
