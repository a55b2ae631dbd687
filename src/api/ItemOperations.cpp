// The operations that find items, read their properties and change them.
#include <cstdint>
#include <new>

#include "api/ComPtr.h"
#include "api/Operations.h"
#include "api/PropertyBagCodec.h"
#include "foundation/IntegerText.h"
#include "foundation/Status.h"
#include "foundation/ThrowingStatus.h"
#include "xml/Serializers.h"

namespace qel::api {

namespace {

// The tag that carries an item's locator inside a bag.
constexpr PropertyTag kItemUriTag = 0x01000000;

uint32_t HexArgument(const WString& value) { return fnd::StringToInteger<uint32_t>(value, 16); }

// The bag's extended interface where it has one, else the bag itself: time
// values then fail when set, everything else still works.
ComPtr<IkrSysPropertyBag> ExtendedOrPlain(IkrSysPropertyBag* bag) {
    ComPtr<IkrSysPropertyBagEx> extended;
    if (bag->QueryInterface(kIID_IkrSysPropertyBagEx, extended.OutVoid()) >= 0 && extended) {
        IkrSysPropertyBag* plain = extended.Get();
        plain->AddRef();
        return ComPtr<IkrSysPropertyBag>(plain);
    }
    bag->AddRef();
    return ComPtr<IkrSysPropertyBag>(bag);
}

}  // namespace

std::unique_ptr<PropertyTag[]> AllocateTagArray(uint32_t count) {
    // On a 32-bit size_t a count above 0x3FFFFFFF would wrap into a small
    // block that the reader then overruns.
    const uint64_t bytes = static_cast<uint64_t>(count) * sizeof(PropertyTag);
    if (bytes > SIZE_MAX) throw std::bad_alloc();
    PropertyTag* tags = new (std::nothrow) PropertyTag[static_cast<size_t>(count)];
    if (!tags) throw std::bad_alloc();
    return std::unique_ptr<PropertyTag[]>(tags);
}

namespace {

// Writes a list element with one child per item the enumerator delivers,
// each item released before the next is asked for; an empty list comes out
// self-closed.
template <typename Item, typename Enumerator, typename WriteItem>
void WriteList(xml::XmlElement& parent, const wchar_t* name, Enumerator* items, WriteItem writeItem) {
    xml::XmlElement list;
    list.openChild(parent, name);
    if (items) {
        const WString nothing;
        ComPtr<Item> item;
        uint32_t fetched = 0;
        while (items->Next(1, item.Out(), &fetched) == 0 && item) {
            list.writeText(nothing);
            writeItem(list, item.Get());
        }
    }
    list.close();
}

}  // namespace

int32_t EnumSystemExperts(OperationContext& context) {
    ComPtr<IkrSysEnumExperts> experts;
    fnd::ThrowingStatus status;
    status = context.framework->EnumSystemExperts(context.locator.CStr(), experts.Out());

    WriteList<IkrSysExpertInfo>(context.fragment, L"SystemExperts", experts.Get(),
                                [](xml::XmlElement& list, IkrSysExpertInfo* expert) {
                                    xml::WriteExpertInfo(list, expert);
                                });
    return status;
}

int32_t GetPropertiesOfItem(OperationContext& context) {
    ComPtr<IkrSysPropertyBag> bag;
    fnd::ThrowingStatus status;
    status = context.framework->GetPropertiesOfItem(context.locator.CStr(), bag.Out());
    xml::XmlElement element;
    element.openChild(context.fragment, L"PropertyBag");
    if (bag) xml::WritePropertyBag(element, bag.Get(), 0, nullptr);
    element.close();
    return status;
}

int32_t SearchForItemNames(OperationContext& context) {
    ComPtr<IkrSysEnumUris> uris;
    fnd::ThrowingStatus status;
    status = context.framework->SearchForItemNames(context.locator.CStr(), uris.Out());
    if (status == fnd::kStatusOk) xml::WriteUriList(context.fragment, uris.Get());
    return status;
}

int32_t SearchForItemsAndProperties(OperationContext& context) {
    const WString* filterText = GetRequestVariable(context.args, L"FilterMode", false);
    const uint32_t filterMode = filterText ? HexArgument(*filterText) : 1;
    const WString* bagsText = GetRequestVariable(context.args, L"NbrBags", false);
    const uint32_t bagCount = bagsText ? HexArgument(*bagsText) : 0;
    if (bagCount > 1) throw static_cast<long>(fnd::kStatusFail);

    fnd::ThrowingStatus status;
    ComPtr<IkrSysPropertyBag> filter;
    if (bagCount == 1) {
        status = context.framework->CreatePropertyBag(filter.Out());
        if (!filter) throw static_cast<long>(fnd::kStatusFail);
        ComPtr<IkrSysPropertyBag> target = ExtendedOrPlain(filter.Get());
        DecodePropertyBag(context.args, target.Get(), 0, 0, nullptr);
    }

    ComPtr<IkrSysEnumPropertyBags> bags;
    status = context.framework->SearchForItemsAndProperties(context.locator.CStr(), filterMode, filter.Get(),
                                                            bags.Out());
    if (status != fnd::kStatusOk) return status;

    WriteList<IkrSysPropertyBag>(context.fragment, L"PropertyBags", bags.Get(),
                                 [](xml::XmlElement& list, IkrSysPropertyBag* bag) {
                                     xml::XmlElement element;
                                     element.openChild(list, L"PropertyBag");
                                     xml::WritePropertyBag(element, bag, 0, nullptr);
                                     element.close();
                                 });
    return status;
}

int32_t PopulateOrRefreshProperties(OperationContext& context) {
    ComPtr<IkrSysPropertyBag> bag;
    fnd::ThrowingStatus thrower;
    thrower = context.framework->GetPropertiesOfItem(context.locator.CStr(), bag.Out());
    const WString& allowAsync = *GetRequestVariable(context.args, L"AllowAsyncNotification", true);
    const uint32_t count = HexArgument(*GetRequestVariable(context.args, L"NbrTags", true));

    std::unique_ptr<PropertyTag[]> tags;
    try {
        tags = AllocateTagArray(count);
    } catch (const std::bad_alloc&) {
        throw static_cast<long>(fnd::kStatusOutOfMemory);
    }

    int32_t status = fnd::kStatusOk;
    bool listRead = false;
    try {
        ReadTagList(context.args, count, tags.get());
        listRead = true;
        status = context.framework->PopulateOrRefreshProperties(bag.Get(), count, tags.get(), HexArgument(allowAsync));
    } catch (long thrown) {
        status = static_cast<int32_t>(thrown);
    } catch (const std::bad_alloc&) {
        status = fnd::kStatusOutOfMemory;
    }

    xml::XmlElement element;
    element.openChild(context.fragment, L"PropertyBag");
    // A partly read list names no property reliably, and an empty filter
    // would select them all.
    if (bag && listRead) xml::WritePropertyBag(element, bag.Get(), count, tags.get());
    tags.reset();
    thrower = status;
    element.close();
    return status;
}

int32_t RenameAlias(OperationContext& context) {
    const WString& name = *GetRequestVariable(context.args, L"ItemName", true);
    const uint32_t mode = HexArgument(*GetRequestVariable(context.args, L"RenameValidationMode", true));

    uint32_t conflict = 0;
    SysStringHolder first;
    SysStringHolder second;
    const int32_t status =
        context.framework->RenameAlias(context.locator.CStr(), name.CStr(), mode, &conflict, first.Out(), second.Out());

    const WString firstText = xml::EscapeXml(first.Get(), nullptr);
    const WString secondText = xml::EscapeXml(second.Get(), nullptr);
    const WString nothing;
    xml::XmlElement result;
    result.openChild(context.fragment, L"RenameAliasResult");
    result.writeAttribute("conflictExisted", fnd::IntegerToString<uint32_t>(conflict, 16));
    result.writeText(nothing);
    xml::XmlElement uris;
    uris.openChild(result, L"URIs");
    uris.writeText(nothing);
    for (const WString* text : {&firstText, &secondText}) {
        xml::XmlElement uri;
        uri.openChild(uris, L"URI");
        uri.writeText(*text);
        uri.close();
    }
    uris.close();
    result.close();
    return status;
}

int32_t PersistPropertyChanges(OperationContext& context) {
    const uint32_t count = HexArgument(*GetRequestVariable(context.args, L"NbrTags", true));

    int32_t status = fnd::kStatusOk;
    uint32_t requiresRestart = 0;
    SysStringHolder detail;
    try {
        std::unique_ptr<PropertyTag[]> tags = AllocateTagArray(count);
        ReadTagList(context.args, count, tags.get());

        fnd::ThrowingStatus step;
        ComPtr<IkrSysPropertyBag> bag;
        step = context.framework->CreatePropertyBag(bag.Out());
        if (!bag) throw static_cast<long>(fnd::kStatusFail);
        ComPtr<IkrSysPropertyBagEx> extended;
        step = bag->QueryInterface(kIID_IkrSysPropertyBagEx, extended.OutVoid());
        if (!extended) throw static_cast<long>(fnd::kStatusNoInterface);

        // The untouched values first, so that change tracking sees only the
        // client's edits as changes.
        DecodePropertyBag(context.args, extended.Get(), 1, count, tags.get());
        step = extended->SetString(kItemUriTag, context.locator.CStr());
        step = extended->ResetChangeTracking();
        DecodePropertyBag(context.args, extended.Get(), 2, count, tags.get());

        const WString* validateText = GetRequestVariable(context.args, L"ValidateOnly", false);
        const uint32_t validateOnly = validateText ? HexArgument(*validateText) : 0;
        status = context.framework->PersistChanges(extended.Get(), validateOnly, &requiresRestart, detail.Out());
    } catch (long thrown) {
        status = static_cast<int32_t>(thrown);
    } catch (const std::bad_alloc&) {
        status = fnd::kStatusOutOfMemory;
    }

    xml::XmlElement persisted;
    persisted.openChild(context.fragment, L"PersistChanges");
    persisted.writeAttribute("requiresRestart", fnd::IntegerToString<uint32_t>(requiresRestart, 16));
    persisted.close();
    xml::WriteDetailedResult(detail.Get(), context.locator, context.fragment, &context.debugText);
    return status;
}

}  // namespace qel::api
