// Result serialization: framework objects into their XML elements.
#include "xml/Serializers.h"

#include <vector>

#include "api/ComPtr.h"
#include "foundation/IntegerText.h"
#include "foundation/Status.h"
#include "foundation/ThrowingStatus.h"
#include "xml/PropertyValue.h"

namespace qel::xml {

void WriteExpertInfo(XmlElement& parent, api::IkrSysExpertInfo* expert) {
    fnd::ThrowingStatus status;
    if (!expert) status = fnd::kStatusPointer;
    api::Guid productId;
    api::SysStringHolder displayName;
    api::SysStringHolder version;
    api::SysStringHolder programmaticName;
    status = expert->GetProductID(&productId);
    status = expert->GetProductDisplayName(displayName.Out());
    status = expert->GetProductVersion(version.Out());
    status = expert->GetProgrammaticName(programmaticName.Out());

    // Built before the element is opened, so that running out of memory here
    // leaves no half-written element either.
    const fnd::WString idText = productId.ToString();
    const fnd::WString nameText = EscapeXml(displayName.Get(), nullptr);
    const fnd::WString versionText = EscapeXml(version.Get(), nullptr);
    const fnd::WString programmaticText = EscapeXml(programmaticName.Get(), nullptr);

    XmlElement info;
    info.openChild(parent, L"ExpertInfo");
    info.writeAttribute("productID", idText);
    info.writeAttribute("productDisplayName", nameText);
    info.writeAttribute("productVersion", versionText);
    info.writeAttribute("programmaticName", programmaticText);
    info.close();
}

}  // namespace qel::xml

namespace qel::xml {

namespace {

bool IsSelected(api::PropertyTag tag, uint32_t filterCount, const api::PropertyTag* filter) {
    if (filterCount == 0) return true;
    const api::PropertyTag group = tag & 0xFFFFF000u;
    const bool inGroup = (tag & 0xFFFu) != 0;
    for (uint32_t i = 0; i < filterCount; ++i)
        if (filter[i] == tag || (inGroup && filter[i] == group)) return true;
    return false;
}

// Upper-case hexadecimal without leading zeros into a buffer that is reused
// for every property of a bag, so that the attributes cost no allocation.
void SetHex(fnd::WString& out, uint32_t value) {
    wchar_t digits[8];
    uint32_t pos = 8;
    do {
        digits[--pos] = L"0123456789ABCDEF"[value & 0xF];
        value >>= 4;
    } while (value);
    out.Assign(digits + pos, 8 - pos);
}

}  // namespace

void WritePropertyBag(XmlElement& bagElement, api::IkrSysPropertyBag* bag, uint32_t filterCount,
                      const api::PropertyTag* filter) {
    fnd::ThrowingStatus status;
    if (!bag) status = fnd::kStatusPointer;
    api::ComPtr<api::IkrSysEnumTags> tags;
    status = bag->EnumPropertyTags(tags.Out());
    if (!tags) return;

    const fnd::WString nothing;
    fnd::WString tagText(8, L'0');
    fnd::WString typeText(8, L'0');
    api::PropertyTag tag = 0;
    uint32_t fetched = 0;
    while (tags->Next(1, &tag, &fetched) == 0) {
        if (!IsSelected(tag, filterCount, filter)) continue;
        api::PropertyTypeCode type = 0;
        status = bag->GetPropertyType(tag, &type);
        // The value is read before anything of this property is written, so
        // a failing query leaves no half-written element behind.
        fnd::WString value = FormatPropertyValue(bag, tag, type);
        if (type == api::kTypeString && !value.IsEmpty()) value = EscapeXml(value.CStr(), nullptr);

        bagElement.writeText(nothing);
        XmlElement property;
        property.openChild(bagElement, L"Property");
        SetHex(tagText, tag);
        SetHex(typeText, type);
        property.writeAttribute("tag", tagText);
        property.writeAttribute("type", typeText);
        if (!value.IsEmpty()) property.writeText(value);
        property.close();
    }
}

void WriteDetailedResult(const wchar_t* text, const fnd::WString& itemName, XmlElement& parent,
                         fnd::WString* report) {
    std::vector<uint32_t> positions;
    const fnd::WString escaped = EscapeXml(text, report ? &positions : nullptr);
    XmlElement result;
    result.openChild(parent, L"DetailedResult");
    result.writeText(escaped);
    if (report && !positions.empty()) {
        // The item name comes from the client's locator arguments; unescaped,
        // a quote or "<" in it would break the document's debug section.
        const fnd::WString item = EscapeXml(itemName.CStr(), nullptr);
        for (uint32_t position : positions) {
            report->Append(L"<InvalidChar item='");
            report->Append(item);
            report->Append(L"'  position='");
            report->Append(fnd::IntegerToString<uint32_t>(position, 16));
            report->Append(L"'/>");
        }
    }
    result.close();
}

void WriteUriList(XmlElement& parent, api::IkrSysEnumUris* uris) {
    XmlElement list;
    list.openChild(parent, L"URIs");
    if (uris) {
        const fnd::WString nothing;
        uint32_t fetched = 0;
        for (;;) {
            api::SysStringHolder uri;
            if (uris->Next(1, uri.Out(), &fetched) != 0) break;
            const fnd::WString escaped = EscapeXml(uri.Get(), nullptr);
            list.writeText(nothing);
            XmlElement item;
            item.openChild(list, L"URI");
            item.writeText(escaped);
            item.close();
        }
    }
    list.close();
}

}  // namespace qel::xml
