// The operations that find items and read their properties.
#include "api/ComPtr.h"
#include "api/Operations.h"
#include "foundation/ThrowingStatus.h"
#include "xml/Serializers.h"

namespace qel::api {

int32_t EnumSystemExperts(OperationContext& context) {
    ComPtr<IkrSysEnumExperts> experts;
    fnd::ThrowingStatus status;
    status = context.framework->EnumSystemExperts(context.locator.CStr(), experts.Out());

    xml::XmlElement list;
    list.openChild(context.fragment, L"SystemExperts");
    if (experts) {
        const WString nothing;
        ComPtr<IkrSysExpertInfo> expert;
        uint32_t fetched = 0;
        while (experts->Next(1, expert.Out(), &fetched) == 0 && expert) {
            list.writeText(nothing);
            xml::WriteExpertInfo(list, expert.Get());
        }
    }
    list.close();
    return status;
}

}  // namespace qel::api
