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
