// The operations behind the "Function" names, as the dispatcher calls them.
#pragma once

#include <cstdint>

#include "api/ArgumentMap.h"
#include "api/Framework.h"
#include "xml/XmlElement.h"

namespace qel::api {

/// What every operation is handed by the dispatcher.
struct OperationContext {
    IkrSysFramework* framework;
    const WString& locator;
    const ArgumentMap& args;
    xml::XmlElement& fragment;  // unnamed: its children go straight into the body
    WString& debugText;
};

/// "EnumSystemExperts": a "SystemExperts" list with one "ExpertInfo" per
/// expert. A failing framework call is thrown as a `long`.
int32_t EnumSystemExperts(OperationContext& context);

}  // namespace qel::api
