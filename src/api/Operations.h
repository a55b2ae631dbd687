// The operations behind the "Function" names, as the dispatcher calls them.
#pragma once

#include <cstdint>
#include <memory>

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

// Each operation returns its status; a failure is thrown as a `long`, except
// where noted that the output is written first and the failure returned (the
// dispatcher's status holder throws it then). Missing required arguments
// fail with kStatusFail before the framework is called. Every interface and
// string received is released on every path.

/// "EnumSystemExperts": a "SystemExperts" list with one "ExpertInfo" per
/// expert.
int32_t EnumSystemExperts(OperationContext& context);
/// "GetPropertiesOfItem": one "PropertyBag" with every property of the item.
int32_t GetPropertiesOfItem(OperationContext& context);
/// "SearchForItemNames": "URIs" when the search answers 0, nothing otherwise.
int32_t SearchForItemNames(OperationContext& context);
/// "SearchForItemsAndProperties": "FilterMode" (absent: 1), "NbrBags" (0 or
/// 1) and the filter bag; "PropertyBags" when the search answers 0.
int32_t SearchForItemsAndProperties(OperationContext& context);
/// "PopulateOrRefreshProperties": refreshes the listed tags ("NbrTags",
/// "Tag_i") and writes them as a "PropertyBag", failure or not. When the tag
/// list cannot be read completely the bag element stays empty.
int32_t PopulateOrRefreshProperties(OperationContext& context);
/// "RenameAlias": "RenameAliasResult" with the two returned URIs, written
/// whatever the framework answers; its status is returned.
int32_t RenameAlias(OperationContext& context);
/// "PersistPropertyChanges": persists the listed tags of the request's bag;
/// "PersistChanges" and "DetailedResult" are written whatever the outcome
/// and the status is returned.
int32_t PersistPropertyChanges(OperationContext& context);

/// "CheckFirmwareStatus": "CheckFirmwareResult" unless the call failed.
int32_t CheckFirmwareStatus(OperationContext& context);
/// "BeginFirmwareChange": "DetailedResult" whatever the framework answers.
int32_t BeginFirmwareChange(OperationContext& context);
/// "UpdateFirmwareVersion": writes nothing.
int32_t UpdateFirmwareVersion(OperationContext& context);
/// "UpdateFirmwareImage": the uploaded file as an image object; a file that
/// cannot be read gives kStatusBadUpload. Writes nothing.
int32_t UpdateFirmwareImage(OperationContext& context);
/// "EraseFirmware": writes nothing.
int32_t EraseFirmware(OperationContext& context);
/// "PerformDeviceReset": writes nothing.
int32_t PerformDeviceReset(OperationContext& context);
/// "DiagnosticSelfTest" and "DiagnosticSelfCalibrate": "DetailedResult"
/// whatever the framework answers.
int32_t DiagnosticSelfTest(OperationContext& context);
int32_t DiagnosticSelfCalibrate(OperationContext& context);

/// An array of `count` tags, never a shorter one: a count whose bytes do not
/// fit in memory or in a size_t throws std::bad_alloc.
std::unique_ptr<PropertyTag[]> AllocateTagArray(uint32_t count);

}  // namespace qel::api
