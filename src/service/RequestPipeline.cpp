// The request pipeline: routing, the status boundary and the result envelope.
#include "service/RequestPipeline.h"

#include <new>

#include "api/Dispatcher.h"
#include "api/FrameworkAccess.h"
#include "catalog/CatalogDocuments.h"
#include "foundation/IntegerText.h"
#include "foundation/SafeInteger.h"
#include "foundation/Status.h"
#include "foundation/Tokenizer.h"
#include "foundation/osdep/IConv.h"
#include "service/FormData.h"
#include "service/ModuleState.h"
#include "service/RequestVariables.h"
#include "service/WebhostRuntime.h"
#include "xml/XmlElement.h"

namespace qel::service {

using fnd::NString;
using fnd::WString;

namespace {

constexpr const wchar_t* kApiRoot = L"QelSysAPI_Results";

[[noreturn]] void Fail(int32_t status) { throw static_cast<long>(status); }

struct RequestState {
    int32_t status = fnd::kStatusOk;
    WString body;
    WString debugText;
    NString catalogueBody;
    const wchar_t* rootName = kApiRoot;
    bool catalogue = false;
    bool utf8 = false;
    api::ArgumentMap args;
    FormResources form;
};

bool IsMapping(const WString& name, const wchar_t* expected) { return fnd::EqualsNoCase(name, WString(expected)); }
bool IsMethod(const NString& method, const char* expected) { return fnd::EqualsNoCase(method, NString(expected)); }

void RunApiRoute(void* request, const NString& method, const WString& mapping, RequestState& state) {
    if (!IsMethod(method, "POST")) Fail(fnd::kStatusFail);
    int32_t ensured = api::EnsureFramework();
    if (ensured < 0) Fail(ensured);

    NString contentType = ReadRequestVariable(request, "CONTENT_TYPE");
    bool utf8Form = contentType.Find(NString("UTF-8")) != NString::npos;
    if (!utf8Form && contentType.Find(NString("charset")) != NString::npos) Fail(fnd::kStatusFail);

    BuildArgumentMap(request, utf8Form, state.args, state.form);
    if (const WString* encoding = api::FindArgument(state.args, L"response_encoding"))
        state.utf8 = fnd::EqualsNoCase(*encoding, WString(L"UTF-8"));

    int32_t status = api::DispatchFunction(state.args, state.body, state.debugText,
                                           IsMapping(mapping, L"ServerAuthenticated"),
                                           IsMapping(mapping, L"ServerFirmware"));
    if (status < 0) Fail(status);
    state.status = status;
}

void RunItemDefinitions(void* request, RequestState& state) {
    std::vector<WString> items;
    fnd::Tokenizer tokens(fnd::osdep::Widen(ReadRequestVariable(request, "items")), WString(L","));
    while (tokens.HasMoreTokens()) items.push_back(tokens.NextToken());
    WString language = fnd::osdep::Widen(ReadRequestVariable(request, "loc"));
    state.status = catalog::WriteItemDefinitions(items, language, state.catalogueBody);
}

void Route(const webhost::RequestMapping* mapping, void* request, RequestState& state) {
    NString method = ReadRequestVariable(request, "REQUEST_METHOD");
    WString name = mapping ? mapping->MappingName() : WString();

    if (IsMapping(name, L"Server") || IsMapping(name, L"ServerAuthenticated") ||
        IsMapping(name, L"ServerFirmware")) {
        RunApiRoute(request, method, name, state);
    } else if (IsMapping(name, L"ItemBindings") || IsMapping(name, L"ItemDefs")) {
        // The method is checked before the flags are set, so a refused
        // catalogue request is answered like an API failure.
        if (!IsMethod(method, "GET")) Fail(fnd::kStatusFail);
        bool bindings = IsMapping(name, L"ItemBindings");
        state.catalogue = state.utf8 = true;
        state.rootName = bindings ? L"allbindings" : L"definitions";
        if (bindings) state.status = catalog::WriteAllBindings(state.catalogueBody);
        else RunItemDefinitions(request, state);
    } else {
        state.status = fnd::kStatusFail;
    }
}

WString StatusText(int32_t status) { return fnd::IntegerToString(static_cast<uint32_t>(status), 16); }

// The envelope on a UTF-8 sink: declaration, root, body, debug text.
void WriteUtf8Document(void* request, RequestState& state) {
    NString document("<?xml version='1.0' encoding='utf-8'?>");
    // A catalogue body runs to megabytes: one block for the whole document
    // spares a regrowth (and a copy of the body) at the end tag.
    if (state.catalogue) document.Reserve(document.Length() + state.catalogueBody.Length() + 128);
    {
        xml::XmlElement root;
        root.openRoot(&document, state.rootName);
        root.writeAttribute("hr", StatusText(state.status));
        root.writeAttribute("version", WString(L"00010001"));
        if (state.catalogue) root.writeText(state.catalogueBody);
        else root.writeText(state.body);
        if (!state.debugText.IsEmpty()) {
            xml::XmlElement debug;
            debug.openChild(root, L"DebugInformation");
            debug.writeText(state.debugText);
        }
    }
    SetHTTPResponseMimeType_C_REST_QEL_QLWS_(request, "text/xml; charset=utf-8");
    WriteOutput_C_REST_QEL_QLWS_(request, document.CStr(), document.Length());
}

// The envelope in UTF-16LE. The pieces around the body are written on a
// small wide sink and encoded as they come; the body is encoded straight into
// the output, which grows to its final size once, and is released before the
// runtime copies the output. At most the wide body and the encoded document
// are alive together.
void WriteUtf16Document(void* request, RequestState& state) {
    WString pieces(L"<?xml version='1.0' encoding='utf-16le'?>");
    NString head;
    NString output;
    {
        xml::XmlElement root;
        root.openRoot(&pieces, state.rootName);
        root.writeAttribute("hr", StatusText(state.status));
        root.writeAttribute("version", WString(L"00010001"));
        root.writeText(WString());
        fnd::osdep::AppendUtf16Le(head, pieces);
        pieces.Clear();
        if (!state.debugText.IsEmpty()) {
            xml::XmlElement debug;
            debug.openChild(root, L"DebugInformation");
            debug.writeText(state.debugText);
        }
    }
    // `pieces` now holds what follows the body; it is small, so encoding it
    // first lets the output be reserved once for the whole document.
    NString tail;
    fnd::osdep::AppendUtf16Le(tail, pieces);
    output.Reserve(fnd::CheckedAdd(fnd::CheckedAdd(head.Length(), tail.Length()),
                                   fnd::osdep::Utf16LeSize(state.body.Data(), state.body.Length())));
    output.Append(head);
    fnd::osdep::AppendUtf16Le(output, state.body);
    WString().Swap(state.body);
    output.Append(tail);
    SetHTTPResponseMimeType_C_REST_QEL_QLWS_(request, "text/xml; charset=utf-16le");
    WriteOutput_C_REST_QEL_QLWS_(request, output.CStr(), output.Length());
}

}  // namespace

void RunRequest(const webhost::RequestMapping* mapping, void* request) noexcept {
    try {
        RequestState state;
        try {
            Route(mapping, request, state);
        } catch (long status) {
            state.status = static_cast<int32_t>(status);
        } catch (const std::bad_alloc&) {
            state.status = fnd::kStatusOutOfMemory;
        } catch (...) {
            // Anything else (text that is not valid UTF-8, a number out of
            // range, a listing that failed) must not read as success.
            state.status = fnd::kStatusFail;
        }
        state.form.Release();
        if (state.utf8) WriteUtf8Document(request, state);
        else WriteUtf16Document(request, state);
    } catch (...) {
        // Memory ran out or the writer overflowed while answering: the
        // request gets no body from the plug-in.
    }
}

}  // namespace qel::service
