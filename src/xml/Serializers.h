// Framework objects written in the fixed XML shapes that every operation
// returning them shares.
#pragma once

#include "api/Framework.h"
#include "xml/XmlElement.h"

namespace qel::xml {

/// Writes one self-closed "ExpertInfo" child of `parent` with the attributes
/// productID, productDisplayName, productVersion and programmaticName. The
/// caller has ended the parent's start tag. All four queries are made before
/// anything is written: the first failure status is thrown as a `long` and
/// leaves the output untouched. A null expert throws kStatusPointer. The
/// expert is borrowed, not released; every string received is freed.
void WriteExpertInfo(XmlElement& parent, api::IkrSysExpertInfo* expert);

}  // namespace qel::xml

namespace qel::xml {

/// Writes one "Property" child of `bagElement` (opened by the caller, start
/// tag possibly still open) per selected property of `bag`, in the order the
/// bag enumerates its tags. With `filterCount` 0 every property is selected;
/// otherwise a tag is selected when it equals a filter entry, or when its low
/// 12 bits are not zero and its group (tag with those bits cleared) equals
/// one: an entry ending in 000 stands for its whole group. A failed query is
/// thrown as a `long`; the end of the enumeration and an enumerator error
/// both just end the list. The bag is borrowed.
void WritePropertyBag(XmlElement& bagElement, api::IkrSysPropertyBag* bag, uint32_t filterCount,
                      const api::PropertyTag* filter);

/// Writes a "DetailedResult" child of `parent` holding the escaped text
/// (null is empty; never self-closed). When `report` is given, each character
/// replaced by "?" adds an "InvalidChar" fragment naming `itemName` and the
/// position in the escaped text.
void WriteDetailedResult(const wchar_t* text, const fnd::WString& itemName, XmlElement& parent,
                         fnd::WString* report);

/// Writes a "URIs" child of `parent` with one "URI" per string the
/// enumerator delivers, escaped; an empty list is self-closed. Every string
/// received is freed; the enumerator is borrowed.
void WriteUriList(XmlElement& parent, api::IkrSysEnumUris* uris);

}  // namespace qel::xml
